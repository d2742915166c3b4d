// SPDX-License-Identifier: Apache-2.0
#include "samba/DirectorySearch.h"

#include <gtest/gtest.h>

using namespace tessel::winbind;

TEST(DirectorySearchTest, EveryObjectIsAnEntry) {
    auto const entries = ReadDirectoryEntries("Got 2 replies\n"
                                              "\n"
                                              "sAMAccountName: user1\n"
                                              "canonicalName: corp.example/Users/user1\n"
                                              "\n"
                                              "objectClass: top\n"
                                              "objectClass: computer\n"
                                              "cn: a: b\n"
                                              "\n");
    ASSERT_EQ(2U, entries.size());
    EXPECT_EQ("user1", ValueIn(entries[0], "sAMAccountName"));
    EXPECT_EQ("corp.example/Users/user1", ValueIn(entries[0], "canonicalName"));
    EXPECT_EQ("", ValueIn(entries[0], "cn"));
    EXPECT_EQ("top", ValueIn(entries[1], "objectClass"));
    EXPECT_EQ(2U, entries[1].count("objectClass"));
    EXPECT_EQ("a: b", ValueIn(entries[1], "cn"));
}

TEST(DirectorySearchTest, NothingFoundIsNoEntry) {
    EXPECT_TRUE(ReadDirectoryEntries("Got 0 replies\n\n").empty());
    EXPECT_TRUE(ReadDirectoryEntries("").empty());
    EXPECT_TRUE(ReadDirectoryEntries("\n\n\n").empty());
}

TEST(DirectorySearchTest, WhatIsSaidBeforeTheAnswerIsNoPartOfIt) {
    auto const entries = ReadDirectoryEntries("WARNING: cn: something\n"
                                              "\n"
                                              "cn: nobody\n"
                                              "Got 1 replies\n"
                                              "\n"
                                              "cn: user1");
    ASSERT_EQ(1U, entries.size());
    EXPECT_EQ("user1", ValueIn(entries[0], "cn"));
}
