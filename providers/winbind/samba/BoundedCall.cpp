// SPDX-License-Identifier: Apache-2.0
#include "samba/BoundedCall.h"

#include "Failure.h"

#include <tslauth/Exception.h>
#include <tslauth/TslauthThreadUtil.h>

#include <base/SignalsBlocked.h>
#include <condition_variable>
#include <exception>
#include <mutex>
#include <new>
#include <pthread.h>
#include <utility>

namespace tessel::winbind {

namespace {

/// The threads of this process. Nothing here is ever destroyed: an abandoned call may end while the
/// process exits.
struct Threads {
    std::mutex lock;                 // guards the numbers, and the members of every call
    std::condition_variable changed; // one of the numbers
    unsigned running = 0;
    unsigned abandoned = 0; // of those running
};

extern "C" void LockThreads();
extern "C" void UnlockThreads();
extern "C" void ForgetThreads();

/// Made when the library is loaded: a thread that made it in its first call could be met by a fork,
/// and the child would wait for it for ever.
Threads& threads = []() -> Threads& {
    (void)pthread_atfork(&LockThreads, &UnlockThreads, &ForgetThreads); // without memory: as is
    return *std::make_unique<Threads>().release();
}();

extern "C" void LockThreads() {
    threads.lock.lock();
}

extern "C" void UnlockThreads() {
    threads.lock.unlock();
}

/// In a child, which has none of its parent's threads, and where this one holds the lock.
extern "C" void ForgetThreads() {
    threads.running = 0;
    threads.abandoned = 0;
    new (&threads.changed) std::condition_variable; // nobody waits for the old one any more
    threads.lock.unlock();
}

/// One call, owned by its caller and by its thread.
struct Call {
    std::function<void()> function;
    std::condition_variable ended;
    bool hasEnded = false;
    bool isAbandoned = false;
    std::exception_ptr failure;
};

void RunCall(std::shared_ptr<Call> call) {
    std::exception_ptr failure;
    try {
        call->function();
    } catch (...) {
        failure = std::current_exception();
    }
    // What it holds goes before its caller is told, who may be waiting to see that gone.
    call->function = nullptr;

    std::lock_guard<std::mutex> const guard(threads.lock);
    call->failure = std::move(failure);
    call->hasEnded = true;
    call->ended.notify_all();
    --threads.running;
    if (call->isAbandoned) {
        --threads.abandoned;
    }
    threads.changed.notify_all();
}

Failure TimedOut(std::string const& what) {
    return {TSLAUTH_PROVIDER_TIMED_OUT, what + ": no answer in time"};
}

} // namespace

void BoundedCall::Wait(std::string const& what, Clock::time_point deadline,
                       std::function<void()> function) {
    auto const call = std::make_shared<Call>();
    call->function = std::move(function);

    std::unique_lock<std::mutex> lock(threads.lock);
    if (Clock::now() >= deadline) {
        throw TimedOut(what);
    }
    while (threads.running >= MaximumThreads) {
        if (threads.abandoned >= MaximumThreads) {
            throw Failure(TSLAUTH_PROVIDER_TIMED_OUT,
                          what + ": all of " + std::to_string(MaximumThreads) +
                              " earlier questions still wait for an answer");
        }
        if (threads.changed.wait_until(lock, deadline) == std::cv_status::timeout &&
            threads.running >= MaximumThreads) {
            throw TimedOut(what);
        }
    }
    ++threads.running;
    lock.unlock();
    try {
        // Also for libwbclient, which takes an interrupted wait for a winbindd that is gone.
        base::SignalsBlocked const blocked;
        authentication::TslauthThreadUtil::ScheduleThread([call] { RunCall(call); });
    } catch (std::exception const& e) {
        lock.lock();
        --threads.running;
        threads.changed.notify_all();
        throw Failure(TSLAUTH_PROVIDER_NOT_ENOUGH_MEMORY, what + ": " + e.what());
    }

    lock.lock();
    if (!call->ended.wait_until(lock, deadline, [&] { return call->hasEnded; })) {
        call->isAbandoned = true;
        ++threads.abandoned;
        threads.changed.notify_all();
        throw TimedOut(what);
    }
    // Its only owner from now on: the thread may still be about to let go of the call.
    std::exception_ptr const failure = std::exchange(call->failure, nullptr);
    lock.unlock();
    if (failure) {
        std::rethrow_exception(failure);
    }
}

unsigned BoundedCall::Abandoned() {
    std::lock_guard<std::mutex> const guard(threads.lock);
    return threads.abandoned;
}

} // namespace tessel::winbind
