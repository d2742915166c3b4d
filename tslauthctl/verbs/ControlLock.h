// SPDX-License-Identifier: Apache-2.0
#ifndef TSLAUTHCTL_CONTROLLOCK_H
#define TSLAUTHCTL_CONTROLLOCK_H

namespace tessel::tslauthctl {

class Console;

/// Held while a command changes the host, so that two of them never interleave. The library itself
/// takes no lock. The kernel lets go of it when the process ends, however it ends; the file stays.
class ControlLock {
public:
    /// Waits until the lock is free, as long as that takes, and says so on a terminal.
    /// @throws Failure
    explicit ControlLock(Console& console);
    ControlLock(ControlLock const&) = delete;
    ControlLock& operator=(ControlLock const&) = delete;
    ~ControlLock();

private:
    int _descriptor;
};

/// @throws Failure (not root), naming what wants to be root
void RequireRoot(char const* what);

} // namespace tessel::tslauthctl

#endif
