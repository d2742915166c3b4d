// SPDX-License-Identifier: Apache-2.0
#include "analysis/InsertedEntries.h"

#include <gmock/gmock.h>

namespace tessel::tslauthctl {
namespace {

using authentication::MakeProviderEntries;
using testing::IsEmpty;
using testing::SizeIs;

EntriesList const two = {MakeProviderEntries("pam_a.so", {"x", "y=1"}, "a", {}),
                         MakeProviderEntries("pam_b.so", {}, "b", {"NOTFOUND=return"})};

TEST(InsertedEntriesTest, WhatIsPrintedIsReadBack) {
    auto const read = ReadInserted(PrintInserted(two));
    ASSERT_THAT(read, SizeIs(2));
    EXPECT_TRUE(IsSame(two[0], read[0]));
    EXPECT_TRUE(IsSame(two[1], read[1]));
    EXPECT_EQ("pam_a.so\tx y=1\ta\t\npam_b.so\t\tb\tNOTFOUND=return\n", PrintInserted(two));
}

TEST(InsertedEntriesTest, LinesOfAnotherFormArePassedOver) {
    EXPECT_THAT(ReadInserted("\n# no\npam_a.so\tx\n\t\ta\t\n"), IsEmpty());
}

TEST(InsertedEntriesTest, OneIsTakenOutByAllThatItIs) {
    EXPECT_THAT(Without(two, two[0]), SizeIs(1));
    EXPECT_THAT(Without(two, MakeProviderEntries("pam_a.so", {"x"}, "a", {})), SizeIs(2));
}

} // namespace
} // namespace tessel::tslauthctl
