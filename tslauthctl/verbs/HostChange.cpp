// SPDX-License-Identifier: Apache-2.0
#include "verbs/HostChange.h"

#include "analysis/ChangeLog.h"
#include "terminal/Console.h"

#include <tslauth/Exceptions.h>

#include <string>
#include <unistd.h>

namespace tessel::tslauthctl {

HostChange::HostChange(Console& console) try {
    if (!_lock.TryLock()) {
        console.Waiting("waiting for another tslauthctl to finish ...");
        _lock.Lock();
    }
    ChangeLog::Begin();
} catch (authentication::IOError const& e) {
    throw Failure(ExitCode::failure, e.what());
}

void RequireRoot(char const* what) {
    if (geteuid() != 0) {
        throw Failure(ExitCode::notRoot, std::string(what) + " changes the host and must be run "
                                                             "as root");
    }
}

} // namespace tessel::tslauthctl
