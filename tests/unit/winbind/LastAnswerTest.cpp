// SPDX-License-Identifier: Apache-2.0
#include "questions/LastAnswer.h"

#include <gtest/gtest.h>

using namespace tessel::winbind;
using tessel::authentication::Domain;

namespace {

Domain const own("corp.example", "CORP");
Domain const other("other.example", "OTHER");

int Silent() {
    throw Failure(TSLAUTH_PROVIDER_TIMED_OUT, "no answer in time");
}

int Refused() {
    throw Failure(TSLAUTH_PROVIDER_ACCESS_DENIED, "refused");
}

} // namespace

TEST(LastAnswerTest, AnAnswerIsRepeatedWhileNoControllerAnswers) {
    LastAnswer<int> last;
    EXPECT_EQ(1, last.Get(own, [] { return 1; }));
    EXPECT_EQ(1, last.Get(own, Silent));
    EXPECT_EQ(2, last.Get(own, [] { return 2; }));
    EXPECT_EQ(2, last.Get(own, Silent));
}

TEST(LastAnswerTest, WithoutAnAnswerTheFailureIsTold) {
    LastAnswer<int> last;
    EXPECT_THROW(last.Get(own, Silent), Failure);
}

TEST(LastAnswerTest, ARefusalIsTold) {
    LastAnswer<int> last;
    EXPECT_EQ(1, last.Get(own, [] { return 1; }));
    EXPECT_THROW(last.Get(own, Refused), Failure);
}

TEST(LastAnswerTest, AnAnswerAboutAnotherDomainIsNotRepeated) {
    LastAnswer<int> last;
    EXPECT_EQ(1, last.Get(own, [] { return 1; }));
    EXPECT_THROW(last.Get(other, Silent), Failure);
    EXPECT_EQ(3, last.Get(other, [] { return 3; }));
    EXPECT_THROW(last.Get(own, Silent), Failure);
}
