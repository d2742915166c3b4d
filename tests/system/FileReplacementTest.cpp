// SPDX-License-Identifier: Apache-2.0
#include <base/WholeFile.h>

#include "Attributes.h"
#include "Node.h"
#include "TemporaryFolder.h"

#include <gmock/gmock.h>
#include <sys/stat.h>
#include <unistd.h>

namespace tessel::base {
namespace {

/// What only root can see kept.
TEST(FileReplacementTest, OwnerModeListAndLabelsAreKept) {
    TemporaryFolder const folder;
    std::string const target = folder / "target";
    SetContents(target, "old");
    ASSERT_EQ(0, ::chown(target.c_str(), 12345, 54321));
    ASSERT_TRUE(attributes::Set(target, attributes::AccessList, attributes::ListFor(2345)));
    // What a kernel with SELinux or Smack calls its label differs; each is one of these.
    ASSERT_TRUE(attributes::Set(target, "security.example", "system_u:object_r:etc_t:s0"));
    ASSERT_TRUE(attributes::Set(target, "trusted.example", "kept"));
    ASSERT_EQ(0, ::chmod(target.c_str(), 06750)); // last: the calls above clear bits of it
    auto const attributesBefore = attributes::Of(target);
    ASSERT_EQ(3U, attributesBefore.size());

    ReplaceFile(target, "new");

    struct stat status = {};
    ASSERT_EQ(0, ::stat(target.c_str(), &status));
    EXPECT_EQ(12345U, status.st_uid);
    EXPECT_EQ(54321U, status.st_gid);
    EXPECT_EQ(06750U, ModeOf(target));
    EXPECT_EQ(attributesBefore, attributes::Of(target));
    EXPECT_EQ("new", Contents(target));
    EXPECT_THAT(folder.Names(), testing::ElementsAre("target"));
}

TEST(FileReplacementTest, WhatAFolderGivesNewFilesDoesNotStick) {
    TemporaryFolder const folder;
    std::string const target = folder / "target";
    SetContents(target, "old");
    ASSERT_TRUE(attributes::Set(folder.Path(), attributes::DefaultList, attributes::ListFor(2345)));
    ASSERT_EQ(0, ::chmod(folder.Path().c_str(), 02755)); // new files get the folder's group
    ASSERT_EQ(0, ::chown(folder.Path().c_str(), 0, 777));
    ReplaceFile(target, "new");
    struct stat status = {};
    ASSERT_EQ(0, ::stat(target.c_str(), &status));
    EXPECT_EQ(0U, status.st_gid);
    EXPECT_THAT(attributes::Of(target), testing::IsEmpty());
}

} // namespace
} // namespace tessel::base
