// SPDX-License-Identifier: Apache-2.0
#include "host/StagingFolder.h"

#include "../../TemporaryFolder.h"
#include "Failure.h"

#include <filesystem>
#include <gmock/gmock.h>
#include <optional>
#include <string>
#include <sys/stat.h>

namespace tessel::winbind {
namespace {

using testing::ElementsAre;
using testing::IsEmpty;
using testing::SizeIs;

std::string PatternIn(TemporaryFolder const& folder) {
    return folder / "staging.XXXXXX";
}

TEST(StagingFolderTest, IsItsOwnersAlonePrivateAndGoesWithEverythingInIt) {
    TemporaryFolder const folder;
    {
        StagingFolder staging(PatternIn(folder));
        staging.Configure({"CORP.EXAMPLE", "CORP", "NODE", {}}, "corp.example", {"dc1"});
        staging.SetSecrets("secrets");
        EXPECT_EQ("secrets", staging.Secrets());
        ASSERT_THAT(folder.Names(), SizeIs(1));
        EXPECT_EQ(0700U, ModeOf(folder / folder.Names().front()));
        EXPECT_EQ(0600U, ModeOf(folder / folder.Names().front() + "/private/secrets.tdb"));
        EXPECT_NE(std::string::npos, Contents(staging.Configuration()).find("CORP.EXAMPLE"));
        EXPECT_NE(std::string::npos, Contents(staging.KerberosConfiguration()).find("kdc = dc1"));
        EXPECT_TRUE(std::filesystem::is_directory(staging.Memory()));
    }
    EXPECT_THAT(folder.Names(), IsEmpty());
}

TEST(StagingFolderTest, WithoutSecretsThereAreNone) {
    TemporaryFolder const folder;
    EXPECT_EQ("", StagingFolder(PatternIn(folder)).Secrets());
}

TEST(StagingFolderTest, OneThatIsInUseOutlivesWhoCleansUp) {
    TemporaryFolder const folder;
    StagingFolder question(PatternIn(folder));
    StagingFolder::RemoveLeftOvers(PatternIn(folder));
    EXPECT_TRUE(std::filesystem::is_directory(question.Memory()));
    question.SetSecrets("still here");
    EXPECT_EQ("still here", question.Secrets());
}

TEST(StagingFolderTest, OneThatSomebodyHasLeftIsRemovedAndNothingElse) {
    TemporaryFolder const folder;
    std::filesystem::create_directories(folder / "staging.a1B2c3/private");
    SetContents(folder / "staging.a1B2c3/private/secrets.tdb", "secrets");
    std::filesystem::create_directory(folder / "staging.longer1");
    std::filesystem::create_directory(folder / "another.a1B2c3");
    SetContents(folder / "staging.a1B2c4", "a file");
    std::filesystem::create_directory_symlink("another.a1B2c3", folder / "staging.a1B2c5");
    StagingFolder::RemoveLeftOvers(PatternIn(folder));
    EXPECT_THAT(folder.Names(), ElementsAre("another.a1B2c3", "staging.a1B2c4", "staging.a1B2c5",
                                            "staging.longer1"));
}

TEST(StagingFolderTest, WhereNoneCanBeMadeThatIsAFailure) {
    TemporaryFolder const folder;
    EXPECT_THROW(StagingFolder(folder / "none/staging.XXXXXX"), Failure);
}

} // namespace
} // namespace tessel::winbind
