// SPDX-License-Identifier: Apache-2.0
#ifndef STRANDCTL_WHOLEFILE_H
#define STRANDCTL_WHOLEFILE_H

#include <optional>
#include <string>
#include <string_view>

/// The one place where the library reads and replaces files. Nothing here holds state, so that
/// everything may be called from any thread; it blocks as long as the file system does.
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

/// Replaces a file by `text`, whole or not at all, and makes it durable. The text goes to a new
/// file of our own beside the target, which takes its place when it is complete on the disk. It
/// never is somebody else's file, whatever stands in that folder, since the system makes it anew
/// under a name that nothing had. The mode (07777) is the target's, 0644 if there is none; so is
/// the owner, where the process may give files away. A symbolic link stays, and its destination is
/// replaced.
///
/// Not promised: extended attributes and access control lists are not carried over, and a target
/// that is mounted on its own (a bind mount) cannot be replaced.
/// @throws HostCtl::Lib::HostCtlException "Cannot replace '" + path + "': " + the reason; the
///         target is as it was then, and the new file is gone
void ReplaceFile(std::string const& path, std::string_view text);

} // namespace StrandCtl

#endif
