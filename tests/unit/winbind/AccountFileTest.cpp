// SPDX-License-Identifier: Apache-2.0
#include "modules/AccountFile.h"

#include <gtest/gtest.h>

#include <string>

namespace {

bool HasName(std::string const& text, char const* name) {
    return AccountFileHasName(text.data(), text.size(), name);
}

bool HasNumber(std::string const& text, id_t number) {
    return AccountFileHasNumber(text.data(), text.size(), number);
}

constexpr char users[] = "root:x:0:0:root:/root:/bin/bash\n"
                         "# lena:x:1001:1001::/home/lena:/bin/sh\n"
                         "\n"
                         " \tindented:x:7:7::/:/bin/sh\n"
                         "top:x:4294967295:0::/:/bin/sh\n"
                         "last:x:1002:1003::/home/last:/bin/sh";

} // namespace

TEST(AccountFileTest, ANameCountsWhole) {
    EXPECT_TRUE(HasName(users, "root"));
    EXPECT_TRUE(HasName(users, "last"));
    EXPECT_FALSE(HasName(users, "roo"));
    EXPECT_FALSE(HasName(users, "roots"));
    EXPECT_FALSE(HasName(users, "ROOT"));
    EXPECT_FALSE(HasName(users, "x"));
    EXPECT_FALSE(HasName(users, "root:x"));
}

TEST(AccountFileTest, ANumberIsTheThirdField) {
    EXPECT_TRUE(HasNumber(users, 0));
    EXPECT_TRUE(HasNumber(users, 1002));
    EXPECT_TRUE(HasNumber(users, 4294967295U));
    EXPECT_FALSE(HasNumber(users, 1003));
    EXPECT_FALSE(HasNumber(users, 1));
}

TEST(AccountFileTest, CommentsAndBlanksAreReadAsTheCLibraryDoes) {
    EXPECT_FALSE(HasName(users, "lena"));
    EXPECT_FALSE(HasName(users, "# lena"));
    EXPECT_FALSE(HasNumber(users, 1001));
    EXPECT_TRUE(HasName(users, "indented"));
    EXPECT_TRUE(HasNumber(users, 7));
    EXPECT_FALSE(HasName(users, ""));
}

TEST(AccountFileTest, ALineThatIsCutShortKeepsItsName) {
    EXPECT_TRUE(HasName("lena", "lena"));
    EXPECT_TRUE(HasName("lena\nroot:x:0", "lena"));
    EXPECT_TRUE(HasNumber("root:x:0", 0));
    EXPECT_FALSE(HasNumber("root:x", 0));
    EXPECT_FALSE(HasNumber("root:x:", 0));
}

TEST(AccountFileTest, WhatIsNoNumberIsNone) {
    EXPECT_FALSE(HasNumber("a:x:1z:0\n", 1));
    EXPECT_FALSE(HasNumber("a:x:-1:0\n", 4294967295U));
    EXPECT_FALSE(HasNumber("a:x:4294967296:0\n", 0));
    EXPECT_FALSE(HasNumber("a:x:18446744073709551616:0\n", 0));
    EXPECT_TRUE(HasNumber("a:x:007:0\n", 7));
}

TEST(AccountFileTest, AnEmptyFileHoldsNobody) {
    EXPECT_FALSE(HasName("", "root"));
    EXPECT_FALSE(HasNumber("", 0));
}
