// SPDX-License-Identifier: Apache-2.0
#include "setup/SetupRecord.h"

#include <gtest/gtest.h>

using namespace tessel::tslauthctl;

namespace {

RecordedFile const File = {"/etc/f", "a\nb\n", "a\nc\n"};
RecordedFile const NewFile = {"/etc/n", std::nullopt, "x\n"};

TEST(SetupRecordTest, AFileThatNobodyHasChangedSinceBecomesWhatItWas) {
    EXPECT_EQ(UndoOf(File, "a\nc\n").kind, UndoKind::restore);
    EXPECT_EQ(UndoOf(NewFile, "x\n").kind, UndoKind::remove);
}

TEST(SetupRecordTest, AFileThatIsAsItWasStays) {
    EXPECT_EQ(UndoOf(File, "a\nb\n").kind, UndoKind::asBefore);
    EXPECT_EQ(UndoOf(NewFile, std::nullopt).kind, UndoKind::asBefore);
}

TEST(SetupRecordTest, AFileThatIsGoneComesBack) {
    EXPECT_EQ(UndoOf(File, std::nullopt).kind, UndoKind::restore);
}

TEST(SetupRecordTest, WhatWasChangedSinceIsCounted) {
    auto const undo = UndoOf(File, "a\nd\ne\n");
    EXPECT_EQ(undo.kind, UndoKind::changedSince);
    EXPECT_EQ(undo.path, "/etc/f");
    EXPECT_EQ(undo.added, 2U);
    EXPECT_EQ(undo.removed, 1U);
}

TEST(SetupRecordTest, WhatTheFirstSetupFoundStays) {
    SetupRecord record;
    record.Add("/etc/f", "first", "second");
    record.Add("/etc/f", "second", "third");
    ASSERT_EQ(record.files.size(), 1U);
    EXPECT_EQ(record.files[0].before, "first");
    EXPECT_EQ(record.files[0].after, "third");
    EXPECT_EQ(record.Find("/etc/g"), nullptr);
}

TEST(SetupRecordTest, ADescriptionIsReadBack) {
    SetupRecord record;
    record.provider = "winbind";
    record.files = {File, NewFile};
    record.links = {"/lib/security/lib/security"};
    record.folders = {"/lib/security", "/lib/security/lib"};
    record.profilesOn = {"tslauth"};
    record.profilesOff = {"winbind"};
    auto const read = RecordIn(nlohmann::json::parse(Described(record).dump()));
    EXPECT_EQ(read.provider, record.provider);
    ASSERT_EQ(read.files.size(), 2U);
    EXPECT_EQ(read.files[0].path, "/etc/f");
    EXPECT_TRUE(read.files[0].before.has_value());
    EXPECT_FALSE(read.files[1].before.has_value());
    EXPECT_EQ(read.links, record.links);
    EXPECT_EQ(read.folders, record.folders);
    EXPECT_EQ(read.profilesOn, record.profilesOn);
    EXPECT_EQ(read.profilesOff, record.profilesOff);
    EXPECT_THROW(RecordIn(nlohmann::json::object()), nlohmann::json::exception);
}

} // namespace
