// SPDX-License-Identifier: Apache-2.0
#include "SystemFile.h"

#include <algorithm>
#include <cerrno>
#include <cstring>
#include <fcntl.h>
#include <sys/stat.h>
#include <tslauth/AtomicFileStream.h>
#include <tslauth/Exceptions.h>
#include <unistd.h>

namespace tessel::authentication {

// Also in 32 bits: otherwise a file system with large inode numbers makes `stat` fail with
// EOVERFLOW for a file of any size. The definition stands in the project's compiler options.
static_assert(sizeof(off_t) == 8, "compile with _FILE_OFFSET_BITS=64");
// Likewise for a file with a time after January 2038.
static_assert(sizeof(time_t) == 8, "compile with _TIME_BITS=64");

namespace {

class Descriptor {
public:
    explicit Descriptor(int number) : _number(number) {}
    Descriptor(Descriptor const&) = delete;
    Descriptor& operator=(Descriptor const&) = delete;
    ~Descriptor() {
        // Nothing was written through it, so there is nothing that closing could lose.
        (void)::close(_number);
    }
    int Number() const {
        return _number;
    }

private:
    int _number;
};

/// Room for the whole file, plus a byte, so that one call reads it and the next one meets its end.
/// A special file has no size, and a large one is not trusted: a sparse file claims anything.
std::size_t FirstGuess(int file) {
    static constexpr off_t least = 4096;
    static constexpr off_t most = off_t{256} * 1024 * 1024;
    struct stat status = {};
    if (::fstat(file, &status) != 0) {
        return static_cast<std::size_t>(least);
    }
    return static_cast<std::size_t>(std::clamp(status.st_size + 1, least, most));
}

} // namespace

std::string SystemText(int error) {
    char buffer[256];
    // The GNU variant: the text is what is returned, in the buffer or not.
    return ::strerror_r(error, buffer, sizeof buffer);
}

void ThrowIOError(std::string const& what, int error) {
    throw IOError(what + ": " + SystemText(error));
}

std::string ReadFile(std::string const& path, char const* openFailure, OnReadError onReadError) {
    int const opened = ::open(path.c_str(), O_RDONLY | O_CLOEXEC);
    if (opened < 0) {
        int const error = errno;
        ThrowIOError(openFailure + (" '" + path + "'"), error);
    }
    Descriptor const file(opened);
    std::string text(FirstGuess(file.Number()), '\0');
    std::size_t length = 0;
    for (;;) {
        if (length == text.size()) {
            text.resize(2 * length);
        }
        ssize_t const count = ::read(file.Number(), &text[length], text.size() - length);
        if (count > 0) {
            length += static_cast<std::size_t>(count);
        } else if (count == 0) {
            break;
        } else if (errno != EINTR) {
            int const error = errno;
            if (onReadError == OnReadError::Throw) {
                ThrowIOError("Cannot read '" + path + "'", error);
            }
            break;
        }
    }
    text.resize(length);
    return text;
}

void ReplaceFile(std::string const& path, std::string_view text) {
    AtomicFileStream stream(path.c_str(), std::ios::out);
    if (!stream) {
        int const error = errno;
        ThrowIOError("Cannot open '" + path + "'", error);
    }
    stream.write(text.data(), static_cast<std::streamsize>(text.size()));
    stream.Sync();
    stream.Commit();
}

} // namespace tessel::authentication
