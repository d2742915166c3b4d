// SPDX-License-Identifier: Apache-2.0
#include <tslauth/systemconfiguration/PAMStack.h>

#include "SystemFileModels.h"

#include <gtest/gtest.h>

#include <sstream>
#include <string>

using namespace SystemConfiguration;
using SystemFileModels::Failure;

namespace {

TEST(PAMStackTest, NewStackIsEmptyAndKnowsItsFacility) {
    EXPECT_TRUE(PAMStack().empty());
    EXPECT_EQ(PAMStack().Facility(), PAMFacility::none);
    PAMStack const stack{PAMFacility(PAMFacility::auth)};
    EXPECT_TRUE(stack.empty());
    EXPECT_TRUE(stack.Facility() == "auth");
}

TEST(PAMStackTest, CopyingKeepsEntriesAndFacility) {
    PAMStack stack{PAMFacility(PAMFacility::session)};
    stack.push_back(PAMEntry(PAMControl::required, "m"));
    PAMStack const copy(stack);
    PAMStack assigned;
    assigned = copy;
    EXPECT_EQ(assigned.Facility(), PAMFacility::session);
    ASSERT_EQ(assigned.size(), 1u);
    EXPECT_EQ(assigned.front(), stack.front());
}

TEST(PAMStackTest, FindReturnsTheFirstEntryOfAModule) {
    PAMStack stack{PAMFacility(PAMFacility::auth)};
    stack.push_back(PAMEntry(PAMControl::required, "other"));
    stack.push_back(PAMEntry(PAMControl::optional, "m"));
    stack.push_back(PAMEntry(PAMControl::required, "m"));
    stack.back().parameters().push_back("p");
    EXPECT_EQ(stack.find("m"), stack.begin() + 1);
    PAMStack const& constant = stack;
    EXPECT_EQ(constant.find("m"), constant.begin() + 1);
}

TEST(PAMStackTest, FindReturnsTheEndWhereThereIsNoSuchModule) {
    PAMStack stack;
    EXPECT_EQ(stack.find("m"), stack.end());
    stack.push_back(PAMEntry(PAMControl::required, "/lib/m"));
    PAMStack const& constant = stack;
    EXPECT_EQ(stack.find("m"), stack.end());
    EXPECT_EQ(constant.find("/lib/M"), constant.end());
}

TEST(PAMStackTest, PrintsOneLineAnEntryInOrder) {
    PAMStack stack{PAMFacility(PAMFacility::auth)};
    stack.push_back(PAMEntry(PAMControl::required, "/lib/security/$ISA/pam_access.so"));
    stack.push_front(PAMEntry(PAMControl(std::string("[default=1]")), "first"));
    stack.front().parameters() = {"a", "b"};
    std::ostringstream out;
    out << stack;
    EXPECT_EQ(out.str(), "auth\t[default=1]\tfirst\ta b \n"
                         "auth\trequired\t/lib/security/$ISA/pam_access.so\t\n");
}

TEST(PAMStackTest, EmptyStackPrintsNothingWhateverItsFacility) {
    std::ostringstream out;
    out << PAMStack() << PAMStack(PAMFacility(PAMFacility::auth));
    EXPECT_EQ(out.str(), "");
}

TEST(PAMStackTest, StackWithoutFacilityCannotPrintItsEntries) {
    PAMStack stack;
    stack.push_back(PAMEntry(PAMControl::required, "m"));
    std::ostringstream out;
    EXPECT_EQ(Failure([&] { out << stack; }), "InvalidFacilityException: Invalid Facility: ");
}

TEST(PAMStackTest, EntryWithoutControlThrowsAfterTheEarlierLines) {
    PAMStack stack{PAMFacility(PAMFacility::auth)};
    stack.push_back(PAMEntry(PAMControl::required, "m"));
    stack.push_back(PAMEntry());
    stack.push_back(PAMEntry(PAMControl::required, "n"));
    std::ostringstream out;
    EXPECT_EQ(Failure([&] { out << stack; }), "InvalidControlException: Invalid Control: ");
    EXPECT_EQ(out.str(), "auth\trequired\tm\t\nauth\t");
}

} // namespace
