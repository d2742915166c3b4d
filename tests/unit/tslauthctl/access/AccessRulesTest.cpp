// SPDX-License-Identifier: Apache-2.0
#include "access/AccessRules.h"

#include "../../../TemporaryFolder.h"

#include <base/AsciiText.h>

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <fstream>
#include <random>
#include <security/pam_appl.h>
#include <string>
#include <vector>

using namespace tessel::tslauthctl;
using testing::ElementsAre;

namespace {

std::string const Last = "-:ALL:ALL\n";
Subject const User = {"CORP\\user1", false};
Subject const Group = {"CORP\\domain users", true};

TEST(AccessRulesTest, AHostBeginsWithNobodyPermitted) {
    auto const rules = ReadAccessRules(FirstAccessRules());
    ASSERT_EQ(rules.rules.size(), 1U);
    EXPECT_TRUE(rules.rules.front().IsLast());
    EXPECT_FALSE(rules.PermitByDefault());
    EXPECT_TRUE(rules.faultyLines.empty());
}

TEST(AccessRulesTest, BlanksBelongToNames) {
    auto const rules = ReadAccessRules(
        "+:CORP\\Ann Lee,(CORP\\domain users),, x :ALL\n- : ALL:ALL EXCEPT LOCAL\n");
    ASSERT_EQ(rules.rules.size(), 2U);
    EXPECT_TRUE(rules.rules[0].permits);
    EXPECT_THAT(rules.rules[0].names, ElementsAre("CORP\\Ann Lee", "(CORP\\domain users)", " x "));
    EXPECT_FALSE(rules.rules[1].permits);
    EXPECT_THAT(rules.rules[1].names, ElementsAre(" ALL"));
    EXPECT_EQ(rules.rules[1].origins, "ALL EXCEPT LOCAL");
    EXPECT_TRUE(rules.PermitByDefault());
}

TEST(AccessRulesTest, WhatPamAccessComplainsOfIsFaulty) {
    auto const rules = ReadAccessRules("*:a:ALL\n+:a\n#+:a:ALL\n\n \t\n #\n+::a:b\n+:x:ALL");
    EXPECT_THAT(rules.faultyLines, ElementsAre(1, 2, 6, 8));
    ASSERT_EQ(rules.rules.size(), 1U);
    EXPECT_EQ(rules.rules[0].line, 7U);
}

TEST(AccessRulesTest, APermissionStandsBeforeTheLastRule) {
    EXPECT_EQ(Permitted("# a\n-:x:ALL\n" + Last, User), "# a\n-:x:ALL\n+:CORP\\user1:ALL\n" + Last);
    EXPECT_EQ(Permitted(Last, Group), "+:(CORP\\domain users):ALL\n" + Last);
    EXPECT_EQ(Permitted("# no line feed", User), "# no line feed\n+:CORP\\user1:ALL\n");
}

TEST(AccessRulesTest, APermissionTakesTheDenialBack) {
    EXPECT_EQ(Permitted("-:y,corp\\USER1,z:ALL\n-:CORP\\user1:ALL\n" + Last, User),
              "-:y,z:ALL\n+:CORP\\user1:ALL\n" + Last);
    EXPECT_EQ(Permitted("-:CORP\\user1:tty1\n" + Last, User),
              "-:CORP\\user1:tty1\n+:CORP\\user1:ALL\n" + Last);
}

TEST(AccessRulesTest, ADenialStandsFirstAndTakesThePermissionBack) {
    EXPECT_EQ(Denied("# a\n+:CORP\\user1:ALL\n+:(g):ALL\n" + Last, User),
              "# a\n-:CORP\\user1:ALL\n+:(g):ALL\n" + Last);
    EXPECT_EQ(Denied("+:(g):ALL\n-:CORP\\user1:ALL\n" + Last, User),
              "-:CORP\\user1:ALL\n+:(g):ALL\n-:CORP\\user1:ALL\n" + Last);
}

TEST(AccessRulesTest, EditingTwiceIsEditingOnce) {
    for (std::string const& text :
         {std::string(), Last, "+:x:ALL\n" + Last, "+:CORP\\user1,x:ALL\n" + Last,
          std::string("-:(CORP\\domain users):ALL\n+:ALL:ALL\n")}) {
        for (auto const& subject : {User, Group, Everybody()}) {
            auto const permitted = Permitted(text, subject);
            EXPECT_EQ(Permitted(permitted, subject), permitted);
            auto const denied = Denied(text, subject);
            EXPECT_EQ(Denied(denied, subject), denied);
        }
        EXPECT_EQ(NobodyPermitted(NobodyPermitted(text)), NobodyPermitted(text));
        EXPECT_FALSE(ReadAccessRules(NobodyPermitted(text)).PermitByDefault());
    }
}

TEST(AccessRulesTest, TakingBackEveryPermissionKeepsDenials) {
    EXPECT_EQ(NobodyPermitted("# a\n-:x:ALL\n+:y:tty1\n+:ALL:ALL\n" + Last),
              "# a\n-:x:ALL\n" + Last);
    EXPECT_EQ(NobodyPermitted("+:ALL:ALL\n"), Last);
}

TEST(AccessRulesTest, NamesThatWouldBeReadAsSomethingElseHaveNoRule) {
    EXPECT_TRUE(CanStandInARule(User));
    EXPECT_TRUE(CanStandInARule(Group));
    EXPECT_TRUE(CanStandInARule({"a@b", true}));
    for (auto const* const name :
         {"", "a,b", "a:b", "a@b", "@a", "(a)", "all", "EXCEPT", "a\nb", "a "}) {
        EXPECT_FALSE(CanStandInARule({name, false})) << name;
    }
}

int NoQuestions(int, pam_message const**, pam_response**, void*) {
    return PAM_CONV_ERR;
}

/// Whether the real module lets a local user in, from another host, by the rules in `file`.
bool PamAccessPermits(std::string const& folder, std::string const& user) {
    pam_conv const conversation = {NoQuestions, nullptr};
    pam_handle_t* handle = nullptr;
    EXPECT_EQ(pam_start_confdir("login", user.c_str(), &conversation, folder.c_str(), &handle),
              PAM_SUCCESS);
    EXPECT_EQ(pam_set_item(handle, PAM_RHOST, "192.0.2.7"), PAM_SUCCESS);
    int const result = pam_acct_mgmt(handle, 0);
    pam_end(handle, result);
    return result == PAM_SUCCESS;
}

bool IsOneOf(std::vector<std::string> const& names, std::string const& user,
             std::string const& group) {
    using tessel::base::AsciiText::EqualsIgnoringCase;
    for (auto const& name : names) {
        if (EqualsIgnoringCase(name, "ALL") || EqualsIgnoringCase(name, user) ||
            name == "(" + group + ")") {
            return true;
        }
    }
    return false;
}

TEST(AccessRulesTest, TheReaderAgreesWithPamAccess) {
    if (sizeof(void*) != 8) {
        GTEST_SKIP() << "the machine's PAM modules are of 64 bits";
    }
    TemporaryFolder const folder;
    std::ofstream(folder / "login")
        << "account required pam_access.so noaudit nodefgroup listsep=, accessfile="
        << folder / "rules"
        << "\n";
    std::vector<std::string> const pieces = {"+:daemon:ALL\n",
                                             "-:nobody:ALL\n",
                                             "+:(nogroup):ALL\n",
                                             "-:(daemon),x:ALL\n",
                                             "-:ALL:ALL\n",
                                             "+:ALL EXCEPT nobody:ALL\n",
                                             "-:ALL,EXCEPT,daemon:ALL\n",
                                             "+ :NOBODY:ALL\n",
                                             "+: nobody:ALL\n",
                                             "+:nobody: ALL\n",
                                             "-:daemon:ALL \t\n",
                                             "# -:ALL:ALL\n",
                                             " # x\n",
                                             "*:ALL:ALL\n",
                                             "-:ALL\n",
                                             "::+::x,,nobody:ALL\n",
                                             "-x:daemon:ALL\n",
                                             "+:all:192.0.2.7\n",
                                             "-:daemon:198.51.100.1\n",
                                             "\n",
                                             "\r\n",
                                             "+:nobody:ALL\r\n",
                                             "-:ALL:ALL"};
    std::mt19937 random(1);
    std::size_t permitted = 0;
    constexpr std::size_t texts = 500;
    for (std::size_t i = 0; i < texts; ++i) {
        std::string text;
        for (auto lines = random() % 5; lines > 0; --lines) {
            text += pieces[random() % pieces.size()];
        }
        std::ofstream(folder / "rules") << text;
        for (std::string const user : {"nobody", "daemon"}) {
            std::string const group = user == "nobody" ? "nogroup" : user;
            bool expected = true;
            for (auto const& rule : ReadAccessRules(text).rules) {
                bool const fromThere = rule.origins == "ALL" || rule.origins == "192.0.2.7";
                if (fromThere && IsOneOf(rule.names, user, group) &&
                    !IsOneOf(rule.exceptions, user, group)) {
                    expected = rule.permits;
                    break;
                }
            }
            ASSERT_EQ(PamAccessPermits(folder.Path(), user), expected) << user << "\n" << text;
            permitted += expected ? 1 : 0;
        }
    }
    EXPECT_GT(permitted, texts / 2);
    EXPECT_LT(permitted, texts * 2 - texts / 4);
}

} // namespace
