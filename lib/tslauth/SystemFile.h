// SPDX-License-Identifier: Apache-2.0
#ifndef TSLAUTH_SYSTEMFILE_H
#define TSLAUTH_SYSTEMFILE_H

#include <string>
#include <string_view>

/// The one place where the library reads a whole file, replaces one, or turns an error number into
/// an exception. Nothing here holds state, so everything may be called from any thread; reading and
/// replacing block as long as the file system does.
namespace tessel::authentication {

/// The system's text for an error number, as `strerror` gives it, but safe with threads.
std::string SystemText(int error);

/// Throws `IOError` with `what` + ": " + the system's text for `error`.
[[noreturn]] void ThrowIOError(std::string const& what, int error);

enum class OnReadError {
    /// What was read before the error is the result, as it is with an input stream.
    EndQuietly,
    /// `IOError` "Cannot read '" + path + "': " + the system's text. For files that are written
    /// back, which an error in the middle must not shorten.
    Throw,
};

/// The bytes of a file.
/// @param openFailure how the message for a file that cannot be opened begins:
///        openFailure + " '" + path + "': " + the system's text
/// @throws IOError if the file cannot be opened or, as `onReadError` says, read
std::string ReadFile(std::string const& path, char const* openFailure = "Cannot open",
                     OnReadError onReadError = OnReadError::Throw);

/// Replaces a file by `text`, whole or not at all, and makes it durable (see `AtomicFileStream`).
/// @throws IOError if the temporary file cannot be created, opened ("Cannot open '" + path + "': "
///         + the system's text), written or moved over `path`, which then is as it was
/// @throws FilePermissionError if the file was replaced but may have the wrong permissions
void ReplaceFile(std::string const& path, std::string_view text);

} // namespace tessel::authentication

#endif
