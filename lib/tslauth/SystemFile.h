// SPDX-License-Identifier: Apache-2.0
#ifndef TSLAUTH_SYSTEMFILE_H
#define TSLAUTH_SYSTEMFILE_H

#include <base/FileError.h>
#include <string>
#include <string_view>
#include <tslauth/Configuration.h>

/// The one place where the library reads a whole file, replaces one, or turns an error number into
/// an exception. Nothing here holds state, so everything may be called from any thread; reading and
/// replacing block as long as the file system does.
namespace tessel::authentication {

using base::SystemText;

/// Throws `IOError` with `what` + ": " + the system's text for `error`.
[[noreturn]] void ThrowIOError(std::string const& what, int error);

/// The bytes of a regular file. What else stands at the path is refused, and a pipe not waited for.
/// Only a folder is read with `OnReadError::EndQuietly`: it opens like a file, and the reading ends
/// at once.
/// @param openFailure how the message for a file that cannot be opened begins:
///        openFailure + " '" + path + "': " + the system's text
/// @throws IOError if the file cannot be opened, is none ("Cannot read '" + path + "': it is not a
///         regular file") or, as `onReadError` says, cannot be read ("Cannot read '" + path + "': "
///         + the system's text)
std::string ReadFile(std::string const& path, char const* openFailure = "Cannot open",
                     OnReadError onReadError = OnReadError::Throw);

/// Replaces a file by `text`, whole or not at all, and makes it durable (see `AtomicFileStream`).
/// @throws IOError if the temporary file cannot be created, opened ("Cannot open '" + path + "': "
///         + the system's text), written or moved over `path`, which then is as it was
/// @throws FilePermissionError if the file was replaced but may have the wrong permissions
void ReplaceFile(std::string const& path, std::string_view text);

} // namespace tessel::authentication

#endif
