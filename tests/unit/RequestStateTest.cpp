// SPDX-License-Identifier: Apache-2.0
#include <tslauth/Exceptions.h>
#include <tslauth/RequestState.h>
#include <tslauth/TslauthThreadUtil.h>

#include <boost/bind/bind.hpp>
#include <boost/make_shared.hpp>
#include <boost/shared_ptr.hpp>
#include <boost/weak_ptr.hpp>
#include <gtest/gtest.h>

#include <cerrno>
#include <chrono>
#include <deque>
#include <future>
#include <limits>
#include <memory>
#include <pthread.h>
#include <string>
#include <thread>

using namespace tessel::authentication;

namespace {

/// What the next waits answer, first to last; empty lets them through.
std::deque<int> waitResults;
int waits = 0;

} // namespace

// The linker sends the library's calls here (see CMakeLists.txt).
extern "C" {
int __real_pthread_cond_timedwait(pthread_cond_t*, pthread_mutex_t*, timespec const*);
int __wrap_pthread_cond_timedwait(pthread_cond_t* condition, pthread_mutex_t* mutex,
                                  timespec const* deadline);

int __wrap_pthread_cond_timedwait(pthread_cond_t* condition, pthread_mutex_t* mutex,
                                  timespec const* deadline) {
    ++waits;
    if (waitResults.empty()) {
        return __real_pthread_cond_timedwait(condition, mutex, deadline);
    }
    int const result = waitResults.front();
    waitResults.pop_front();
    return result;
}
}

namespace {

void FinishAfter(boost::shared_ptr<RequestState> const& state, std::chrono::milliseconds delay) {
    std::this_thread::sleep_for(delay);
    state->Done(nullptr);
}

std::string MessageOf(RequestState& state, int timeout) {
    try {
        state.WaitResult(timeout);
    } catch (Exception const& failure) {
        return failure.what();
    }
    return "";
}

} // namespace

TEST(RequestState, WaitOfZeroSecondsTimesOutAtOnce) {
    RequestState state;
    EXPECT_THROW(state.WaitResult(0), ProviderCallTimedOutException);
    EXPECT_EQ("Provider call timed out.", MessageOf(state, 0));
}

TEST(RequestState, NegativeTimeoutTimesOutAtOnce) {
    RequestState state;
    EXPECT_THROW(state.WaitResult(-1), ProviderCallTimedOutException);
    EXPECT_THROW(state.WaitResult(std::numeric_limits<int>::min()), ProviderCallTimedOutException);
}

TEST(RequestState, HugeTimeoutWaitsForTheWorker) {
    auto const state = boost::make_shared<RequestState>();
    TslauthThreadUtil::ScheduleThread(
        boost::bind(&FinishAfter, state, std::chrono::milliseconds(30)));
    EXPECT_NO_THROW(state->WaitResult(std::numeric_limits<int>::max()));
}

TEST(RequestState, DoneBeforeTheWaitReturnsAtOnce) {
    RequestState state;
    state.Done(nullptr);
    EXPECT_NO_THROW(state.WaitResult(0));
    EXPECT_NO_THROW(state.WaitResult(60));
}

TEST(RequestState, FailureIsThrownAsItsOwnClassEachTime) {
    RequestState state;
    {
        NoSuchDomainException const failure(1355, "gone");
        state.Done(&failure);
    }
    for (int i = 0; i < 2; ++i) {
        EXPECT_THROW(state.WaitResult(0), NoSuchDomainException);
        EXPECT_EQ("Exception 0x0000054b: gone", MessageOf(state, 0));
    }
}

TEST(RequestState, LaterFailureReplacesTheEarlierOne) {
    RequestState state;
    TimeSkewException const first(1398, "first");
    LogonFailureException const second(1326, "second");
    state.Done(&first);
    state.Done(&second);
    EXPECT_THROW(state.WaitResult(0), LogonFailureException);
    state.Done(nullptr);
    EXPECT_THROW(state.WaitResult(0), LogonFailureException);
}

namespace {

struct CannotBeCopied : Exception {
    CannotBeCopied() : Exception("x") {}
    Exception* Clone() const override {
        throw std::bad_alloc();
    }
};

} // namespace

constexpr char InternalError[] = "Exception 0x0000054f: An internal error occurred.";

TEST(RequestState, FailureThatCannotBeKeptIsNotTakenForSuccess) {
    RequestState state;
    CannotBeCopied const failure;
    state.Done(&failure);
    for (int i = 0; i < 2; ++i) {
        EXPECT_THROW(state.WaitResult(0), InternalErrorException);
        EXPECT_EQ(InternalError, MessageOf(state, 0));
    }
}

namespace {

/// Calls back into the state that throws it, as a class of a caller's may.
struct CallsBack : Exception {
    CallsBack(RequestState& state, bool& finished)
        : Exception("x"), _state(state), _finished(finished) {}
    Exception* Clone() const override {
        return new CallsBack(*this);
    }
    void Throw() const override {
        // From another thread, so that a mutex that is held keeps it waiting and not this test.
        auto const done = std::make_shared<std::promise<void>>();
        std::thread([done, &state = _state] {
            state.Done(nullptr);
            done->set_value();
        }).detach();
        _finished =
            done->get_future().wait_for(std::chrono::seconds(5)) == std::future_status::ready;
        throw CallsBack(*this);
    }

private:
    RequestState& _state;
    bool& _finished;
};

/// Is its own copy, and says when it goes.
struct ItsOwnClone : Exception {
    explicit ItsOwnClone(bool& gone) : Exception("x"), _gone(gone) {}
    ~ItsOwnClone() override {
        _gone = true;
    }
    Exception* Clone() const override {
        return const_cast<ItsOwnClone*>(this);
    }

private:
    bool& _gone;
};

} // namespace

TEST(RequestState, FailureIsThrownWithoutTheMutex) {
    RequestState state;
    bool finished = false;
    CallsBack const failure(state, finished);
    state.Done(&failure);
    EXPECT_THROW(state.WaitResult(0), CallsBack);
    EXPECT_TRUE(finished);
}

TEST(RequestState, FailureThatIsKeptAlreadyStaysAlive) {
    bool gone = false;
    {
        RequestState state;
        auto* const failure = new ItsOwnClone(gone); // the state's from the first call on
        state.Done(failure);
        state.Done(failure);
        EXPECT_FALSE(gone);
    }
    EXPECT_TRUE(gone);
}

TEST(RequestState, WaiterThatGivesUpLeavesTheWorkerItsState) {
    auto state = boost::make_shared<RequestState>();
    boost::weak_ptr<RequestState> const observed = state;
    TslauthThreadUtil::ScheduleThread(
        boost::bind(&FinishAfter, state, std::chrono::milliseconds(50)));
    EXPECT_THROW(state->WaitResult(0), ProviderCallTimedOutException);
    state.reset();
    EXPECT_FALSE(observed.expired());
    for (int i = 0; i < 200 && !observed.expired(); ++i) {
        std::this_thread::sleep_for(std::chrono::milliseconds(20));
    }
    EXPECT_TRUE(observed.expired());
}

TEST(RequestState, WaitThatFailsIsReportedWithWhatIsLeftOfItsText) {
    RequestState state;
    waitResults = {EINVAL};
    EXPECT_EQ("Thread Error:  failed. RC=", MessageOf(state, 60));
    waitResults = {EPERM};
    EXPECT_THROW(state.WaitResult(60), ThreadErrorException);
    // The mutex was released: the worker can still finish.
    state.Done(nullptr);
    EXPECT_NO_THROW(state.WaitResult(0));
}

TEST(RequestState, SpuriousWakeUpGoesOnWaiting) {
    RequestState state;
    waitResults = {0, 0, ETIMEDOUT};
    waits = 0;
    EXPECT_THROW(state.WaitResult(60), ProviderCallTimedOutException);
    EXPECT_EQ(3, waits);
}
