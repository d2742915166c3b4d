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

} // namespace
} // namespace tessel::tslauthctl::ChangeLog
