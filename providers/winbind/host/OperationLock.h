// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "host/ChildProcess.h"

#include <base/Descriptor.h>
#include <string>

namespace tessel::winbind {

/// Keeps what changes the host apart: among the threads of a process, and among processes. Released
/// by the destructor, and by the end of the process; nothing of it stays in the file system.
class OperationLock {
public:
    /// Waits its turn.
    /// @param path of the file that is locked; it is there as long as the lock
    /// @throws Failure 10060 at the deadline, 5 where this is not root, otherwise
    ///         `TSLAUTH_WINBIND_SEE_SYSTEM_LOG`
    OperationLock(std::string path, Clock::time_point deadline);
    OperationLock(OperationLock const&) = delete;
    OperationLock& operator=(OperationLock const&) = delete;
    ~OperationLock();

private:
    std::string _path;
    base::Descriptor _file;
};

} // namespace tessel::winbind
