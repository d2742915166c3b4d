// SPDX-License-Identifier: Apache-2.0
#ifndef TSLAUTHCTL_PATHONHOST_H
#define TSLAUTHCTL_PATHONHOST_H

#include "history/Snapshot.h"

#include <string>
#include <vector>

/// What is at the host's paths, and how it becomes something else.
namespace tessel::tslauthctl {

/// @throws base::FileError where it cannot be read
PathState StateOnHost(std::string const& path);

/// The same for many paths, for the files that links among them lead to, and for the folders above
/// them that are not there.
/// @throws base::FileError
PathStates StatesOnHost(std::vector<std::string> const& paths);

/// Of the paths of `states` alone.
/// @throws base::FileError
PathStates CurrentOf(PathStates const& states);

/// Makes what is at a path the same as `wanted`, whole and durably. A folder that others have put
/// something into stays; those above that are missing are made.
/// @throws base::FileError, Failure; what was there is there then
void PutStateOnHost(std::string const& path, PathState const& wanted);

} // namespace tessel::tslauthctl

#endif
