// SPDX-License-Identifier: Apache-2.0
#include <base/FileError.h>

#include <cerrno>
#include <cstring>
#include <gtest/gtest.h>
#include <string>

namespace tessel::base {
namespace {

TEST(FileErrorTest, SystemTextIsThatOfStrerror) {
    for (int error = 0; error < 200; ++error) {
        EXPECT_EQ(std::strerror(error), SystemText(error));
    }
    EXPECT_EQ(std::strerror(-1), SystemText(-1));
}

TEST(FileErrorTest, TellsOperationPathAndTheSystemsReason) {
    FileError const error("read", "/etc/hosts", EACCES);
    EXPECT_STREQ("Cannot read '/etc/hosts': Permission denied", error.what());
    EXPECT_EQ("read", error.Operation());
    EXPECT_EQ("/etc/hosts", error.Path());
    EXPECT_EQ(EACCES, error.Error());
    EXPECT_EQ("Permission denied", error.Reason());
}

TEST(FileErrorTest, AReasonInWordsHasNoNumber) {
    FileError const error("replace", "/dev/null", "it is not a regular file");
    EXPECT_STREQ("Cannot replace '/dev/null': it is not a regular file", error.what());
    EXPECT_EQ(0, error.Error());
}

} // namespace
} // namespace tessel::base
