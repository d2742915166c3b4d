// SPDX-License-Identifier: Apache-2.0
#ifndef TSLAUTH_ATOMICFILESTREAM_H
#define TSLAUTH_ATOMICFILESTREAM_H

#include "Export.h"

#include <fstream>
#include <ios>
#include <string>

namespace tessel {
namespace authentication {

/// An output stream that replaces a file whole: who reads the target sees its old contents or all
/// of the new ones, at any moment and also after a crash.
///
/// Everything is written to a temporary file beside the target, which `Commit` renames over it:
///
///     AtomicFileStream stream("/etc/example.conf", std::ios::out);
///     stream << "key = \"value\"\n";
///     stream.Sync();   // throws instead of committing a short file
///     stream.Commit();
///
/// What it does not promise:
/// - A stream that is destroyed without a successful `Commit` leaves its temporary file (the
///   target's name, a dot and six characters) behind. Deliberate: nothing here ever removes a file.
/// - `Commit` alone does not look at the stream's state. Only `Sync` before it finds a full disk.
/// - Owner, group, access control lists and extended attributes are not carried over, and a target
///   that is a symbolic link is replaced by a file.
/// - There is no lock: of two streams on one target, the last commit wins.
///
/// One object is used by one thread at a time. Every call may block as long as the disk does.
class TSLAUTH_EXPORT AtomicFileStream : public std::ofstream {
public:
    /// The same as `open`.
    AtomicFileStream(char const* path, std::ios::openmode mode);

    /// Closes the stream. Neither commits nor removes anything.
    ~AtomicFileStream() override;

    /// Creates the temporary file, with permissions 0600, and opens the stream on it. If only that
    /// second step fails, the stream's fail state is set and `errno` says why; nothing is thrown
    /// then, whatever the stream's exception mask.
    /// @param path the target, which need not exist; at most 4088 bytes
    /// @param mode some flag besides `std::ios::in`, usually `std::ios::out`, which is added in any
    ///        case; without one the process ends with an assertion report
    /// @throws IOError "Unable to create temporary file to write '" + path + "': " + reason
    void open(char const* path, std::ios::openmode mode);

    /// Brings everything that was inserted onto the disk, and proves it: the last chance to give up
    /// while the target is untouched. The temporary file gets the target's mode with it, so that
    /// after a crash the target is never there without it; a failed `Commit` takes it back.
    ///
    /// The reason in the message is right when no other call came between a failed insertion and
    /// this one.
    /// @throws IOError "Cannot write '" + path + "': " + reason, `path` being the target's, if this
    ///         or any earlier output failed (disk full, quota, I/O error)
    void Sync();

    /// Closes the stream and renames the temporary file over the target, which keeps its mode bits
    /// (07777). A new target has the permissions 0600. The folder's change is asked onto the disk
    /// before this returns. To be called once.
    /// @throws IOError "Unable to rename '" + temporary + "' to '" + path + "': " + reason; the
    ///         target is untouched and the temporary file stays, with permissions 0600
    /// @throws FilePermissionError the target is replaced, but its mode could not be read or set
    void Commit();

private:
    std::string _tempName;
    std::string _targetName;
};

} // namespace authentication
} // namespace tessel

#endif
