// SPDX-License-Identifier: Apache-2.0
#include <tslauth/AtomicFileStream.h>

#include "../TemporaryFolder.h"

#include <cerrno>
#include <fcntl.h>
#include <gmock/gmock.h>
#include <memory>
#include <sys/stat.h>
#include <tslauth/Exceptions.h>
#include <type_traits>
#include <unistd.h>

namespace tessel::authentication {
namespace {

class AtomicFileStreamTest : public testing::Test {
protected:
    std::string CommitError(AtomicFileStream& stream) {
        try {
            stream.Commit();
        } catch (IOError const& error) {
            EXPECT_EQ(0UL, error.Code());
            return error.what();
        }
        return {};
    }

    static std::string SyncError(AtomicFileStream& stream) {
        try {
            stream.Sync();
        } catch (IOError const& error) {
            EXPECT_EQ(0UL, error.Code());
            return error.what();
        }
        return {};
    }

    /// Replaces the target the way the library does.
    void Replace(std::string const& text, std::ios::openmode mode = std::ios::out) {
        AtomicFileStream stream(target.c_str(), mode);
        stream << text;
        stream.Sync();
        stream.Commit();
    }

    TemporaryFolder folder;
    std::string target = folder / "file";
};

TEST_F(AtomicFileStreamTest, IsAnOutputFileStream) {
    static_assert(std::is_base_of_v<std::ofstream, AtomicFileStream>);
    static_assert(!std::is_copy_constructible_v<AtomicFileStream>);
    AtomicFileStream stream(target.c_str(), std::ios::out);
    stream << 1 << ' ' << std::string("two") << std::endl;
    stream.Commit();
    EXPECT_EQ("1 two\n", Contents(target));
}

TEST_F(AtomicFileStreamTest, CommitCreatesAMissingFileWithMode0600) {
    AtomicFileStream stream(target.c_str(), std::ios::out);
    stream << "a";
    stream.Commit();
    EXPECT_EQ("a", Contents(target));
    EXPECT_EQ(0600U, ModeOf(target));
    EXPECT_THAT(folder.Names(), testing::ElementsAre("file"));
}

TEST_F(AtomicFileStreamTest, CommitOverAnExistingFileKeepsItsMode) {
    SetContents(target, "old");
    for (mode_t const mode : {0644U, 0600U, 0777U, 0444U, 0U, 04755U, 02755U, 01755U, 07777U}) {
        ASSERT_EQ(0, ::chmod(target.c_str(), mode));
        Replace("new");
        EXPECT_EQ(mode, ModeOf(target));
        EXPECT_THAT(folder.Names(), testing::ElementsAre("file"));
    }
}

TEST_F(AtomicFileStreamTest, TheUmaskDoesNotNarrowTheMode) {
    SetContents(target, "old");
    ASSERT_EQ(0, ::chmod(target.c_str(), 0666));
    mode_t const before = ::umask(0077);
    Replace("new");
    ::umask(before);
    EXPECT_EQ(0666U, ModeOf(target));
}

TEST_F(AtomicFileStreamTest, TheTemporaryFileLiesBesideTheTargetWithMode0600) {
    AtomicFileStream const stream(target.c_str(), std::ios::out);
    ASSERT_THAT(folder.Names(), testing::ElementsAre(testing::MatchesRegex("file\\.......")));
    EXPECT_EQ(0600U, ModeOf(folder / folder.Names().front()));
}

TEST_F(AtomicFileStreamTest, TheTargetIsUntouchedUntilCommit) {
    SetContents(target, "old");
    AtomicFileStream stream(target.c_str(), std::ios::out);
    stream << "new" << std::flush;
    EXPECT_EQ("old", Contents(target));
    stream.Sync();
    EXPECT_EQ("old", Contents(target));
    stream.Commit();
    EXPECT_EQ("new", Contents(target));
}

TEST_F(AtomicFileStreamTest, WithoutCommitTheTargetStaysAndSoDoesTheTemporaryFile) {
    SetContents(target, "old");
    {
        AtomicFileStream stream(target.c_str(), std::ios::out);
        stream << "new";
    }
    EXPECT_EQ("old", Contents(target));
    ASSERT_THAT(folder.Names(),
                testing::ElementsAre("file", testing::MatchesRegex("file\\.......")));
    EXPECT_EQ("new", Contents(folder / folder.Names().back()));
}

TEST_F(AtomicFileStreamTest, AMissingFolderIsAnIOErrorAndNothingIsCreated) {
    std::string const missing = folder / "none/file";
    try {
        AtomicFileStream stream(missing.c_str(), std::ios::out);
        FAIL() << "nothing was thrown";
    } catch (IOError const& error) {
        EXPECT_EQ("Unable to create temporary file to write '" + missing +
                      "': No such file or directory",
                  std::string(error.what()));
        EXPECT_EQ(0UL, error.Code());
    }
    EXPECT_THAT(folder.Names(), testing::IsEmpty());
}

TEST_F(AtomicFileStreamTest, APathThatLeavesNoRoomForThePlaceholdersIsAnIOError) {
    // 4088 bytes, the placeholders and the zero fill the buffer; the kernel then finds it too long
    // or not, but one byte more is refused before.
    for (std::size_t const length : {4089U, 4095U, 4096U, 10000U}) {
        std::string const path(length, 'p');
        try {
            AtomicFileStream stream(path.c_str(), std::ios::out);
            FAIL() << "nothing was thrown";
        } catch (IOError const& error) {
            EXPECT_EQ("Unable to create temporary file to write '" + path + "': Invalid argument",
                      std::string(error.what()));
        }
    }
}

TEST_F(AtomicFileStreamTest, APathMayFillTheBuffer) {
    std::string path = folder.Path();
    while (path.size() + 101 < 4088) {
        path += "/" + std::string(100, 'd');
    }
    std::filesystem::create_directories(path);
    path += "/";
    path += std::string(4088 - path.size(), 'f');
    ASSERT_EQ(4088U, path.size());
    AtomicFileStream stream(path.c_str(), std::ios::out);
    ASSERT_TRUE(stream);
    stream << "a";
    stream.Sync();
    stream.Commit();
    EXPECT_EQ("a", Contents(path));
}

TEST_F(AtomicFileStreamTest, ARelativePathMeansTheWorkingFolder) {
    std::filesystem::path const before = std::filesystem::current_path();
    std::filesystem::current_path(folder.Path());
    {
        AtomicFileStream stream("relative", std::ios::out);
        stream << "a";
        stream.Sync();
        stream.Commit();
    }
    std::filesystem::current_path(before);
    EXPECT_EQ("a", Contents(folder / "relative"));
}

TEST_F(AtomicFileStreamTest, ModesOfAnOutputFileStreamWork) {
    for (std::ios::openmode const mode :
         {std::ios::out, std::ios::app, std::ios::ate, std::ios::trunc,
          std::ios::out | std::ios::binary, std::ios::out | std::ios::in}) {
        SetContents(target, "old");
        Replace("new", mode);
        EXPECT_EQ("new", Contents(target)) << "mode " << mode;
    }
}

TEST_F(AtomicFileStreamTest, AnImpossibleModeSetsTheFailState) {
    AtomicFileStream stream(target.c_str(), std::ios::app | std::ios::trunc);
    EXPECT_TRUE(stream.fail());
}

using AtomicFileStreamDeathTest = AtomicFileStreamTest;

TEST_F(AtomicFileStreamDeathTest, TheModeInAloneEndsTheProcess) {
    EXPECT_EXIT(AtomicFileStream(target.c_str(), std::ios::in), testing::KilledBySignal(SIGABRT),
                "lib/tslauth/AtomicFileStream:[0-9]+: "
                "void tessel::authentication::AtomicFileStream::open\\(.*\\): "
                "Assertion `mode & ~std::ios::in' failed");
    EXPECT_THAT(folder.Names(), testing::IsEmpty());
}

TEST_F(AtomicFileStreamDeathTest, NoModeAtAllEndsTheProcess) {
    EXPECT_EXIT(AtomicFileStream(target.c_str(), std::ios::openmode()),
                testing::KilledBySignal(SIGABRT), "Assertion `mode & ~std::ios::in' failed");
}

TEST_F(AtomicFileStreamTest, AFailedRenameNamesBothFilesAndLeavesTheTemporaryOne) {
    std::filesystem::create_directory(target);
    AtomicFileStream stream(target.c_str(), std::ios::out);
    stream << "new";
    stream.Sync();
    std::string const temporary = target + folder.Names().back().substr(4);
    EXPECT_EQ("Unable to rename '" + temporary + "' to '" + target + "': Is a directory",
              CommitError(stream));
    EXPECT_EQ("new", Contents(temporary));
    EXPECT_TRUE(std::filesystem::is_directory(target));
}

TEST_F(AtomicFileStreamTest, ATemporaryFileThatIsGoneIsAFailedRename) {
    SetContents(target, "old");
    AtomicFileStream stream(target.c_str(), std::ios::out);
    std::string const temporary = folder / folder.Names().back();
    std::filesystem::remove(temporary);
    EXPECT_EQ("Unable to rename '" + temporary + "' to '" + target + "': No such file or directory",
              CommitError(stream));
    EXPECT_EQ("old", Contents(target));
}

TEST_F(AtomicFileStreamTest, OfTwoStreamsOnOneTargetTheLastCommitWins) {
    AtomicFileStream first(target.c_str(), std::ios::out);
    AtomicFileStream second(target.c_str(), std::ios::out);
    EXPECT_EQ(2U, folder.Names().size());
    first << "first";
    second << "second";
    second.Commit();
    EXPECT_EQ("second", Contents(target));
    first.Commit();
    EXPECT_EQ("first", Contents(target));
    EXPECT_THAT(folder.Names(), testing::ElementsAre("file"));
}

TEST_F(AtomicFileStreamTest, AfterCommitTheStreamIsClosedAndInsertsNothing) {
    AtomicFileStream stream(target.c_str(), std::ios::out);
    stream << "a";
    stream.Commit();
    EXPECT_FALSE(stream.is_open());
    stream << "b" << std::flush;
    EXPECT_TRUE(stream.fail());
    EXPECT_EQ("a", Contents(target));
}

TEST_F(AtomicFileStreamTest, ASymbolicLinkIsReplacedByAFileWithTheModeOfItsTarget) {
    SetContents(folder / "real", "old");
    ASSERT_EQ(0, ::chmod((folder / "real").c_str(), 0640));
    std::filesystem::create_symlink("real", target);
    Replace("new");
    EXPECT_FALSE(std::filesystem::is_symlink(target));
    EXPECT_EQ("new", Contents(target));
    EXPECT_EQ(0640U, ModeOf(target));
    EXPECT_EQ("old", Contents(folder / "real"));
}

TEST_F(AtomicFileStreamTest, ALinkInCirclesIsReplacedAndReportedAsAPermissionError) {
    std::filesystem::create_symlink("file", target);
    AtomicFileStream stream(target.c_str(), std::ios::out);
    stream << "new";
    stream.Sync();
    try {
        stream.Commit();
        FAIL() << "nothing was thrown";
    } catch (FilePermissionError const& error) {
        EXPECT_STREQ("Failed to save file permissions, file permissions may be incorrect: "
                     "Too many levels of symbolic links",
                     error.what());
        EXPECT_EQ(0UL, error.Code());
    }
    EXPECT_EQ("new", Contents(target));
    EXPECT_EQ(0600U, ModeOf(target));
}

TEST_F(AtomicFileStreamTest, SyncMakesTheContentsVisibleInTheTemporaryFile) {
    AtomicFileStream stream(target.c_str(), std::ios::out);
    stream << "a";
    stream.Sync();
    EXPECT_EQ("a", Contents(folder / folder.Names().front()));
    stream << "b";
    stream.Sync();
    stream.Commit();
    EXPECT_EQ("ab", Contents(target));
}

TEST_F(AtomicFileStreamTest, SyncRefusesAStreamThatFailedBefore) {
    SetContents(target, "old");
    AtomicFileStream stream(target.c_str(), std::ios::out);
    stream.setstate(std::ios::failbit);
    errno = ENOSPC;
    EXPECT_EQ("Cannot write '" + target + "': No space left on device", SyncError(stream));
    EXPECT_EQ("old", Contents(target));
}

TEST_F(AtomicFileStreamTest, SyncOfAFailureWithoutAReasonCallsItAnIOError) {
    AtomicFileStream stream(target.c_str(), std::ios::out);
    stream.setstate(std::ios::failbit);
    errno = 0;
    EXPECT_EQ("Cannot write '" + target + "': Input/output error", SyncError(stream));
}

TEST_F(AtomicFileStreamTest, SyncSaysThatTheStreamDoesNotKnowTheMode) {
    errno = ENOTTY;
    AtomicFileStream stream(target.c_str(), std::ios::app | std::ios::trunc);
    EXPECT_EQ("Cannot write '" + target + "': Invalid argument", SyncError(stream));
}

TEST_F(AtomicFileStreamTest, ExceptionMaskOfTheStreamDoesNotStopACommit) {
    SetContents(target, "old");
    AtomicFileStream stream(target.c_str(), std::ios::out);
    stream.exceptions(std::ios::failbit | std::ios::badbit);
    stream << "new";
    stream.rdbuf()->close();
    // The stream has nothing to close any more, which sets its fail state and is not reported.
    EXPECT_EQ("", CommitError(stream));
    EXPECT_TRUE(stream.fail());
    EXPECT_EQ("new", Contents(target));
    EXPECT_EQ(std::ios::failbit | std::ios::badbit, stream.exceptions());
    errno = 0;
    EXPECT_EQ("Cannot write '" + target + "': Input/output error", SyncError(stream));
}

TEST_F(AtomicFileStreamTest, FileWithATimeBeyond2038KeepsItsMode) {
    SetContents(target, "old");
    ASSERT_EQ(0, ::chmod(target.c_str(), 0644));
    timespec const times[2] = {{4000000000, 0}, {4000000000, 0}};
    ASSERT_EQ(0, ::utimensat(AT_FDCWD, target.c_str(), times, 0));
    Replace("new");
    EXPECT_EQ(0644U, ModeOf(target));
}

TEST_F(AtomicFileStreamTest, SyncAfterCommitIsRefused) {
    AtomicFileStream stream(target.c_str(), std::ios::out);
    stream.Commit();
    EXPECT_EQ("Cannot write '" + target + "': Bad file descriptor", SyncError(stream));
}

TEST_F(AtomicFileStreamTest, OpeningAgainClearsTheState) {
    AtomicFileStream stream(target.c_str(), std::ios::out);
    stream.Commit();
    stream.setstate(std::ios::failbit);
    std::string const other = folder / "other";
    stream.open(other.c_str(), std::ios::out);
    ASSERT_TRUE(stream);
    stream << "b";
    stream.Commit();
    EXPECT_EQ("b", Contents(other));
}

} // namespace
} // namespace tessel::authentication
