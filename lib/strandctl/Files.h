// SPDX-License-Identifier: Apache-2.0
#ifndef STRANDCTL_FILES_H
#define STRANDCTL_FILES_H

#include <optional>
#include <string>
#include <string_view>

/// The one place where the library reads and replaces files, and where what goes wrong with the
/// system becomes its own exception. Nothing here holds state, so that everything may be called
/// from any thread; it blocks as long as the file system does. What is done to a file,
/// <base/WholeFile.h> says.
namespace StrandCtl {

/// Throws `HostCtlException` with `what` + ": " + the system's text for an error number.
[[noreturn]] void ThrowSystemError(std::string const& what, int error);

/// The bytes of a regular file; nothing if there is no file at `path`.
/// @throws HostCtl::Lib::HostCtlException "Cannot read '" + path + "': " + the reason
std::optional<std::string> ReadFile(std::string const& path);

/// The file that a path leads to, with every symbolic link on the way followed; the file itself
/// need not exist.
/// @throws HostCtl::Lib::HostCtlException for a loop of links, or a folder that cannot be looked at
std::string Destination(std::string const& path);

/// Replaces a file by `text`, whole or not at all, and makes it durable. A symbolic link stays, and
/// its destination is replaced; a new file gets the mode 0644.
/// @throws HostCtl::Lib::HostCtlException "Cannot replace '" + path + "': " + the reason; the
///         target is as it was then, and nothing is left beside it
void ReplaceFile(std::string const& path, std::string_view text);

} // namespace StrandCtl

#endif
