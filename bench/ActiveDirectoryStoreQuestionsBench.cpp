// SPDX-License-Identifier: Apache-2.0
#include "Cases.h"
#include "Host.h"

#include <tslauth/ActiveDirectoryStore.h>

#include <chrono>
#include <ctime>
#include <deque>
#include <dlfcn.h>
#include <memory>
#include <pthread.h>
#include <stdexcept>
#include <string>
#include <sys/time.h>
#include <thread>
#include <vector>

namespace bench {

namespace {

using tessel::authentication::ActiveDirectoryStore;
using tessel::authentication::Domain;

/// What the provider of this folder answers.
std::deque<Domain> Answer() {
    std::deque<Domain> domains;
    for (char const* const name : {"ONE", "TWO", "THREE", "FOUR"}) {
        domains.emplace_back("a-trusted-domain.corp.example.com", name);
    }
    return domains;
}

/// While it lives, the provider does not answer for the trusted domains.
class HangingProvider {
public:
    HangingProvider() : _library(::dlopen("/usr/libexec/tslauth/libbench.so", RTLD_LAZY)) {
        void* const symbol = _library == nullptr ? nullptr : ::dlsym(_library, "benchHangs");
        if (symbol == nullptr) {
            throw std::runtime_error("no provider to hang");
        }
        _hangs = static_cast<int*>(symbol);
        Set(1);
    }
    HangingProvider(HangingProvider const&) = delete;
    HangingProvider& operator=(HangingProvider const&) = delete;
    ~HangingProvider() {
        LetThrough();
        ::dlclose(_library);
    }

    /// Lets its callers go, and hangs again for the next.
    void Renew() {
        LetThrough();
        Set(1);
    }

private:
    void LetThrough() {
        Set(0);
        // It looks every millisecond; then its worker ends.
        std::this_thread::sleep_for(std::chrono::milliseconds(20));
    }
    void Set(int hangs) {
        __atomic_store_n(_hangs, hangs, __ATOMIC_RELEASE);
    }

    void* _library;
    int* _hangs;
};

/// A timed question written out by hand: one worker at a time, a cache for everybody else.
struct ByHand {
    pthread_mutex_t lock = PTHREAD_MUTEX_INITIALIZER;
    bool active = false;
    std::deque<Domain> cache;

    struct Request {
        ByHand* question;
        pthread_mutex_t mutex = PTHREAD_MUTEX_INITIALIZER;
        pthread_cond_t condition = PTHREAD_COND_INITIALIZER;
        bool done = false;
    };

    static void* Work(void* argument) {
        std::unique_ptr<std::shared_ptr<Request>> const request(
            static_cast<std::shared_ptr<Request>*>(argument));
        Request& it = **request;
        std::deque<Domain> answer = Answer();
        pthread_mutex_lock(&it.question->lock);
        it.question->cache.swap(answer);
        it.question->active = false;
        pthread_mutex_unlock(&it.question->lock);
        pthread_mutex_lock(&it.mutex);
        it.done = true;
        pthread_cond_signal(&it.condition);
        pthread_mutex_unlock(&it.mutex);
        return nullptr;
    }

    std::deque<Domain> Ask() {
        pthread_mutex_lock(&lock);
        bool const claimed = !active;
        active = true;
        pthread_mutex_unlock(&lock);
        if (claimed) {
            auto const request = std::make_shared<Request>();
            request->question = this;
            auto held = std::make_unique<std::shared_ptr<Request>>(request);
            pthread_t thread;
            if (pthread_create(&thread, nullptr, Work, held.get()) != 0) {
                throw std::runtime_error("no thread");
            }
            (void)held.release(); // the thread's now
            pthread_detach(thread);
            WaitUntil(request->mutex, request->condition, request->done, 60);
        }
        pthread_mutex_lock(&lock);
        std::deque<Domain> answer = cache;
        pthread_mutex_unlock(&lock);
        return answer;
    }

    static void WaitUntil(pthread_mutex_t& mutex, pthread_cond_t& condition, bool const& done,
                          int seconds) {
        timeval now;
        ::gettimeofday(&now, nullptr);
        timespec const deadline = {now.tv_sec + seconds, now.tv_usec * 1000};
        pthread_mutex_lock(&mutex);
        while (!done && pthread_cond_timedwait(&condition, &mutex, &deadline) == 0) {
        }
        pthread_mutex_unlock(&mutex);
    }
};

/// `count` callers that each ask many times between two meetings, so that the meetings cost
/// nothing.
template <typename Ask> void MeasureCallers(benchmark::State& state, unsigned count, Ask ask) {
    if (count == 1) {
        Measure(state, ask);
        return;
    }
    constexpr unsigned Questions = 1024;
    pthread_barrier_t start, end;
    pthread_barrier_init(&start, nullptr, count + 1);
    pthread_barrier_init(&end, nullptr, count + 1);
    bool over = false; // read behind the barrier
    std::vector<std::thread> callers;
    for (unsigned caller = 0; caller < count; ++caller) {
        callers.emplace_back([&] {
            for (;;) {
                pthread_barrier_wait(&start);
                if (over) {
                    return;
                }
                for (unsigned question = 0; question < Questions / count; ++question) {
                    ask();
                }
                pthread_barrier_wait(&end);
            }
        });
    }
    Measure(state, [&] {
        pthread_barrier_wait(&start);
        pthread_barrier_wait(&end);
    });
    over = true;
    pthread_barrier_wait(&start);
    for (auto& caller : callers) {
        caller.join();
    }
    pthread_barrier_destroy(&start);
    pthread_barrier_destroy(&end);
}

Body Asked(unsigned callers) {
    return [=](benchmark::State& state) {
        Host::ConfigureProvider();
        ActiveDirectoryStore const store(60);
        if (store.GetTrustedDomains() != Answer()) {
            throw std::runtime_error("not what is answered by hand");
        }
        MeasureCallers(state, callers,
                       [&] { benchmark::DoNotOptimize(store.GetTrustedDomains()); });
    };
}

Body AskedByHand(unsigned callers) {
    return [=](benchmark::State& state) {
        ByHand question;
        MeasureCallers(state, callers, [&] { benchmark::DoNotOptimize(question.Ask()); });
        // Its last worker may still hold the lock.
        std::this_thread::sleep_for(std::chrono::milliseconds(20));
    };
}

void AskedOfAHangingProvider(benchmark::State& state) {
    Host::ConfigureProvider();
    ActiveDirectoryStore const store(1);
    HangingProvider provider;
    MeasureEach(
        state, [&] { provider.Renew(); },
        [&] { benchmark::DoNotOptimize(store.GetTrustedDomains()); });
}

void WaitOfASecond(benchmark::State& state) {
    pthread_mutex_t mutex = PTHREAD_MUTEX_INITIALIZER;
    pthread_cond_t condition = PTHREAD_COND_INITIALIZER;
    bool const never = false;
    MeasureEach(
        state, [] {}, [&] { ByHand::WaitUntil(mutex, condition, never, 1); });
}

void AskedWhileAWorkerRuns(benchmark::State& state) {
    Host::ConfigureProvider();
    ActiveDirectoryStore const store(60);
    if (store.GetTrustedDomains() != Answer()) {
        throw std::runtime_error("not what is copied by hand");
    }
    HangingProvider const provider;
    ActiveDirectoryStore(0).GetTrustedDomains();
    Measure(state, [&] { benchmark::DoNotOptimize(store.GetTrustedDomains()); });
}

void Copied(benchmark::State& state) {
    std::deque<Domain> const domains = Answer();
    Measure(state, [&] {
        std::deque<Domain> copy = domains;
        benchmark::DoNotOptimize(copy);
    });
}

} // namespace

void AddActiveDirectoryStoreQuestionsCases(Table& table) {
    table.Add("timed question, 1 caller", {Bar::Of::Ratio, 1.15}, Clock::Wall, 15,
              {{"ours", Asked(1)}, {"floor", AskedByHand(1)}});
    for (unsigned const callers : {8U, 64U}) {
        table.Add("1024 timed questions, " + std::to_string(callers) + " callers",
                  {Bar::Of::Ratio, 1.15}, Clock::Wall, 15,
                  {{"ours", Asked(callers)}, {"floor", AskedByHand(callers)}});
    }
    table.Add("provider that hangs, limit 1 s", {Bar::Of::Overhead, 1e6}, Clock::Wall, 3,
              {{"ours", AskedOfAHangingProvider, true}, {"wait", WaitOfASecond, true}});
    table.Add("answer from the cache", {Bar::Of::Overhead, 200}, Clock::Processor, 15,
              {{"ours", AskedWhileAWorkerRuns}, {"copy", Copied}});
}

} // namespace bench
