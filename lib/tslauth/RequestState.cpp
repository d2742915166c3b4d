// SPDX-License-Identifier: Apache-2.0
#include <tslauth/RequestState.h>

#include "MutexLock.h"
#include "ThreadError.h"
#include "ThrowMappedException.h"

#include <cerrno>
#include <limits>
#include <sys/time.h>
#include <utility>

namespace tessel::authentication {

namespace {

/// Now + `seconds`, held within what the clock can count.
timespec DeadlineIn(int seconds) {
    timeval now;
    (void)gettimeofday(&now, nullptr); // cannot fail with a valid address
    timespec deadline;
    if (__builtin_add_overflow(now.tv_sec, seconds, &deadline.tv_sec)) {
        deadline.tv_sec = std::numeric_limits<time_t>::max();
    }
    if (deadline.tv_sec < 0) {
        deadline.tv_sec = 0;
    }
    deadline.tv_nsec = static_cast<long>(now.tv_usec) * 1000;
    return deadline;
}

} // namespace

RequestState::RequestState() : _done(false), _failureLost(false) {
    // With default attributes neither can fail: both are memory that is filled in.
    (void)pthread_mutex_init(&_mutex, nullptr);
    (void)pthread_cond_init(&_condition, nullptr);
}

RequestState::~RequestState() {
    pthread_mutex_destroy(&_mutex);
    pthread_cond_destroy(&_condition);
}

void RequestState::Done(Exception const* failure) noexcept {
    MutexLock const lock(_mutex);
    _done = true;
    if (failure) {
        try {
            std::unique_ptr<Exception> clone(failure->Clone());
            if (clone == _failure) {
                (void)clone.release(); // one that clones itself to what is kept already
            } else {
                _failure = std::move(clone);
            }
        } catch (...) {
            _failureLost = true;
        }
    }
    pthread_cond_signal(&_condition);
}

void RequestState::WaitResult(int timeoutSeconds) {
    timespec const deadline = DeadlineIn(timeoutSeconds);
    int error = 0;
    Exception const* failure = nullptr;
    bool failureLost = false;
    {
        MutexLock const lock(_mutex);
        while (!_done && error == 0) {
            error = pthread_cond_timedwait(&_condition, &_mutex, &deadline);
        }
        failure = _failure.get();
        failureLost = _failureLost;
    }
    // Nothing is thrown under the mutex: the code of a failure's own class may come back here.
    if (error == ETIMEDOUT) {
        throw ProviderCallTimedOutException("Provider call timed out.");
    }
    if (error != 0) {
        ThrowThreadError("pthread_cond_timedwait failed. RC=", error);
    }
    if (failure) {
        failure->Throw();
    }
    if (failureLost) {
        ThrowMappedException(TSLAUTH_PROVIDER_INTERNAL_ERROR);
    }
}

} // namespace tessel::authentication
