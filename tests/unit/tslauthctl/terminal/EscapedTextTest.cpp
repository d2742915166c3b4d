// SPDX-License-Identifier: Apache-2.0
#include "terminal/EscapedText.h"

#include <gtest/gtest.h>

namespace tessel::tslauthctl {
namespace {

TEST(EscapedTextTest, ControlCharactersAreEscaped) {
    EXPECT_EQ("a\\x1b[31mb\tc\\x0a\\x7f\\x00",
              Escaped(std::string_view("a\x1b[31mb\tc\n\x7f\0", 12)));
    EXPECT_EQ("a\\x0d\nb", EscapedLines("a\r\nb"));
}

TEST(EscapedTextTest, WellFormedUTF8StaysAndTheRestIsEscaped) {
    EXPECT_EQ("gr\xc3\xbc\xc3\x9f \xe2\x82\xac \xf0\x9f\x98\x80",
              Escaped("gr\xc3\xbc\xc3\x9f \xe2\x82\xac \xf0\x9f\x98\x80"));
    // A lone byte, a sequence cut short, an overlong one, a surrogate, a control of the C1 set.
    EXPECT_EQ("\\xff", Escaped("\xff"));
    EXPECT_EQ("\\xe2\\x82", Escaped("\xe2\x82"));
    EXPECT_EQ("\\xc0\\xaf", Escaped("\xc0\xaf"));
    EXPECT_EQ("\\xed\\xa0\\x80", Escaped("\xed\xa0\x80"));
    EXPECT_EQ("\\xc2\\x9b", Escaped("\xc2\x9b"));
}

} // namespace
} // namespace tessel::tslauthctl
