// SPDX-License-Identifier: Apache-2.0
#include <tslauth/systemconfiguration/PAMFacility.h>

#include <gtest/gtest.h>

#include <sstream>
#include <string>

using namespace SystemConfiguration;

namespace {

template <typename Action> std::string Refusal(Action const& action) {
    try {
        action();
    } catch (InvalidFacilityException const& error) {
        return error.what();
    }
    return "nothing was thrown";
}

struct Row {
    int number;
    PAMFacility::Facility value;
    char const* word;
};

class PAMFacilityRow : public testing::TestWithParam<Row> {};

TEST_P(PAMFacilityRow, ParsesToItsNumberAndPrintsBackUnchanged) {
    auto const& row = GetParam();
    PAMFacility const facility{std::string(row.word)};
    EXPECT_EQ(static_cast<int>(PAMFacility::Facility(facility)), row.number);
    EXPECT_EQ(std::string(facility), row.word);
    EXPECT_EQ(std::string(PAMFacility(row.value)), row.word);

    PAMFacility assigned;
    assigned = std::string(row.word);
    EXPECT_EQ(assigned, facility);
    assigned = PAMFacility::none;
    assigned = row.value;
    EXPECT_EQ(assigned, facility);
}

TEST_P(PAMFacilityRow, PassesThroughStreams) {
    auto const& row = GetParam();
    std::istringstream in(std::string(" \t\n") + row.word + " rest");
    PAMFacility facility;
    EXPECT_TRUE(in >> facility);
    EXPECT_EQ(facility, row.value);
    std::string rest;
    std::getline(in, rest);
    EXPECT_EQ(rest, " rest");

    std::ostringstream out;
    out << facility;
    EXPECT_EQ(out.str(), row.word);
}

TEST_P(PAMFacilityRow, ComparesWithItsWordAndItsEnumeratorFromBothSides) {
    auto const& row = GetParam();
    PAMFacility const facility(row.value);
    EXPECT_TRUE(facility == row.value);
    EXPECT_TRUE(row.value == facility);
    EXPECT_TRUE(facility == row.word);
    EXPECT_TRUE(row.word == facility);
    EXPECT_FALSE(facility != row.value);
    EXPECT_FALSE(row.value != facility);
    EXPECT_FALSE(facility != row.word);
    EXPECT_FALSE(row.word != facility);

    auto const other = row.value == PAMFacility::auth ? PAMFacility::session : PAMFacility::auth;
    EXPECT_TRUE(facility != other);
    EXPECT_TRUE(facility != PAMFacility(other));
    EXPECT_FALSE(other == facility);
}

INSTANTIATE_TEST_SUITE_P(All, PAMFacilityRow,
                         testing::Values(Row{1, PAMFacility::account, "account"},
                                         Row{2, PAMFacility::auth, "auth"},
                                         Row{3, PAMFacility::password, "password"},
                                         Row{4, PAMFacility::session, "session"}));

TEST(PAMFacilityTest, AuthHasTheValueTwo) {
    PAMFacility const facility(std::string("auth"));
    EXPECT_EQ(static_cast<int>(PAMFacility::Facility(facility)), 2);
    EXPECT_EQ(std::string(facility), "auth");
}

TEST(PAMFacilityTest, LeadingMinusIsRejected) {
    EXPECT_EQ(Refusal([] { PAMFacility(std::string("-session")); }), "Invalid Facility: -session");
}

TEST(PAMFacilityTest, WordsThatAreNoFacilityAreRejected) {
    for (std::string const word : {"", "Auth", "auth ", "authx", "@include", "none"}) {
        EXPECT_EQ(Refusal([&] { PAMFacility{word}; }), "Invalid Facility: " + word);
    }
}

TEST(PAMFacilityTest, PrintingADefaultFacilityThrowsTheBareText) {
    PAMFacility const facility;
    EXPECT_EQ(facility, PAMFacility::none);
    EXPECT_EQ(Refusal([&] { (void)std::string(facility); }), "Invalid Facility: ");
    std::ostringstream out;
    EXPECT_EQ(Refusal([&] { out << facility; }), "Invalid Facility: ");
    EXPECT_EQ(out.str(), "");
}

// The message starts as many characters later as the value says. No reader makes such a value; a
// cast of a caller's can.
TEST(PAMFacilityTest, ValueBeyondTheTableCutsTheMessage) {
    auto const value = static_cast<PAMFacility::Facility>(5);
    EXPECT_EQ(Refusal([&] { (void)std::string(PAMFacility(value)); }), "id Facility: ");
}

TEST(PAMFacilityTest, ComparingWithAnUnknownWordThrows) {
    PAMFacility const facility(PAMFacility::auth);
    EXPECT_EQ(Refusal([&] { (void)(facility == "bogus"); }), "Invalid Facility: bogus");
    EXPECT_EQ(Refusal([&] { (void)("bogus" != facility); }), "Invalid Facility: bogus");
}

TEST(PAMFacilityTest, ARefusedAssignmentLeavesTheFacilityAsItWas) {
    PAMFacility facility(PAMFacility::auth);
    EXPECT_EQ(Refusal([&] { facility = std::string("bogus"); }), "Invalid Facility: bogus");
    EXPECT_EQ(facility, PAMFacility::auth);
}

TEST(PAMFacilityTest, ARefusedWordIsConsumedFromTheStream) {
    std::istringstream in("-auth required");
    PAMFacility facility;
    EXPECT_EQ(Refusal([&] { in >> facility; }), "Invalid Facility: -auth");
    std::string next;
    in >> next;
    EXPECT_EQ(next, "required");
}

TEST(PAMFacilityTest, EndOfInputFailsTheStreamAndThrowsNothing) {
    std::istringstream in(" \n");
    PAMFacility facility(PAMFacility::auth);
    EXPECT_FALSE(in >> facility);
    EXPECT_TRUE(in.eof());
    EXPECT_EQ(facility, PAMFacility::auth);
}

} // namespace
