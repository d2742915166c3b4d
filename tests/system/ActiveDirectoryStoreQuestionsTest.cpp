// SPDX-License-Identifier: Apache-2.0
#include "GatedHost.h"

#include <tslauth/Exceptions.h>

#include <gmock/gmock.h>
#include <limits>
#include <vector>

TSLAUTH_AUTO_PTR_BEGIN

using namespace tessel::authentication;
using testing::ElementsAre;
using testing::IsEmpty;

namespace {

std::string const ConfigurationTimedOut =
    SystemLog::Warning("GetStoreConfiguration call timedout. Returning cached value.");
std::string const DomainsTimedOut =
    SystemLog::Warning("GetTrustedDomains call timedout. Returning cached value.");
std::string const TrustStateTimedOut =
    SystemLog::Warning("GetDomainTrustState call timedout. Returning cached value.");

} // namespace

using ActiveDirectoryStoreQuestionsTest = Host::GatedTest;

TEST_F(ActiveDirectoryStoreQuestionsTest, AnswersComeFromTheProvider) {
    Change([](Gate& it) { it.value = 42; });
    std::deque<Domain> const domains = _patient->GetTrustedDomains();
    ASSERT_EQ(1U, domains.size());
    EXPECT_EQ("other.example", domains[0].DNSName());
    EXPECT_EQ("OTHER", domains[0].NetBIOSName());
    EXPECT_EQ(42, _patient->GetDomainTrustState());

    ActiveDirectoryStoreConfiguration const configuration = ConfigurationOf(*_patient);
    EXPECT_EQ("corp.example", configuration.activeDomain.DNSName());
    EXPECT_EQ("CORP", configuration.activeDomain.NetBIOSName());
    EXPECT_THAT(configuration.preferredDomainControllers,
                ElementsAre("dc1.corp.example", "dc2.corp.example"));
}

TEST_F(ActiveDirectoryStoreQuestionsTest, FieldThatCannotBeToldStaysEmptyAndHidesNoOther) {
    // The provider has no entry for the machine account's name.
    ActiveDirectoryStoreConfiguration const configuration = ConfigurationOf(*_patient);
    EXPECT_EQ("corp.example", configuration.activeDomain.DNSName());
    EXPECT_EQ("", configuration.machineAccountDN);
    // And one that cannot be told any more does not keep its old value.
    Change([](Gate& it) { it.code = 1355; });
    EXPECT_EQ("", ConfigurationOf(*_patient).activeDomain.DNSName());
    EXPECT_THAT(ConfigurationOf(*_patient).preferredDomainControllers, IsEmpty());
}

TEST_F(ActiveDirectoryStoreQuestionsTest, FailureOfTheProviderReachesTheCallerAndSparesTheCache) {
    EXPECT_EQ(1U, _patient->GetTrustedDomains().size());
    Change([](Gate& it) { it.code = 1355; });
    EXPECT_THROW(_patient->GetTrustedDomains(), NoSuchDomainException);
    Change([](Gate& it) { it.code = 0; });
    // While a worker hangs, callers are shown what the failure spared.
    Close();
    std::thread hanging([this] { _patient->GetTrustedDomains(); });
    AwaitSomebodyInside();
    EXPECT_EQ(1U, _patient->GetTrustedDomains().size());
    Open();
    hanging.join();
}

TEST_F(ActiveDirectoryStoreQuestionsTest, SlowProviderIsAnsweredFromTheCacheWithOneWorkerAtMost) {
    Close();
    EXPECT_THAT(_impatient->GetTrustedDomains(), IsEmpty());
    AwaitSomebodyInside();
    // While that worker runs, no caller waits, however patient, on any store.
    for (int i = 0; i < 100; ++i) {
        EXPECT_THAT(_patient->GetTrustedDomains(), IsEmpty());
        EXPECT_THAT(_impatient->GetTrustedDomains(), IsEmpty());
    }
    EXPECT_EQ(1U, Calls());
    Open();
    EXPECT_EQ(1U, EventuallyTrustedDomains(*_impatient).size());
}

TEST_F(ActiveDirectoryStoreQuestionsTest, LateAnswerServesTheNextCaller) {
    Close();
    EXPECT_EQ("", ConfigurationOf(*_impatient).activeDomain.DNSName());
    AwaitSomebodyInside();
    Open();
    AwaitNobodyInside();
    for (int i = 0; i < 500 && ConfigurationOf(*_impatient).activeDomain.DNSName().empty(); ++i) {
        std::this_thread::sleep_for(std::chrono::milliseconds(10));
    }
    EXPECT_EQ("corp.example", ConfigurationOf(*_impatient).activeDomain.DNSName());
}

TEST_F(ActiveDirectoryStoreQuestionsTest, StoreMayBeDestroyedWhileItsWorkerRuns) {
    Close();
    EXPECT_THAT(_impatient->GetTrustedDomains(), IsEmpty());
    AwaitSomebodyInside();
    _impatient.reset();
    _patient.reset();
    Open();
    AwaitNobodyInside();
    // The flag is the process's: a new store asks again as soon as that worker has ended.
    EXPECT_EQ(1U, EventuallyTrustedDomains(ActiveDirectoryStore(Time)).size());
}

TEST_F(ActiveDirectoryStoreQuestionsTest, MissingFileOfTrustedDomainsIsTrustStateSeven) {
    Change([](Gate& it) { it.code = 2; });
    EXPECT_THROW(_patient->GetTrustedDomains(), FileNotFoundException);
    unsigned const before = Calls();
    EXPECT_EQ(7, _patient->GetDomainTrustState());
    EXPECT_EQ(before + 1, Calls()) << "the trust state itself was not asked for";
    EXPECT_THAT(_log.Messages(), IsEmpty());
}

TEST_F(ActiveDirectoryStoreQuestionsTest, TrustStateSevenIsKept) {
    Change([](Gate& it) { it.code = 2; });
    EXPECT_EQ(7, _patient->GetDomainTrustState());
    // A worker that hangs for another store shows what this one has kept.
    Close();
    std::thread hanging([this] { _impatient->GetDomainTrustState(); });
    AwaitSomebodyInside();
    hanging.join();
    EXPECT_EQ(7, _patient->GetDomainTrustState());
}

TEST_F(ActiveDirectoryStoreQuestionsTest, OtherFailureOfTrustedDomainsDoesNotHideTheTrustState) {
    Change([](Gate& it) {
        it.code = 1355;
        it.value = -3;
    });
    EXPECT_EQ(-3, _patient->GetDomainTrustState());
    EXPECT_THAT(_log.Messages(),
                ElementsAre(SystemLog::Warning(
                    "GetDomainTrustState: Call to GetTrustedDomains() failed: "
                    "Exception 0x0000054b: "
                    "The specified domain either does not exist or could not be contacted.")));
}

TEST_F(ActiveDirectoryStoreQuestionsTest, NoTimeStartsAWorkerAndLogsOnceForEachQuestion) {
    Close();
    EXPECT_EQ("", ConfigurationOf(*_impatient).activeDomain.DNSName());
    EXPECT_THAT(_log.Messages(), ElementsAre(ConfigurationTimedOut));
    // Now a worker runs: from the cache at once, without a log and without another worker.
    EXPECT_EQ("", ConfigurationOf(*_impatient).activeDomain.DNSName());
    EXPECT_EQ("", ConfigurationOf(*_patient).activeDomain.DNSName());
    EXPECT_THAT(_log.Messages(), ElementsAre(ConfigurationTimedOut));

    _log.Forget();
    EXPECT_THAT(_impatient->GetTrustedDomains(), IsEmpty());
    EXPECT_THAT(_impatient->GetTrustedDomains(), IsEmpty());
    EXPECT_THAT(_log.Messages(), ElementsAre(DomainsTimedOut));

    _log.Forget();
    EXPECT_EQ(0, _impatient->GetDomainTrustState());
    EXPECT_EQ(0, _impatient->GetDomainTrustState());
    EXPECT_THAT(_log.Messages(), ElementsAre(TrustStateTimedOut));
    Await([](Gate const& it) { return it.inside == 3; });
    EXPECT_EQ(3U, Calls());
}

TEST_F(ActiveDirectoryStoreQuestionsTest, TrustStateWaitsForBothOfItsQuestions) {
    Close();
    EXPECT_EQ(0, _impatient->GetDomainTrustState());
    EXPECT_THAT(_log.Messages(), ElementsAre(DomainsTimedOut, TrustStateTimedOut));
}

TEST_F(ActiveDirectoryStoreQuestionsTest, TimeoutIsTheStores) {
    Close();
    Store const store(1);
    auto const start = std::chrono::steady_clock::now();
    EXPECT_THAT(store.GetTrustedDomains(), IsEmpty());
    auto const waited = std::chrono::steady_clock::now() - start;
    // The limit is on the wall clock, which may be set meanwhile; a little less is allowed for.
    EXPECT_LE(std::chrono::milliseconds(990), waited);
    EXPECT_GT(std::chrono::milliseconds(10000), waited);
    EXPECT_THAT(_log.Messages(), ElementsAre(DomainsTimedOut));
}

TEST_F(ActiveDirectoryStoreQuestionsTest, NegativeTimeoutIsNoTime) {
    Close();
    Store const store(-1);
    EXPECT_THAT(store.GetTrustedDomains(), IsEmpty());
    EXPECT_THAT(_log.Messages(), ElementsAre(DomainsTimedOut));
}

TEST_F(ActiveDirectoryStoreQuestionsTest, HugeTimeoutWaitsForTheProvider) {
    Store const store(std::numeric_limits<int>::max());
    EXPECT_EQ(1U, store.GetTrustedDomains().size());
    EXPECT_THAT(_log.Messages(), IsEmpty());
}

TEST_F(ActiveDirectoryStoreQuestionsTest, CachesBelongToOneStoreAndFlagsToAll) {
    EXPECT_EQ(1U, _patient->GetTrustedDomains().size());
    Close();
    EXPECT_THAT(_impatient->GetTrustedDomains(), IsEmpty());
    // The other store's worker keeps this one from asking, and its cache is its own.
    EXPECT_EQ(1U, _patient->GetTrustedDomains().size());
    EXPECT_THAT(_log.Messages(), ElementsAre(DomainsTimedOut));
}

TEST_F(ActiveDirectoryStoreQuestionsTest, FailureThatComesTooLateReachesNobodyAndSparesTheCache) {
    EXPECT_EQ(1U, _patient->GetTrustedDomains().size());
    Close();
    Change([](Gate& it) { it.code = 1355; });
    Store const store(NoTime);
    EXPECT_THAT(store.GetTrustedDomains(), IsEmpty());
    Open();
    AwaitEndOfWorkers();
    EXPECT_THAT(_log.Messages(), ElementsAre(DomainsTimedOut));
    EXPECT_THROW(_patient->GetTrustedDomains(), NoSuchDomainException)
        << "the failure has cleared the flag";
}

TEST_F(ActiveDirectoryStoreQuestionsTest, ThreeQuestionsAreAskedAtTheSameTime) {
    Close();
    ConfigurationOf(*_impatient);
    _impatient->GetTrustedDomains();
    _impatient->GetDomainTrustState();
    Await([](Gate const& it) { return it.inside == 3; });
    Open();
    AwaitEndOfWorkers();
}

TEST_F(ActiveDirectoryStoreQuestionsTest, ManyCallersShareOneWorkerAQuestion) {
    std::vector<std::thread> callers;
    for (int caller = 0; caller < 8; ++caller) {
        callers.emplace_back([&, caller] {
            ActiveDirectoryStore const store(caller % 2 == 0 ? NoTime : Time);
            for (int i = 0; i < 200; ++i) {
                EXPECT_LE(store.GetTrustedDomains().size(), 1U);
            }
        });
    }
    for (auto& caller : callers) {
        caller.join();
    }
    unsigned mostInside = 0;
    Change([&](Gate& it) { mostInside = it.mostInside; });
    EXPECT_EQ(1U, mostInside);
}

TSLAUTH_AUTO_PTR_END
