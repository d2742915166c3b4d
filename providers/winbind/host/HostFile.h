// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <tslauth/tslauth_provider.h>

#include <functional>
#include <optional>
#include <string>
#include <sys/types.h>
#include <vector>

/// The host's files: read whole, replaced whole, put back.
namespace tessel::winbind {

/// What a refusal of the system's is to the caller: 5, 8, 112 or "see the system log".
ActiveDirectoryClientErrorCode CodeOfSystem(int error) noexcept;

/// @throws Failure of that code, with what + ": " + the system's text for `error`
[[noreturn]] void ThrowSystemFailure(std::string const& what, int error);

/// The bytes of a file, or nothing where there is none.
/// @throws Failure where it cannot be read
std::optional<std::string> ReadHostFile(std::string const& path);

/// Whether anything is there, a link that leads nowhere included.
/// @throws Failure where that cannot be told
bool FileExists(std::string const& path);

/// Where there is none, there is nothing to do.
/// @throws Failure
void RemoveHostFile(std::string const& path);

/// Removes a folder that nobody has put anything into, if there is one.
/// @throws Failure
void RemoveEmptyFolder(std::string const& path);

/// Changes of the host that are taken back, in reverse order, unless they are kept. Taking back is
/// done with what was set aside before, and needs no room on a disk.
///
/// An original is set aside as a second link beside its file. What a process that dies in between
/// leaves is put back by `RestoreOriginals`.
class HostChanges {
public:
    HostChanges() = default;
    HostChanges(HostChanges const&) = delete;
    HostChanges& operator=(HostChanges const&) = delete;
    /// Takes back what was not kept.
    ~HostChanges();

    /// Replaces a file, or makes it, whole and durable. One that exists keeps its owner, mode,
    /// access control list and other extended attributes, and a link to it stays a link.
    /// @param mode for a new file
    /// @throws Failure, and the file is as it was; also where the path is a link to nothing
    void Replace(std::string const& path, std::string const& text, mode_t mode);

    /// Removes a file, if there is one.
    void Remove(std::string const& path);

    /// Makes a file that is there until the changes are kept or taken back: who finds it later
    /// knows that a process has died in between, and reads in `text` what that one was about.
    /// @throws Failure
    void Mark(std::string const& path, std::string const& text);

    /// Makes a folder, if there is none.
    /// @return whether it was made
    bool MakeFolder(std::string const& path, mode_t mode);

    /// Whatever else is to be taken back in its turn.
    void OnUndo(std::function<void()> step);

    /// The changes are the host's from now on, durably: a power loss brings no mark and no original
    /// back.
    void Keep() noexcept;

    /// Takes all changes back. What fails is logged, and the rest goes on.
    /// @return whether everything was taken back
    bool Undo() noexcept;

private:
    void SetAside(std::string const& target);

    std::vector<std::function<void()>> _undo;
    /// Marks and originals, which go with the end of the changes.
    std::vector<std::string> _passing;
};

/// Puts the originals of `paths` back that a `HostChanges` without an end has left.
void RestoreOriginals(std::vector<std::string> const& paths);

/// Removes what is only on its way in the folders of `paths`, originals included.
void RemoveTemporaryFiles(std::vector<std::string> const& paths);

} // namespace tessel::winbind
