// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <csignal>

namespace tessel::base {

/// Keeps every signal from the calling thread, and so from the threads and processes that it makes
/// meanwhile: a host's handlers belong to the host's own threads, and must not run in a child that
/// shares its memory's contents.
class SignalsBlocked {
public:
    SignalsBlocked() {
        sigset_t all;
        (void)sigfillset(&all); // none of these can fail with arguments that are valid
        (void)pthread_sigmask(SIG_SETMASK, &all, &_before);
    }
    SignalsBlocked(SignalsBlocked const&) = delete;
    SignalsBlocked& operator=(SignalsBlocked const&) = delete;
    ~SignalsBlocked() {
        (void)pthread_sigmask(SIG_SETMASK, &_before, nullptr);
    }

private:
    sigset_t _before{};
};

} // namespace tessel::base
