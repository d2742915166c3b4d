// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "host/ChildProcess.h"

namespace tessel::winbind {

/// Keeps what changes the host apart: among the threads of a process, and among processes. Released
/// by the destructor, and by the end of the process; nothing of it stays in the file system.
class OperationLock {
public:
    /// Waits its turn.
    /// @throws Failure 10060 at the deadline, 5 where this is not root, otherwise `SeeSystemLog`
    explicit OperationLock(Clock::time_point deadline);
    OperationLock(OperationLock const&) = delete;
    OperationLock& operator=(OperationLock const&) = delete;
    ~OperationLock();

private:
    int _descriptor;
};

} // namespace tessel::winbind
