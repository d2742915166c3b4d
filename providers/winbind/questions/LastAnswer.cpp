// SPDX-License-Identifier: Apache-2.0
#include "questions/LastAnswer.h"

#include <pthread.h>

namespace tessel::winbind {

namespace {

std::mutex lock;

extern "C" void LockLastAnswers() {
    lock.lock();
}

extern "C" void UnlockLastAnswers() {
    lock.unlock();
}

/// When the library is loaded: a fork takes the lock, so that the child, which has the thread that
/// forked alone, finds it free. Without memory for it, as it is.
int const registered = pthread_atfork(&LockLastAnswers, &UnlockLastAnswers, &UnlockLastAnswers);

} // namespace

std::mutex& LastAnswerLock() {
    (void)registered; // nothing could be done without
    return lock;
}

} // namespace tessel::winbind
