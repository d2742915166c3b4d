// SPDX-License-Identifier: Apache-2.0
#include "analysis/NearestName.h"

#include <gtest/gtest.h>

namespace tessel::tslauthctl {
namespace {

std::vector<std::string> const commands = {"stores", "status", "plan", "activate", "part", "dc"};

TEST(NearestNameTest, OneSlipOfTheFingersIsForgiven) {
    EXPECT_EQ("status", NearestName("statsu", commands));
    EXPECT_EQ("status", NearestName("staus", commands));
    EXPECT_EQ("status", NearestName("Status", commands));
    EXPECT_EQ("plan", NearestName("plam", commands));
    EXPECT_EQ("activate", NearestName("act", commands));
}

TEST(NearestNameTest, WhatIsFarFromEachIsNone) {
    EXPECT_EQ("", NearestName("xyzzy", commands));
    EXPECT_EQ("", NearestName("", commands));
    EXPECT_EQ("", NearestName("status", {}));
}

} // namespace
} // namespace tessel::tslauthctl
