// SPDX-License-Identifier: Apache-2.0
#include "analysis/ChangeLog.h"

#include <gtest/gtest.h>

namespace tessel::tslauthctl::ChangeLog {
namespace {

TEST(ChangeLogTest, ALineSaysWhatAndHowItEndedAndWho) {
    EXPECT_EQ("change=\"join corp.example --user joiner\" outcome=done uid=0 login_uid=1000 "
              "sudo_user=\"alice\"",
              LineFor({"join", "corp.example", "--user", "joiner"}, "done", {0, "1000", "alice"}));
    EXPECT_EQ("change=\"activate 'Active Directory'\" outcome=loss uid=0 login_uid=none",
              LineFor({"activate", "Active Directory"}, "loss", {0, "", ""}));
}

TEST(ChangeLogTest, NothingInAnArgumentPassesForAFieldOrALine) {
    EXPECT_EQ("change=\"part \\\"\\\\x0aoutcome=done\" outcome=refused uid=0 login_uid=none",
              LineFor({"part", "\"\noutcome=done"}, "refused", {0, "", ""}));
}

TEST(ChangeLogTest, APasswordBehindTheNameOfAnAccountIsNotShown) {
    for (auto const& account : {std::vector<std::string>{"--user", "joiner%secret"},
                                std::vector<std::string>{"--user=joiner%secret"}}) {
        auto arguments = account;
        arguments.insert(arguments.begin(), "part");
        auto const line = LineFor(arguments, "done", {0, "", ""});
        EXPECT_EQ(std::string::npos, line.find("secret")) << line;
        EXPECT_NE(std::string::npos, line.find("joiner%...")) << line;
    }
    EXPECT_NE(std::string::npos,
              LineFor({"permit", "--force", "a%b"}, "done", {0, "", ""}).find("a%b"));
}

} // namespace
} // namespace tessel::tslauthctl::ChangeLog
