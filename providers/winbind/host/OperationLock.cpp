// SPDX-License-Identifier: Apache-2.0
#include "host/OperationLock.h"

#include "Failure.h"
#include "Paths.h"
#include "host/HostFile.h"

#include <cerrno>
#include <fcntl.h>
#include <string>
#include <sys/file.h>
#include <sys/stat.h>
#include <thread>
#include <unistd.h>

namespace tessel::winbind {

namespace {

/// Whether the file that is locked is the one that the next comer finds: who had it before has
/// removed it with its name.
bool IsInPlace(int descriptor) {
    struct stat locked = {};
    struct stat found = {};
    return ::fstat(descriptor, &locked) == 0 && ::lstat(Paths::Lock, &found) == 0 &&
           locked.st_dev == found.st_dev && locked.st_ino == found.st_ino;
}

} // namespace

OperationLock::OperationLock(Clock::time_point deadline) : _descriptor(-1) {
    for (;;) {
        _descriptor = ::open(Paths::Lock, O_RDWR | O_CREAT | O_CLOEXEC | O_NOFOLLOW, 0600);
        if (_descriptor < 0) {
            ThrowSystemFailure("cannot open '" + std::string(Paths::Lock) + "'", errno);
        }
        if (::flock(_descriptor, LOCK_EX | LOCK_NB) == 0 && IsInPlace(_descriptor)) {
            return;
        }
        (void)::close(_descriptor); // nothing was written to it
        if (Clock::now() >= deadline) {
            throw Failure(TSLAUTH_PROVIDER_TIMED_OUT,
                          "another operation holds '" + std::string(Paths::Lock) + "'");
        }
        std::this_thread::sleep_for(std::chrono::milliseconds(50));
    }
}

OperationLock::~OperationLock() {
    // The name goes first, so that who opens it from here on gets a new file. The lock is let go of
    // by hand, because a child that the host has made elsewhere may hold the descriptor as well.
    (void)::unlink(Paths::Lock);
    (void)::flock(_descriptor, LOCK_UN);
    (void)::close(_descriptor);
}

} // namespace tessel::winbind
