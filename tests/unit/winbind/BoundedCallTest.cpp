// SPDX-License-Identifier: Apache-2.0
#include "samba/BoundedCall.h"
#include "Failure.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <atomic>
#include <condition_variable>
#include <csignal>
#include <mutex>
#include <pthread.h>
#include <sys/wait.h>
#include <thread>
#include <unistd.h>
#include <vector>

using tessel::winbind::BoundedCall;
using tessel::winbind::Failure;
using namespace std::chrono_literals;

#if defined(__has_feature)
#if __has_feature(thread_sanitizer)
extern "C" char const* __tsan_default_options();
extern "C" char const* __tsan_default_options() { // a test forks with threads at work, on purpose
    return "die_after_fork=0";
}
#endif
#endif

namespace {

BoundedCall::Clock::time_point In(BoundedCall::Clock::duration time) {
    return BoundedCall::Clock::now() + time;
}

/// What calls hang on.
class Gate {
public:
    void Pass() {
        std::unique_lock<std::mutex> lock(_lock);
        _inside = std::max(_inside, ++_now);
        _changed.wait(lock, [this] { return _open; });
        --_now;
    }

    void Open() {
        std::lock_guard<std::mutex> const guard(_lock);
        _open = true;
        _changed.notify_all();
    }

    /// How many have hung at the same time.
    int MostInside() {
        std::lock_guard<std::mutex> const guard(_lock);
        return _inside;
    }

private:
    std::mutex _lock;
    std::condition_variable _changed;
    bool _open = false;
    int _now = 0;
    int _inside = 0;
};

class BoundedCallTest : public testing::Test {
protected:
    void TearDown() override {
        _gate->Open();
        while (BoundedCall::Abandoned() != 0) {
            std::this_thread::sleep_for(1ms);
        }
    }

    void Hang(BoundedCall::Clock::duration time) {
        BoundedCall::Run("a call", In(time), [gate = _gate] { gate->Pass(); });
    }

    /// The code of a call that hangs, and for how long its caller waited.
    std::pair<ActiveDirectoryClientErrorCode, BoundedCall::Clock::duration>
    OutcomeOfHanging(BoundedCall::Clock::duration time) {
        auto const start = BoundedCall::Clock::now();
        try {
            Hang(time);
        } catch (Failure const& failure) {
            return {failure.Code(), BoundedCall::Clock::now() - start};
        }
        return {TSLAUTH_PROVIDER_SUCCESS, BoundedCall::Clock::now() - start};
    }

    std::shared_ptr<Gate> _gate = std::make_shared<Gate>();
};

} // namespace

TEST_F(BoundedCallTest, AResultIsReturned) {
    EXPECT_EQ("a result that is longer than a short string",
              BoundedCall::Run("a call", In(10s), [] {
                  return std::string("a result that is longer than a short string");
              }));
}

TEST_F(BoundedCallTest, TheCallRunsOnAnotherThread) {
    EXPECT_NE(std::this_thread::get_id(),
              BoundedCall::Run("a call", In(10s), [] { return std::this_thread::get_id(); }));
}

TEST_F(BoundedCallTest, AFailureIsPassedOn) {
    try {
        BoundedCall::Run("a call", In(10s),
                         [] { throw Failure(TSLAUTH_PROVIDER_NO_SUCH_USER, "nobody"); });
        FAIL() << "nothing was thrown";
    } catch (Failure const& failure) {
        EXPECT_EQ(static_cast<ActiveDirectoryClientErrorCode>(TSLAUTH_PROVIDER_NO_SUCH_USER),
                  failure.Code());
        EXPECT_STREQ("nobody", failure.what());
    }
}

TEST_F(BoundedCallTest, AnythingElseThatIsThrownIsPassedOn) {
    EXPECT_THROW(BoundedCall::Run("a call", In(10s), [] { throw 42; }), int);
    EXPECT_THROW(BoundedCall::Run("a call", In(10s), []() -> int { throw std::bad_alloc(); }),
                 std::bad_alloc);
}

TEST_F(BoundedCallTest, ACallThatHangsIsLeftAtTheDeadline) {
    auto const [code, waited] = OutcomeOfHanging(50ms);
    EXPECT_EQ(static_cast<ActiveDirectoryClientErrorCode>(TSLAUTH_PROVIDER_TIMED_OUT), code);
    EXPECT_GE(waited, 50ms);
    EXPECT_LT(waited, 5s);
    EXPECT_EQ(1U, BoundedCall::Abandoned());
    _gate->Open();
    for (int i = 0; BoundedCall::Abandoned() != 0 && i < 5000; ++i) {
        std::this_thread::sleep_for(1ms);
    }
    EXPECT_EQ(0U, BoundedCall::Abandoned());
}

TEST_F(BoundedCallTest, ACallWhoseDeadlineHasPassedIsNotMade) {
    auto const made = std::make_shared<std::atomic<bool>>(false);
    EXPECT_THROW(BoundedCall::Run("a call", In(-1ms), [made] { *made = true; }), Failure);
    EXPECT_FALSE(*made);
    EXPECT_EQ(0U, BoundedCall::Abandoned());
}

TEST_F(BoundedCallTest, WhereEveryThreadIsAbandonedTheNextCallFailsAtOnce) {
    for (unsigned i = 0; i < BoundedCall::MaximumThreads; ++i) {
        EXPECT_THROW(Hang(1ms), Failure);
    }
    EXPECT_EQ(BoundedCall::MaximumThreads, BoundedCall::Abandoned());
    auto const [code, waited] = OutcomeOfHanging(1h);
    EXPECT_EQ(static_cast<ActiveDirectoryClientErrorCode>(TSLAUTH_PROVIDER_TIMED_OUT), code);
    EXPECT_LT(waited, 30s);
    _gate->Open();
    while (BoundedCall::Abandoned() != 0) {
        std::this_thread::sleep_for(1ms);
    }
    EXPECT_EQ(7, BoundedCall::Run("a call", In(10s), [] { return 7; }));
}

TEST_F(BoundedCallTest, ManyCallersAtOnceNeverHaveMoreThreadsThanTheMaximum) {
    std::vector<std::thread> callers;
    std::atomic<unsigned> timedOut{0};
    for (unsigned i = 0; i < 4 * BoundedCall::MaximumThreads; ++i) {
        callers.emplace_back([&] {
            timedOut += OutcomeOfHanging(300ms).first == TSLAUTH_PROVIDER_TIMED_OUT ? 1 : 0;
        });
    }
    for (std::thread& caller : callers) {
        caller.join();
    }
    EXPECT_EQ(4 * BoundedCall::MaximumThreads, timedOut);
    EXPECT_EQ(static_cast<int>(BoundedCall::MaximumThreads), _gate->MostInside());
    EXPECT_EQ(BoundedCall::MaximumThreads, BoundedCall::Abandoned());
}

TEST_F(BoundedCallTest, CallersBeyondTheMaximumWaitForTheirTurn) {
    std::vector<std::thread> callers;
    std::atomic<unsigned> sum{0};
    for (unsigned i = 0; i < 4 * BoundedCall::MaximumThreads; ++i) {
        callers.emplace_back([&sum, i] {
            sum += BoundedCall::Run("a call", In(60s), [i] {
                std::this_thread::sleep_for(2ms);
                return i;
            });
        });
    }
    for (std::thread& caller : callers) {
        caller.join();
    }
    EXPECT_EQ(2 * BoundedCall::MaximumThreads * (4 * BoundedCall::MaximumThreads - 1), sum);
    EXPECT_EQ(0U, BoundedCall::Abandoned());
}

TEST_F(BoundedCallTest, WhatACallHoldsIsGoneWhenItReturns) {
    auto const held = std::make_shared<int>(1);
    EXPECT_EQ(1, BoundedCall::Run("a call", In(10s), [held] { return *held; }));
    EXPECT_EQ(1, held.use_count());
    EXPECT_THROW(BoundedCall::Run("a call", In(10s), [held] { throw *held; }), int);
    EXPECT_EQ(1, held.use_count());
}

TEST_F(BoundedCallTest, NoSignalReachesTheThread) {
    sigset_t before;
    ASSERT_EQ(0, pthread_sigmask(SIG_SETMASK, nullptr, &before));
    sigset_t const inside = BoundedCall::Run("a call", In(10s), [] {
        sigset_t mask;
        (void)pthread_sigmask(SIG_SETMASK, nullptr, &mask); // cannot fail
        return mask;
    });
    for (int const signal : {SIGTERM, SIGINT, SIGHUP, SIGCHLD, SIGALRM, SIGUSR1}) {
        EXPECT_EQ(1, sigismember(&inside, signal)) << signal;
    }
    sigset_t after;
    ASSERT_EQ(0, pthread_sigmask(SIG_SETMASK, nullptr, &after));
    EXPECT_EQ(sigismember(&before, SIGTERM), sigismember(&after, SIGTERM));
}

TEST_F(BoundedCallTest, AChildOfTheProcessStartsWithoutThreads) {
    for (unsigned i = 0; i < BoundedCall::MaximumThreads; ++i) {
        EXPECT_THROW(Hang(1ms), Failure);
    }
    pid_t const child = fork();
    ASSERT_NE(-1, child);
    if (child == 0) {
        bool const works = BoundedCall::Abandoned() == 0 &&
                           BoundedCall::Run("a call", In(10s), [] { return 7; }) == 7;
        _exit(works ? 0 : 1);
    }
    int status = -1;
    ASSERT_EQ(child, waitpid(child, &status, 0));
    EXPECT_TRUE(WIFEXITED(status) && WEXITSTATUS(status) == 0) << status;
    EXPECT_EQ(BoundedCall::MaximumThreads, BoundedCall::Abandoned());
}

TEST_F(BoundedCallTest, AProcessExitsWhileACallHangs) {
    pid_t const child = fork();
    ASSERT_NE(-1, child);
    if (child == 0) {
        auto const gate = std::make_shared<Gate>();
        try {
            BoundedCall::Run("a call", In(1ms), [gate] { gate->Pass(); });
        } catch (Failure const&) {
            // It ends while the process does.
            std::thread([gate] { gate->Open(); }).detach();
            exit(0);
        }
        _exit(1);
    }
    int status = -1;
    ASSERT_EQ(child, waitpid(child, &status, 0));
    EXPECT_TRUE(WIFEXITED(status) && WEXITSTATUS(status) == 0) << status;
}
