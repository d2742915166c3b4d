// SPDX-License-Identifier: Apache-2.0
#include <tslauth/AtomicFileStream.h>

#include "Assertion.h"
#include "SystemFile.h"

#include <base/WholeFile.h>
#include <cerrno>
#include <cstdio>
#include <cstdlib>
#include <sys/stat.h>
#include <tslauth/Exceptions.h>
#include <unistd.h>

namespace tessel::authentication {

namespace {

/// The descriptor of an open stream. The standard library knows it and does not tell, but lets
/// derived classes at the file that holds it. Opening the file a second time instead could miss an
/// error that the kernel reports once for each opened file.
int DescriptorOf(std::filebuf& buffer) {
    struct Access : std::filebuf {
        static int Number(std::filebuf& any) {
            return (any.*(&Access::_M_file)).fd();
        }
    };
    return Access::Number(buffer);
}

/// Makes a file durable that is to take the place of another, with the mode of that one. A mode set
/// after the sync could be lost in a crash that keeps the rename.
bool SyncInPlaceOf(std::string const& target, int descriptor) {
    struct stat old = {};
    if (::stat(target.c_str(), &old) == 0) {
        (void)::fchmod(descriptor, old.st_mode & 07777); // `Commit` finds out what fails here
    }
    return ::fsync(descriptor) == 0;
}

/// Turns a stream's exceptions off for a scope: what they would report is checked, or is not meant
/// to stop a commit half-way.
class WithoutExceptions {
public:
    explicit WithoutExceptions(std::ios& stream) : _stream(stream), _mask(stream.exceptions()) {
        _stream.exceptions(std::ios::goodbit);
    }
    WithoutExceptions(WithoutExceptions const&) = delete;
    WithoutExceptions& operator=(WithoutExceptions const&) = delete;
    ~WithoutExceptions() {
        try {
            _stream.exceptions(_mask);
        } catch (std::ios::failure const&) {
            // Setting the mask throws when the state is bad already, and has been set by then.
        }
    }

private:
    std::ios& _stream;
    std::ios::iostate _mask;
};

} // namespace

AtomicFileStream::AtomicFileStream(char const* path, std::ios::openmode mode) {
    open(path, mode);
}

AtomicFileStream::~AtomicFileStream() = default;

void AtomicFileStream::open(char const* path, std::ios::openmode mode) {
    if (!(mode & ~std::ios::in)) {
        FailAssertion("mode & ~std::ios::in", "lib/tslauth/AtomicFileStream", __LINE__,
                      "void tessel::authentication::AtomicFileStream::open(const char*, "
                      "std::ios_base::openmode)");
    }
    char name[4096];
    // A path that does not fit loses its six placeholders, which `mkstemp` then refuses.
    (void)std::snprintf(name, sizeof name, "%s.XXXXXX", path);
    int const created = ::mkstemp(name);
    if (created < 0) {
        int const error = errno;
        ThrowIOError("Unable to create temporary file to write '" + std::string(path) + "'", error);
    }
    // Nothing was written through this descriptor; the stream opens the file by its name.
    (void)::close(created);
    _tempName = name;
    _targetName = path;
    WithoutExceptions const quiet(*this);
    // What stays where the stream refuses a combination of modes without asking the system.
    errno = EINVAL;
    if (rdbuf()->open(_tempName, mode | std::ios::out)) {
        clear();
    } else {
        setstate(std::ios::failbit);
    }
}

void AtomicFileStream::Sync() {
    WithoutExceptions const quiet(*this);
    // A stream that failed before writes nothing here, and the error number is still that of the
    // failure. There is none when the stream's state was set by hand.
    flush();
    int error = 0;
    if (fail()) {
        error = errno != 0 ? errno : EIO;
    } else if (!is_open()) {
        error = EBADF;
    } else if (!SyncInPlaceOf(_targetName, DescriptorOf(*rdbuf()))) {
        error = errno;
        setstate(std::ios::badbit);
    }
    if (error != 0) {
        ThrowIOError("Cannot write '" + _targetName + "'", error);
    }
}

void AtomicFileStream::Commit() {
    WithoutExceptions const quiet(*this);
    if (!rdbuf()->close()) {
        // Not reported, and the rename goes on: only `Sync` vouches for the contents.
        setstate(std::ios::failbit);
    }

    std::string permissionError;
    struct stat old = {};
    errno = 0;
    bool const known = ::stat(_targetName.c_str(), &old) == 0;
    if (!known && errno != ENOENT) {
        permissionError = SystemText(errno);
    }

    if (::rename(_tempName.c_str(), _targetName.c_str()) != 0) {
        int const error = errno;
        // What is left behind is nobody's but ours, whatever mode `Sync` gave it.
        (void)::chmod(_tempName.c_str(), 0600);
        ThrowIOError("Unable to rename '" + _tempName + "' to '" + _targetName + "'", error);
    }
    // Once more: the target's mode may be a later one than `Sync` saw, which need not have been
    // called.
    if (known && ::chmod(_targetName.c_str(), old.st_mode & 07777) != 0) {
        permissionError = SystemText(errno);
    }
    base::SyncFolderOf(_targetName);
    if (!permissionError.empty()) {
        throw FilePermissionError(
            "Failed to save file permissions, file permissions may be incorrect: " +
            permissionError);
    }
}

} // namespace tessel::authentication
