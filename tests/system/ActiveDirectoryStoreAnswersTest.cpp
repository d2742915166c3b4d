// SPDX-License-Identifier: Apache-2.0
#include "Host.h"
#include "LoadedProvider.h"
#include "SystemLog.h"
#include "providers/Scripted.h"

#include <tslauth/ActiveDirectoryStore.h>
#include <tslauth/Exceptions.h>
#include <tslauth/string_cast.h>

#include <gmock/gmock.h>
#include <limits>
#include <memory>
#include <new>
#include <stdexcept>
#include <vector>

TSLAUTH_AUTO_PTR_BEGIN

using namespace tessel::authentication;
using testing::ElementsAre;
using testing::IsEmpty;

namespace {

constexpr char InternalError[] = "Exception 0x0000054f: An internal error occurred.";

} // namespace

class ActiveDirectoryStoreAnswersTest : public Host::Test {
protected:
    void SetUp() override {
        Host::Test::SetUp();
        Host::Write(Paths::ProviderConfiguration, "provider = \"scripted\"\n");
        _library = std::make_unique<LoadedProvider>("scripted");
        _scripted = &_library->Find<Scripted>("scripted");
        _store = std::make_unique<ActiveDirectoryStore>(60);
        Change([](Scripted& it) {
            for (auto& act : it.acts) {
                act = ScriptedAnswers;
            }
            it.code = 1355;
            it.value = 42;
            it.count = 0;
        });
    }

    template <typename Edit> void Change(Edit edit) {
        pthread_mutex_lock(&_scripted->lock);
        edit(*_scripted);
        pthread_mutex_unlock(&_scripted->lock);
    }
    void Let(ScriptedEntry entry, ScriptedAct act) {
        Change([&](Scripted& it) { it.acts[entry] = act; });
    }
    std::vector<ScriptedEntry> Calls() {
        std::vector<ScriptedEntry> calls;
        Change([&](Scripted& it) { calls.assign(it.calls, it.calls + it.count); });
        return calls;
    }
    std::string Arguments() {
        std::string arguments;
        Change([&](Scripted& it) { arguments = it.arguments; });
        return arguments;
    }
    bool WasAskedOnThisThread() {
        bool was = false;
        Change([&](Scripted& it) { was = pthread_equal(it.thread, pthread_self()) != 0; });
        return was;
    }

    ActiveDirectoryStoreConfiguration ConfigurationOf(ActiveDirectoryStore const& store) {
        std::auto_ptr<StoreConfiguration> const configuration = store.GetStoreConfiguration();
        return dynamic_cast<ActiveDirectoryStoreConfiguration&>(*configuration);
    }

    /// Everything that keeps a field of the configuration from being told.
    static constexpr ScriptedAct Failures[] = {ScriptedFails, ScriptedThrowsStandard,
                                               ScriptedThrowsBadAlloc, ScriptedThrowsNumber};
    static constexpr ScriptedAct Throws[] = {ScriptedThrowsStandard, ScriptedThrowsBadAlloc,
                                             ScriptedThrowsNumber};

    SystemLog _log;
    std::unique_ptr<LoadedProvider> _library;
    Scripted* _scripted = nullptr;
    std::unique_ptr<ActiveDirectoryStore> _store;
};

constexpr ScriptedAct ActiveDirectoryStoreAnswersTest::Failures[];
constexpr ScriptedAct ActiveDirectoryStoreAnswersTest::Throws[];

// --- the three timed questions -------------------------------------------------------------------

TEST_F(ActiveDirectoryStoreAnswersTest, ConfigurationHasThreeFieldsAskedForInOrder) {
    ActiveDirectoryStoreConfiguration const configuration = ConfigurationOf(*_store);
    EXPECT_EQ(Domain("corp.example", "CORP"), configuration.activeDomain);
    EXPECT_THAT(configuration.preferredDomainControllers,
                ElementsAre("dc1.corp.example", "dc2.corp.example"));
    EXPECT_EQ("CN=NODE", configuration.machineAccountDN);
    EXPECT_THAT(Calls(), ElementsAre(ScriptedActiveDomain, ScriptedPreferredDomainControllers,
                                     ScriptedMachineAccountDN));
    EXPECT_FALSE(WasAskedOnThisThread());
}

TEST_F(ActiveDirectoryStoreAnswersTest, MachineAccountThatCannotBeToldStaysEmptyAlone) {
    for (ScriptedAct const failure : Failures) {
        Let(ScriptedMachineAccountDN, failure);
        ActiveDirectoryStoreConfiguration const configuration = ConfigurationOf(*_store);
        EXPECT_EQ("corp.example", configuration.activeDomain.DNSName()) << failure;
        EXPECT_EQ(2U, configuration.preferredDomainControllers.size()) << failure;
        EXPECT_EQ("", configuration.machineAccountDN) << failure;
    }
}

TEST_F(ActiveDirectoryStoreAnswersTest, EachFieldThatCannotBeToldIsEmptiedAndTheNextIsAskedFor) {
    ConfigurationOf(*_store);
    for (ScriptedAct const failure : Failures) {
        Let(ScriptedActiveDomain, failure);
        Let(ScriptedPreferredDomainControllers, failure);
        Change([](Scripted& it) { it.count = 0; });
        ActiveDirectoryStoreConfiguration const configuration = ConfigurationOf(*_store);
        EXPECT_EQ(Domain(), configuration.activeDomain) << failure;
        EXPECT_THAT(configuration.preferredDomainControllers, IsEmpty()) << failure;
        EXPECT_EQ("CN=NODE", configuration.machineAccountDN) << failure;
        EXPECT_EQ(3U, Calls().size()) << failure;
    }
}

TEST_F(ActiveDirectoryStoreAnswersTest, ConfigurationIsTheCallersOwn) {
    std::auto_ptr<StoreConfiguration> const first = _store->GetStoreConfiguration();
    std::auto_ptr<StoreConfiguration> const second = _store->GetStoreConfiguration();
    EXPECT_NE(first.get(), second.get());
    _store.reset();
    EXPECT_EQ("CN=NODE", dynamic_cast<ActiveDirectoryStoreConfiguration&>(*first).machineAccountDN);
}

TEST_F(ActiveDirectoryStoreAnswersTest, TrustedDomainsThatThrowReachTheWaiterAsAnInternalError) {
    for (ScriptedAct const failure : Throws) {
        Let(ScriptedTrustedDomains, failure);
        EXPECT_THROW(_store->GetTrustedDomains(), InternalErrorException) << failure;
        EXPECT_EQ(std::string("InternalErrorException: ") + InternalError,
                  Host::FailureOf([&] { _store->GetTrustedDomains(); }))
            << failure;
    }
    Let(ScriptedTrustedDomains, ScriptedAnswers);
    EXPECT_EQ(1U, _store->GetTrustedDomains().size());
}

TEST_F(ActiveDirectoryStoreAnswersTest, TrustedDomainsThatFailReachTheWaiterAsTheirOwnClass) {
    Let(ScriptedTrustedDomains, ScriptedFails);
    EXPECT_THROW(_store->GetTrustedDomains(), NoSuchDomainException);
    Change([](Scripted& it) { it.code = 86; });
    EXPECT_THROW(_store->GetTrustedDomains(), InvalidPasswordException);
    Change([](Scripted& it) { it.code = -1; });
    EXPECT_THROW(_store->GetTrustedDomains(), UnknownException);
}

TEST_F(ActiveDirectoryStoreAnswersTest, TrustedDomainsWhoseCodeSaysNotImplementedAreEmpty) {
    EXPECT_EQ(1U, _store->GetTrustedDomains().size());
    Let(ScriptedTrustedDomains, ScriptedFails);
    Change([](Scripted& it) { it.code = TSLAUTH_PROVIDER_CALL_NOT_IMPLEMENTED; });
    EXPECT_THAT(_store->GetTrustedDomains(), IsEmpty()) << "the empty list replaces the old one";
}

TEST_F(ActiveDirectoryStoreAnswersTest, TrustStateIsWhatTheProviderSaysWhateverItIs) {
    for (int const value : {0, 7, -1, 1 << 30, std::numeric_limits<int>::min()}) {
        Change([&](Scripted& it) { it.value = value; });
        EXPECT_EQ(value, _store->GetDomainTrustState());
    }
}

TEST_F(ActiveDirectoryStoreAnswersTest, TrustStateThatThrowsReachesTheWaiterAsAnInternalError) {
    for (ScriptedAct const failure : Throws) {
        Let(ScriptedTrustState, failure);
        EXPECT_THROW(_store->GetDomainTrustState(), InternalErrorException) << failure;
    }
    Let(ScriptedTrustState, ScriptedAnswers);
    EXPECT_EQ(42, _store->GetDomainTrustState());
    EXPECT_THAT(_log.Messages(), IsEmpty());
}

TEST_F(ActiveDirectoryStoreAnswersTest, TrustStateAsksForTheTrustedDomainsFirst) {
    EXPECT_EQ(42, _store->GetDomainTrustState());
    EXPECT_THAT(Calls(), ElementsAre(ScriptedTrustedDomains, ScriptedTrustState));
}

TEST_F(ActiveDirectoryStoreAnswersTest, TrustStateIsSevenWhereNothingTellsTheTrustedDomains) {
    Let(ScriptedTrustedDomains, ScriptedFails);
    Change([](Scripted& it) { it.code = 2; });
    EXPECT_EQ(7, _store->GetDomainTrustState());
    EXPECT_THAT(Calls(), ElementsAre(ScriptedTrustedDomains));
    EXPECT_THAT(_log.Messages(), IsEmpty());
}

TEST_F(ActiveDirectoryStoreAnswersTest, TrustStateCarriesOnAfterAnyOtherFailureAndLogsIt) {
    Let(ScriptedTrustedDomains, ScriptedThrowsNumber);
    EXPECT_EQ(42, _store->GetDomainTrustState());
    Let(ScriptedTrustedDomains, ScriptedFails);
    Change([](Scripted& it) { it.code = 5; });
    EXPECT_EQ(42, _store->GetDomainTrustState());
    std::string const start = "GetDomainTrustState: Call to GetTrustedDomains() failed: ";
    EXPECT_THAT(_log.Messages(),
                ElementsAre(SystemLog::Warning(start + InternalError),
                            SystemLog::Warning(start + "Exception 0x00000005: Access is denied.")));
}

TEST_F(ActiveDirectoryStoreAnswersTest, QuestionsThatTheProviderLacksHaveANeutralAnswer) {
    Host::Write(Paths::ProviderConfiguration, "provider = \"null-entries\"\n");
    ActiveDirectoryStore store(60);
    EXPECT_THAT(store.GetTrustedDomains(), IsEmpty());
    EXPECT_EQ(0, store.GetDomainTrustState());
    EXPECT_EQ(0, store.GetDomainTrustRelationship("corp.example"));
    EXPECT_EQ("", store.GetHostPrincipalForDomain("corp.example"));
    EXPECT_EQ("", store.GetDomainControllerForDomain("corp.example"));
    EXPECT_EQ("CORP\\user", store.ConvertCanonicalUsername("CORP\\user"));
    EXPECT_EQ("DNS Name: (unset), NetBIOS Name: (unset)",
              string_cast(ConfigurationOf(store).activeDomain));
    EXPECT_THAT(_log.Messages(), IsEmpty());
    EXPECT_NO_THROW(store.SetPreferredDomainControllers({"dc1"}));
    EXPECT_THAT(_log.Messages(),
                ElementsAre(SystemLog::Warning(
                    "Setting of preferred domain controllers is not implemented.")));
}

// --- the five direct questions -------------------------------------------------------------------

TEST_F(ActiveDirectoryStoreAnswersTest, DirectQuestionsAreAskedOnTheCallersThread) {
    EXPECT_EQ(42, _store->GetDomainTrustRelationship("a.example"));
    EXPECT_TRUE(WasAskedOnThisThread());
    EXPECT_EQ("a.example, (null)", Arguments());
    EXPECT_EQ("host/node@CORP.EXAMPLE", _store->GetHostPrincipalForDomain("b.example"));
    EXPECT_TRUE(WasAskedOnThisThread());
    EXPECT_EQ("b.example, (null)", Arguments());
    EXPECT_EQ("dc3.corp.example", _store->GetDomainControllerForDomain("c.example"));
    EXPECT_TRUE(WasAskedOnThisThread());
    EXPECT_EQ("(null), c.example", Arguments()) << "the first argument is left open";
    EXPECT_EQ("CORP\\converted", _store->ConvertCanonicalUsername("user@d.example"));
    EXPECT_TRUE(WasAskedOnThisThread());
    EXPECT_EQ("user@d.example, (null)", Arguments());
    _store->SetPreferredDomainControllers({"dc1", "dc2"});
    EXPECT_TRUE(WasAskedOnThisThread());
    EXPECT_EQ("dc1, dc2", Arguments());
    _store->SetPreferredDomainControllers({});
    EXPECT_EQ("(null), (null)", Arguments());
}

TEST_F(ActiveDirectoryStoreAnswersTest, FailuresOfDirectQuestionsPropagate) {
    for (ScriptedEntry const entry :
         {ScriptedHostPrincipal, ScriptedAnyDomainController, ScriptedCanonicalUsername,
          ScriptedSetPreferredDomainControllers}) {
        Let(entry, ScriptedFails);
    }
    EXPECT_THROW(_store->GetHostPrincipalForDomain(""), NoSuchDomainException);
    EXPECT_THROW(_store->GetDomainControllerForDomain(""), NoSuchDomainException);
    EXPECT_THROW(_store->ConvertCanonicalUsername(""), NoSuchDomainException);
    EXPECT_THROW(_store->SetPreferredDomainControllers({}), NoSuchDomainException);
    EXPECT_THAT(_log.Messages(), IsEmpty());
}

TEST_F(ActiveDirectoryStoreAnswersTest, WhatDirectQuestionsThrowPropagates) {
    for (ScriptedEntry const entry :
         {ScriptedTrustRelationship, ScriptedHostPrincipal, ScriptedAnyDomainController,
          ScriptedCanonicalUsername, ScriptedSetPreferredDomainControllers}) {
        Let(entry, ScriptedThrowsStandard);
    }
    EXPECT_THROW(_store->GetDomainTrustRelationship(""), std::runtime_error);
    EXPECT_THROW(_store->GetHostPrincipalForDomain(""), std::runtime_error);
    EXPECT_THROW(_store->GetDomainControllerForDomain(""), std::runtime_error);
    EXPECT_THROW(_store->ConvertCanonicalUsername(""), std::runtime_error);
    EXPECT_THROW(_store->SetPreferredDomainControllers({}), std::runtime_error);
}

TEST_F(ActiveDirectoryStoreAnswersTest, DirectQuestionsWhoseCodeSaysNotImplementedAreNeutral) {
    Change([](Scripted& it) {
        it.code = TSLAUTH_PROVIDER_CALL_NOT_IMPLEMENTED;
        for (auto& act : it.acts) {
            act = ScriptedFails;
        }
    });
    EXPECT_EQ("", _store->GetHostPrincipalForDomain("corp.example"));
    EXPECT_EQ("", _store->GetDomainControllerForDomain("corp.example"));
    EXPECT_EQ("CORP\\user", _store->ConvertCanonicalUsername("CORP\\user"));
    EXPECT_NO_THROW(_store->SetPreferredDomainControllers({"dc1"}));
    EXPECT_EQ(1U, _log.Messages().size());
}

TSLAUTH_AUTO_PTR_END
