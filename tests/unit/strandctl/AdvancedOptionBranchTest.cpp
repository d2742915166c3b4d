// SPDX-License-Identifier: Apache-2.0
#include <strandctl/AdvancedOptionBranch.h>

#include "HostCtlFailure.h"

#include <gtest/gtest.h>

namespace HostCtl::Adv {
namespace {

using Options = std::map<std::string, std::string>;

AdvancedIntegerOption Option(std::string const& value) {
    return AdvancedOptionBranch(Options{{"UserVars.Example", value}})
        .GetBranch("UserVars")
        .GetIntegerOption("Example");
}

TEST(AdvancedOptionBranchTest, AnOptionIsFoundByItsNameInItsBranch) {
    AdvancedOptionBranch const root(
        Options{{"A.x", "1"}, {"B.C.x", "2"}, {"B.x", "3"}, {"x", "4"}});
    EXPECT_EQ(1, root.GetBranch("A").GetIntegerOption("x").GetValue());
    EXPECT_EQ(2, root.GetBranch("B").GetBranch("C").GetIntegerOption("x").GetValue());
    EXPECT_EQ("B.C.x", root.GetBranch("B").GetBranch("C").GetIntegerOption("x").GetName());
    EXPECT_EQ(3, root.GetBranch("B").GetIntegerOption("x").GetValue());
    EXPECT_EQ(4, root.GetIntegerOption("x").GetValue());
}

TEST(AdvancedOptionBranchTest, ABranchWithoutOptionsIsMissing) {
    for (char const* const key :
         {"UserVar.x", "UserVarsX.x", "uservars.x", "UserVars", "X.UserVars.x"}) {
        EXPECT_EQ("Unable to get user from root", FailureOf([&] {
                      AdvancedOptionBranch(Options{{key, "1"}}).GetBranch("UserVars");
                  }))
            << key;
    }
    EXPECT_EQ("Unable to get user from root",
              FailureOf([] { AdvancedOptionBranch(Options{}).GetBranch("UserVars"); }));
}

TEST(AdvancedOptionBranchTest, AMissingOptionHasItsOwnText) {
    AdvancedOptionBranch const branch =
        AdvancedOptionBranch(Options{{"UserVars.Other", "1"}}).GetBranch("UserVars");
    for (char const* const name : {"Example", "other", "Othe", "Others", ""}) {
        EXPECT_EQ("Unable to get the user option",
                  FailureOf([&] { branch.GetIntegerOption(name); }));
    }
}

TEST(AdvancedOptionBranchTest, WholeNumbersAreRead) {
    EXPECT_EQ(0, Option("0").GetValue());
    EXPECT_EQ(1, Option("1").GetValue());
    EXPECT_EQ(7, Option("007").GetValue());
    EXPECT_EQ(-5, Option("-5").GetValue());
    EXPECT_EQ(2147483647, Option("2147483647").GetValue());
    EXPECT_EQ(-2147483647 - 1, Option("-2147483648").GetValue());
}

TEST(AdvancedOptionBranchTest, AnythingElseIsNoIntegerOption) {
    for (char const* const value :
         {"", " ", "x", "1x", "x1", " 1", "1 ", "+1", "--1", "-", "1.0", "0x1", "true", "\"1",
          "1\r", "2147483648", "-2147483649", "4294967297", "18446744073709551617"}) {
        EXPECT_EQ("Unable to get advanced option UserVars.Example",
                  FailureOf([&] { Option(value); }))
            << '\'' << value << '\'';
    }
}

} // namespace
} // namespace HostCtl::Adv
