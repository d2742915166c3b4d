// SPDX-License-Identifier: Apache-2.0
#include <tslauth/systemconfiguration/PAMControl.h>

#include <gtest/gtest.h>

#include <string>
#include <type_traits>

using namespace SystemConfiguration;

namespace {

template <typename Action> std::string Refusal(Action const& action) {
    try {
        action();
    } catch (InvalidControlException const& error) {
        return error.what();
    }
    return "nothing was thrown";
}

struct Row {
    int number;
    PAMControl::Control value;
    char const* text;
};

class PAMControlRow : public testing::TestWithParam<Row> {};

TEST_P(PAMControlRow, ParsesToItsNumberAndPrintsBackUnchanged) {
    auto const& row = GetParam();
    PAMControl const control{std::string(row.text)};
    EXPECT_EQ(static_cast<int>(PAMControl::Control(control)), row.number);
    EXPECT_EQ(std::string(control), row.text);

    PAMControl assigned(PAMControl::include);
    assigned = std::string(row.text);
    EXPECT_EQ(assigned, control);
}

TEST_P(PAMControlRow, ComparesWithItsWordAndItsEnumeratorFromBothSides) {
    auto const& row = GetParam();
    PAMControl const control{std::string(row.text)};
    EXPECT_TRUE(control == row.value);
    EXPECT_TRUE(row.value == control);
    EXPECT_TRUE(control == row.text);
    EXPECT_TRUE(row.text == control);
    EXPECT_FALSE(control != row.value);
    EXPECT_FALSE(row.value != control);
    EXPECT_FALSE(control != row.text);
    EXPECT_FALSE(row.text != control);

    auto const other =
        row.value == PAMControl::required ? PAMControl::optional : PAMControl::required;
    EXPECT_TRUE(control != other);
    EXPECT_TRUE(other != control);
    EXPECT_FALSE(control == other);
    EXPECT_TRUE(control != PAMControl(other));
}

TEST_P(PAMControlRow, IsBuiltFromItsNumberWithItsText) {
    auto const& row = GetParam();
    PAMControl const control(row.value, row.value == PAMControl::bracketed ? row.text : "");
    EXPECT_EQ(std::string(control), row.text);
    EXPECT_EQ(control, PAMControl(std::string(row.text)));
}

INSTANTIATE_TEST_SUITE_P(All, PAMControlRow,
                         testing::Values(Row{1, PAMControl::required, "required"},
                                         Row{2, PAMControl::requisite, "requisite"},
                                         Row{3, PAMControl::sufficient, "sufficient"},
                                         Row{4, PAMControl::optional, "optional"},
                                         Row{5, PAMControl::include, "include"},
                                         Row{6, PAMControl::substack, "substack"},
                                         Row{7, PAMControl::bracketed,
                                             "[success=1 default=ignore]"}));

TEST(PAMControlTest, DefaultControlIsZeroWithoutText) {
    PAMControl const control;
    EXPECT_EQ(static_cast<int>(PAMControl::Control(control)), 0);
    EXPECT_EQ(control.text(), "");
    EXPECT_EQ(control, PAMControl::none);
}

TEST(PAMControlTest, PrintingADefaultControlThrowsTheBareText) {
    EXPECT_EQ(Refusal([] { (void)std::string(PAMControl()); }), "Invalid Control: ");
}

TEST(PAMControlTest, CapitalisedWordIsRejected) {
    EXPECT_EQ(Refusal([] { PAMControl(std::string("Required")); }), "Invalid Control: Required");
}

TEST(PAMControlTest, TextsThatAreNoControlAreRejected) {
    for (std::string const text :
         {"", "[", "]", "[a", "a]", " required", "required ", "require", "requiredd", "none"}) {
        EXPECT_EQ(Refusal([&] { PAMControl{text}; }), "Invalid Control: " + text);
    }
}

TEST(PAMControlTest, EmptyBracketsAreBracketed) {
    PAMControl const control(std::string("[]"));
    EXPECT_EQ(control, PAMControl::bracketed);
    EXPECT_EQ(control.text(), "[]");
}

TEST(PAMControlTest, ARefusedAssignmentLeavesTheControlAsItWas) {
    PAMControl control(std::string("[a]"));
    EXPECT_EQ(Refusal([&] { control = std::string("bogus"); }), "Invalid Control: bogus");
    EXPECT_EQ(std::string(control), "[a]");
}

TEST(PAMControlTest, AssigningAWordOrAnEnumeratorEmptiesTheText) {
    PAMControl byWord(std::string("[a]"));
    byWord = std::string("required");
    EXPECT_EQ(byWord.text(), "");

    PAMControl byValue(std::string("[a]"));
    byValue = PAMControl::bracketed;
    EXPECT_EQ(byValue.text(), "");
    EXPECT_EQ(byValue, PAMControl::bracketed);
}

TEST(PAMControlTest, BracketedControlsCompareTheirTextsByteForByte) {
    PAMControl const one(std::string("[default=bad]"));
    PAMControl const same(std::string("[default=bad]"));
    PAMControl const other(std::string("[default=die]"));
    EXPECT_TRUE(one == same);
    EXPECT_FALSE(one != same);
    EXPECT_FALSE(one == other);
    EXPECT_TRUE(one != other);
}

TEST(PAMControlTest, BracketedControlComparesAnyTextWithoutParsing) {
    PAMControl const control(std::string("[default=bad]"));
    EXPECT_FALSE(control == "bogus");
    EXPECT_FALSE(control == "required");
    EXPECT_FALSE(control == "[default=die]");
    EXPECT_TRUE("bogus" != control);
}

TEST(PAMControlTest, PlainControlsIgnoreTheirTexts) {
    EXPECT_EQ(PAMControl(PAMControl::required, "x"), PAMControl(PAMControl::required, "y"));
    EXPECT_EQ(std::string(PAMControl(PAMControl::required, "x")), "required");
}

TEST(PAMControlTest, ComparingAPlainControlWithAnUnknownWordThrows) {
    PAMControl const control(PAMControl::required);
    EXPECT_EQ(Refusal([&] { (void)(control == "bogus"); }), "Invalid Control: bogus");
    EXPECT_EQ(Refusal([&] { (void)(control != "bogus"); }), "Invalid Control: bogus");
    EXPECT_EQ(Refusal([&] { (void)("bogus" == control); }), "Invalid Control: bogus");
    EXPECT_EQ(Refusal([&] { (void)(PAMControl() == ""); }), "Invalid Control: ");
}

TEST(PAMControlTest, APlainControlIsNotABracketedText) {
    EXPECT_FALSE(PAMControl(PAMControl::required) == "[required]");
    EXPECT_TRUE(PAMControl(PAMControl::required) != "[required]");
}

TEST(PAMControlTest, ExceptionStandsOutsideTheFamilyOfTheLibrary) {
    static_assert(std::is_base_of<std::exception, InvalidControlException>::value, "");
    EXPECT_STREQ(InvalidControlException("text").what(), "text");
}

} // namespace
