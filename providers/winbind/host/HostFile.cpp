// SPDX-License-Identifier: Apache-2.0
#include "host/HostFile.h"

#include "Failure.h"
#include "Paths.h"
#include "host/SystemLog.h"

#include <cerrno>
#include <climits>
#include <cstdlib>
#include <dirent.h>
#include <exception>
#include <fcntl.h>
#include <memory>
#include <set>
#include <string_view>
#include <sys/stat.h>
#include <system_error>
#include <tslauth/AtomicFileStream.h>
#include <tslauth/Exception.h>
#include <unistd.h>

namespace tessel::winbind {

namespace {

std::string FolderOf(std::string const& path) {
    return path.substr(0, path.rfind('/') + 1);
}

std::string Beside(std::string const& path) {
    return FolderOf(path) + Paths::TemporaryPrefix + path.substr(path.rfind('/') + 1);
}

std::string OriginalOf(std::string const& path) {
    return Beside(path) + Paths::OriginalSuffix;
}

/// Where a file lies that may be reached through links, so that the links stay.
std::string Target(std::string const& path) {
    std::unique_ptr<char, decltype(&std::free)> const real(::realpath(path.c_str(), nullptr),
                                                           &std::free);
    return real ? real.get() : path;
}

void Rename(std::string const& from, std::string const& to) {
    if (::rename(from.c_str(), to.c_str()) != 0) {
        ThrowSystemFailure("cannot rename '" + from + "' to '" + to + "'", errno);
    }
    SyncFolderOf(to);
}

/// Undoes `HostChanges::Replace`. A rename over another link of the same file does nothing at all.
void PutBack(std::string const& original, std::string const& target) {
    Rename(original, target);
    RemoveHostFile(original);
}

/// Removes the files of `folder` that `isMeant` picks.
template <typename Predicate> void RemoveFiles(std::string const& folder, Predicate isMeant) {
    std::unique_ptr<DIR, int (*)(DIR*)> const list(::opendir(folder.c_str()), &::closedir);
    if (!list) {
        return; // a folder that does not exist holds nothing
    }
    std::vector<std::string> found;
    while (dirent const* const entry = ::readdir(list.get())) {
        if (isMeant(std::string_view(entry->d_name))) {
            found.push_back(folder + entry->d_name);
        }
    }
    for (std::string const& file : found) {
        RemoveHostFile(file);
    }
}

/// What a stream to `beside` leaves behind when it fails: a dot and six characters more.
void RemoveUncommitted(std::string const& beside) {
    std::string const start = beside.substr(beside.rfind('/') + 1) + '.';
    RemoveFiles(FolderOf(beside), [&](std::string_view name) {
        return name.size() == start.size() + 6 && name.substr(0, start.size()) == start;
    });
}

/// The new file complete beside its place: contents, owner and mode.
void WriteBeside(std::string const& path, std::string const& text, struct stat const& like) {
    std::string const beside = Beside(path);
    RemoveHostFile(beside);
    try {
        authentication::AtomicFileStream stream(beside.c_str(), std::ios::out);
        stream.write(text.data(), static_cast<std::streamsize>(text.size()));
        stream.Sync();
        stream.Commit();
    } catch (authentication::Exception const& e) {
        RemoveUncommitted(beside);
        throw Failure(SeeSystemLog, e.what());
    }
    // In this order: a change of the owner may clear bits of the mode.
    if (::chown(beside.c_str(), like.st_uid, like.st_gid) != 0 ||
        ::chmod(beside.c_str(), like.st_mode & 07777) != 0) {
        int const error = errno;
        RemoveHostFile(beside);
        ThrowSystemFailure("cannot give '" + beside + "' its owner and mode", error);
    }
}

} // namespace

void ThrowSystemFailure(std::string const& what, int error) {
    std::string const text = what + ": " + std::generic_category().message(error);
    switch (error) {
    case EACCES:
    case EPERM:
        throw Failure(TSLAUTH_PROVIDER_ACCESS_DENIED, text);
    case ENOMEM:
        throw Failure(TSLAUTH_PROVIDER_NOT_ENOUGH_MEMORY, text);
    default:
        throw Failure(SeeSystemLog, text);
    }
}

std::optional<std::string> ReadHostFile(std::string const& path) {
    // Without waiting: the path may be a pipe, from which nothing ever comes.
    int const file = ::open(path.c_str(), O_RDONLY | O_CLOEXEC | O_NONBLOCK);
    if (file < 0) {
        int const error = errno;
        if (error == ENOENT || error == ENOTDIR) {
            return std::nullopt;
        }
        ThrowSystemFailure("cannot open '" + path + "'", error);
    }
    struct stat status = {};
    if (::fstat(file, &status) != 0 || !S_ISREG(status.st_mode)) {
        (void)::close(file); // nothing was read
        throw Failure(SeeSystemLog, "'" + path + "' is not a regular file");
    }
    std::string text;
    int error = 0;
    for (;;) {
        char buffer[16384];
        ssize_t const count = ::read(file, buffer, sizeof buffer);
        if (count > 0) {
            text.append(buffer, static_cast<std::size_t>(count));
        } else if (count == 0) {
            break;
        } else if (errno != EINTR) {
            error = errno;
            break;
        }
    }
    (void)::close(file); // nothing was written through it
    if (error != 0) {
        ThrowSystemFailure("cannot read '" + path + "'", error);
    }
    return text;
}

bool FileExists(std::string const& path) {
    struct stat status = {};
    return ::lstat(path.c_str(), &status) == 0;
}

void RemoveHostFile(std::string const& path) {
    if (::unlink(path.c_str()) != 0 && errno != ENOENT && errno != ENOTDIR) {
        ThrowSystemFailure("cannot remove '" + path + "'", errno);
    }
}

void SyncFolderOf(std::string const& path) noexcept {
    std::string const folder = FolderOf(path);
    int const opened = ::open(folder.c_str(), O_RDONLY | O_DIRECTORY | O_CLOEXEC);
    if (opened >= 0) {
        // Some file systems refuse; what a crash could undo is a rename, from whole to whole.
        (void)::fsync(opened);
        (void)::close(opened);
    }
}

HostChanges::~HostChanges() {
    (void)Undo(); // who wants to know calls it first
}

void HostChanges::Replace(std::string const& path, std::string const& text, mode_t mode) {
    std::string const target = Target(path);
    struct stat like = {};
    bool const exists = ::stat(target.c_str(), &like) == 0;
    if (!exists) {
        if (FileExists(target)) {
            // The link would be lost, and what it should lead to is not the provider's to make.
            throw Failure(SeeSystemLog, "'" + target + "' is a link to nothing");
        }
        like.st_uid = ::geteuid();
        like.st_gid = ::getegid();
        like.st_mode = mode;
    }
    WriteBeside(target, text, like);
    std::string const beside = Beside(target);
    std::string const original = OriginalOf(target);
    try {
        RemoveHostFile(original);
        if (exists && ::link(target.c_str(), original.c_str()) != 0) {
            ThrowSystemFailure("cannot set '" + target + "' aside", errno);
        }
        if (exists) {
            _originals.push_back(original);
            _undo.emplace_back([original, target] { PutBack(original, target); });
        } else {
            _undo.emplace_back([target] { RemoveHostFile(target); });
        }
        Rename(beside, target);
    } catch (...) {
        (void)::unlink(beside.c_str()); // the failure that is reported is the one above
        throw;
    }
}

void HostChanges::Remove(std::string const& path) {
    std::string const original = OriginalOf(path);
    RemoveHostFile(original);
    if (::rename(path.c_str(), original.c_str()) == 0) {
        _originals.push_back(original);
        _undo.emplace_back([original, path] { PutBack(original, path); });
        SyncFolderOf(path);
    } else if (errno != ENOENT && errno != ENOTDIR) {
        ThrowSystemFailure("cannot remove '" + path + "'", errno);
    }
}

void HostChanges::Mark(std::string const& path) {
    Replace(path, "", 0600);
    // Gone before the first original: what is kept in part is kept.
    _originals.insert(_originals.begin(), path);
}

bool HostChanges::MakeFolder(std::string const& path, mode_t mode) {
    if (::mkdir(path.c_str(), mode) != 0) {
        if (errno == EEXIST) {
            return false;
        }
        ThrowSystemFailure("cannot make the folder '" + path + "'", errno);
    }
    _undo.emplace_back([path] { (void)::rmdir(path.c_str()); }); // stays where others use it
    if (::chmod(path.c_str(), mode) != 0) {                      // whatever the host's umask is
        ThrowSystemFailure("cannot give '" + path + "' its mode", errno);
    }
    return true;
}

void HostChanges::OnUndo(std::function<void()> step) {
    _undo.push_back(std::move(step));
}

void HostChanges::Keep() noexcept {
    _undo.clear();
    for (std::string const& original : _originals) {
        (void)::unlink(original.c_str()); // the next operation removes what stays
    }
    _originals.clear();
}

bool HostChanges::Undo() noexcept {
    bool whole = true;
    while (!_undo.empty()) {
        try {
            _undo.back()();
        } catch (std::exception const& e) {
            whole = false;
            LogWarning(std::string("cannot take a change back: ") + e.what());
        }
        _undo.pop_back();
    }
    _originals.clear();
    return whole;
}

void RestoreOriginals(std::vector<std::string> const& paths) {
    for (std::string const& path : paths) {
        std::string const target = Target(path);
        std::string const original = OriginalOf(target);
        if (FileExists(original)) {
            PutBack(original, target);
        }
    }
}

void RemoveTemporaryFiles(std::vector<std::string> const& paths) {
    std::set<std::string> folders;
    for (std::string const& path : paths) {
        folders.insert(FolderOf(Target(path)));
    }
    for (std::string const& folder : folders) {
        RemoveFiles(folder, [](std::string_view name) {
            return name.substr(0, sizeof Paths::TemporaryPrefix - 1) == Paths::TemporaryPrefix;
        });
    }
}

} // namespace tessel::winbind
