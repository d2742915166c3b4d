// SPDX-License-Identifier: Apache-2.0
#include "GatedHost.h"

#include <tslauth/Exceptions.h>

#include <atomic>
#include <cerrno>
#include <gmock/gmock.h>
#include <pthread.h>

TSLAUTH_AUTO_PTR_BEGIN

using namespace tessel::authentication;
using testing::ElementsAre;
using testing::IsEmpty;

namespace {

/// What the next pthread_create of the library answers instead of starting a thread, and how many
/// of them do so.
std::atomic<int> createError{0};
std::atomic<int> failingCreates{0};
/// What the next timed wait of the library answers instead of waiting; 0 lets it wait.
std::atomic<int> waitError{0};

} // namespace

// The linker sends the library's calls here (see CMakeLists.txt).
extern "C" {
int __real_pthread_create(pthread_t*, pthread_attr_t const*, void* (*)(void*), void*);
int __wrap_pthread_create(pthread_t* thread, pthread_attr_t const* attributes,
                          void* (*start)(void*), void* argument);
int __real_pthread_cond_timedwait(pthread_cond_t*, pthread_mutex_t*, timespec const*);
int __wrap_pthread_cond_timedwait(pthread_cond_t* condition, pthread_mutex_t* mutex,
                                  timespec const* deadline);

int __wrap_pthread_create(pthread_t* thread, pthread_attr_t const* attributes,
                          void* (*start)(void*), void* argument) {
    if (failingCreates > 0) {
        --failingCreates;
        return createError;
    }
    return __real_pthread_create(thread, attributes, start, argument);
}

int __wrap_pthread_cond_timedwait(pthread_cond_t* condition, pthread_mutex_t* mutex,
                                  timespec const* deadline) {
    int const error = waitError.exchange(0);
    return error ? error : __real_pthread_cond_timedwait(condition, mutex, deadline);
}
}

class ActiveDirectoryStoreThreadsTest : public Host::GatedTest {
protected:
    static void FailToCreate(int error, int times = 1) {
        createError = error;
        failingCreates = times;
    }
};

TEST_F(ActiveDirectoryStoreThreadsTest, ConfigurationWithoutAThreadFailsOnceAndIsAskedForAgain) {
    for (int i = 0; i < 2; ++i) {
        FailToCreate(EAGAIN);
        EXPECT_EQ("ThreadErrorException: Thread Error: ate failed. RC=",
                  Host::FailureOf([&] { ConfigurationOf(*_patient); }));
    }
    EXPECT_EQ(0U, Calls());
    EXPECT_EQ("corp.example", ConfigurationOf(*_patient).activeDomain.DNSName());
    FailToCreate(EPERM);
    EXPECT_THROW(ConfigurationOf(*_patient), ThreadErrorException);
    EXPECT_THAT(_log.Messages(), IsEmpty());
}

TEST_F(ActiveDirectoryStoreThreadsTest, StoreIsReleasedWhenItsWorkerCannotBeStarted) {
    Host::Write(Paths::ProviderConfiguration, "provider = \"plain\"\n");
    {
        Store const store(Time);
        EXPECT_TRUE(LoadedProvider::IsLoaded("plain"));
        FailToCreate(EAGAIN);
        EXPECT_THROW(store.GetStoreConfiguration(), ThreadErrorException);
    }
    EXPECT_FALSE(LoadedProvider::IsLoaded("plain"));
}

TEST_F(ActiveDirectoryStoreThreadsTest, WaitThatFailsReachesTheCallerAndTheWorkerGoesOn) {
    Close();
    waitError = EINVAL;
    EXPECT_EQ("ThreadErrorException: Thread Error:  failed. RC=",
              Host::FailureOf([&] { _patient->GetTrustedDomains(); }));
    waitError = EINVAL;
    EXPECT_EQ("ThreadErrorException: Thread Error:  failed. RC=",
              Host::FailureOf([&] { ConfigurationOf(*_patient); }));
    Await([](Gate const& it) { return it.inside == 2; });
    // Both still run: answered from the cache, without a wait that could fail.
    waitError = EINVAL;
    EXPECT_THAT(_patient->GetTrustedDomains(), IsEmpty());
    EXPECT_EQ("", ConfigurationOf(*_patient).activeDomain.DNSName());
    waitError = 0;
    EXPECT_THAT(_log.Messages(), IsEmpty());
    Open();
    AwaitEndOfWorkers();
    EXPECT_EQ(1U, _patient->GetTrustedDomains().size());
}

TEST_F(ActiveDirectoryStoreThreadsTest, TrustStateWhoseWaitsFailReportsTheSecondAndLogsTheFirst) {
    Close();
    waitError = EINVAL;
    // The first question's failed wait is logged; the second is asked with no time at all.
    EXPECT_EQ(0, _impatient->GetDomainTrustState());
    EXPECT_THAT(_log.Messages(),
                ElementsAre(SystemLog::Warning("GetDomainTrustState: Call to GetTrustedDomains() "
                                               "failed: Thread Error:  failed. RC="),
                            SystemLog::Warning(
                                "GetDomainTrustState call timedout. Returning cached value.")));
    Open();
    AwaitEndOfWorkers();
    // While the trusted domains are being asked for, only the trust state waits.
    Close();
    _impatient->GetTrustedDomains();
    waitError = EINVAL;
    EXPECT_THROW(_patient->GetDomainTrustState(), ThreadErrorException);
}

TEST_F(ActiveDirectoryStoreThreadsTest, TrustStateWithoutAThreadFailsOnceAndIsAskedForAgain) {
    // With a worker for the trusted domains under way, the trust state's is the next to be started.
    Close();
    _impatient->GetTrustedDomains();
    for (int i = 0; i < 2; ++i) {
        FailToCreate(EAGAIN);
        EXPECT_EQ("ThreadErrorException: Thread Error: ate failed. RC=",
                  Host::FailureOf([&] { _patient->GetDomainTrustState(); }));
    }
    Open();
    AwaitEndOfWorkers();
    Change([](Gate& it) { it.value = 42; });
    EXPECT_EQ(42, _patient->GetDomainTrustState());
}

// Last, since it changes this process for good. A flag that stays set cannot be cleared by a test
// either.
TEST_F(ActiveDirectoryStoreThreadsTest, TrustedDomainsWithoutAThreadAreNeverAskedForAgain) {
    Change([](Gate& it) { it.value = 42; });
    EXPECT_EQ(1U, _patient->GetTrustedDomains().size());

    // One worker for the trust state hangs.
    Close();
    Store(NoTime).GetDomainTrustState();
    Await([](Gate const& it) { return it.inside == 2; });
    unsigned const calls = Calls();
    EXPECT_EQ(0, _patient->GetDomainTrustState()) << "from the cache";
    EXPECT_EQ(calls, Calls());
    // Its other question ends, and the next one for the trusted domains finds no thread.
    Change([](Gate& it) { it.domainsOpen = 1; });
    Await([](Gate const& it) { return it.inside == 1; });
    AwaitWorkers(1);
    FailToCreate(EAGAIN);
    EXPECT_EQ("ThreadErrorException: Thread Error: ate failed. RC=",
              Host::FailureOf([&] { _patient->GetTrustedDomains(); }));
    Change([](Gate& it) { it.domainsOpen = 0; });

    // Its own flag stays set: each store shows what it has, without asking and without a log.
    _log.Forget();
    unsigned const before = Calls();
    EXPECT_EQ(1U, _patient->GetTrustedDomains().size());
    EXPECT_THAT(_impatient->GetTrustedDomains(), IsEmpty());
    EXPECT_THAT(Store(Time).GetTrustedDomains(), IsEmpty());
    EXPECT_EQ(before, Calls());
    EXPECT_THAT(_log.Messages(), IsEmpty());

    // The trust state's flag is clear: a second worker joins the one that hangs. It sets the flag
    // again, so that no third one does.
    EXPECT_EQ(0, _impatient->GetDomainTrustState());
    Await([](Gate const& it) { return it.inside == 2; });
    EXPECT_EQ(0, _impatient->GetDomainTrustState());
    EXPECT_EQ(0, _patient->GetDomainTrustState());
    EXPECT_EQ(before + 1, Calls());
    Open();
    AwaitEndOfWorkers();

    // Nothing else has changed: the other two questions are asked, the trusted domains are not.
    unsigned const after = Calls();
    EXPECT_EQ(42, _patient->GetDomainTrustState());
    EXPECT_EQ(after + 1, Calls());
    EXPECT_EQ("corp.example", ConfigurationOf(*_patient).activeDomain.DNSName());
    Change([](Gate& it) { it.code = 1355; });
    EXPECT_NO_THROW(_patient->GetTrustedDomains());
    unsigned mostInside = 0;
    Change([&](Gate& it) { mostInside = it.mostInside; });
    EXPECT_EQ(2U, mostInside);
}

TSLAUTH_AUTO_PTR_END
