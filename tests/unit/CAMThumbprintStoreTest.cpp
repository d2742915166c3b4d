// SPDX-License-Identifier: Apache-2.0
#include <tslauth/CAMThumbprintStore.h>

#include "../TemporaryFolder.h"

#include <gmock/gmock.h>
#include <sys/stat.h>
#include <tslauth/Exceptions.h>
#include <type_traits>

namespace tessel::authentication {
namespace {

constexpr char first[] = "0A:1B:2C:3D:4E:5F:60:71:82:93:A4:B5:C6:D7:E8:F9:0A:1B:2C:FF";
constexpr char second[] = "FF:1B:2C:3D:4E:5F:60:71:82:93:A4:B5:C6:D7:E8:F9:0A:1B:2C:00";

class CAMThumbprintStoreTest : public testing::Test {
protected:
    /// Changes with every replacement of the file.
    ino_t FileIdentity() const {
        struct stat status = {};
        EXPECT_EQ(0, ::stat(path.c_str(), &status));
        return status.st_ino;
    }

    TemporaryFolder folder;
    std::string path = folder / "camservers.conf";
};

TEST_F(CAMThumbprintStoreTest, IsAConfiguration) {
    static_assert(std::is_base_of_v<Configuration, CAMThumbprintStore>);
    static_assert(sizeof(CAMThumbprintStore) == sizeof(Configuration));
}

TEST_F(CAMThumbprintStoreTest, AMissingFileIsAnIOErrorAndIsNotCreated) {
    try {
        CAMThumbprintStore store(path);
        FAIL() << "nothing was thrown";
    } catch (IOError const& error) {
        EXPECT_EQ("Unable to open '" + path + "': No such file or directory",
                  std::string(error.what()));
    }
    EXPECT_THAT(folder.Names(), testing::IsEmpty());
}

TEST_F(CAMThumbprintStoreTest, ImportWritesTheServersThumbprint) {
    SetContents(path, "");
    CAMThumbprintStore store(path);
    store.ImportThumbprint(first, "10.0.0.1");
    EXPECT_EQ("10.0.0.1 = \"" + std::string(first) + "\"\n", Contents(path));
    EXPECT_EQ(first, store.LookupThumbprint("10.0.0.1"));
    EXPECT_EQ(first, CAMThumbprintStore(path).LookupThumbprint("10.0.0.1"));
}

TEST_F(CAMThumbprintStoreTest, ImportingTheSameThumbprintAgainWritesNothing) {
    SetContents(path, "");
    CAMThumbprintStore store(path);
    store.ImportThumbprint(first, "10.0.0.1");
    // Held open, so that a new file could not get the old one's identity.
    std::ifstream const held(path);
    ino_t const written = FileIdentity();
    store.ImportThumbprint(first, "10.0.0.1");
    CAMThumbprintStore(path).ImportThumbprint(first, "10.0.0.1");
    EXPECT_EQ(written, FileIdentity());
    store.ImportThumbprint(second, "10.0.0.1");
    EXPECT_NE(written, FileIdentity());
}

TEST_F(CAMThumbprintStoreTest, ImportingAnotherThumbprintReplacesOneLine) {
    SetContents(path, "10.0.0.2 = \"kept\"\n10.0.0.1 = \"" + std::string(first) + "\"\n");
    CAMThumbprintStore(path).ImportThumbprint(second, "10.0.0.1");
    EXPECT_EQ("10.0.0.1 = \"" + std::string(second) + "\"\n10.0.0.2 = \"kept\"\n", Contents(path));
}

TEST_F(CAMThumbprintStoreTest, ThumbprintsAreComparedByteForByte) {
    SetContents(path, "10.0.0.1 = \"ff\"\n");
    CAMThumbprintStore(path).ImportThumbprint("FF", "10.0.0.1");
    EXPECT_EQ("10.0.0.1 = \"FF\"\n", Contents(path));
}

TEST_F(CAMThumbprintStoreTest, ServersAreKeptAsTheCallerWroteThem) {
    SetContents(path, "");
    CAMThumbprintStore store(path);
    store.ImportThumbprint(first, "10.0.0.1");
    EXPECT_EQ("", store.LookupThumbprint("010.0.0.1"));
    EXPECT_EQ("", store.LookupThumbprint("10.0.0.1 "));
}

TEST_F(CAMThumbprintStoreTest, LookingUpAnUnknownServerGivesNothingAndChangesNothing) {
    SetContents(path, "10.0.0.2=x\n");
    CAMThumbprintStore const store(path);
    EXPECT_EQ("", store.LookupThumbprint("10.0.0.1"));
    EXPECT_EQ(1U, store.size());
    EXPECT_EQ("10.0.0.2=x\n", Contents(path));
}

TEST_F(CAMThumbprintStoreTest, AFailedImportLeavesTheFileAsItWas) {
    std::filesystem::create_directory(folder / "sub");
    std::string const gone = folder / "sub/camservers.conf";
    SetContents(gone, "");
    CAMThumbprintStore store(gone);
    std::filesystem::rename(folder / "sub", folder / "moved");
    try {
        store.ImportThumbprint(first, "10.0.0.1");
        FAIL() << "nothing was thrown";
    } catch (IOError const& error) {
        EXPECT_EQ("Unable to create temporary file to write '" + gone +
                      "': No such file or directory",
                  std::string(error.what()));
    }
    EXPECT_EQ("", Contents(folder / "moved/camservers.conf"));
}

} // namespace
} // namespace tessel::authentication
