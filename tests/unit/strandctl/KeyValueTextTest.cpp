// SPDX-License-Identifier: Apache-2.0
#include "KeyValueText.h"

#include "HostCtlFailure.h"

#include <gtest/gtest.h>
#include <map>
#include <string>

namespace StrandCtl {
namespace {

TEST(KeyValueTextTest, TheFirstAssignmentOfAKeyCounts) {
    EXPECT_EQ((std::map<std::string, std::string>{{"a", "1"}, {"b", "2"}}),
              ParseKeyValueText("a = \"1\"\nb = 2\na = 3\n"));
}

TEST(KeyValueTextTest, ABadLineIsTheLibrarysOwnFailure) {
    EXPECT_EQ("Error parsing configuration on line 2: no delimiter found",
              FailureOf([] { ParseKeyValueText("\n# comment\n"); }));
    EXPECT_EQ("Error parsing configuration at line 1: invalid quoting",
              FailureOf([] { ParseKeyValueText("a = '"); }));
}

} // namespace
} // namespace StrandCtl
