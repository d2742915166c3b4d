// SPDX-License-Identifier: Apache-2.0
#include "host/OperationLock.h"

#include "Failure.h"
#include "host/HostFile.h"

#include <cerrno>
#include <fcntl.h>
#include <sys/file.h>
#include <sys/stat.h>
#include <thread>
#include <unistd.h>
#include <utility>

namespace tessel::winbind {

namespace {

/// Whether the file that is locked is the one that the next comer finds: who had it before has
/// removed it with its name.
bool IsInPlace(int descriptor, std::string const& path) {
    struct stat locked = {};
    struct stat found = {};
    return ::fstat(descriptor, &locked) == 0 && ::lstat(path.c_str(), &found) == 0 &&
           locked.st_dev == found.st_dev && locked.st_ino == found.st_ino;
}

} // namespace

OperationLock::OperationLock(std::string path, Clock::time_point deadline)
    : _path(std::move(path)) {
    for (;;) {
        _file = base::Descriptor(
            ::open(_path.c_str(), O_RDWR | O_CREAT | O_CLOEXEC | O_NOFOLLOW | O_NONBLOCK, 0600));
        if (!_file) {
            ThrowSystemFailure("cannot open '" + _path + "'", errno);
        }
        if (::flock(_file.Get(), LOCK_EX | LOCK_NB) == 0 && IsInPlace(_file.Get(), _path)) {
            return;
        }
        _file.Close();
        if (Clock::now() >= deadline) {
            throw Failure(TSLAUTH_PROVIDER_TIMED_OUT, "another operation holds '" + _path + "'");
        }
        std::this_thread::sleep_for(std::chrono::milliseconds(50));
    }
}

OperationLock::~OperationLock() {
    // The name goes first, so that who opens it from here on gets a new file. The lock is let go of
    // by hand, because a child that the host has made elsewhere may hold the descriptor as well.
    (void)::unlink(_path.c_str());
    (void)::flock(_file.Get(), LOCK_UN);
}

} // namespace tessel::winbind
