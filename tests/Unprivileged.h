// SPDX-License-Identifier: Apache-2.0
#ifndef TESTS_UNPRIVILEGED_H
#define TESTS_UNPRIVILEGED_H

#include <grp.h>
#include <stdexcept>
#include <sys/types.h>
#include <unistd.h>

/// Makes this process an ordinary user's for good, so that permissions mean something to it also
/// where the tests run as root. For child processes.
inline void BecomeUnprivileged() {
    static constexpr uid_t nobody = 65534;
    if (::geteuid() == 0 &&
        (::setgroups(0, nullptr) != 0 || ::setgid(nobody) != 0 || ::setuid(nobody) != 0)) {
        throw std::runtime_error("cannot give up root's rights");
    }
}

#endif
