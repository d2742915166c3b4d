// SPDX-License-Identifier: Apache-2.0
#include "OneTimeCode.h"

#include "../winbind/Failure.h"
#include "Codes.h"

#include <algorithm>
#include <array>
#include <base/Descriptor.h>
#include <cerrno>
#include <cstring>
#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>
#include <utility>

namespace tessel::winbind::cam {

namespace {

/// Room for every code of the service, and for white space around it.
constexpr std::size_t MaximumSize = 256;

std::string Text(char const* operation, std::string const& path, int error) {
    return std::string(operation) + " '" + path + "': " + strerror(error);
}

bool IsBlank(char c) {
    return c == ' ' || c == '\t' || c == '\r' || c == '\n';
}

bool IsOfACode(char c) {
    return (c >= 'A' && c <= 'Z') || (c >= 'a' && c <= 'z') || (c >= '0' && c <= '9') || c == '-';
}

} // namespace

OneTimeCode::OneTimeCode(std::string path) : _path(std::move(path)) {}

OneTimeCode::~OneTimeCode() = default;

SecretText OneTimeCode::Read() const {
    // Without waiting: the path may be a pipe.
    base::Descriptor const file(
        open(_path.c_str(), O_RDONLY | O_CLOEXEC | O_NOFOLLOW | O_NONBLOCK));
    if (!file) {
        int const error = errno;
        std::string const text = Text("cannot open the one-time code", _path, error);
        if (error == ENOENT) {
            throw Failure(Codes::NoCodeOnThisHost, text);
        }
        throw Failure(error == ELOOP ? Codes::CodeNotProtected : Codes::Unknown, text);
    }
    struct stat status = {};
    if (fstat(file.Get(), &status) != 0) {
        throw Failure(Codes::Unknown, Text("cannot look at", _path, errno));
    }
    if (!S_ISREG(status.st_mode) || status.st_uid != geteuid() ||
        (status.st_mode & (S_IRWXG | S_IRWXO)) != 0) {
        throw Failure(Codes::CodeNotProtected,
                      "'" + _path +
                          "' must be a regular file of root that nobody else may read or write "
                          "(mode 0600); a code that others may have read should be revoked");
    }
    SecretText content(MaximumSize + 1);
    std::size_t size = 0;
    while (size < content.size()) {
        ssize_t const count = read(file.Get(), content.data() + size, content.size() - size);
        if (count < 0 && errno == EINTR) {
            continue;
        }
        if (count < 0) {
            throw Failure(Codes::Unknown, Text("cannot read", _path, errno));
        }
        if (count == 0) {
            break;
        }
        size += static_cast<std::size_t>(count);
    }
    auto const end = content.begin() + static_cast<std::ptrdiff_t>(size);
    auto const first = std::find_if_not(content.begin(), end, IsBlank);
    if (first == end) {
        throw Failure(Codes::NoCodeOnThisHost, "'" + _path + "' is empty");
    }
    auto last = end;
    while (IsBlank(*(last - 1))) {
        --last;
    }
    if (size > MaximumSize || !std::all_of(first, last, IsOfACode)) {
        throw Failure(Codes::InvalidParameter, "'" + _path + "' holds no one-time code");
    }
    return SecretText(first, last);
}

void OneTimeCode::Spend() const {
    {
        base::Descriptor const file(
            open(_path.c_str(), O_WRONLY | O_CLOEXEC | O_NOFOLLOW | O_NONBLOCK));
        struct stat status = {};
        if (file && fstat(file.Get(), &status) == 0 && S_ISREG(status.st_mode)) {
            std::array<char, MaximumSize> const zeros = {};
            auto const size = std::min<off_t>(status.st_size, MaximumSize);
            // Where it cannot be overwritten it is still removed.
            (void)!pwrite(file.Get(), zeros.data(), static_cast<std::size_t>(size), 0);
            (void)fsync(file.Get());
        }
    }
    if (unlink(_path.c_str()) != 0 && errno != ENOENT) {
        throw Failure(Codes::Unknown, Text("cannot remove the one-time code", _path, errno));
    }
}

} // namespace tessel::winbind::cam
