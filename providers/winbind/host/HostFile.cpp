// SPDX-License-Identifier: Apache-2.0
#include "host/HostFile.h"

#include "Failure.h"
#include "Paths.h"
#include "host/SystemLog.h"

#include <algorithm>
#include <base/AsciiText.h>
#include <base/FileError.h>
#include <base/WholeFile.h>
#include <cerrno>
#include <dirent.h>
#include <exception>
#include <memory>
#include <set>
#include <string_view>
#include <sys/stat.h>
#include <unistd.h>

namespace tessel::winbind {

namespace {

std::string FolderOf(std::string const& path) {
    return path.substr(0, path.rfind('/') + 1);
}

std::string OriginalOf(std::string const& path) {
    return FolderOf(path) + base::TemporaryPrefix + path.substr(path.rfind('/') + 1) +
           Paths::OriginalSuffix;
}

/// Runs what reads or replaces a file, with the failures of this provider.
template <typename Operation> auto WithFailures(Operation operation) -> decltype(operation()) {
    try {
        return operation();
    } catch (base::FileError const& e) {
        throw Failure(CodeOfSystem(e.Error()), e.what());
    }
}

/// Where a file lies that may be reached through links, so that the links stay.
std::string Target(std::string const& path) {
    return WithFailures([&] { return base::Destination(path); });
}

void Rename(std::string const& from, std::string const& to) {
    if (::rename(from.c_str(), to.c_str()) != 0) {
        ThrowSystemFailure("cannot rename '" + from + "' to '" + to + "'", errno);
    }
    base::SyncFolderOf(to);
}

void RemoveDurably(std::string const& path) {
    RemoveHostFile(path);
    base::SyncFolderOf(path);
}

/// Undoes `HostChanges::Replace`. A rename over another link of the same file does nothing at all.
void PutBack(std::string const& original, std::string const& target) {
    Rename(original, target);
    RemoveDurably(original);
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

} // namespace

ActiveDirectoryClientErrorCode CodeOfSystem(int error) noexcept {
    switch (error) {
    case EACCES:
    case EPERM:
        return TSLAUTH_PROVIDER_ACCESS_DENIED;
    case ENOMEM:
        return TSLAUTH_PROVIDER_NOT_ENOUGH_MEMORY;
    case ENOSPC:
    case EDQUOT:
        return TSLAUTH_WINBIND_DISK_FULL;
    default:
        return TSLAUTH_WINBIND_SEE_SYSTEM_LOG;
    }
}

void ThrowSystemFailure(std::string const& what, int error) {
    throw Failure(CodeOfSystem(error), what + ": " + base::SystemText(error));
}

std::optional<std::string> ReadHostFile(std::string const& path) {
    return WithFailures([&] { return base::ReadFile(path); });
}

bool FileExists(std::string const& path) {
    struct stat status = {};
    if (::lstat(path.c_str(), &status) == 0) {
        return true;
    }
    if (errno != ENOENT && errno != ENOTDIR) {
        ThrowSystemFailure("cannot look at '" + path + "'", errno);
    }
    return false;
}

void RemoveHostFile(std::string const& path) {
    if (::unlink(path.c_str()) != 0 && errno != ENOENT && errno != ENOTDIR) {
        ThrowSystemFailure("cannot remove '" + path + "'", errno);
    }
}

void RemoveEmptyFolder(std::string const& path) {
    // One that others use, or have mounted something on, stays.
    if (::rmdir(path.c_str()) != 0 && errno != ENOTEMPTY && errno != EEXIST && errno != EBUSY &&
        errno != ENOENT && errno != ENOTDIR) {
        ThrowSystemFailure("cannot remove the folder '" + path + "'", errno);
    }
}

HostChanges::~HostChanges() {
    (void)Undo(); // who wants to know calls it first
}

void HostChanges::Replace(std::string const& path, std::string const& text, mode_t mode) {
    std::string const target = Target(path);
    if (FileExists(path) && !FileExists(target)) {
        // The link would be lost, and what it should lead to is not the provider's to make.
        throw Failure(TSLAUTH_WINBIND_SEE_SYSTEM_LOG, "'" + path + "' is a link to nothing");
    }
    WithFailures([&] {
        base::FileReplacement replacement(path, text, {base::Links::Follow, mode});
        if (replacement.Existed()) {
            SetAside(target);
        } else {
            _undo.emplace_back([target] { RemoveDurably(target); });
        }
        replacement.Commit();
    });
}

/// The original of a file that is about to be replaced: a second link, to be put back.
void HostChanges::SetAside(std::string const& target) {
    std::string const original = OriginalOf(target);
    RemoveHostFile(original);
    if (::link(target.c_str(), original.c_str()) != 0) {
        ThrowSystemFailure("cannot set '" + target + "' aside", errno);
    }
    _passing.push_back(original);
    _undo.emplace_back([original, target] { PutBack(original, target); });
}

void HostChanges::Remove(std::string const& path) {
    std::string const original = OriginalOf(path);
    RemoveHostFile(original);
    if (::rename(path.c_str(), original.c_str()) == 0) {
        _passing.push_back(original);
        _undo.emplace_back([original, path] { PutBack(original, path); });
        base::SyncFolderOf(path);
    } else if (errno != ENOENT && errno != ENOTDIR) {
        ThrowSystemFailure("cannot remove '" + path + "'", errno);
    }
}

void HostChanges::Mark(std::string const& path, std::string const& text) {
    Replace(path, text, 0600);
    // Gone before the first original: what is kept in part is kept.
    _passing.insert(_passing.begin(), path);
}

bool HostChanges::MakeFolder(std::string const& path, mode_t mode) {
    if (::mkdir(path.c_str(), mode) != 0) {
        if (errno == EEXIST) {
            return false;
        }
        ThrowSystemFailure("cannot make the folder '" + path + "'", errno);
    }
    _undo.emplace_back([path] { RemoveEmptyFolder(path); });
    if (::chmod(path.c_str(), mode) != 0) { // whatever the host's umask is
        ThrowSystemFailure("cannot give '" + path + "' its mode", errno);
    }
    return true;
}

void HostChanges::OnUndo(std::function<void()> step) {
    _undo.push_back(std::move(step));
}

void HostChanges::Keep() noexcept {
    _undo.clear();
    for (std::string const& path : _passing) {
        (void)::unlink(path.c_str()); // the next operation removes what stays
        // One by one: what a crash leaves of them must not be the mark without the originals' end.
        base::SyncFolderOf(path);
    }
    _passing.clear();
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
    _passing.clear();
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
            return base::AsciiText::StartsWith(name, base::TemporaryPrefix);
        });
    }
}

} // namespace tessel::winbind
