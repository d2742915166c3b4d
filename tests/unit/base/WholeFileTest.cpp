// SPDX-License-Identifier: Apache-2.0
#include <base/WholeFile.h>

#include "Attributes.h"
#include "FileFailure.h"
#include "TemporaryFolder.h"
#include "Unprivileged.h"
#include "faults/Faults.h"

#include <cerrno>
#include <fcntl.h>
#include <filesystem>
#include <gmock/gmock.h>
#include <map>
#include <stdexcept>
#include <string>
#include <sys/stat.h>
#include <sys/types.h>
#include <sys/wait.h>
#include <sys/xattr.h>
#include <tuple>
#include <unistd.h>
#include <vector>

namespace tessel::base {
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
    std::filesystem::create_symlink(folder / "victim", folder / ".tslauth-hosts.XXXXXX");
    std::filesystem::create_symlink(folder / "victim", folder / "hosts.tmp");
    std::filesystem::create_symlink(folder / "victim", folder / "hosts.new");
    SetContents(target, "old");
    ReplaceFile(target, "new");
    EXPECT_EQ("precious", Contents(folder / "victim"));
    EXPECT_THAT(folder.Names(),
                ElementsAre(".tslauth-hosts.XXXXXX", "hosts", "hosts.new", "hosts.tmp", "victim"));
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

TEST_F(WholeFileTest, AnOpenedFileTellsItsKind) {
    EXPECT_TRUE(ReadableFile(folder.Path()).IsFolder());
    EXPECT_FALSE(ReadableFile(folder.Path()).IsRegular());
    EXPECT_EQ("", ReadableFile(folder.Path()).TextUpToAnError());
    SetContents(target, "a");
    EXPECT_TRUE(ReadableFile(target).IsRegular());
    EXPECT_FALSE(ReadableFile("/dev/null").IsRegular());
    EXPECT_EQ("Cannot read '/dev/null': it is not a regular file",
              FailureOf([] { ReadFile("/dev/null"); }));
    EXPECT_EQ("Cannot read '" + (folder / "none") + "': No such file or directory",
              FailureOf([&] { ReadableFile(folder / "none"); }));
}

TEST_F(WholeFileTest, EveryByteOfEveryLengthIsRead) {
    std::string all;
    for (int byte = 0; byte < 256; ++byte) {
        all += static_cast<char>(byte);
    }
    for (std::size_t const size : {0U, 1U, 4095U, 4096U, 4097U, 8192U, 1000000U}) {
        std::string text;
        while (text.size() < size) {
            text += all;
        }
        text.resize(size);
        SetContents(target, text);
        EXPECT_TRUE(ReadFile(target) == text) << size;
    }
}

TEST_F(WholeFileTest, WhatHasNoSizeIsRead) {
    EXPECT_THAT(*ReadFile("/proc/self/status"), testing::StartsWith("Name:"));
    std::string const maps = *ReadFile("/proc/self/smaps");
    EXPECT_GT(maps.size(), 8192U) << "no longer a test of a growing buffer";
    EXPECT_EQ('\n', maps.back());
    int ends[2];
    ASSERT_EQ(0, ::pipe(ends));
    Descriptor const reading(ends[0]);
    ASSERT_EQ(5, ::write(ends[1], "piped", 5));
    ASSERT_EQ(0, ::close(ends[1]));
    EXPECT_EQ("piped", ReadAll(reading.Get(), "a pipe"));
    EXPECT_EQ("Cannot read 'nothing': Bad file descriptor",
              FailureOf([] { ReadAll(-1, "nothing"); }));
}

TEST_F(WholeFileTest, ALinkCanBeReplacedByAFile) {
    SetContents(folder / "real", "old");
    std::filesystem::create_symlink("real", target);
    ReplaceFile(target, "new", {Links::Replace, 0600});
    EXPECT_FALSE(std::filesystem::is_symlink(target));
    EXPECT_EQ("new", Contents(target));
    EXPECT_EQ(0600U, ModeOf(target));
    EXPECT_EQ("old", Contents(folder / "real"));
}

TEST_F(WholeFileTest, ANewFileHasTheModeThatIsAskedFor) {
    ReplaceFile(target, "new", {Links::Follow, 0640});
    EXPECT_EQ(0640U, ModeOf(target));
    ReplaceFile(target, "newer", {Links::Follow, 0600});
    EXPECT_EQ(0640U, ModeOf(target)) << "it is new no more";
}

TEST_F(WholeFileTest, AFileThatBecomesWhatItWasHasTheAttributesItHad) {
    SetContents(target, "was");
    ASSERT_EQ(0, ::chmod(target.c_str(), 0604));
    bool const lists = attributes::Set(target, attributes::AccessList, attributes::ListFor(54321));
    auto const was = ReadAttributes(Descriptor(::open(target.c_str(), O_RDONLY)).Get());
    ASSERT_TRUE(was);
    std::filesystem::remove(target);
    SetContents(target, "is");
    ReplaceFile(target, "was", {Links::Replace, 0600, *was});
    EXPECT_EQ(*was, *ReadAttributes(Descriptor(::open(target.c_str(), O_RDONLY)).Get()));
    EXPECT_EQ(lists ? 1U : 0U, attributes::Of(target).count(attributes::AccessList));
}

TEST_F(WholeFileTest, AFileIsMadeWhereThereIsNone) {
    MakeFile(target, "new", 0640);
    EXPECT_EQ("new", Contents(target));
    EXPECT_EQ(0640U, ModeOf(target));
    EXPECT_EQ("Cannot make '" + target + "': File exists",
              FailureOf([&] { MakeFile(target, "other", 0600); }));
    EXPECT_EQ("new", Contents(target));
}

TEST_F(WholeFileTest, ANewFileHasNoListOfItsFolders) {
    if (!attributes::Set(folder.Path(), attributes::DefaultList, attributes::ListFor(54321))) {
        GTEST_SKIP() << "the temporary folder's file system has no access control lists";
    }
    SetContents(target, "old");
    ASSERT_EQ(0, ::removexattr(target.c_str(), attributes::AccessList));
    ReplaceFile(target, "new");
    EXPECT_EQ(0U, attributes::Of(target).count(attributes::AccessList)) << "the old one had none";
}

TEST_F(WholeFileTest, ARelativePathMeansTheWorkingFolder) {
    std::filesystem::path const before = std::filesystem::current_path();
    std::filesystem::current_path(folder.Path());
    ReplaceFile("relative", "a", {Links::Replace, 0644});
    ReplaceFile("relative", "b");
    std::filesystem::current_path(before);
    EXPECT_EQ("b", Contents(folder / "relative"));
    EXPECT_THAT(folder.Names(), ElementsAre("relative"));
}

TEST_F(WholeFileTest, NoDescriptorStaysOpen) {
    auto const count = [] {
        return std::distance(std::filesystem::directory_iterator("/proc/self/fd"), {});
    };
    auto const before = count();
    ReplaceFile(target, "a");
    ReadFile(target);
    FailureOf([&] { ReadFile(folder.Path()); });
    FailureOf([&] { ReplaceFile(folder.Path(), "a"); });
    EXPECT_EQ(before, count());
}

TEST_F(WholeFileTest, AMissingFileIsNothingAndAMissingFolderAnError) {
    EXPECT_EQ(std::nullopt, ReadFile(target));
    SetContents(folder / "file", "");
    EXPECT_EQ(std::nullopt, ReadFile(folder / "file/below"));
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

/// The faults meet a target whose access control list has to be carried over, and a folder that
/// gives one of its own to new files, where the file system knows such lists.
class WholeFileFaultsTest : public WholeFileTest {
protected:
    void SetUp() override {
        if (!faults::Available()) {
            GTEST_SKIP() << "this kernel does not let a process be watched";
        }
        (void)attributes::Set(folder.Path(), attributes::DefaultList, attributes::ListFor(11111));
    }
    void Prepare() {
        for (std::string const& name : folder.Names()) {
            std::filesystem::remove(folder / name);
        }
        SetContents(target, "old");
        (void)attributes::Set(target, attributes::AccessList, attributes::ListFor(22222));
        ASSERT_EQ(0, ::chmod(target.c_str(), 0640));
        kept = Kept();
    }
    /// What no replacement may change.
    std::tuple<mode_t, uid_t, gid_t, std::map<std::string, std::string>> Kept() const {
        struct stat status = {};
        EXPECT_EQ(0, ::stat(target.c_str(), &status));
        return {status.st_mode, status.st_uid, status.st_gid, attributes::Of(target)};
    }

    std::tuple<mode_t, uid_t, gid_t, std::map<std::string, std::string>> kept;
};

TEST_F(WholeFileFaultsTest, WhateverCallFailsTheTargetIsWholeAndTheCallerKnows) {
    int failures = 0;
    for (int const error : {ENOSPC, EIO, EDQUOT}) {
        std::size_t const calls = faults::Walk(
            faults::FailsWith(error), [&] { Prepare(); }, [&] { ReplaceFile(target, "new"); },
            [&](std::size_t place, faults::Outcome const& outcome) {
                SCOPED_TRACE(outcome.calls[place - 1] + " " + std::to_string(place));
                EXPECT_TRUE(outcome.finished);
                if (outcome.exception.empty()) {
                    EXPECT_EQ("new", Contents(target));
                } else {
                    ++failures;
                    EXPECT_EQ("tessel::base::FileError", outcome.exception);
                    EXPECT_THAT(outcome.message, testing::HasSubstr(target));
                    EXPECT_EQ("old", Contents(target));
                }
                EXPECT_EQ(kept, Kept());
                EXPECT_THAT(folder.Names(), ElementsAre("hosts"));
            });
        EXPECT_GE(calls, 12U);
    }
    EXPECT_GE(failures, 3 * 8)
        << "creating, opening, writing, owner, attributes, mode, syncing and "
           "moving must be noticed";
}

TEST_F(WholeFileFaultsTest, KilledAnywhereTheTargetIsWhole) {
    faults::Walk(
        faults::Killed(), [&] { Prepare(); }, [&] { ReplaceFile(target, "new"); },
        [&](std::size_t place, faults::Outcome const& outcome) {
            SCOPED_TRACE(outcome.calls[place - 1] + " " + std::to_string(place));
            EXPECT_FALSE(outcome.finished);
            EXPECT_THAT(Contents(target), testing::AnyOf("old", "new"));
            EXPECT_EQ(kept, Kept());
            for (std::string const& name : folder.Names()) {
                EXPECT_TRUE(name == "hosts" || name.rfind(TemporaryPrefix, 0) == 0) << name;
            }
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

TEST_F(WholeFileFaultsTest, EverythingIsSyncedBeforeItTakesTheTargetsPlace) {
    Prepare();
    auto const outcome =
        faults::Run([&] { ReplaceFile(target, "new"); },
                    [](std::size_t, std::string const&) { return faults::Happens(); });
    std::vector<std::string> steps;
    for (std::string const& call : outcome.calls) {
        if (call == "write" || call == "chown" || call == "chmod" || call == "fsync" ||
            call == "rename") {
            steps.push_back(call);
        }
    }
    EXPECT_THAT(steps, ElementsAre("write", "chown", "chmod", "fsync", "rename", "fsync"));
}

TEST_F(WholeFileFaultsTest, AReadThatFailsInTheMiddleIsAnError) {
    SetContents(target, "abc");
    for (std::size_t const call : {1U, 2U}) {
        auto const outcome = faults::RunWithFaultIn(
            "read", faults::FailsWith(EIO), [&] { ReadFile(target); }, call, 1);
        EXPECT_TRUE(outcome.injected);
        EXPECT_EQ("Cannot read '" + target + "': Input/output error", outcome.message);
    }
}

TEST_F(WholeFileFaultsTest, AReadErrorEndsTheTextWhereThatIsWanted) {
    SetContents(target, "abc");
    auto const outcome = faults::RunWithFaultIn(
        "read", faults::FailsWith(EIO),
        [&] { throw std::runtime_error(ReadableFile(target).TextUpToAnError()); }, 2, 1);
    EXPECT_TRUE(outcome.injected);
    EXPECT_EQ("abc", outcome.message);
}

TEST_F(WholeFileFaultsTest, ReadingMakesFiveCalls) {
    SetContents(target, std::string(100000, 'a'));
    auto const outcome = faults::RunWithFaultAt(0, faults::Killed(), [&] { ReadFile(target); });
    EXPECT_THAT(outcome.calls, ElementsAre("open", "stat", "read", "read", "close"));
}

TEST_F(WholeFileFaultsTest, AReplacementThatIsGivenUpLeavesNothing) {
    Prepare();
    {
        FileReplacement const replacement(target, "new");
        EXPECT_TRUE(replacement.Existed());
        EXPECT_EQ(2U, folder.Names().size());
    }
    EXPECT_EQ("old", Contents(target));
    EXPECT_THAT(folder.Names(), ElementsAre("hosts"));
}

} // namespace
} // namespace tessel::base
