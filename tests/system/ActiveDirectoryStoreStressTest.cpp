// SPDX-License-Identifier: Apache-2.0
#include "Host.h"
#include "LoadedProvider.h"
#include "SystemLog.h"
#include "providers/Erratic.h"

#include <tslauth/ActiveDirectoryStore.h>
#include <tslauth/Exceptions.h>

#include <atomic>
#include <chrono>
#include <cstdlib>
#include <dirent.h>
#include <filesystem>
#include <malloc.h>
#include <memory>
#include <new>
#include <random>
#include <string>
#include <system_error>
#include <thread>
#include <vector>

TSLAUTH_AUTO_PTR_BEGIN

using namespace tessel::authentication;

// The sanitizers bring a `new` of their own, and look for leaks themselves.
#if defined(__SANITIZE_ADDRESS__) || defined(__SANITIZE_THREAD__)
#define COUNTS_MEMORY 0
#elif defined(__has_feature)
#if __has_feature(address_sanitizer) || __has_feature(thread_sanitizer)
#define COUNTS_MEMORY 0
#endif
#endif
#ifndef COUNTS_MEMORY
#define COUNTS_MEMORY 1
#endif

#if COUNTS_MEMORY

namespace {

/// What `new` has handed out and not got back: the library's and the test's own.
std::atomic<long> allocations{0};

void* Allocate(std::size_t size) {
    void* const memory = std::malloc(size != 0 ? size : 1);
    if (memory == nullptr) {
        throw std::bad_alloc();
    }
    allocations.fetch_add(1, std::memory_order_relaxed);
    return memory;
}

void Release(void* memory) noexcept {
    if (memory != nullptr) {
        allocations.fetch_sub(1, std::memory_order_relaxed);
    }
    std::free(memory);
}

} // namespace

void* operator new(std::size_t size) {
    return Allocate(size);
}
void* operator new[](std::size_t size) {
    return Allocate(size);
}
void operator delete(void* memory) noexcept {
    Release(memory);
}
void operator delete[](void* memory) noexcept {
    Release(memory);
}
void operator delete(void* memory, std::size_t /*size*/) noexcept {
    Release(memory);
}
void operator delete[](void* memory, std::size_t /*size*/) noexcept {
    Release(memory);
}

#endif

namespace {

constexpr unsigned Callers = 16;
constexpr unsigned QueriesOfACaller = 6250;
static_assert(Callers * QueriesOfACaller == 100000);

/// What the callers have seen, together.
struct Tally {
    std::atomic<unsigned> answers{0};
    std::atomic<unsigned> failures{0};
    std::atomic<unsigned> surprises{0};
};

/// An answer is empty, where nothing is cached yet, or whole.
bool IsWhole(std::deque<Domain> const& domains) {
    Domain const other("another-domain-that-needs-memory.example", "OTHER");
    return domains.empty() || (domains.size() == 2 && domains[0] == other && domains[1] == other);
}

bool IsWhole(ActiveDirectoryStoreConfiguration const& configuration) {
    std::string const& name = configuration.activeDomain.DNSName();
    std::size_t const controllers = configuration.preferredDomainControllers.size();
    std::string const& account = configuration.machineAccountDN;
    // Each field may have failed by itself.
    return (name.empty() || name == "a-domain-name-that-needs-memory.corp.example") &&
           (controllers == 0 || controllers == 2) &&
           (account.empty() || account == "CN=NODE,OU=Hosts,DC=corp,DC=example");
}

/// Asks `store` a question, and tells whether the answer was one that may be given.
bool Ask(ActiveDirectoryStore const& store, ErraticQuestion question) {
    switch (question) {
    case ErraticStoreConfiguration: {
        std::auto_ptr<StoreConfiguration> const configuration = store.GetStoreConfiguration();
        return IsWhole(dynamic_cast<ActiveDirectoryStoreConfiguration&>(*configuration));
    }
    case ErraticTrustedDomains:
        return IsWhole(store.GetTrustedDomains());
    case ErraticTrustState: {
        int const state = store.GetDomainTrustState();
        return state == 0 || state == 7 || state == 42;
    }
    case ErraticQuestions:
        break;
    }
    return false;
}

/// The store that the provider itself asks: a worker of the same question runs, so that the answer
/// comes from the cache. Were a lock held across the provider's call, it would never come.
ActiveDirectoryStore const* storeOfTheProvider = nullptr;

void AskFromInside(ErraticQuestion question) {
    // The trust state would start a worker for the trusted domains, and wait for it.
    if (question != ErraticTrustState) {
        (void)Ask(*storeOfTheProvider, question); // that it returns is what counts
    }
}

void CallMany(unsigned number, unsigned queries, Tally& tally) {
    std::minstd_rand random(number + 1);
    std::unique_ptr<ActiveDirectoryStore> store;
    for (unsigned query = 0; query < queries; ++query) {
        if (!store || random() % 16 == 0) {
            // The old one goes, whether a worker of its runs or not. Most are in a hurry.
            store = std::make_unique<ActiveDirectoryStore>(random() % 4 == 0 ? 60 : 0);
        }
        // Without a rest, nearly every query would find a worker under way.
        std::this_thread::sleep_for(std::chrono::microseconds(random() % 400));
        try {
            auto const question = static_cast<ErraticQuestion>(random() % ErraticQuestions);
            ++(Ask(*store, question) ? tally.answers : tally.surprises);
        } catch (FileNotFoundException const&) {
            ++tally.failures;
        } catch (NoSuchDomainException const&) {
            ++tally.failures;
        } catch (...) {
            ++tally.surprises;
        }
    }
}

void CallManyFromManyThreads(unsigned queries, Tally& tally) {
    std::vector<std::thread> callers;
    for (unsigned caller = 0; caller < Callers; ++caller) {
        callers.emplace_back([&, caller] { CallMany(caller, queries, tally); });
    }
    for (auto& caller : callers) {
        caller.join();
    }
}

std::size_t EntriesOf(char const* path) {
    DIR* const folder = opendir(path);
    std::size_t count = 0;
    while (readdir(folder) != nullptr) {
        ++count;
    }
    closedir(folder);
    return count;
}

/// What is open, for whoever finds more than there should be.
std::string Descriptors() {
    std::string descriptors;
    for (auto const& entry : std::filesystem::directory_iterator("/proc/self/fd")) {
        std::error_code closed; // of the folder itself
        descriptors += std::filesystem::read_symlink(entry.path(), closed).string() + "\n";
    }
    return descriptors;
}

/// What must be the same before and after.
struct Resources {
    std::size_t threads = EntriesOf("/proc/self/task");
    std::size_t descriptors = EntriesOf("/proc/self/fd");
#if COUNTS_MEMORY
    long memory = allocations;
#endif
};

void AwaitEndOfWorkers(std::size_t threads) {
    for (int i = 0; i < 3000 && EntriesOf("/proc/self/task") != threads; ++i) {
        std::this_thread::sleep_for(std::chrono::milliseconds(10));
    }
}

} // namespace

using ActiveDirectoryStoreStressTest = Host::Test;

TEST_F(ActiveDirectoryStoreStressTest, HundredThousandQueriesKeepEveryPromise) {
    Host::Write(Paths::ProviderConfiguration, "provider = \"erratic\"\n");
    SystemLog::MakePrivateDevices(); // where there is no system log to fill
    Erratic counts = {};
    Tally tally;
    // What is made once a process is made before anything is counted; the thread sanitizer has a
    // thread of its own from the first one on.
    std::thread([] {}).join();
    std::size_t const threads = EntriesOf("/proc/self/task");
    CallManyFromManyThreads(10, tally);
    AwaitEndOfWorkers(threads);
    EXPECT_FALSE(LoadedProvider::IsLoaded("erratic"));

    tally.answers = tally.failures = tally.surprises = 0;
    Resources const before;
    {
        LoadedProvider const library("erratic");
        ActiveDirectoryStore const store(60);
        storeOfTheProvider = &store;
        auto& provider = library.Find<Erratic>("erratic");
        provider.callBack = AskFromInside;
        CallManyFromManyThreads(QueriesOfACaller, tally);
        AwaitEndOfWorkers(before.threads);
        pthread_mutex_lock(&provider.lock);
        counts = provider;
        pthread_mutex_unlock(&provider.lock);
    }
    Resources const after;

    EXPECT_EQ(Callers * QueriesOfACaller, tally.answers + tally.failures);
    EXPECT_EQ(0U, tally.surprises);
    // It did happen.
    EXPECT_LT(0U, tally.failures);
    EXPECT_LT(0U, counts.failures);
    EXPECT_LT(0U, counts.callBacks);
    for (unsigned question = 0; question < ErraticQuestions; ++question) {
        EXPECT_LT(1000U, counts.calls[question]) << question;
        EXPECT_EQ(1U, counts.mostInside[question]) << question;
        EXPECT_EQ(0U, counts.inside[question]) << question;
        RecordProperty("calls" + std::to_string(question), std::to_string(counts.calls[question]));
    }

    EXPECT_EQ(before.threads, after.threads);
    EXPECT_EQ(before.descriptors, after.descriptors) << Descriptors();
#if COUNTS_MEMORY
    EXPECT_EQ(before.memory, after.memory);
#endif
    EXPECT_FALSE(LoadedProvider::IsLoaded("erratic")) << "somebody still holds it";
}

TEST_F(ActiveDirectoryStoreStressTest, TenThousandStoresLeaveMemoryWhereItWas) {
    auto const makeStores = [](int count) {
        for (int i = 0; i < count; ++i) {
            ActiveDirectoryStore const store(60);
        }
    };
    makeStores(10); // the first one makes what stays
    Resources const before;
#if COUNTS_MEMORY
    struct mallinfo2 const heapBefore = mallinfo2();
#endif
    makeStores(10000);
#if COUNTS_MEMORY
    struct mallinfo2 const heapAfter = mallinfo2();
    // Also what does not come from `new`, such as the loader's.
    EXPECT_EQ(heapBefore.uordblks, heapAfter.uordblks);
#endif
    Resources const after;
    EXPECT_EQ(before.threads, after.threads);
    EXPECT_EQ(before.descriptors, after.descriptors) << Descriptors();
#if COUNTS_MEMORY
    EXPECT_EQ(before.memory, after.memory);
#endif
    EXPECT_FALSE(LoadedProvider::IsLoaded(Provider));
}

TSLAUTH_AUTO_PTR_END
