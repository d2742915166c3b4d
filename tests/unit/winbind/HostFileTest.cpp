// SPDX-License-Identifier: Apache-2.0
#include "host/HostFile.h"

#include "../../TemporaryFolder.h"
#include "../../faults/Faults.h"
#include "Failure.h"

#include <gmock/gmock.h>
#include <stdexcept>
#include <string>
#include <sys/stat.h>
#include <unistd.h>
#include <vector>

namespace tessel::winbind {
namespace {

using testing::ElementsAre;

struct stat StatusOf(std::string const& path) {
    struct stat status = {};
    if (::lstat(path.c_str(), &status) != 0) {
        throw std::runtime_error("cannot stat " + path);
    }
    return status;
}

TEST(HostFileTest, AMissingFileHasNoText) {
    TemporaryFolder const folder;
    EXPECT_FALSE(ReadHostFile(folder / "none"));
    EXPECT_FALSE(ReadHostFile(folder / "none/below"));
}

TEST(HostFileTest, AFolderCannotBeRead) {
    TemporaryFolder const folder;
    EXPECT_THROW(ReadHostFile(folder.Path()), Failure);
}

TEST(HostFileTest, APipeIsNotWaitedFor) {
    TemporaryFolder const folder;
    ASSERT_EQ(0, ::mkfifo((folder / "pipe").c_str(), 0600));
    EXPECT_THROW(ReadHostFile(folder / "pipe"), Failure);
}

TEST(HostFileTest, KeptChangesStayAndLeaveNothingBeside) {
    TemporaryFolder const folder;
    SetContents(folder / "old", "old");
    SetContents(folder / "gone", "gone");
    HostChanges changes;
    changes.Replace(folder / "old", "new", 0600);
    changes.Replace(folder / "made", "made", 0640);
    changes.Remove(folder / "gone");
    EXPECT_TRUE(changes.MakeFolder(folder / "folder", 0750));
    EXPECT_FALSE(changes.MakeFolder(folder / "folder", 0700));
    changes.Keep();
    EXPECT_THAT(folder.Names(), ElementsAre("folder", "made", "old"));
    EXPECT_EQ("new", Contents(folder / "old"));
    EXPECT_EQ("made", Contents(folder / "made"));
    EXPECT_EQ(0640U, ModeOf(folder / "made"));
    EXPECT_EQ(0750U, ModeOf(folder / "folder"));
}

TEST(HostFileTest, AReplacedFileKeepsItsMode) {
    TemporaryFolder const folder;
    SetContents(folder / "old", "old");
    ASSERT_EQ(0, ::chmod((folder / "old").c_str(), 02754));
    HostChanges changes;
    changes.Replace(folder / "old", "new", 0600);
    changes.Keep();
    EXPECT_EQ(02754U, ModeOf(folder / "old"));
}

TEST(HostFileTest, UndoGivesBackTheVeryFiles) {
    TemporaryFolder const folder;
    SetContents(folder / "old", "old");
    SetContents(folder / "gone", "gone");
    ASSERT_EQ(0, ::chmod((folder / "old").c_str(), 0604));
    auto const before = StatusOf(folder / "old");
    {
        HostChanges changes;
        changes.Replace(folder / "old", "new", 0600);
        changes.Replace(folder / "made", "made", 0600);
        changes.Remove(folder / "gone");
        EXPECT_TRUE(changes.MakeFolder(folder / "folder", 0755));
        changes.Replace(folder / "folder/in", "in", 0600);
        EXPECT_TRUE(changes.Undo());
    }
    EXPECT_THAT(folder.Names(), ElementsAre("gone", "old"));
    EXPECT_EQ("old", Contents(folder / "old"));
    EXPECT_EQ("gone", Contents(folder / "gone"));
    auto const after = StatusOf(folder / "old");
    EXPECT_EQ(before.st_ino, after.st_ino);
    EXPECT_EQ(before.st_mode, after.st_mode);
    EXPECT_EQ(before.st_nlink, after.st_nlink);
    EXPECT_EQ(before.st_mtim.tv_sec, after.st_mtim.tv_sec);
    EXPECT_EQ(before.st_mtim.tv_nsec, after.st_mtim.tv_nsec);
}

TEST(HostFileTest, WhatIsNotKeptIsTakenBackInReverseOrder) {
    TemporaryFolder const folder;
    std::string order;
    {
        HostChanges changes;
        changes.OnUndo([&] { order += "first"; });
        changes.Replace(folder / "made", "made", 0600);
        changes.OnUndo([&] { order += FileExists(folder / "made") ? "last " : "late "; });
    }
    EXPECT_EQ("last first", order);
    EXPECT_TRUE(folder.Names().empty());
}

TEST(HostFileTest, AStepThatFailsIsToldAndTheOthersAreDone) {
    TemporaryFolder const folder;
    HostChanges changes;
    changes.Replace(folder / "made", "made", 0600);
    changes.OnUndo([] { throw std::runtime_error("deliberate"); });
    EXPECT_FALSE(changes.Undo());
    EXPECT_TRUE(folder.Names().empty());
}

TEST(HostFileTest, ALinkStaysALink) {
    TemporaryFolder const folder;
    SetContents(folder / "target", "old");
    ASSERT_EQ(0, ::symlink("target", (folder / "link").c_str()));
    HostChanges changes;
    changes.Replace(folder / "link", "new", 0600);
    EXPECT_TRUE(S_ISLNK(StatusOf(folder / "link").st_mode));
    EXPECT_EQ("new", Contents(folder / "target"));
    EXPECT_TRUE(changes.Undo());
    EXPECT_TRUE(S_ISLNK(StatusOf(folder / "link").st_mode));
    EXPECT_EQ("old", Contents(folder / "target"));
    EXPECT_THAT(folder.Names(), ElementsAre("link", "target"));
}

TEST(HostFileTest, AMarkIsThereUntilTheChangesAreKeptOrTakenBack) {
    TemporaryFolder const folder;
    for (bool const isKept : {true, false}) {
        HostChanges changes;
        changes.Mark(folder / "mark", "what for");
        EXPECT_EQ("what for", Contents(folder / "mark"));
        if (isKept) {
            changes.Keep();
        } else {
            EXPECT_TRUE(changes.Undo());
        }
        EXPECT_TRUE(folder.Names().empty());
    }
}

TEST(HostFileTest, NoMarkAndNoOriginalComesBackWithAPowerLoss) {
    if (!faults::Available()) {
        GTEST_SKIP() << "this kernel has no seccomp notifications";
    }
    TemporaryFolder const folder;
    SetContents(folder / "old", "old");
    HostChanges changes;
    changes.Mark(folder / "mark", "");
    changes.Replace(folder / "old", "new", 0600);
    auto const outcome = faults::Run(
        [&] { changes.Keep(); }, [](std::size_t, std::string const&) { return faults::Happens(); });
    // The mark's end is durable before the original's, and both before the changes are said to be
    // kept.
    EXPECT_THAT(outcome.calls, ElementsAre("unlink", "open", "fsync", "close", "unlink", "open",
                                           "fsync", "close"));
    changes.Keep();
}

TEST(HostFileTest, AFolderThatSomebodyUsesIsNotRemoved) {
    TemporaryFolder const folder;
    SetContents(folder / "file", "");
    RemoveEmptyFolder(folder.Path());
    RemoveEmptyFolder(folder / "none");
    EXPECT_THAT(folder.Names(), ElementsAre("file"));
}

TEST(HostFileTest, AFullDiskHasItsCode) {
    EXPECT_EQ(TSLAUTH_WINBIND_DISK_FULL, CodeOfSystem(ENOSPC));
    EXPECT_EQ(TSLAUTH_WINBIND_DISK_FULL, CodeOfSystem(EDQUOT));
    EXPECT_EQ(TSLAUTH_PROVIDER_ACCESS_DENIED, CodeOfSystem(EPERM));
    EXPECT_EQ(TSLAUTH_PROVIDER_NOT_ENOUGH_MEMORY, CodeOfSystem(ENOMEM));
    EXPECT_EQ(TSLAUTH_WINBIND_SEE_SYSTEM_LOG, CodeOfSystem(EIO));
}

TEST(HostFileTest, ALinkToNothingIsNotReplaced) {
    TemporaryFolder const folder;
    ASSERT_EQ(0, ::symlink("nowhere", (folder / "link").c_str()));
    {
        HostChanges changes;
        EXPECT_THROW(changes.Replace(folder / "link", "new", 0600), Failure);
    }
    EXPECT_TRUE(S_ISLNK(StatusOf(folder / "link").st_mode));
    EXPECT_THAT(folder.Names(), ElementsAre("link"));
}

TEST(HostFileTest, AFailureLeavesTheFileAndNothingBeside) {
    TemporaryFolder const folder;
    ASSERT_EQ(0, ::mkdir((folder / "is-a-folder").c_str(), 0755));
    HostChanges changes;
    EXPECT_THROW(changes.Replace(folder / "is-a-folder", "text", 0600), Failure);
    EXPECT_THROW(changes.Replace(folder / "none/file", "text", 0600), Failure);
    (void)changes.Undo();
    EXPECT_THAT(folder.Names(), ElementsAre("is-a-folder"));
}

TEST(HostFileTest, OriginalsOfWhoDiedInBetweenAreRestored) {
    TemporaryFolder const folder;
    SetContents(folder / "old", "new");
    SetContents(folder / ".tslauth-old.original", "old");
    // Who died before the new file was in place left a second link of the same file.
    SetContents(folder / "same", "same");
    ASSERT_EQ(0, ::link((folder / "same").c_str(), (folder / ".tslauth-same.original").c_str()));
    RestoreOriginals({folder / "old", folder / "same", folder / "untouched"});
    EXPECT_THAT(folder.Names(), ElementsAre("old", "same"));
    EXPECT_EQ("old", Contents(folder / "old"));
}

TEST(HostFileTest, TemporaryFilesAloneAreRemoved) {
    TemporaryFolder const folder;
    for (char const* const name : {".tslauth-smb.conf", ".tslauth-smb.conf.a1B2c3",
                                   ".tslauth-smb.conf.original", "smb.conf", "smb.conf.backup"}) {
        SetContents(folder / name, "");
    }
    RemoveTemporaryFiles({folder / "smb.conf", folder / "none/file"});
    EXPECT_THAT(folder.Names(), ElementsAre("smb.conf", "smb.conf.backup"));
}

} // namespace
} // namespace tessel::winbind
