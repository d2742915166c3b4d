// SPDX-License-Identifier: Apache-2.0
#include <tslauth/AtomicFileStream.h>

#include "../faults/FaultTest.h"

#include "SystemFile.h"

#include <algorithm>
#include <csignal>
#include <gmock/gmock.h>
#include <sys/resource.h>

namespace tessel::authentication {
namespace {

class AtomicFileStreamFaultTest : public FaultTest {
protected:
    AtomicFileStreamFaultTest() : FaultTest("file", "old contents\n") {}

    void ExpectOld() {
        EXPECT_TRUE(Contents(target) == oldText);
        EXPECT_EQ(0644U, ModeOf(target));
    }

    void ExpectNew() {
        EXPECT_TRUE(Contents(target) == newText);
    }

    void ExpectIOError(faults::Outcome const& outcome, std::string const& message) {
        EXPECT_TRUE(outcome.injected);
        EXPECT_EQ("tessel::authentication::IOError", outcome.exception);
        EXPECT_EQ(message, outcome.message);
        ExpectOld();
    }

    /// The name of the file that a replacement left behind.
    std::string Temporary() {
        EXPECT_EQ(2U, folder.Names().size());
        return folder / folder.Names().back();
    }

    std::string newText = "new contents, which are longer than the old ones\n";
    std::function<void()> replace = [this] { ReplaceFile(target, newText); };
    std::function<void()> replaceWithoutSync = [this] {
        AtomicFileStream stream(target.c_str(), std::ios::out);
        stream << newText;
        stream.Commit();
    };
};

constexpr char permissionMessage[] =
    "Failed to save file permissions, file permissions may be incorrect: Input/output error";

TEST_F(AtomicFileStreamFaultTest, AReplacementMakesExactlyTheseCalls) {
    faults::Outcome const outcome = faults::RunWithFaultAt(0, faults::Killed(), replace);
    EXPECT_TRUE(outcome.finished);
    EXPECT_EQ("", outcome.message);
    EXPECT_THAT(outcome.calls,
                testing::ElementsAre("open", "close", "open", "write", "stat", "chmod", "fsync",
                                     "close", "stat", "rename", "chmod", "open", "fsync", "close"));
    ExpectNew();
    EXPECT_EQ(0644U, ModeOf(target));
}

TEST_F(AtomicFileStreamFaultTest, WhicheverCallFailsTheTargetIsWholeAndTheCallerKnows) {
    for (int const error : {EIO, ENOSPC, EDQUOT, EACCES, EROFS, EMFILE}) {
        std::size_t const calls = faults::Walk(
            faults::FailsWith(error), [this] { Reset(); }, replace,
            [&](std::size_t place, faults::Outcome const& outcome) {
                SCOPED_TRACE("call " + std::to_string(place) + ", " + outcome.calls[place - 1] +
                             ": " + SystemText(error));
                EXPECT_TRUE(outcome.finished);
                if (outcome.exception == "tessel::authentication::IOError") {
                    ExpectOld();
                } else {
                    EXPECT_THAT(outcome.exception,
                                testing::AnyOf("", "tessel::authentication::FilePermissionError"));
                    ExpectNew();
                }
            });
        EXPECT_EQ(14U, calls);
    }
}

TEST_F(AtomicFileStreamFaultTest, WhereverTheProcessIsKilledTheTargetIsWhole) {
    std::size_t const calls = faults::Walk(
        faults::Killed(), [this] { Reset(); }, replace,
        [&](std::size_t place, faults::Outcome const& outcome) {
            SCOPED_TRACE("call " + std::to_string(place) + ", " + outcome.calls[place - 1]);
            EXPECT_FALSE(outcome.finished);
            std::size_t const rename = 10;
            if (place <= rename) {
                ExpectOld();
            } else {
                ExpectNew();
                EXPECT_EQ(0644U, ModeOf(target));
            }
        });
    EXPECT_EQ(14U, calls);
}

TEST_F(AtomicFileStreamFaultTest, ATemporaryFileThatCannotBeCreatedIsReported) {
    ExpectIOError(faults::RunWithFaultAt(1, faults::FailsWith(EACCES), replace),
                  "Unable to create temporary file to write '" + target + "': Permission denied");
    EXPECT_THAT(folder.Names(), testing::ElementsAre("file"));
}

TEST_F(AtomicFileStreamFaultTest, AFailedReopenIsReportedAsSuch) {
    ExpectIOError(faults::RunWithFaultAt(3, faults::FailsWith(EMFILE), replace),
                  "Cannot open '" + target + "': Too many open files");
}

TEST_F(AtomicFileStreamFaultTest, AFailedReopenSetsTheFailStateAndSyncKnowsWhy) {
    ExpectIOError(faults::RunWithFaultAt(3, faults::FailsWith(EMFILE),
                                         [&] {
                                             AtomicFileStream stream(target.c_str(), std::ios::out);
                                             stream << newText;
                                             stream.Sync();
                                             stream.Commit();
                                         }),
                  "Cannot write '" + target + "': Too many open files");
}

TEST_F(AtomicFileStreamFaultTest, AFailedWriteIsReportedWithItsReason) {
    for (auto const& [error, text] : {std::make_pair(ENOSPC, "No space left on device"),
                                      std::make_pair(EDQUOT, "Disk quota exceeded"),
                                      std::make_pair(EIO, "Input/output error")}) {
        ExpectIOError(faults::RunWithFaultIn("write", faults::FailsWith(error), replace),
                      "Cannot write '" + target + "': " + text);
        Reset();
    }
}

TEST_F(AtomicFileStreamFaultTest, AFailedWriteOfMoreThanTheBufferIsReportedWithItsReason) {
    newText.assign(1024 * 1024, 'n');
    ExpectIOError(faults::RunWithFaultIn("write", faults::FailsWith(ENOSPC), replace),
                  "Cannot write '" + target + "': No space left on device");
}

TEST_F(AtomicFileStreamFaultTest, AFailedSyncIsReportedWithItsReason) {
    ExpectIOError(faults::RunWithFaultIn("fsync", faults::FailsWith(EIO), replace, 1, 1),
                  "Cannot write '" + target + "': Input/output error");
}

TEST_F(AtomicFileStreamFaultTest, AnInterruptedWriteIsRepeated) {
    faults::Outcome const outcome =
        faults::RunWithFaultIn("write", faults::FailsWith(EINTR), replace, 1, 3);
    EXPECT_TRUE(outcome.injected);
    EXPECT_EQ("", outcome.message);
    ExpectNew();
}

TEST_F(AtomicFileStreamFaultTest, AFailedRenameIsReportedAndTheTemporaryFileStays) {
    faults::Outcome const outcome =
        faults::RunWithFaultIn("rename", faults::FailsWith(EXDEV), replace);
    ExpectIOError(outcome, "Unable to rename '" + Temporary() + "' to '" + target +
                               "': Invalid cross-device link");
    EXPECT_EQ(newText, Contents(Temporary()));
}

TEST_F(AtomicFileStreamFaultTest, AnOldModeThatCannotBeReadIsReportedAfterTheReplacement) {
    faults::Outcome const outcome = faults::RunWithFaultIn("stat", faults::FailsWith(EIO), replace);
    EXPECT_EQ("tessel::authentication::FilePermissionError", outcome.exception);
    EXPECT_EQ(permissionMessage, outcome.message);
    ExpectNew();
    EXPECT_EQ(0600U, ModeOf(target));
    EXPECT_THAT(outcome.calls, testing::Not(testing::Contains("chmod")));
}

TEST_F(AtomicFileStreamFaultTest, AModeThatCannotBeSetIsReportedAfterTheReplacement) {
    faults::Outcome const outcome =
        faults::RunWithFaultIn("chmod", faults::FailsWith(EIO), replace);
    EXPECT_EQ("tessel::authentication::FilePermissionError", outcome.exception);
    EXPECT_EQ(permissionMessage, outcome.message);
    ExpectNew();
    EXPECT_EQ(0600U, ModeOf(target));
}

TEST_F(AtomicFileStreamFaultTest, TheModeIsSetTwiceAndTheFirstTimeMayFail) {
    faults::Outcome const outcome =
        faults::RunWithFaultIn("chmod", faults::FailsWith(EIO), replace, 1, 1);
    EXPECT_TRUE(outcome.injected);
    EXPECT_EQ("", outcome.message);
    ExpectNew();
    EXPECT_EQ(0644U, ModeOf(target));
}

TEST_F(AtomicFileStreamFaultTest, TheNewFileNeverLacksTheOldMode) {
    // Killed between the rename and the change of mode that follows it.
    faults::Outcome const outcome =
        faults::RunWithFaultIn("chmod", faults::Killed(), replace, 2, 1);
    EXPECT_TRUE(outcome.injected);
    EXPECT_FALSE(outcome.finished);
    ExpectNew();
    EXPECT_EQ(0644U, ModeOf(target));
}

TEST_F(AtomicFileStreamFaultTest, TheModeIsDurableWithTheContents) {
    faults::Outcome const outcome = faults::RunWithFaultAt(0, faults::Killed(), replace);
    auto const chmod = std::find(outcome.calls.begin(), outcome.calls.end(), "chmod");
    auto const fsync = std::find(outcome.calls.begin(), outcome.calls.end(), "fsync");
    auto const rename = std::find(outcome.calls.begin(), outcome.calls.end(), "rename");
    EXPECT_LT(chmod, fsync);
    EXPECT_LT(fsync, rename);
    EXPECT_NE(rename, outcome.calls.end());
}

TEST_F(AtomicFileStreamFaultTest, AFileLeftBehindByAFailedRenameHasMode0600) {
    for (auto const& operation : {replace, replaceWithoutSync}) {
        faults::Outcome const outcome =
            faults::RunWithFaultIn("rename", faults::FailsWith(EIO), operation);
        ExpectIOError(outcome, "Unable to rename '" + Temporary() + "' to '" + target +
                                   "': Input/output error");
        EXPECT_EQ(0600U, ModeOf(Temporary()));
        Reset();
    }
}

TEST_F(AtomicFileStreamFaultTest, AFailedReopenThrowsNothingWhateverTheMask) {
    faults::Outcome const outcome = faults::RunWithFaultIn(
        "open", faults::FailsWith(EMFILE),
        [&] {
            AtomicFileStream stream((folder / "other").c_str(), std::ios::out);
            stream.close();
            stream.exceptions(std::ios::failbit | std::ios::badbit);
            stream.open(target.c_str(), std::ios::out);
            bool const kept = stream.exceptions() == (std::ios::failbit | std::ios::badbit);
            throw std::runtime_error(stream.fail() && kept ? "fail state" : "no fail state");
        },
        4, 1);
    EXPECT_TRUE(outcome.injected);
    EXPECT_EQ("fail state", outcome.message);
}

TEST_F(AtomicFileStreamFaultTest, AFolderThatCannotBeSyncedDoesNotMatter) {
    for (std::size_t const place : {12U, 13U, 14U}) {
        faults::Outcome const outcome =
            faults::RunWithFaultAt(place, faults::FailsWith(EINVAL), replace);
        EXPECT_TRUE(outcome.injected);
        EXPECT_EQ("", outcome.message);
        ExpectNew();
        Reset();
    }
}

TEST_F(AtomicFileStreamFaultTest, CommitWithoutSyncReplacesByWhatReachedTheDisk) {
    // The write is that of closing, which is not reported: this is what `Sync` is for.
    faults::Outcome const outcome =
        faults::RunWithFaultIn("write", faults::FailsWith(ENOSPC), replaceWithoutSync);
    EXPECT_TRUE(outcome.injected);
    EXPECT_EQ("", outcome.message);
    EXPECT_EQ("", Contents(target));
    EXPECT_EQ(0644U, ModeOf(target));
}

TEST_F(AtomicFileStreamFaultTest, AFailedCloseSetsTheFailStateAndTheCommitGoesOn) {
    faults::Outcome const outcome = faults::RunWithFaultIn(
        "close", faults::FailsWith(EIO),
        [&] {
            AtomicFileStream stream(target.c_str(), std::ios::out);
            stream << newText;
            stream.Sync();
            stream.Commit();
            if (stream.fail()) {
                throw std::runtime_error("fail state");
            }
        },
        2, 1);
    EXPECT_TRUE(outcome.injected);
    EXPECT_EQ("fail state", outcome.message);
    ExpectNew();
}

/// The operation's file may have `limit` bytes; what a full disk does to a process of any user.
std::function<void()> Limited(rlim_t limit, std::function<void()> const& operation) {
    return [=] {
        std::signal(SIGXFSZ, SIG_IGN);
        rlimit const size = {limit, limit};
        if (::setrlimit(RLIMIT_FSIZE, &size) != 0) {
            throw std::runtime_error("cannot limit the size of files");
        }
        operation();
    };
}

TEST_F(AtomicFileStreamFaultTest, AFileThatOutgrowsTheDiskLeavesTheTargetAlone) {
    for (std::size_t const size : {100U, 8192U, 1000000U}) {
        newText.assign(size, 'n');
        faults::Outcome const outcome =
            faults::RunWithFaultAt(0, faults::Killed(), Limited(size - 1, replace));
        EXPECT_EQ("tessel::authentication::IOError", outcome.exception);
        EXPECT_EQ("Cannot write '" + target + "': File too large", outcome.message);
        ExpectOld();
        EXPECT_EQ(size - 1, Contents(Temporary()).size());
        Reset();
    }
}

TEST_F(AtomicFileStreamFaultTest, AFileThatJustFitsReplacesTheTarget) {
    newText.assign(1000000, 'n');
    EXPECT_EQ("", faults::RunWithFaultAt(0, faults::Killed(), Limited(1000000, replace)).message);
    ExpectNew();
}

} // namespace
} // namespace tessel::authentication
