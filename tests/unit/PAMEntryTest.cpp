// SPDX-License-Identifier: Apache-2.0
#include <tslauth/systemconfiguration/PAMEntry.h>

#include "SystemFileModels.h"

#include <gtest/gtest.h>

#include <list>
#include <sstream>
#include <string>
#include <type_traits>

using namespace SystemConfiguration;
using SystemFileModels::Failure;

namespace {

using Parameters = std::list<std::string>;

PAMEntry Read(std::string const& text) {
    std::istringstream in(text);
    PAMEntry entry;
    in >> entry;
    return entry;
}

std::string Print(PAMEntry const& entry) {
    std::ostringstream out;
    out << entry;
    return out.str();
}

TEST(PAMEntryTest, DefaultEntryIsEmpty) {
    PAMEntry const entry;
    EXPECT_EQ(entry.control(), PAMControl::none);
    EXPECT_EQ(entry.module(), "");
    EXPECT_TRUE(entry.parameters().empty());
}

TEST(PAMEntryTest, EntryHoldsControlAndModuleAndNoParameters) {
    PAMEntry entry(PAMControl::sufficient, "pam_unix.so");
    EXPECT_EQ(entry.control(), PAMControl::sufficient);
    EXPECT_EQ(entry.module(), "pam_unix.so");
    EXPECT_TRUE(entry.parameters().empty());
    entry.parameters().push_back("nullok");
    EXPECT_EQ(Print(entry), "sufficient\tpam_unix.so\tnullok ");
}

TEST(PAMEntryTest, MovingAnEntryCannotThrow) {
    static_assert(std::is_nothrow_move_constructible<PAMEntry>::value, "");
    static_assert(std::is_nothrow_move_assignable<PAMEntry>::value, "");
    PAMEntry entry = Read("required m a b");
    PAMEntry const moved = std::move(entry);
    EXPECT_EQ(moved.parameters(), (Parameters{"a", "b"}));
}

TEST(PAMEntryTest, ParametersPrintWithASpaceAfterEach) {
    EXPECT_EQ(Print(Read("sufficient   /lib/security/$ISA/pam_access.so p1   p2\n")),
              "sufficient\t/lib/security/$ISA/pam_access.so\tp1 p2 ");
}

TEST(PAMEntryTest, LineWithoutParametersPrintsWithATrailingTab) {
    auto const entry = Read("required pam_deny.so\n");
    EXPECT_TRUE(entry.parameters().empty());
    EXPECT_EQ(Print(entry), "required\tpam_deny.so\t");
}

TEST(PAMEntryTest, BracketedControlIsRejoinedWithSingleSpaces) {
    auto const entry = Read("[success=ok  default=bad] pam_unix.so\n");
    EXPECT_EQ(entry.control().text(), "[success=ok default=bad]");
    EXPECT_EQ(entry.control(), PAMControl::bracketed);
    EXPECT_EQ(Print(entry), "[success=ok default=bad]\tpam_unix.so\t");
}

TEST(PAMEntryTest, BracketedControlMaySpanTabsAndLines) {
    auto const entry = Read("[\ta=1\n b=2\t ] m x\n");
    EXPECT_EQ(entry.control().text(), "[ a=1 b=2 ]");
    EXPECT_EQ(entry.module(), "m");
    EXPECT_EQ(entry.parameters(), (Parameters{"x"}));
}

TEST(PAMEntryTest, UnclosedBracketSwallowsTheRestOfTheInput) {
    std::istringstream in("[success=1  default\naccount required m\n");
    PAMEntry entry;
    EXPECT_EQ(Failure([&] { in >> entry; }),
              "InvalidControlException: Invalid Control: [success=1 default account required m");
    EXPECT_TRUE(in.eof());
}

TEST(PAMEntryTest, AClosingBracketInsideAWordDoesNotCloseTheControl) {
    EXPECT_EQ(Read("[a b]c d] m\n").control().text(), "[a b]c d]");
}

TEST(PAMEntryTest, BracketsAndQuotesInArgumentsHaveNoMeaning) {
    EXPECT_EQ(Read("required m [a b] \"c d\" # e\n").parameters(),
              (Parameters{"[a", "b]", "\"c", "d\"", "#", "e"}));
}

TEST(PAMEntryTest, ReadingStopsAtTheLineEnd) {
    std::istringstream in("required m a b\nnext line\n");
    PAMEntry entry;
    EXPECT_TRUE(in >> entry);
    EXPECT_EQ(entry.parameters(), (Parameters{"a", "b"}));
    std::string rest;
    std::getline(in, rest);
    EXPECT_EQ(rest, "next line");
}

TEST(PAMEntryTest, ControlAndModuleAreFoundOnLaterLines) {
    auto const entry = Read("\n required \n\n m a\n");
    EXPECT_EQ(entry.control(), PAMControl::required);
    EXPECT_EQ(entry.module(), "m");
    EXPECT_EQ(entry.parameters(), (Parameters{"a"}));
}

TEST(PAMEntryTest, CarriageReturnIsWhiteSpace) {
    EXPECT_EQ(Print(Read("required m a\r\n")), "required\tm\ta ");
    EXPECT_EQ(Print(Read("required m\r\n")), "required\tm\t");
}

TEST(PAMEntryTest, ParametersAreAddedToThoseThatTheEntryHas) {
    PAMEntry entry(PAMControl::required, "m");
    entry.parameters().push_back("first");
    std::istringstream in("optional n second\n");
    in >> entry;
    EXPECT_EQ(entry.control(), PAMControl::optional);
    EXPECT_EQ(entry.module(), "n");
    EXPECT_EQ(entry.parameters(), (Parameters{"first", "second"}));
}

TEST(PAMEntryTest, UnknownControlThrowsAndIsConsumed) {
    std::istringstream in("bogus m a\n");
    PAMEntry entry(PAMControl::required, "before");
    EXPECT_EQ(Failure([&] { in >> entry; }), "InvalidControlException: Invalid Control: bogus");
    EXPECT_EQ(entry, PAMEntry(PAMControl::required, "before"));
    std::string next;
    in >> next;
    EXPECT_EQ(next, "m");
}

TEST(PAMEntryTest, EndOfInputLeavesTheMissingFieldsEmptyAndFailsTheStream) {
    struct {
        char const* text;
        PAMControl::Control control;
        char const* module;
    } const rows[] = {
        {"", PAMControl::none, ""},
        {" \t", PAMControl::none, ""},
        {"required", PAMControl::required, ""},
        {"required \n", PAMControl::required, ""},
        {"required m", PAMControl::required, "m"},
    };
    for (auto const& row : rows) {
        SCOPED_TRACE(row.text);
        std::istringstream in(row.text);
        PAMEntry entry;
        EXPECT_NO_THROW(in >> entry);
        EXPECT_TRUE(in.fail());
        EXPECT_TRUE(in.eof());
        EXPECT_EQ(entry, PAMEntry(row.control, row.module));
    }
}

TEST(PAMEntryTest, LastLineNeedsNoLineFeed) {
    std::istringstream in("required m a");
    PAMEntry entry;
    EXPECT_TRUE(in >> entry);
    EXPECT_TRUE(in.eof());
    EXPECT_EQ(entry.parameters(), (Parameters{"a"}));
}

TEST(PAMEntryTest, EntriesCompareModuleAndParametersInOrder) {
    EXPECT_TRUE(Read("required m a b") == Read("required  m  a  b"));
    EXPECT_FALSE(Read("required m a b") != Read("required m a b"));
    EXPECT_TRUE(Read("required m a b") != Read("required m b a"));
    EXPECT_TRUE(Read("required m a b") != Read("required m a"));
    EXPECT_TRUE(Read("required m") != Read("required n"));
    EXPECT_TRUE(Read("required m") != Read("optional m"));
    EXPECT_TRUE(Read("required m") != Read("[a] m"));
}

TEST(PAMEntryTest, EntriesThatDifferOnlyInBracketedTextsAreEqualAndTheirControlsAreNot) {
    auto const one = Read("[default=bad] m");
    auto const other = Read("[default=die] m");
    EXPECT_TRUE(one == other);
    EXPECT_FALSE(one != other);
    EXPECT_FALSE(one.control() == other.control());
}

TEST(PAMEntryTest, PrintingAnEntryWithoutControlThrowsAndWritesNothing) {
    std::ostringstream out;
    EXPECT_EQ(Failure([&] { out << PAMEntry(); }), "InvalidControlException: Invalid Control: ");
    EXPECT_EQ(out.str(), "");
}

} // namespace
