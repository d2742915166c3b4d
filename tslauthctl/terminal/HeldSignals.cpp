// SPDX-License-Identifier: Apache-2.0
#include "terminal/HeldSignals.h"

#include <csignal>
#include <initializer_list>

namespace tessel::tslauthctl {

namespace {

sigset_t EndingSignals() noexcept {
    sigset_t signals;
    sigemptyset(&signals);
    for (int const signal : {SIGINT, SIGTERM, SIGHUP}) {
        sigaddset(&signals, signal);
    }
    return signals;
}

/// What was held before.
sigset_t held;
bool holds = false;

} // namespace

void HoldSignals() noexcept {
    if (!holds) {
        auto const signals = EndingSignals();
        holds = pthread_sigmask(SIG_BLOCK, &signals, &held) == 0;
    }
}

void LetSignalsThrough() noexcept {
    if (holds) {
        holds = false;
        // It was the mask before, so it can be again.
        (void)pthread_sigmask(SIG_SETMASK, &held, nullptr);
    }
}

} // namespace tessel::tslauthctl
