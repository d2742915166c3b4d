// SPDX-License-Identifier: Apache-2.0
#include "history/Confirmation.h"

#include <gmock/gmock.h>
#include <nlohmann/json.hpp>

namespace tessel::tslauthctl {
namespace {

TEST(ConfirmationTest, WhatIsWrittenIsReadAgain) {
    auto const read = ReadConfirmation(PrintConfirmation({7, "a-boot", 1234}));
    EXPECT_EQ(7U, read.number);
    EXPECT_EQ("a-boot", read.boot);
    EXPECT_EQ(1234, read.until);
    EXPECT_THROW(ReadConfirmation("{}"), nlohmann::json::exception);
}

TEST(ConfirmationTest, ItIsDueWhenItsTimeHasPassedOrTheHostWasRestarted) {
    Confirmation const confirmation = {7, "a-boot", 1234};
    EXPECT_EQ(34, SecondsLeft(confirmation, "a-boot", 1200));
    EXPECT_EQ(0, SecondsLeft(confirmation, "a-boot", 1234));
    EXPECT_EQ(0, SecondsLeft(confirmation, "a-boot", 9999));
    EXPECT_EQ(0, SecondsLeft(confirmation, "another-boot", 3));
}

} // namespace
} // namespace tessel::tslauthctl
