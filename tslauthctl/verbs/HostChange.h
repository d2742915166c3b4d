// SPDX-License-Identifier: Apache-2.0
#ifndef TSLAUTHCTL_HOSTCHANGE_H
#define TSLAUTHCTL_HOSTCHANGE_H

#include <tslauth/HostLock.h>

namespace tessel::tslauthctl {

class Console;

/// Lives while a command changes the host: keeps every other change of it out.
class HostChange {
public:
    /// Waits until nobody else changes the host, as long as that takes, and says so on a terminal.
    /// @throws Failure
    explicit HostChange(Console& console);

private:
    authentication::HostLock _lock;
};

/// @throws Failure (not root), naming what wants to be root
void RequireRoot(char const* what);

} // namespace tessel::tslauthctl

#endif
