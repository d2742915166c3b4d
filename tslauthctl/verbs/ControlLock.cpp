// SPDX-License-Identifier: Apache-2.0
#include "verbs/ControlLock.h"

#include "terminal/Console.h"

#include <Paths.h>
#include <SystemFile.h>

#include <cerrno>
#include <fcntl.h>
#include <string>
#include <sys/file.h>
#include <sys/stat.h>
#include <unistd.h>

namespace tessel::tslauthctl {

namespace {

using authentication::SystemText;
using authentication::Paths::ControlLock;

int OpenLockFile() {
    // A link is not followed: whatever it leads to, it is not the lock.
    return open(ControlLock, O_RDWR | O_CREAT | O_CLOEXEC | O_NOFOLLOW | O_NOCTTY, 0600);
}

[[noreturn]] void Fail(int descriptor, std::string const& what) {
    if (descriptor >= 0) {
        close(descriptor);
    }
    throw Failure(ExitCode::failure, std::string("Cannot lock '") + ControlLock + "': " + what);
}

} // namespace

ControlLock::ControlLock(Console& console) : _descriptor(OpenLockFile()) {
    if (_descriptor < 0) {
        Fail(-1, SystemText(errno));
    }
    struct stat status = {};
    if (fstat(_descriptor, &status) != 0 || !S_ISREG(status.st_mode) || status.st_uid != 0) {
        Fail(_descriptor, "it is not a file of root's");
    }
    if (flock(_descriptor, LOCK_EX | LOCK_NB) == 0) {
        return;
    }
    if (errno == EWOULDBLOCK) {
        console.Waiting("waiting for another tslauthctl to finish ...");
    }
    while (flock(_descriptor, LOCK_EX) != 0) {
        if (int const error = errno; error != EINTR) {
            Fail(_descriptor, SystemText(error));
        }
    }
}

ControlLock::~ControlLock() {
    close(_descriptor);
}

void RequireRoot(char const* what) {
    if (geteuid() != 0) {
        throw Failure(ExitCode::notRoot, std::string(what) + " changes the host and must be run "
                                                             "as root");
    }
}

} // namespace tessel::tslauthctl
