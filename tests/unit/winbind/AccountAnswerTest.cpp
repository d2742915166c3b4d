// SPDX-License-Identifier: Apache-2.0
#include "text/AccountAnswer.h"

#include <gtest/gtest.h>

#include <string>

using namespace tessel::winbind;

TEST(AccountAnswerTest, EveryAnswerIsReadFromItsLine) {
    for (AccountAnswer const answer :
         {AccountAnswer::NotOfTheDomain, AccountAnswer::InOrder, AccountAnswer::Disabled,
          AccountAnswer::LockedOut, AccountAnswer::Expired, AccountAnswer::OffLine,
          AccountAnswer::NoAnswer}) {
        EXPECT_EQ(answer, AnswerIn(std::string(WordOf(answer)) + "\n"));
    }
}

TEST(AccountAnswerTest, AnythingElseIsNoAnswer) {
    for (char const* const text : {"", "\n", "in-order", "in-order \n", " in-order\n",
                                   "warning\nin-order\n", "in-orderly\n", "0\n"}) {
        EXPECT_EQ(std::nullopt, AnswerIn(text)) << "'" << text << "'";
    }
}

TEST(AccountAnswerTest, WhatComesBehindTheLineDoesNotCount) {
    EXPECT_EQ(AccountAnswer::Disabled, AnswerIn("disabled\nin-order\n"));
}
