// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "Descriptor.h"
#include "ExtendedAttributes.h"

#include <optional>
#include <string>
#include <string_view>
#include <sys/stat.h>
#include <sys/types.h>

/// Files are read whole and replaced whole. Nothing here holds state, so that everything may be
/// called from any thread; it blocks as long as the file system does.
namespace tessel::base {

/// A file, opened to be read whole. Whatever is at the path, a pipe that nobody writes to, say, is
/// not waited for.
class ReadableFile {
public:
    /// @throws FileError "Cannot read '" + path + "': " + the system's text
    explicit ReadableFile(std::string const& path);

    bool IsRegular() const noexcept {
        return S_ISREG(_status.st_mode);
    }
    bool IsFolder() const noexcept {
        return S_ISDIR(_status.st_mode);
    }

    /// The bytes of a regular file.
    /// @throws FileError "Cannot read '" + path + "': " + the reason
    std::string Text() const;

    /// What could be read before the end or an error, as it is with an input stream.
    std::string TextUpToAnError() const;

private:
    std::string _path;
    Descriptor _file;
    struct stat _status = {};
};

inline constexpr char NotRegular[] = "it is not a regular file";

/// The bytes of a regular file; nothing if there is none at `path`.
/// @throws FileError "Cannot read '" + path + "': " + the reason
std::optional<std::string> ReadFile(std::string const& path);

/// The bytes that an open descriptor still gives.
/// @param path for the message
/// @throws FileError
std::string ReadAll(int descriptor, std::string const& path);

/// The file that a path leads to, with every symbolic link on the way followed; the file itself
/// need not exist.
/// @throws FileError for a loop of links, or a folder that cannot be looked at
std::string Destination(std::string const& path);

/// Makes the entries of the folder that holds `path` durable, as far as its file system does that.
/// What a crash could undo otherwise is a rename, from one whole file to the other.
void SyncFolderOf(std::string const& path) noexcept;

enum class Links {
    /// A symbolic link stays, and the file that it leads to is replaced.
    Follow,
    /// A symbolic link is replaced by the file.
    Replace,
};

/// What a file has beside its bytes.
struct FileAttributes {
    mode_t mode = 0;
    uid_t owner = 0;
    gid_t group = 0;
    ExtendedAttributes extended;

    bool operator==(FileAttributes const& other) const {
        return mode == other.mode && owner == other.owner && group == other.group &&
               extended == other.extended;
    }
};

/// Those of an open file.
/// @return nothing where the file system fails; `errno` says why
std::optional<FileAttributes> ReadAttributes(int file);

struct Replacing {
    Links links = Links::Follow;
    /// Of a file that did not exist, whatever the umask is.
    mode_t newMode = 0644;
    /// What the file gets, whatever the target has: for a file that becomes what it was.
    std::optional<FileAttributes> attributes = std::nullopt;
};

/// The new file beside its target: complete and durable, with the mode (07777), the owner, the
/// access control list, the label and all other extended attributes of the target. It takes the
/// target's place in `Commit`, and is gone without it.
///
/// Its name begins with `TemporaryPrefix`. It never is somebody else's file, whatever stands in
/// that folder, since the system makes it anew under a name that nothing had.
///
/// Not promised: a target that is mounted on its own (a bind mount) cannot be replaced, and a
/// process that is not root leaves the owner to the system.
class FileReplacement {
public:
    /// @throws FileError "Cannot replace '" + path + "': " + the reason, or as `Destination`;
    ///     nothing is left then
    FileReplacement(std::string const& path, std::string_view text, Replacing how = {});
    FileReplacement(FileReplacement const&) = delete;
    FileReplacement& operator=(FileReplacement const&) = delete;
    ~FileReplacement();

    /// What is replaced, after links were followed.
    std::string const& Target() const noexcept {
        return _target;
    }
    /// Whether there was a file at the target.
    bool Existed() const noexcept {
        return _existed;
    }

    /// Renames the new file over the target, durably. To be called once.
    /// @throws FileError; the target is as it was
    void Commit();

private:
    void Fill(std::string_view text, Replacing const& how);

    std::string _path;
    std::string _target;
    std::string _temporary;
    bool _existed = false;
    Descriptor _file;
};

/// Makes a file where there is none, durable but for its name: for a folder that nobody looks into
/// before `SyncFolderOf`.
/// @param mode whatever the umask is
/// @throws FileError "Cannot make '" + path + "': " + the reason; a file may be left
void MakeFile(std::string const& path, std::string_view text, mode_t mode);

inline constexpr char TemporaryPrefix[] = ".tslauth-";

/// `FileReplacement` in one call.
/// @throws FileError; the target is as it was
void ReplaceFile(std::string const& path, std::string_view text, Replacing how = {});

} // namespace tessel::base
