// SPDX-License-Identifier: Apache-2.0
#include <base/AsciiText.h>

#include <clocale>
#include <gtest/gtest.h>
#include <string>
#include <vector>

namespace tessel::base::AsciiText {
namespace {

/// Every byte, so that nothing outside ASCII is taken for a letter.
std::string AllBytes() {
    std::string bytes;
    for (int byte = 0; byte < 256; ++byte) {
        bytes += static_cast<char>(byte);
    }
    return bytes;
}

/// What `kind` is true for.
template <typename Kind> std::string Those(Kind kind) {
    std::string found;
    for (char const byte : AllBytes()) {
        if (kind(byte)) {
            found += byte;
        }
    }
    return found;
}

TEST(AsciiTextTest, OnlyAsciiHasLettersAndDigits) {
    EXPECT_EQ("0123456789", Those(IsDigit));
    EXPECT_EQ("ABCDEFGHIJKLMNOPQRSTUVWXYZabcdefghijklmnopqrstuvwxyz", Those(IsLetter));
    std::string control;
    for (char byte = 0; byte < ' '; ++byte) {
        control += byte;
    }
    EXPECT_EQ(control + '\x7f', Those(IsControl));
}

TEST(AsciiTextTest, CaseIsChangedOfAsciiLettersAlone) {
    EXPECT_EQ("corp.internal-09_\xc4\xdc\xff", Lower("CORP.Internal-09_\xc4\xdc\xff"));
    EXPECT_EQ("CORP.INTERNAL-09_\xe4\xfc\xff", Upper("corp.Internal-09_\xe4\xfc\xff"));
    for (char const byte : AllBytes()) {
        EXPECT_EQ(IsLetter(byte), Lower(byte) != Upper(byte)) << static_cast<int>(byte);
        EXPECT_EQ(Lower(byte), Lower(Upper(byte)));
    }
}

TEST(AsciiTextTest, NamesAreEqualWhateverTheirCase) {
    EXPECT_TRUE(EqualsIgnoringCase("CORP.INTERNAL", "corp.internal"));
    EXPECT_TRUE(EqualsIgnoringCase("", ""));
    EXPECT_FALSE(EqualsIgnoringCase("corp", "corp."));
    EXPECT_FALSE(EqualsIgnoringCase("corp.", "corp"));
    EXPECT_FALSE(EqualsIgnoringCase("\xc4", "\xe4"));
    EXPECT_FALSE(EqualsIgnoringCase("@", "`")) << "they differ in the bit that letters differ in";
}

TEST(AsciiTextTest, NoLocaleMakesAnotherLetterOfI) {
    // Where the machine has a Turkish locale, the C library's own comparison fails here.
    char const* const turkish = std::setlocale(LC_ALL, "tr_TR.ISO-8859-9");
    EXPECT_TRUE(EqualsIgnoringCase("CORP.INTERNAL", "corp.internal"));
    EXPECT_EQ("internal", Lower("INTERNAL"));
    EXPECT_EQ("INTERNAL", Upper("internal"));
    std::setlocale(LC_ALL, "C");
    RecordProperty("turkish", turkish ? "yes" : "no");
}

TEST(AsciiTextTest, StartsAndEnds) {
    EXPECT_TRUE(StartsWith("search corp", "search"));
    EXPECT_TRUE(StartsWith("a", ""));
    EXPECT_FALSE(StartsWith("sea", "search"));
    EXPECT_TRUE(EndsWith("libplain.so", ".so"));
    EXPECT_TRUE(EndsWith("a", ""));
    EXPECT_FALSE(EndsWith("so", ".so"));
    EXPECT_FALSE(EndsWith("", "a"));
}

TEST(AsciiTextTest, ControlCharactersAreFound) {
    EXPECT_TRUE(HasControlCharacters("a\nb"));
    EXPECT_TRUE(HasControlCharacters(std::string("\0", 1)));
    EXPECT_TRUE(HasControlCharacters("\x7f"));
    EXPECT_FALSE(HasControlCharacters("a b \xc3\xa4"));
    EXPECT_FALSE(HasControlCharacters(""));
}

TEST(AsciiTextTest, TrimmingTakesAllSixKindsOfWhiteSpace) {
    EXPECT_EQ("a b", Trimmed(" \t\n\v\f\ra b \t\n\v\f\r"));
    EXPECT_EQ(" a", TrimmedRight(" a \r\n"));
    for (std::string const blank : {"", " ", " \t\n\v\f\r"}) {
        EXPECT_EQ("", Trimmed(blank));
        EXPECT_EQ("", TrimmedRight(blank));
    }
    EXPECT_EQ("\xa0", Trimmed(" \xa0")) << "a blank in Latin 1 alone";
}

TEST(AsciiTextTest, LinesAreTakenWithTheirEndsAndTheLastMayHaveNone) {
    std::string_view text = "a\r\n\nb";
    std::vector<std::string> lines;
    while (!text.empty()) {
        lines.emplace_back(TakeLine(text));
    }
    EXPECT_EQ((std::vector<std::string>{"a\r\n", "\n", "b"}), lines);
}

TEST(AsciiTextTest, WordsAreTakenWithoutTheirBlanks) {
    std::string_view text = " a\t\rbc\n ";
    EXPECT_EQ("a", TakeWord(text));
    EXPECT_EQ("bc", TakeWord(text));
    EXPECT_EQ("", TakeWord(text));
    EXPECT_EQ("", text);
    text = "a\rb c";
    EXPECT_EQ("a\rb", TakeWord(text, " \t"));
    EXPECT_EQ("c", TakeWord(text, " \t"));
}

TEST(AsciiTextTest, TheLineEndIsTheTextsOwn) {
    EXPECT_EQ("\n", LineEnd(""));
    EXPECT_EQ("\n", LineEnd("a\nb\r"));
    EXPECT_EQ("\r\n", LineEnd("a\r\nb\n"));
}

} // namespace
} // namespace tessel::base::AsciiText
