// SPDX-License-Identifier: Apache-2.0
#include <tslauth/string_cast.h>

#include <gtest/gtest.h>

#include <limits>
#include <locale>

using tessel::authentication::string_cast;

namespace {

struct Grouping : std::numpunct<char> {
    char do_thousands_sep() const override {
        return '.';
    }
    std::string do_grouping() const override {
        return "\3";
    }
};

} // namespace

TEST(string_cast, PrintsIntegersInDecimal) {
    EXPECT_EQ("0", string_cast(0));
    EXPECT_EQ("-2147483648", string_cast(std::numeric_limits<int>::min()));
    EXPECT_EQ("4294967295", string_cast(4294967295U));
}

TEST(string_cast, KeepsText) {
    EXPECT_EQ("a b", string_cast(std::string("a b")));
}

TEST(string_cast, IgnoresTheGlobalLocale) {
    std::locale const previous =
        std::locale::global(std::locale(std::locale::classic(), new Grouping));
    EXPECT_EQ("1000000", string_cast(1000000));
    std::locale::global(previous);
}
