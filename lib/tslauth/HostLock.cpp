// SPDX-License-Identifier: Apache-2.0
#include <tslauth/HostLock.h>

#include "SystemFile.h"

#include <tslauth/Exceptions.h>
#include <tslauth/Paths.h>

#include <base/Descriptor.h>

#include <cerrno>
#include <chrono>
#include <fcntl.h>
#include <string>
#include <sys/file.h>
#include <sys/stat.h>
#include <thread>

namespace tessel::authentication {

namespace {

constexpr std::chrono::milliseconds pause(20);

std::string const& Message() {
    static std::string const message = std::string("Cannot lock '") + Paths::HostLock + "'";
    return message;
}

} // namespace

HostLock::HostLock() : _descriptor(-1) {
    // A link is not followed: whatever it leads to, it is not the lock. Nor is a pipe waited for.
    base::Descriptor file(open(
        Paths::HostLock, O_RDWR | O_CREAT | O_CLOEXEC | O_NOFOLLOW | O_NOCTTY | O_NONBLOCK, 0600));
    if (!file) {
        ThrowIOError(Message(), errno);
    }
    struct stat status = {};
    if (fstat(file.Get(), &status) != 0 || !S_ISREG(status.st_mode) || status.st_uid != 0) {
        throw IOError(Message() + ": it is not a file of root's");
    }
    _descriptor = file.Release();
}

HostLock::~HostLock() {
    base::Descriptor const closed(_descriptor);
}

void HostLock::Lock() {
    while (flock(_descriptor, LOCK_EX) != 0) {
        if (int const error = errno; error != EINTR) {
            ThrowIOError(Message(), error);
        }
    }
}

bool HostLock::TryLock(int seconds) {
    auto const deadline = std::chrono::steady_clock::now() + std::chrono::seconds(seconds);
    while (flock(_descriptor, LOCK_EX | LOCK_NB) != 0) {
        int const error = errno;
        if (error != EWOULDBLOCK && error != EINTR) {
            ThrowIOError(Message(), error);
        }
        if (std::chrono::steady_clock::now() >= deadline) {
            return false;
        }
        std::this_thread::sleep_for(pause);
    }
    return true;
}

} // namespace tessel::authentication
