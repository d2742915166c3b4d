// SPDX-License-Identifier: Apache-2.0
#include "SystemFile.h"

#include "../TemporaryFolder.h"
#include "../Unprivileged.h"
#include "../faults/Faults.h"

#include <cerrno>
#include <gmock/gmock.h>
#include <sys/stat.h>
#include <tslauth/Exceptions.h>

namespace tessel::authentication {
namespace {

template <typename Call> std::string IOErrorOf(Call call) {
    try {
        call();
    } catch (IOError const& error) {
        EXPECT_EQ(0UL, error.Code());
        return error.what();
    }
    return {};
}

class SystemFileTest : public testing::Test {
protected:
    TemporaryFolder folder;
    std::string path = folder / "file";
};

TEST_F(SystemFileTest, ThrowIOErrorJoinsOperationAndReason) {
    EXPECT_EQ("Cannot do it: Permission denied",
              IOErrorOf([] { ThrowIOError("Cannot do it", EACCES); }));
}

TEST_F(SystemFileTest, ReadFileGivesTheText) {
    std::string const text("a\0b\n", 4);
    SetContents(path, text);
    EXPECT_EQ(text, ReadFile(path));
    EXPECT_EQ(text, ReadFile(path, "Unable to open", OnReadError::EndQuietly));
}

TEST_F(SystemFileTest, WhatIsNoRegularFileIsRefusedAndNotWaitedFor) {
    ASSERT_EQ(0, ::mkfifo(path.c_str(), 0600));
    for (std::string const& name : {path, std::string("/dev/null"), std::string("/dev/zero")}) {
        for (OnReadError const onReadError : {OnReadError::Throw, OnReadError::EndQuietly}) {
            EXPECT_EQ("Cannot read '" + name + "': it is not a regular file",
                      IOErrorOf([&] { (void)ReadFile(name, "Cannot open", onReadError); }));
        }
    }
}

TEST_F(SystemFileTest, ReadFileLeavesNoDescriptorOpen) {
    SetContents(path, "a");
    auto const count = [] {
        return std::distance(std::filesystem::directory_iterator("/proc/self/fd"), {});
    };
    auto const before = count();
    (void)ReadFile(path);
    EXPECT_NE("", IOErrorOf([&] { (void)ReadFile(folder.Path()); }));
    ReplaceFile(path, "b");
    EXPECT_EQ(before, count());
}

TEST_F(SystemFileTest, AFileThatCannotBeOpenedIsReportedInTheCallersWords) {
    EXPECT_EQ("Cannot open '" + path + "': No such file or directory",
              IOErrorOf([&] { (void)ReadFile(path); }));
    EXPECT_EQ("Unable to open '" + path + "': No such file or directory",
              IOErrorOf([&] { (void)ReadFile(path, "Unable to open"); }));
}

TEST_F(SystemFileTest, AnUnreadableFileIsReportedAndStays) {
    if (!faults::Available()) {
        GTEST_SKIP() << "this kernel has no seccomp notifications";
    }
    SetContents(path, "a");
    ASSERT_EQ(0, ::chmod(folder.Path().c_str(), 0755));
    ASSERT_EQ(0, ::chmod(path.c_str(), 0));
    faults::Outcome const outcome = faults::Run(
        [&] {
            BecomeUnprivileged();
            (void)ReadFile(path);
        },
        [](std::size_t, std::string const&) { return faults::Happens(); });
    EXPECT_EQ("Cannot open '" + path + "': Permission denied", outcome.message);
    ASSERT_EQ(0, ::chmod(path.c_str(), 0600));
    EXPECT_EQ("a", Contents(path));
}

TEST_F(SystemFileTest, AReadErrorIsReportedUnlessItShallEndQuietly) {
    EXPECT_EQ("Cannot read '" + folder.Path() + "': it is not a regular file",
              IOErrorOf([&] { (void)ReadFile(folder.Path()); }));
    EXPECT_EQ("", ReadFile(folder.Path(), "Cannot open", OnReadError::EndQuietly));
}

TEST_F(SystemFileTest, AReadErrorInTheMiddleNeverShortensTheText) {
    if (!faults::Available()) {
        GTEST_SKIP() << "this kernel has no seccomp notifications";
    }
    SetContents(path, "abc");
    for (std::size_t const call : {1U, 2U}) {
        faults::Outcome const outcome = faults::RunWithFaultIn(
            "read", faults::FailsWith(EIO), [&] { (void)ReadFile(path); }, call, 1);
        EXPECT_TRUE(outcome.injected);
        EXPECT_EQ("tessel::authentication::IOError", outcome.exception);
        EXPECT_EQ("Cannot read '" + path + "': Input/output error", outcome.message);
    }
}

TEST_F(SystemFileTest, ReadFileMakesFiveCalls) {
    if (!faults::Available()) {
        GTEST_SKIP() << "this kernel has no seccomp notifications";
    }
    SetContents(path, std::string(100000, 'a'));
    EXPECT_THAT(faults::RunWithFaultAt(0, faults::Killed(), [&] { (void)ReadFile(path); }).calls,
                testing::ElementsAre("open", "stat", "read", "read", "close"));
}

TEST_F(SystemFileTest, ReplaceFileKeepsTheModeAndLeavesNothingBeside) {
    SetContents(path, "old");
    ASSERT_EQ(0, ::chmod(path.c_str(), 0640));
    std::string const text("n\0w", 3);
    ReplaceFile(path, text);
    EXPECT_EQ(text, Contents(path));
    EXPECT_EQ(0640U, ModeOf(path));
    EXPECT_THAT(folder.Names(), testing::ElementsAre("file"));
}

TEST_F(SystemFileTest, ReplaceFileWritesAnyLength) {
    for (std::size_t const size : {0U, 1U, 8190U, 8191U, 8192U, 10000000U}) {
        std::string const text(size, 'x');
        ReplaceFile(path, text);
        EXPECT_TRUE(Contents(path) == text) << size;
    }
}

TEST_F(SystemFileTest, ReplaceFileInAMissingFolderSaysWhatFailed) {
    EXPECT_EQ("Unable to create temporary file to write '" + path +
                  "/file': No such file or directory",
              IOErrorOf([&] { ReplaceFile(path + "/file", "a"); }));
    EXPECT_THAT(folder.Names(), testing::IsEmpty());
}

} // namespace
} // namespace tessel::authentication
