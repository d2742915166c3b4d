// SPDX-License-Identifier: Apache-2.0
#include "Host.h"
#include "providers/Gate.h"

#include <tslauth/ActiveDirectoryStore.h>
#include <tslauth/Exceptions.h>
#include <tslauth/string_cast.h>

#include <dlfcn.h>
#include <gmock/gmock.h>
#include <memory>
#include <thread>
#include <vector>

TSLAUTH_AUTO_PTR_BEGIN

using namespace tessel::authentication;
using testing::ElementsAre;
using testing::IsEmpty;

namespace {

/// Whom a provider answers: no time at all, or all it takes.
constexpr int NoTime = 0;
constexpr int Time = 60;

} // namespace

class ActiveDirectoryStoreQuestionsTest : public Host::Test {
protected:
    void SetUp() override {
        Host::Test::SetUp();
        UseProvider("gate");
        _impatient = std::make_unique<ActiveDirectoryStore>(NoTime);
        _patient = std::make_unique<ActiveDirectoryStore>(Time);
        _library = dlopen("/usr/libexec/tslauth/libgate.so", RTLD_LAZY | RTLD_NOLOAD);
        ASSERT_TRUE(_library);
        _gate = static_cast<Gate*>(dlsym(_library, "gate"));
        ASSERT_TRUE(_gate);
        Change([](Gate& it) {
            it.code = it.value = 0;
            it.calls = it.mostInside = 0;
        });
    }

    void TearDown() override {
        if (_gate) {
            Open();
            AwaitNobodyInside();
            dlclose(_library);
        }
        Host::Test::TearDown();
    }

    static void UseProvider(std::string const& name) {
        Host::Write(Paths::ProviderConfiguration, "provider = \"" + name + "\"\n");
    }

    template <typename Edit> void Change(Edit edit) {
        pthread_mutex_lock(&_gate->lock);
        edit(*_gate);
        pthread_cond_broadcast(&_gate->change);
        pthread_mutex_unlock(&_gate->lock);
    }
    void Close() {
        Change([](Gate& it) { it.closed = 1; });
    }
    void Open() {
        Change([](Gate& it) { it.closed = 0; });
    }
    /// Waits until a worker has reached the gate; ctest ends a test that waits for ever.
    void AwaitSomebodyInside() {
        Await([](Gate const& it) { return it.inside != 0; });
    }
    void AwaitNobodyInside() {
        Await([](Gate const& it) { return it.inside == 0; });
    }
    unsigned Calls() {
        unsigned calls = 0;
        Change([&](Gate& it) { calls = it.calls; });
        return calls;
    }

    /// The snapshot, as its own class.
    static ActiveDirectoryStoreConfiguration ConfigurationOf(ActiveDirectoryStore const& store) {
        std::auto_ptr<StoreConfiguration> const configuration = store.GetStoreConfiguration();
        return dynamic_cast<ActiveDirectoryStoreConfiguration&>(*configuration);
    }

    /// Asks until the worker that was late has delivered.
    static std::deque<Domain> EventuallyTrustedDomains(ActiveDirectoryStore const& store) {
        std::deque<Domain> domains;
        for (int i = 0; i < 500 && domains.empty(); ++i) {
            std::this_thread::sleep_for(std::chrono::milliseconds(10));
            domains = store.GetTrustedDomains();
        }
        return domains;
    }

    std::unique_ptr<ActiveDirectoryStore> _impatient;
    std::unique_ptr<ActiveDirectoryStore> _patient;
    Gate* _gate = nullptr;

private:
    template <typename Condition> void Await(Condition condition) {
        pthread_mutex_lock(&_gate->lock);
        while (!condition(*_gate)) {
            pthread_cond_wait(&_gate->change, &_gate->lock);
        }
        pthread_mutex_unlock(&_gate->lock);
    }

    void* _library = nullptr;
};

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
}

TEST_F(ActiveDirectoryStoreQuestionsTest, OtherFailureOfTrustedDomainsDoesNotHideTheTrustState) {
    Change([](Gate& it) {
        it.code = 1355;
        it.value = -3;
    });
    EXPECT_EQ(-3, _patient->GetDomainTrustState());
}

TEST_F(ActiveDirectoryStoreQuestionsTest, QuestionsThatTheProviderLacksHaveANeutralAnswer) {
    UseProvider("null-entries");
    ActiveDirectoryStore store(Time);
    EXPECT_THAT(store.GetTrustedDomains(), IsEmpty());
    EXPECT_EQ(0, store.GetDomainTrustState());
    EXPECT_EQ(0, store.GetDomainTrustRelationship("corp.example"));
    EXPECT_EQ("", store.GetHostPrincipalForDomain("corp.example"));
    EXPECT_EQ("", store.GetDomainControllerForDomain("corp.example"));
    EXPECT_EQ("CORP\\user", store.ConvertCanonicalUsername("CORP\\user"));
    EXPECT_NO_THROW(store.SetPreferredDomainControllers({"dc1"}));
    EXPECT_EQ("DNS Name: (unset), NetBIOS Name: (unset)",
              string_cast(ConfigurationOf(store).activeDomain));
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
