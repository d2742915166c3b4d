// SPDX-License-Identifier: Apache-2.0
#include "history/PathOnHost.h"

#include "setup/SetupHost.h"

#include <base/AsciiText.h>
#include <base/Descriptor.h>
#include <base/FileError.h>

#include <cerrno>
#include <cstdlib>
#include <fcntl.h>
#include <filesystem>
#include <sys/stat.h>
#include <system_error>
#include <unistd.h>

namespace tessel::tslauthctl {

namespace {

using Kind = PathState::Kind;

PathState FileState(std::string const& path) {
    base::Descriptor const file(
        ::open(path.c_str(), O_RDONLY | O_NONBLOCK | O_CLOEXEC | O_NOCTTY | O_NOFOLLOW));
    auto attributes = file ? base::ReadAttributes(file.Get()) : std::nullopt;
    if (!attributes) {
        throw base::FileError("read", path, errno);
    }
    return {Kind::file, std::move(*attributes), base::ReadAll(file.Get(), path)};
}

PathState LinkState(std::string const& path, struct stat const& status) {
    std::error_code error;
    auto target = std::filesystem::read_symlink(path, error).string();
    if (error) {
        throw base::FileError("read", path, error.value());
    }
    return {Kind::link, {0, status.st_uid, status.st_gid, {}}, std::move(target)};
}

void Remove(std::string const& path) {
    struct stat status = {};
    if (::lstat(path.c_str(), &status) != 0) {
        if (errno == ENOENT || errno == ENOTDIR) {
            return;
        }
        throw base::FileError("remove", path, errno);
    }
    bool const isFolder = S_ISDIR(status.st_mode);
    if ((isFolder ? ::rmdir(path.c_str()) : ::unlink(path.c_str())) != 0 &&
        !(isFolder && (errno == ENOTEMPTY || errno == EEXIST))) {
        throw base::FileError("remove", path, errno);
    }
    base::SyncFolderOf(path);
}

void PutLink(std::string const& path, PathState const& wanted) {
    // Beside its place, as a file that is replaced: there is a link at every moment.
    auto const slash = path.rfind('/') + 1;
    auto const temporary =
        path.substr(0, slash) + base::TemporaryPrefix + path.substr(slash) + ".link";
    (void)::unlink(temporary.c_str()); // of a process that was killed
    if (::symlink(wanted.text.c_str(), temporary.c_str()) != 0 ||
        ::lchown(temporary.c_str(), wanted.attributes.owner, wanted.attributes.group) != 0 ||
        ::rename(temporary.c_str(), path.c_str()) != 0) {
        int const error = errno;
        (void)::unlink(temporary.c_str()); // the failure matters more
        throw base::FileError("make", path, error);
    }
    base::SyncFolderOf(path);
}

/// Those that were there when the state was kept, and went with what was in them.
void MakeFoldersAbove(std::string const& path) {
    for (auto const& folder : MissingFolders(path)) {
        MakeFolder(folder);
    }
}

void PutFolder(std::string const& path, PathState const& wanted) {
    if (::mkdir(path.c_str(), 0700) != 0) {
        struct stat status = {};
        if (errno != EEXIST || ::lstat(path.c_str(), &status) != 0) {
            throw base::FileError("make", path, errno);
        }
        if (!S_ISDIR(status.st_mode)) {
            throw base::FileError("make", path, ENOTDIR);
        }
    }
    if (::chown(path.c_str(), wanted.attributes.owner, wanted.attributes.group) != 0 ||
        ::chmod(path.c_str(), wanted.attributes.mode) != 0) {
        throw base::FileError("make", path, errno);
    }
    base::SyncFolderOf(path);
}

} // namespace

PathState StateOnHost(std::string const& path) {
    struct stat status = {};
    if (::lstat(path.c_str(), &status) != 0) {
        if (errno == ENOENT || errno == ENOTDIR) {
            return {};
        }
        throw base::FileError("read", path, errno);
    }
    if (S_ISREG(status.st_mode)) {
        return FileState(path);
    }
    if (S_ISLNK(status.st_mode)) {
        return LinkState(path, status);
    }
    if (S_ISDIR(status.st_mode)) {
        return {Kind::folder, {status.st_mode & 07777, status.st_uid, status.st_gid, {}}, {}};
    }
    return {Kind::other, {}, {}};
}

PathStates StatesOnHost(std::vector<std::string> const& paths) {
    PathStates states;
    for (auto const& path : paths) {
        auto const& state = states[path] = StateOnHost(path);
        if (state.kind == Kind::link) {
            // What writes the file follows the link. What lies elsewhere, such as the resolver's
            // own file below /run, is written anew by whose it is.
            auto const destination = base::Destination(path);
            if (base::AsciiText::StartsWith(destination, "/etc/")) {
                states[destination] = StateOnHost(destination);
            }
        } else if (state.kind == Kind::absent) {
            for (auto& folder : MissingFolders(path)) {
                states[std::move(folder)] = {};
            }
        }
    }
    return states;
}

PathStates CurrentOf(PathStates const& states) {
    PathStates current;
    for (auto const& [path, state] : states) {
        current[path] = StateOnHost(path);
    }
    return current;
}

void PutStateOnHost(std::string const& path, PathState const& wanted) {
    switch (wanted.kind) {
    case Kind::absent:
        Remove(path);
        return;
    case Kind::file:
        MakeFoldersAbove(path);
        base::ReplaceFile(path, wanted.text,
                          {base::Links::Replace, wanted.attributes.mode, wanted.attributes});
        return;
    case Kind::link:
        MakeFoldersAbove(path);
        PutLink(path, wanted);
        return;
    case Kind::folder:
        PutFolder(path, wanted);
        return;
    case Kind::other:
        break;
    }
    throw base::FileError("put back", path, "it is neither a file nor a link nor a folder");
}

} // namespace tessel::tslauthctl
