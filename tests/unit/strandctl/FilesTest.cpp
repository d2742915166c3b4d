// SPDX-License-Identifier: Apache-2.0
#include "Files.h"

#include "HostCtlFailure.h"
#include "TemporaryFolder.h"

#include <cerrno>
#include <gtest/gtest.h>
#include <optional>
#include <string>

namespace StrandCtl {
namespace {

TEST(FilesTest, FilesAreReadAndReplaced) {
    TemporaryFolder const folder;
    std::string const target = folder / "hosts";
    EXPECT_EQ(std::nullopt, ReadFile(target));
    ReplaceFile(target, "new");
    EXPECT_EQ("new", ReadFile(target));
    EXPECT_EQ(0644U, ModeOf(target));
    EXPECT_EQ(std::filesystem::canonical(folder.Path()).string() + "/hosts", Destination(target));
}

TEST(FilesTest, FailuresAreTheLibrarysOwn) {
    TemporaryFolder const folder;
    std::string const target = folder / "hosts";
    EXPECT_EQ("Cannot read '" + folder.Path() + "': it is not a regular file",
              FailureOf([&] { ReadFile(folder.Path()); }));
    EXPECT_EQ("Cannot replace '" + folder.Path() + "': it is not a regular file",
              FailureOf([&] { ReplaceFile(folder.Path(), "new"); }));
    std::filesystem::create_symlink("hosts", target);
    EXPECT_EQ("Cannot follow '" + target + "': Too many levels of symbolic links",
              FailureOf([&] { ReplaceFile(target, "new"); }));
    EXPECT_EQ("Cannot follow '" + target + "': Too many levels of symbolic links",
              FailureOf([&] { Destination(target); }));
    EXPECT_EQ("Cannot do it: Permission denied",
              FailureOf([] { ThrowSystemError("Cannot do it", EACCES); }));
}

} // namespace
} // namespace StrandCtl
