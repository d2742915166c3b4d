// SPDX-License-Identifier: Apache-2.0
#include "WholeFile.h"

#include "HostCtlFailure.h"
#include "TemporaryFolder.h"
#include "Unprivileged.h"
#include "faults/Faults.h"

#include <cerrno>
#include <filesystem>
#include <gmock/gmock.h>
#include <string>
#include <sys/stat.h>
#include <sys/wait.h>
#include <unistd.h>

namespace StrandCtl {
namespace {

using testing::ElementsAre;

class WholeFileTest : public testing::Test {
protected:
    TemporaryFolder const folder;
    std::string const target = folder / "hosts";
    std::string const cannot = "Cannot replace '" + target + "': ";
};

TEST_F(WholeFileTest, ReplacesTheTextAndLeavesNothingBehind) {
    SetContents(target, "old");
    ReplaceFile(target, "new\n");
    EXPECT_EQ("new\n", Contents(target));
    EXPECT_THAT(folder.Names(), ElementsAre("hosts"));
}

TEST_F(WholeFileTest, AnEmptyAndALongTextAreWritten) {
    std::string const text(5000000, 'x');
    ReplaceFile(target, text);
    EXPECT_TRUE(text == Contents(target));
    EXPECT_TRUE(text == ReadFile(target));
    ReplaceFile(target, "");
    EXPECT_EQ("", Contents(target));
    EXPECT_EQ("", ReadFile(target));
}

TEST_F(WholeFileTest, KeepsEveryBitOfTheMode) {
    for (mode_t const mode : {0600U, 0644U, 0664U, 0640U, 0400U, 0444U, 01755U, 04755U, 02640U}) {
        SetContents(target, "old");
        ASSERT_EQ(0, ::chmod(target.c_str(), mode));
        mode_t const kept = ModeOf(target);
        ReplaceFile(target, "new");
        EXPECT_EQ(kept, ModeOf(target)) << std::oct << mode;
        std::filesystem::remove(target);
    }
}

TEST_F(WholeFileTest, ANewFileIsReadableWhateverTheMask) {
    mode_t const mask = ::umask(077);
    ReplaceFile(target, "new");
    ::umask(mask);
    EXPECT_EQ(0644U, ModeOf(target));
}

TEST_F(WholeFileTest, AReaderOfTheOldFileKeepsReadingIt) {
    SetContents(target, "old");
    std::ifstream reader(target);
    ReplaceFile(target, "new");
    std::string text;
    reader >> text;
    EXPECT_EQ("old", text);
}

TEST_F(WholeFileTest, FilesOfOthersBesideTheTargetAreNotTouched) {
    SetContents(folder / "victim", "precious");
    std::filesystem::create_symlink(folder / "victim", folder / "hosts.XXXXXX");
    std::filesystem::create_symlink(folder / "victim", folder / "hosts.tmp");
    std::filesystem::create_symlink(folder / "victim", folder / "hosts.new");
    SetContents(target, "old");
    ReplaceFile(target, "new");
    EXPECT_EQ("precious", Contents(folder / "victim"));
    EXPECT_THAT(folder.Names(),
                ElementsAre("hosts", "hosts.XXXXXX", "hosts.new", "hosts.tmp", "victim"));
}

TEST_F(WholeFileTest, ALinkStaysAndItsDestinationIsReplaced) {
    std::filesystem::create_directory(folder / "real");
    SetContents(folder / "real/file", "old");
    ASSERT_EQ(0, ::chmod((folder / "real/file").c_str(), 0640));
    std::filesystem::create_symlink("real", folder / "way");
    std::filesystem::create_symlink("way/file", folder / "second");
    std::filesystem::create_symlink("second", target);
    ReplaceFile(target, "new");
    EXPECT_TRUE(std::filesystem::is_symlink(target));
    EXPECT_TRUE(std::filesystem::is_symlink(folder / "second"));
    EXPECT_EQ("new", Contents(folder / "real/file"));
    EXPECT_EQ(0640U, ModeOf(folder / "real/file"));
    EXPECT_THAT(folder.Names(), ElementsAre("hosts", "real", "second", "way"));
}

TEST_F(WholeFileTest, ALinkToNothingGetsItsDestination) {
    std::filesystem::create_symlink("later", target);
    ReplaceFile(target, "new");
    EXPECT_TRUE(std::filesystem::is_symlink(target));
    EXPECT_EQ("new", Contents(folder / "later"));
}

TEST_F(WholeFileTest, TheDestinationIsWhereTheLinksLead) {
    std::string const real = std::filesystem::canonical(folder.Path()).string();
    EXPECT_EQ(real + "/hosts", Destination(target));
    std::filesystem::create_symlink("missing/../gone/file", target);
    EXPECT_EQ(real + "/gone/file", Destination(target));
    std::filesystem::create_symlink("/run/no-such-folder/resolv.conf", folder / "resolv.conf");
    EXPECT_EQ("/run/no-such-folder/resolv.conf", Destination(folder / "resolv.conf"));
}

TEST_F(WholeFileTest, ALoopOfLinksIsAnError) {
    std::filesystem::create_symlink("other", target);
    std::filesystem::create_symlink("hosts", folder / "other");
    EXPECT_EQ("Cannot follow '" + target + "': Too many levels of symbolic links",
              FailureOf([&] { ReplaceFile(target, "new"); }));
    EXPECT_EQ("Cannot read '" + target + "': Too many levels of symbolic links",
              FailureOf([&] { ReadFile(target); }));
}

TEST_F(WholeFileTest, WhatIsNoRegularFileIsAnError) {
    std::filesystem::create_directory(target);
    EXPECT_EQ(cannot + "it is not a regular file", FailureOf([&] { ReplaceFile(target, "new"); }));
    EXPECT_EQ("Cannot read '" + target + "': it is not a regular file",
              FailureOf([&] { ReadFile(target); }));
    std::filesystem::remove(target);
    ASSERT_EQ(0, ::mkfifo(target.c_str(), 0644));
    EXPECT_EQ(cannot + "it is not a regular file", FailureOf([&] { ReplaceFile(target, "new"); }));
    EXPECT_EQ("Cannot read '" + target + "': it is not a regular file",
              FailureOf([&] { ReadFile(target); }));
    EXPECT_THAT(folder.Names(), ElementsAre("hosts"));
}

TEST_F(WholeFileTest, AMissingFileIsNothingAndAMissingFolderAnError) {
    EXPECT_EQ(std::nullopt, ReadFile(target));
    EXPECT_EQ("Cannot replace '" + (folder / "none/hosts") + "': No such file or directory",
              FailureOf([&] { ReplaceFile(folder / "none/hosts", "new"); }));
}

TEST_F(WholeFileTest, AnOrdinaryUsersReplacementFailsWhereHeMayNotWrite) {
    SetContents(target, "old");
    ASSERT_EQ(0, ::chmod(folder.Path().c_str(), 0555));
    pid_t const child = ::fork();
    if (child == 0) {
        BecomeUnprivileged();
        ::_exit(FailureOf([&] { ReplaceFile(target, "new"); }) == cannot + "Permission denied" ? 0
                                                                                               : 1);
    }
    int status = 0;
    ASSERT_EQ(child, ::waitpid(child, &status, 0));
    EXPECT_EQ(0, status);
    ASSERT_EQ(0, ::chmod(folder.Path().c_str(), 0755));
    EXPECT_EQ("old", Contents(target));
    EXPECT_THAT(folder.Names(), ElementsAre("hosts"));
}

TEST_F(WholeFileTest, AFileThatMayNotBeReadIsAnError) {
    SetContents(target, "old");
    ASSERT_EQ(0, ::chmod(target.c_str(), 0));
    ASSERT_EQ(0, ::chmod(folder.Path().c_str(), 0755));
    pid_t const child = ::fork();
    if (child == 0) {
        BecomeUnprivileged();
        ::_exit(FailureOf([&] { ReadFile(target); }) ==
                        "Cannot read '" + target + "': Permission denied"
                    ? 0
                    : 1);
    }
    int status = 0;
    ASSERT_EQ(child, ::waitpid(child, &status, 0));
    EXPECT_EQ(0, status);
}

class WholeFileFaultsTest : public WholeFileTest {
protected:
    void SetUp() override {
        if (!faults::Available()) {
            GTEST_SKIP() << "this kernel does not let a process be watched";
        }
    }
    void Prepare() const {
        for (std::string const& name : folder.Names()) {
            std::filesystem::remove(folder / name);
        }
        SetContents(target, "old");
        ASSERT_EQ(0, ::chmod(target.c_str(), 0640));
    }
};

TEST_F(WholeFileFaultsTest, WhateverCallFailsTheTargetIsWholeAndTheCallerKnows) {
    int failures = 0;
    for (int const error : {ENOSPC, EIO, EDQUOT}) {
        faults::Walk(
            faults::FailsWith(error), [&] { Prepare(); }, [&] { ReplaceFile(target, "new"); },
            [&](std::size_t place, faults::Outcome const& outcome) {
                SCOPED_TRACE(outcome.calls[place - 1] + " " + std::to_string(place));
                EXPECT_TRUE(outcome.finished);
                if (outcome.exception.empty()) {
                    EXPECT_EQ("new", Contents(target));
                    EXPECT_EQ(0640U, ModeOf(target));
                } else {
                    ++failures;
                    EXPECT_EQ("HostCtl::Lib::HostCtlException", outcome.exception);
                    EXPECT_THAT(outcome.message, testing::HasSubstr(target));
                    EXPECT_EQ("old", Contents(target));
                }
                EXPECT_THAT(folder.Names(), ElementsAre("hosts"));
            });
    }
    EXPECT_GE(failures, 3 * 5) << "creating, writing, its mode, syncing and moving must be noticed";
}

TEST_F(WholeFileFaultsTest, KilledAnywhereTheTargetIsWhole) {
    faults::Walk(
        faults::Killed(), [&] { Prepare(); }, [&] { ReplaceFile(target, "new"); },
        [&](std::size_t place, faults::Outcome const& outcome) {
            EXPECT_FALSE(outcome.finished);
            EXPECT_THAT(Contents(target), testing::AnyOf("old", "new")) << place;
            EXPECT_EQ(0640U, ModeOf(target));
        });
}

TEST_F(WholeFileFaultsTest, AnInterruptedCallIsMadeAgain) {
    Prepare();
    for (char const* const call : {"write", "read"}) {
        auto const outcome = faults::RunWithFaultIn(
            call, faults::FailsWith(EINTR),
            [&] {
                ReplaceFile(target, "new");
                ReadFile(target);
            },
            1, 1);
        EXPECT_TRUE(outcome.injected) << call;
        EXPECT_EQ("", outcome.exception) << call << outcome.message;
        EXPECT_EQ("new", Contents(target));
    }
}

TEST_F(WholeFileFaultsTest, TheTextIsSyncedBeforeItTakesTheTargetsPlace) {
    Prepare();
    auto const outcome =
        faults::Run([&] { ReplaceFile(target, "new"); },
                    [](std::size_t, std::string const&) { return faults::Happens(); });
    std::vector<std::string> steps;
    for (std::string const& call : outcome.calls) {
        if (call == "write" || call == "chmod" || call == "fsync" || call == "rename") {
            steps.push_back(call);
        }
    }
    EXPECT_THAT(steps, ElementsAre("write", "chmod", "fsync", "rename", "fsync"));
}

TEST_F(WholeFileFaultsTest, AReadThatFailsInTheMiddleIsAnError) {
    SetContents(target, std::string(100000, 'x'));
    auto const outcome = faults::RunWithFaultIn(
        "read", faults::FailsWith(EIO), [&] { ReadFile(target); }, 3, 1);
    EXPECT_TRUE(outcome.injected);
    EXPECT_EQ("Cannot read '" + target + "': Input/output error", outcome.message);
}

} // namespace
} // namespace StrandCtl
