// SPDX-License-Identifier: Apache-2.0
#include "ThreadError.h"

#include <tslauth/Exceptions.h>
#include <tslauth/TslauthThreadUtil.h>

#include <boost/bind/bind.hpp>
#include <boost/make_shared.hpp>
#include <boost/shared_ptr.hpp>
#include <gtest/gtest.h>

#include <atomic>
#include <cerrno>
#include <chrono>
#include <pthread.h>
#include <string>
#include <thread>
#include <unistd.h>

using namespace tessel::authentication;

namespace {

/// What the next pthread_create answers instead of starting a thread; 0 lets it through.
int pthreadCreateError = 0;

} // namespace

// The linker sends the library's calls here (see CMakeLists.txt).
extern "C" {
int __real_pthread_create(pthread_t*, pthread_attr_t const*, void* (*)(void*), void*);
int __wrap_pthread_create(pthread_t* thread, pthread_attr_t const* attributes,
                          void* (*start)(void*), void* argument);

int __wrap_pthread_create(pthread_t* thread, pthread_attr_t const* attributes,
                          void* (*start)(void*), void* argument) {
    return pthreadCreateError ? pthreadCreateError
                              : __real_pthread_create(thread, attributes, start, argument);
}
}

namespace {

void Count(boost::shared_ptr<std::atomic<int>> const& counter) {
    ++*counter;
}

void CallNothing() {
    TslauthThreadUtil::ScheduleThread(boost::function<void()>());
    pause();
}

void ThrowFromTheThread() {
    TslauthThreadUtil::ScheduleThread([] { throw 1; });
    pause();
}

template <typename Condition> bool Eventually(Condition condition) {
    for (int i = 0; i < 500 && !condition(); ++i) {
        std::this_thread::sleep_for(std::chrono::milliseconds(10));
    }
    return condition();
}

template <std::size_t Size> std::string ThreadErrorText(char const (&text)[Size], int error) {
    try {
        ThrowThreadError(text, error);
    } catch (ThreadErrorException const& failure) {
        return failure.what();
    }
}

} // namespace

TEST(TslauthThreadUtil, RunsTheCallOnceAndReleasesIt) {
    auto const counter = boost::make_shared<std::atomic<int>>(0);
    TslauthThreadUtil::ScheduleThread(boost::bind(&Count, counter));
    EXPECT_TRUE(Eventually([&] { return counter.use_count() == 1; }));
    EXPECT_EQ(1, *counter);
}

TEST(TslauthThreadUtilDeathTest, EmptyCallEndsTheProcess) {
    EXPECT_EXIT(CallNothing(), testing::KilledBySignal(SIGABRT), "call to empty boost::function");
}

TEST(TslauthThreadUtilDeathTest, ExceptionThatLeavesTheCallEndsTheProcess) {
    EXPECT_EXIT(ThrowFromTheThread(), testing::KilledBySignal(SIGABRT), "");
}

TEST(TslauthThreadUtil, ThreadThatCannotBeCreatedIsReportedAndReleasesTheCall) {
    auto const counter = boost::make_shared<std::atomic<int>>(0);
    for (int const error : {EAGAIN, EPERM, EINVAL}) {
        pthreadCreateError = error;
        try {
            TslauthThreadUtil::ScheduleThread(boost::bind(&Count, counter));
            ADD_FAILURE() << "started a thread";
        } catch (ThreadErrorException const& failure) {
            EXPECT_EQ(ThreadErrorText("pthread_create failed. RC=", error), failure.what());
        }
        EXPECT_EQ(1, counter.use_count());
    }
    pthreadCreateError = 0;
    EXPECT_EQ(0, *counter);
}

TEST(ThreadError, StartsTheTextAtTheErrorNumber) {
    EXPECT_EQ("Thread Error: ate failed. RC=",
              ThreadErrorText("pthread_create failed. RC=", EAGAIN));
    EXPECT_EQ("Thread Error:  failed. RC=",
              ThreadErrorText("pthread_cond_timedwait failed. RC=", EINVAL));
    EXPECT_EQ("Thread Error: pthread_create failed. RC=",
              ThreadErrorText("pthread_create failed. RC=", 0));
    EXPECT_EQ("Thread Error: =", ThreadErrorText("pthread_create failed. RC=", 25));
}

TEST(ThreadError, NumberBeyondTheTextLeavesNothingOfIt) {
    for (int error : {26, 27, 110, 1 << 30, -1}) {
        EXPECT_EQ("Thread Error: ", ThreadErrorText("pthread_create failed. RC=", error)) << error;
    }
}
