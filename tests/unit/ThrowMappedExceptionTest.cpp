// SPDX-License-Identifier: Apache-2.0
#include "ThrowMappedException.h"
#include "../MappedCodes.h"

#include <tslauth/Exceptions.h>

#include <gtest/gtest.h>

#include <csignal>
#include <cstdio>
#include <set>
#include <typeindex>
#include <typeinfo>

using namespace tessel::authentication;

namespace {

struct Thrown {
    std::type_index type;
    unsigned long code;
    std::string message;
};

Thrown ThrownFor(ActiveDirectoryClientErrorCode code) {
    try {
        ThrowMappedException(code);
    } catch (Exception const& failure) {
        return {typeid(failure), failure.Code(), failure.what()};
    }
}

std::string Prefix(unsigned long code) {
    char prefix[sizeof "Exception 0x00000000: "];
    std::snprintf(prefix, sizeof prefix, "Exception 0x%08lx: ", code);
    return prefix;
}

void ExpectUnknown(ActiveDirectoryClientErrorCode code) {
    SCOPED_TRACE(code);
    Thrown const thrown = ThrownFor(code);
    EXPECT_EQ(std::type_index(typeid(UnknownException)), thrown.type);
    EXPECT_EQ(code, thrown.code);
    EXPECT_EQ(Prefix(code) + "Unknown exception", thrown.message);
}

struct Row {
    ActiveDirectoryClientErrorCode code;
    std::type_index type;
    char const* text;
};

Row const rows[] = {
#define ROW(code, Class, text) {code, typeid(Class), text},
    TSLAUTH_MAPPED_CODES(ROW)
#undef ROW
};

class MappedCode : public testing::TestWithParam<Row> {};

} // namespace

TEST_P(MappedCode, ThrowsItsClassWithItsCodeAndText) {
    Row const& row = GetParam();
    Thrown const thrown = ThrownFor(row.code);
    EXPECT_EQ(row.type, thrown.type);
    EXPECT_EQ(row.code, thrown.code);
    EXPECT_EQ(Prefix(row.code) + row.text, thrown.message);
}

INSTANTIATE_TEST_SUITE_P(ThrowMappedExceptionTest, MappedCode, testing::ValuesIn(rows),
                         [](auto const& row) { return std::to_string(row.param.code); });

#define ROW(mapped, Class, text)                                                                   \
    TEST(ThrowMappedExceptionTest, Code##mapped##IsCaughtAs##Class) {                              \
        EXPECT_THROW(ThrowMappedException(mapped), Class);                                         \
    }
TSLAUTH_MAPPED_CODES(ROW)
#undef ROW

TEST(ThrowMappedExceptionTest, FortySixCodesHaveAClassOfTheirOwn) {
    std::set<ActiveDirectoryClientErrorCode> codes;
    std::set<std::type_index> types;
    for (Row const& row : rows) {
        codes.insert(row.code);
        types.insert(row.type);
    }
    EXPECT_EQ(46U, codes.size());
    EXPECT_EQ(46U, types.size());
}

TEST(ThrowMappedExceptionTest, EveryOtherSmallCodeIsUnknown) {
    std::set<ActiveDirectoryClientErrorCode> codes;
    for (Row const& row : rows) {
        codes.insert(row.code);
    }
    for (ActiveDirectoryClientErrorCode code = 1; code < 12000; ++code) {
        if (codes.count(code) == 0) {
            ExpectUnknown(code);
        }
    }
}

TEST(ThrowMappedExceptionTest, CodesOutsideTheNumberingAreUnknown) {
    ExpectUnknown(0x7fffffffU);
    ExpectUnknown(0x80000000U);
    ExpectUnknown(0x80090325U);
    ExpectUnknown(0xfffeffffU);
    ExpectUnknown(0xffff0002U);
    ExpectUnknown(0xffffffffU);
}

TEST(ThrowMappedExceptionTest, TheTwoCodesThatProvidersReturnForUnknownAreUnknown) {
    ExpectUnknown(0xffff0000U);
    ExpectUnknown(0xffff0001U);
    EXPECT_EQ("Exception 0xffff0000: Unknown exception", ThrownFor(0xffff0000U).message);
    EXPECT_EQ("Exception 0xffff0001: Unknown exception", ThrownFor(0xffff0001U).message);
}

TEST(ThrowMappedExceptionTest, AWholeMessageReads) {
    EXPECT_EQ("Exception 0x0000052e: The attempted logon is invalid. This is due to either a bad "
              "user name or authentication information.",
              ThrownFor(1326).message);
    EXPECT_EQ("Exception 0x00000008: Not enough memory", ThrownFor(8).message);
    EXPECT_EQ("Exception 0x00000003: Unknown exception", ThrownFor(3).message);
}

// The report begins with the program's name and goes on with the source, the line, the function and
// the expression; the pattern is anchored at its end and knows everything but the first and the
// line.
TEST(ThrowMappedExceptionDeathTest, SuccessIsAnAssertionThatNamesTheAdapter) {
    EXPECT_DEATH(ThrowMappedException(0),
                 "ThrowMappedExceptionTest: lib/tslauth/ActiveDirectoryProvider:[0-9]+: "
                 "void ThrowMappedException\\(ActiveDirectoryClientErrorCode\\): "
                 "Assertion `0' failed\\.\n");
    EXPECT_EXIT(ThrowMappedException(0), testing::KilledBySignal(SIGABRT), "");
}
