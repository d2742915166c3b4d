// SPDX-License-Identifier: Apache-2.0
#include "OperationLock.h"

#include "Failure.h"
#include "HostFile.h"
#include "Paths.h"

#include <cerrno>
#include <fcntl.h>
#include <string>
#include <sys/file.h>
#include <thread>
#include <unistd.h>

namespace tessel::winbind {

OperationLock::OperationLock(Clock::time_point deadline)
    : _descriptor(::open(Paths::Lock, O_RDWR | O_CREAT | O_CLOEXEC | O_NOFOLLOW, 0600)) {
    if (_descriptor < 0) {
        ThrowSystemFailure("cannot open '" + std::string(Paths::Lock) + "'", errno);
    }
    // Each opening of the file is a holder of its own, so that threads exclude each other as well.
    while (::flock(_descriptor, LOCK_EX | LOCK_NB) != 0) {
        if (Clock::now() >= deadline) {
            (void)::close(_descriptor); // nothing was written to it
            throw Failure(TSLAUTH_PROVIDER_TIMED_OUT,
                          "another operation holds '" + std::string(Paths::Lock) + "'");
        }
        std::this_thread::sleep_for(std::chrono::milliseconds(50));
    }
}

OperationLock::~OperationLock() {
    // By hand, because a child that the host has made elsewhere may hold the descriptor as well.
    (void)::flock(_descriptor, LOCK_UN);
    (void)::close(_descriptor);
}

} // namespace tessel::winbind
