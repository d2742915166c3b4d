// SPDX-License-Identifier: Apache-2.0
#include <tslauth/TslauthThreadUtil.h>

#include "ThreadError.h"

#include <memory>
#include <pthread.h>

namespace tessel::authentication {

namespace {

typedef boost::function<void()> Call;

extern "C" void* RunScheduledCall(void* argument) {
    std::unique_ptr<Call> const call(static_cast<Call*>(argument));
    (*call)();
    return nullptr;
}

} // namespace

void TslauthThreadUtil::ScheduleThread(Call call) {
    auto copy = std::make_unique<Call>(call);
    // The caller's objects must not live as long as this frame only because its argument does.
    call.clear();
    pthread_t thread;
    if (int const error = pthread_create(&thread, nullptr, &RunScheduledCall, copy.get())) {
        copy.reset();
        ThrowThreadError("pthread_create failed. RC=", error);
    }
    (void)copy.release();         // the thread's now
    (void)pthread_detach(thread); // cannot fail: the thread is ours, and joinable until now
}

} // namespace tessel::authentication
