// SPDX-License-Identifier: Apache-2.0
#ifndef TSLAUTHCTL_HOSTFILE_H
#define TSLAUTHCTL_HOSTFILE_H

#include <optional>
#include <string>

namespace tessel::tslauthctl {

/// The bytes of a file of the host.
/// @throws authentication::IOError where it is missing, no regular file or cannot be read
std::string ReadHostFile(std::string const& path);

/// The same; nothing where it cannot be had.
std::optional<std::string> HostFileOrNothing(std::string const& path);

} // namespace tessel::tslauthctl

#endif
