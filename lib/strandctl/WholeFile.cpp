// SPDX-License-Identifier: Apache-2.0
#include "WholeFile.h"

#include <cerrno>
#include <cstdio>
#include <cstdlib>
#include <fcntl.h>
#include <filesystem>
#include <strandctl/HostCtlException.h>
#include <sys/stat.h>
#include <sys/types.h>
#include <system_error>
#include <unistd.h>

namespace StrandCtl {

namespace {

class Descriptor {
public:
    explicit Descriptor(int number) : _number(number) {}
    Descriptor(Descriptor const&) = delete;
    Descriptor& operator=(Descriptor const&) = delete;
    ~Descriptor() {
        if (_number >= 0) {
            (void)::close(_number); // what was written is synced before, and a reader loses nothing
        }
    }

    int Get() const {
        return _number;
    }

private:
    int _number;
};

/// The new file, until it has taken the target's place.
class TemporaryFile {
public:
    explicit TemporaryFile(std::string const& target)
        : _name(target + ".XXXXXX"), _descriptor(::mkostemp(_name.data(), O_CLOEXEC)),
          _exists(_descriptor.Get() >= 0) {}
    TemporaryFile(TemporaryFile const&) = delete;
    TemporaryFile& operator=(TemporaryFile const&) = delete;
    ~TemporaryFile() {
        if (_exists) {
            (void)::unlink(_name.c_str()); // there is a failure on its way that matters more
        }
    }

    int Get() const {
        return _descriptor.Get();
    }
    bool MoveTo(std::string const& target) {
        if (::rename(_name.c_str(), target.c_str()) != 0) {
            return false;
        }
        _exists = false;
        return true;
    }

private:
    std::string _name;
    Descriptor _descriptor;
    bool _exists;
};

bool WriteAll(int descriptor, std::string_view text) {
    while (!text.empty()) {
        ssize_t const written = ::write(descriptor, text.data(), text.size());
        if (written >= 0) {
            text.remove_prefix(static_cast<std::size_t>(written));
        } else if (errno != EINTR) {
            return false;
        }
    }
    return true;
}

/// Best effort: the target is in place and whole, some file systems refuse to sync a folder, and
/// what a crash could undo is only the rename, back to the old whole file.
void SyncFolderOf(std::string const& path) {
    Descriptor const folder(
        ::open(path.substr(0, path.rfind('/') + 1).c_str(), O_RDONLY | O_DIRECTORY | O_CLOEXEC));
    if (folder.Get() >= 0) {
        (void)::fsync(folder.Get());
    }
}

} // namespace

void ThrowSystemError(std::string const& what, int error) {
    throw HostCtl::Lib::HostCtlException(what + ": " + std::generic_category().message(error));
}

std::optional<std::string> ReadFile(std::string const& path) {
    std::string const failure = "Cannot read '" + path + "'";
    // Not blocking, so that a pipe in the file's place is found out and not waited for.
    Descriptor const file(::open(path.c_str(), O_RDONLY | O_NONBLOCK | O_CLOEXEC));
    if (file.Get() < 0) {
        int const error = errno;
        if (error == ENOENT) {
            return std::nullopt;
        }
        ThrowSystemError(failure, error);
    }
    struct stat status = {};
    if (::fstat(file.Get(), &status) != 0) {
        int const error = errno;
        ThrowSystemError(failure, error);
    }
    if (!S_ISREG(status.st_mode)) {
        throw HostCtl::Lib::HostCtlException(failure + ": it is not a regular file");
    }
    std::string text;
    char buffer[16384];
    for (;;) {
        ssize_t const count = ::read(file.Get(), buffer, sizeof buffer);
        if (count == 0) {
            return text;
        }
        if (count > 0) {
            text.append(buffer, static_cast<std::size_t>(count));
        } else if (errno != EINTR) {
            int const error = errno;
            ThrowSystemError(failure, error);
        }
    }
}

std::string Destination(std::string const& path) {
    std::string const failure = "Cannot follow '" + path + "'";
    std::filesystem::path current = path;
    // As many as the kernel follows before it speaks of a loop.
    for (int links = 0; links < 40; ++links) {
        std::error_code error;
        std::filesystem::path folder =
            std::filesystem::weakly_canonical(current.parent_path(), error);
        if (error) {
            ThrowSystemError(failure, error.value());
        }
        current = folder / current.filename();
        std::filesystem::file_status const status = std::filesystem::symlink_status(current, error);
        if (status.type() == std::filesystem::file_type::not_found) {
            return current.string();
        }
        if (error) {
            ThrowSystemError(failure, error.value());
        }
        if (status.type() != std::filesystem::file_type::symlink) {
            return current.string();
        }
        std::filesystem::path const target = std::filesystem::read_symlink(current, error);
        if (error) {
            ThrowSystemError(failure, error.value());
        }
        current = folder / target;
    }
    ThrowSystemError(failure, ELOOP);
}

void ReplaceFile(std::string const& path, std::string_view text) {
    std::string const failure = "Cannot replace '" + path + "'";
    std::string const target = Destination(path);
    struct stat old = {};
    bool const known = ::stat(target.c_str(), &old) == 0;
    if (!known && errno != ENOENT) {
        int const error = errno;
        ThrowSystemError(failure, error);
    }
    if (known && !S_ISREG(old.st_mode)) {
        throw HostCtl::Lib::HostCtlException(failure + ": it is not a regular file");
    }
    TemporaryFile file(target);
    if (known && file.Get() >= 0) {
        // Best effort: an ordinary user may not give files away. Before the mode, since giving a
        // file away clears bits of it.
        int const ignored = ::fchown(file.Get(), old.st_uid, old.st_gid);
        (void)ignored;
    }
    mode_t const mode = known ? old.st_mode & 07777 : 0644;
    if (file.Get() < 0 || !WriteAll(file.Get(), text) || ::fchmod(file.Get(), mode) != 0 ||
        ::fsync(file.Get()) != 0 || !file.MoveTo(target)) {
        int const error = errno;
        ThrowSystemError(failure, error);
    }
    SyncFolderOf(target);
}

} // namespace StrandCtl
