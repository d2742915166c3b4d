// SPDX-License-Identifier: Apache-2.0
#include "WholeFile.h"

#include "FileError.h"

#include <algorithm>
#include <cerrno>
#include <cstdio>
#include <cstdlib>
#include <fcntl.h>
#include <filesystem>
#include <sys/stat.h>
#include <system_error>

namespace tessel::base {

// Also in 32 bits: otherwise a file system with large inode numbers makes `stat` fail with
// EOVERFLOW for a file of any size. The definition stands in the project's compiler options.
static_assert(sizeof(off_t) == 8, "compile with _FILE_OFFSET_BITS=64");
// Likewise for a file with a time after January 2038.
static_assert(sizeof(time_t) == 8, "compile with _TIME_BITS=64");

namespace {

/// Reads to the end, or up to an error.
/// @param size what the file says, if it says so. A special file has none, and a large one is not
///     trusted: a sparse file claims anything.
/// @return 0 or the number of the error
int ReadUpToAnError(int descriptor, off_t size, std::string& text) {
    static constexpr off_t least = 4096;
    static constexpr off_t most = off_t{256} * 1024 * 1024;
    // A byte more than the file has, so that one call reads it and the next one meets its end.
    text.resize(static_cast<std::size_t>(std::clamp(size, off_t{0}, most - 1) + 1));
    text.resize(std::max(text.size(), static_cast<std::size_t>(least)));
    std::size_t length = 0;
    int error = 0;
    for (ssize_t count = 1; count != 0 && error == 0;) {
        if (length == text.size()) {
            text.resize(2 * length);
        }
        count = ::read(descriptor, &text[length], text.size() - length);
        if (count > 0) {
            length += static_cast<std::size_t>(count);
        } else if (count < 0 && errno != EINTR) {
            error = errno;
        }
    }
    text.resize(length);
    return error;
}

/// @return none where it cannot be opened; `errno` says why
Descriptor OpenToRead(std::string const& path) {
    return Descriptor(::open(path.c_str(), O_RDONLY | O_NONBLOCK | O_CLOEXEC | O_NOCTTY));
}

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

/// A folder, and the name in it.
std::size_t StartOfName(std::string const& path) {
    return path.rfind('/') + 1; // 0 where there is no slash
}

/// An ordinary user may not give files away, and keeps what the system gave.
bool GiveOwner(int descriptor, FileAttributes const& wanted) {
    return ::fchown(descriptor, wanted.owner, wanted.group) == 0 || ::geteuid() != 0;
}

/// In this order: a change of the owner clears bits of the mode, and an access control list brings
/// some.
bool GiveAttributes(int descriptor, FileAttributes const& wanted) {
    return GiveOwner(descriptor, wanted) && SetExtendedAttributes(descriptor, wanted.extended) &&
           ::fchmod(descriptor, wanted.mode) == 0;
}

} // namespace

std::string ReadAll(int descriptor, std::string const& path) {
    std::string text;
    if (int const error = ReadUpToAnError(descriptor, 0, text)) {
        throw FileError("read", path, error);
    }
    return text;
}

ReadableFile::ReadableFile(std::string const& path) : _path(path), _file(OpenToRead(path)) {
    if (!_file || ::fstat(_file.Get(), &_status) != 0) {
        throw FileError("read", _path, errno);
    }
}

std::string ReadableFile::Text() const {
    if (!IsRegular()) {
        throw FileError("read", _path, NotRegular);
    }
    std::string text;
    if (int const error = ReadUpToAnError(_file.Get(), _status.st_size, text)) {
        throw FileError("read", _path, error);
    }
    return text;
}

std::string ReadableFile::TextUpToAnError() const {
    std::string text;
    (void)ReadUpToAnError(_file.Get(), _status.st_size, text); // what came before it is the answer
    return text;
}

std::optional<std::string> ReadFile(std::string const& path) {
    try {
        return ReadableFile(path).Text();
    } catch (FileError const& failure) {
        if (failure.Error() == ENOENT || failure.Error() == ENOTDIR) {
            return std::nullopt;
        }
        throw;
    }
}

std::string Destination(std::string const& path) {
    auto const fail = [&path](int error) { throw FileError("follow", path, error); };
    std::filesystem::path current = path;
    // As many as the kernel follows before it speaks of a loop.
    for (int links = 0; links < 40; ++links) {
        std::error_code error;
        std::filesystem::path const folder =
            std::filesystem::weakly_canonical(current.parent_path(), error);
        if (error) {
            fail(error.value());
        }
        current = folder / current.filename();
        std::filesystem::file_status const status = std::filesystem::symlink_status(current, error);
        if (status.type() == std::filesystem::file_type::not_found) {
            return current.string();
        }
        if (error) {
            fail(error.value());
        }
        if (status.type() != std::filesystem::file_type::symlink) {
            return current.string();
        }
        std::filesystem::path const target = std::filesystem::read_symlink(current, error);
        if (error) {
            fail(error.value());
        }
        current = folder / target;
    }
    fail(ELOOP);
    return {};
}

void SyncFolderOf(std::string const& path) noexcept {
    // Without memory for the name there is nothing to sync with; the rename stands all the same.
    try {
        std::string const folder = path.substr(0, StartOfName(path));
        Descriptor const opened(
            ::open(folder.empty() ? "." : folder.c_str(), O_RDONLY | O_DIRECTORY | O_CLOEXEC));
        if (opened) {
            (void)::fsync(opened.Get()); // some file systems refuse
        }
    } catch (std::bad_alloc const&) {
        return;
    }
}

std::optional<FileAttributes> ReadAttributes(int file) {
    struct stat status = {};
    if (::fstat(file, &status) != 0) {
        return std::nullopt;
    }
    auto extended = ReadExtendedAttributes(file);
    if (!extended) {
        return std::nullopt;
    }
    return FileAttributes{status.st_mode & 07777, status.st_uid, status.st_gid,
                          std::move(*extended)};
}

FileReplacement::FileReplacement(std::string const& path, std::string_view text, Replacing how)
    : _path(path), _target(how.links == Links::Follow ? Destination(path) : path) {
    std::size_t const name = StartOfName(_target);
    _temporary = _target.substr(0, name) + TemporaryPrefix + _target.substr(name) + ".XXXXXX";
    _file = Descriptor(::mkostemp(_temporary.data(), O_CLOEXEC));
    if (!_file) {
        throw FileError("replace", _path, errno);
    }
    try {
        Fill(text, how);
    } catch (...) {
        (void)::unlink(_temporary.c_str()); // there is a failure on its way that matters more
        throw;
    }
}

void FileReplacement::Fill(std::string_view text, Replacing const& how) {
    Descriptor const old(
        ::open(_target.c_str(), O_RDONLY | O_NONBLOCK | O_CLOEXEC | O_NOCTTY | O_NOFOLLOW));
    // A link that is replaced by a file has nothing to keep.
    _existed = bool(old);
    if (!_existed && errno != ENOENT && errno != ELOOP) {
        throw FileError("replace", _path, errno);
    }
    struct stat status = {};
    if (_existed && ::fstat(old.Get(), &status) != 0) {
        throw FileError("replace", _path, errno);
    }
    if (_existed && !S_ISREG(status.st_mode)) {
        throw FileError("replace", _path, NotRegular);
    }
    auto wanted = how.attributes;
    if (!wanted && _existed && !(wanted = ReadAttributes(old.Get()))) {
        throw FileError("replace", _path, errno);
    }
    // All of it before the sync, so that nothing is durable without the rest.
    bool const filled =
        WriteAll(_file.Get(), text) &&
        (wanted ? GiveAttributes(_file.Get(), *wanted) : ::fchmod(_file.Get(), how.newMode) == 0) &&
        ::fsync(_file.Get()) == 0;
    if (!filled) {
        throw FileError("replace", _path, errno);
    }
}

FileReplacement::~FileReplacement() {
    if (!_temporary.empty()) {
        (void)::unlink(_temporary.c_str()); // what fails here stays under a name that tells it
    }
}

void FileReplacement::Commit() {
    if (::rename(_temporary.c_str(), _target.c_str()) != 0) {
        throw FileError("replace", _path, errno);
    }
    _temporary.clear();
    SyncFolderOf(_target);
}

void MakeFile(std::string const& path, std::string_view text, mode_t mode) {
    Descriptor const file(
        ::open(path.c_str(), O_WRONLY | O_CREAT | O_EXCL | O_CLOEXEC | O_NOCTTY, mode));
    if (!file || !WriteAll(file.Get(), text) || ::fchmod(file.Get(), mode) != 0 ||
        ::fsync(file.Get()) != 0) {
        throw FileError("make", path, errno);
    }
}

void ReplaceFile(std::string const& path, std::string_view text, Replacing how) {
    FileReplacement(path, text, how).Commit();
}

} // namespace tessel::base
