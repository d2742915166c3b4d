// SPDX-License-Identifier: Apache-2.0
#ifndef TSLAUTHCTL_PROVIDERCHECK_H
#define TSLAUTHCTL_PROVIDERCHECK_H

#include <string>

namespace tessel::tslauthctl {

/// Refuses a configured provider that this process must not load: one outside the providers'
/// folder, and one whose loading ends or hangs a process, which a child finds out. Whatever else is
/// wrong with it, the library says.
///
/// To be called while the process has no other threads.
/// @throws Failure (refused)
void CheckProvider();

/// The same for a library by its path.
/// @param seconds that loading may take
/// @throws Failure (refused)
void CheckLoading(std::string const& path, int seconds);

} // namespace tessel::tslauthctl

#endif
