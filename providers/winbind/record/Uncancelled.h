// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <pthread.h>

namespace tessel::winbind {

/// While one lives, its thread is not cancelled: a cancellation unwinds the stack, which ends the
/// process where it meets `noexcept`, and would leave a call in the middle. It comes afterwards.
class Uncancelled {
public:
    Uncancelled() noexcept {
        (void)pthread_setcancelstate(PTHREAD_CANCEL_DISABLE, &_before); // cannot fail
    }
    Uncancelled(Uncancelled const&) = delete;
    Uncancelled& operator=(Uncancelled const&) = delete;
    ~Uncancelled() {
        (void)pthread_setcancelstate(_before, nullptr); // nor this
    }

private:
    int _before = PTHREAD_CANCEL_ENABLE;
};

} // namespace tessel::winbind
