// SPDX-License-Identifier: Apache-2.0
#include "host/FolderSnapshot.h"

#include "../../TemporaryFolder.h"

#include <gmock/gmock.h>
#include <sys/stat.h>
#include <unistd.h>

namespace tessel::winbind {
namespace {

using testing::ElementsAre;

void Make(std::string const& path) {
    ASSERT_EQ(0, ::mkdir(path.c_str(), 0755));
}

TEST(FolderSnapshotTest, RemovesWhatIsNewAndNothingElse) {
    TemporaryFolder const folder;
    SetContents(folder / "old", "old");
    Make(folder / "below");
    FolderSnapshot const snapshot({folder.Path()});
    SetContents(folder / "old", "changed");
    SetContents(folder / "new", "new");
    SetContents(folder / "below/new", "new");
    Make(folder / "made");
    Make(folder / "made/deep");
    SetContents(folder / "made/deep/new", "new");
    snapshot.RemoveNewFiles();
    EXPECT_THAT(folder.Names(), ElementsAre("below", "old"));
    EXPECT_EQ("changed", Contents(folder / "old"));
    EXPECT_NE(0, ::rmdir((folder / "old").c_str()));
    EXPECT_EQ(0, ::rmdir((folder / "below").c_str())); // it is empty again
}

TEST(FolderSnapshotTest, RemovesAFolderThatWasNotThere) {
    TemporaryFolder const folder;
    FolderSnapshot const snapshot({folder / "made"});
    Make(folder / "made");
    SetContents(folder / "made/new", "new");
    SetContents(folder / "beside", "not looked at");
    snapshot.RemoveNewFiles();
    EXPECT_THAT(folder.Names(), ElementsAre("beside"));
}

TEST(FolderSnapshotTest, StandsForFoldersInsideEachOther) {
    TemporaryFolder const folder;
    Make(folder / "inner");
    SetContents(folder / "inner/old", "old");
    FolderSnapshot const snapshot({folder.Path(), folder / "inner", folder / "inner"});
    SetContents(folder / "inner/new", "new");
    snapshot.RemoveNewFiles();
    EXPECT_TRUE(::access((folder / "inner/old").c_str(), F_OK) == 0);
    EXPECT_FALSE(::access((folder / "inner/new").c_str(), F_OK) == 0);
}

} // namespace
} // namespace tessel::winbind
