// SPDX-License-Identifier: Apache-2.0
#include "GatedHost.h"

#include <tslauth/Exceptions.h>

#include <gmock/gmock.h>

#include <chrono>
#include <thread>

TSLAUTH_AUTO_PTR_BEGIN

using namespace tessel::authentication;
using testing::ElementsAre;

using ActiveDirectoryStoreAskTest = Host::GatedTest;

TEST_F(ActiveDirectoryStoreAskTest, AnswersComeFromTheProviderWhateverTheStoresOwnTimeout) {
    Change([](Gate& it) { it.value = 42; });
    EXPECT_EQ(1U, _impatient->AskTrustedDomains(Time).size());
    EXPECT_EQ(42, _impatient->AskDomainTrustState(Time));
    auto const configuration = _impatient->AskStoreConfiguration(Time);
    EXPECT_EQ("corp.example", configuration.activeDomain.DNSName());
    EXPECT_THAT(configuration.preferredDomainControllers,
                ElementsAre("dc1.corp.example", "dc2.corp.example"));
    EXPECT_EQ("", configuration.machineAccountDN) << "which the provider does not offer";
}

TEST_F(ActiveDirectoryStoreAskTest, ARememberedAnswerIsNotGiven) {
    EXPECT_EQ(1U, _patient->GetTrustedDomains().size());
    Close();
    EXPECT_THROW(_patient->AskTrustedDomains(NoTime), ProviderCallTimedOutException);
    EXPECT_THROW(_patient->AskDomainTrustState(NoTime), ProviderCallTimedOutException);
    EXPECT_THROW(_patient->AskStoreConfiguration(NoTime), ProviderCallTimedOutException);
}

TEST_F(ActiveDirectoryStoreAskTest, AFailureIsNoEmptyAnswer) {
    Change([](Gate& it) { it.code = 1355; });
    EXPECT_THROW(_patient->AskTrustedDomains(Time), NoSuchDomainException);
    EXPECT_THROW(_patient->AskStoreConfiguration(Time), NoSuchDomainException);
}

TEST_F(ActiveDirectoryStoreAskTest, WhoeverFindsAWorkerRunningWaitsWithinTheTimeout) {
    Close();
    EXPECT_THROW(_patient->AskTrustedDomains(NoTime), ProviderCallTimedOutException);
    AwaitSomebodyInside();
    auto const calls = Calls();
    auto const start = std::chrono::steady_clock::now();
    EXPECT_THROW(_patient->AskTrustedDomains(1), ProviderCallTimedOutException);
    EXPECT_GE(std::chrono::steady_clock::now() - start, std::chrono::seconds(1));
    EXPECT_EQ(calls, Calls()) << "no second worker has gone to the provider";
    std::thread opener([this] {
        std::this_thread::sleep_for(std::chrono::milliseconds(100));
        Open();
    });
    EXPECT_EQ(1U, _patient->AskTrustedDomains(Time).size());
    opener.join();
}

TEST_F(ActiveDirectoryStoreAskTest, TheRememberedAnswersStayAsTheyWere) {
    EXPECT_EQ(1U, _patient->AskTrustedDomains(Time).size());
    Close();
    EXPECT_TRUE(_impatient->GetTrustedDomains().empty()) << "its own worker has not answered";
}

TSLAUTH_AUTO_PTR_END
