// SPDX-License-Identifier: Apache-2.0
#ifndef BENCH_FLOOR_H
#define BENCH_FLOOR_H

#include <array>
#include <cerrno>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <fcntl.h>
#include <memory>
#include <new>
#include <string>
#include <string_view>
#include <sys/stat.h>
#include <sys/uio.h>
#include <system_error>
#include <unistd.h>

/// What each hot path costs at least: its system calls, one by one, and no more work on the bytes
/// than the result needs. No checks of the text, no values, no stream. tools/bench compares the
/// system calls with the library's, and each case compares the files that both leave.
namespace Floor {

struct Free {
    void operator()(char* memory) const {
        std::free(memory);
    }
};

/// Bytes that are not set to zero before something is read into them.
using Bytes = std::unique_ptr<char, Free>;

inline Bytes Allocate(std::size_t size) {
    Bytes bytes(static_cast<char*>(std::malloc(size)));
    if (bytes == nullptr) {
        throw std::bad_alloc();
    }
    return bytes;
}

inline int Checked(int result) {
    if (result < 0) {
        throw std::system_error(errno, std::generic_category(), "floor");
    }
    return result;
}

struct File {
    Bytes bytes;
    std::size_t size;

    std::string_view Text() const {
        return {bytes.get(), size};
    }
};

/// open, fstat, read, read, close
inline File Read(char const* path) {
    int const file = Checked(::open(path, O_RDONLY | O_CLOEXEC));
    struct stat status = {};
    Checked(::fstat(file, &status));
    auto const room = static_cast<std::size_t>(status.st_size) + 1;
    File result{Allocate(room), 0};
    for (;;) {
        ssize_t const count = ::read(file, result.bytes.get() + result.size, room - result.size);
        if (count <= 0) {
            break;
        }
        result.size += static_cast<std::size_t>(count);
    }
    ::close(file);
    return result;
}

/// Replaces a file through a temporary one: `write(descriptor)` fills it.
/// openat (mkstemp), close, openat, ..., stat, fchmod, fsync, close, stat, rename, chmod, and for
/// the folder openat, fsync, close
template <typename Write> void Replace(std::string const& path, Write write) {
    char name[4096];
    char const* const target = path.c_str();
    std::snprintf(name, sizeof name, "%s.XXXXXX", target);
    ::close(Checked(::mkstemp(name)));
    int const file = Checked(::open(name, O_WRONLY | O_CREAT | O_TRUNC, 0666));
    write(file);
    struct stat old = {};
    Checked(::stat(target, &old));
    Checked(::fchmod(file, old.st_mode & 07777));
    Checked(::fsync(file));
    ::close(file);
    Checked(::stat(target, &old));
    Checked(::rename(name, target));
    Checked(::chmod(target, old.st_mode & 07777));
    name[path.rfind('/') + 1] = '\0';
    int const folder = Checked(::open(name, O_RDONLY | O_DIRECTORY | O_CLOEXEC));
    Checked(::fsync(folder));
    ::close(folder);
}

/// As above, all at once.
template <std::size_t Count> void Replace(std::string const& path, iovec const (&pieces)[Count]) {
    Replace(path, [&](int file) {
        Checked(static_cast<int>(::writev(file, pieces, static_cast<int>(Count))));
    });
}

inline iovec Piece(char const* begin, char const* end) {
    return {const_cast<char*>(begin), static_cast<std::size_t>(end - begin)};
}

inline iovec Piece(std::string_view text) {
    return Piece(text.data(), text.data() + text.size());
}

inline char const* Find(char const* begin, char const* end, std::string_view what) {
    void const* const found =
        ::memmem(begin, static_cast<std::size_t>(end - begin), what.data(), what.size());
    return found == nullptr ? end : static_cast<char const*>(found);
}

/// Where an entry goes into the stack whose lines begin at `stack` and end with an empty line:
/// behind the line of pam_access.so. Looks whether it is there already, as the edit must.
inline char const* PlaceInStack(char const* stack, char const* end, std::string_view line,
                                std::string_view access) {
    char const* const behind = Find(stack, end, "\n\n");
    if (Find(stack, behind, line) != behind) {
        return nullptr;
    }
    char const* const found = Find(stack, behind, access);
    return found == behind ? stack : Find(found, end, "\n") + 1;
}

/// The edit of a normalised PAM policy: finds the two places, and lets the kernel put the pieces
/// together. `account` and `auth` are the two lines to insert.
inline void EditPAMPolicy(char const* source, std::string const& target, std::string_view account,
                          std::string_view auth) {
    static constexpr std::string_view access = "\t/lib/security/$ISA/pam_access.so\t";
    File const file = Read(source);
    char const* const begin = file.bytes.get();
    char const* const end = begin + file.size;
    char const* const first =
        PlaceInStack(Find(begin, end, "\n\naccount\t") + 2, end, account, access);
    char const* const second = PlaceInStack(Find(first, end, "\n\nauth\t") + 2, end, auth, access);
    iovec const pieces[] = {Piece(begin, first), Piece(account), Piece(first, second), Piece(auth),
                            Piece(second, end)};
    Replace(target, pieces);
}

/// The databases in the order in which they are written.
inline constexpr std::array<std::string_view, 15> Databases = {
    "passwd", "group", "shadow",   "hosts",      "netmasks",  "networks",  "protocols", "services",
    "ethers", "rpc",   "netgroup", "bootparams", "publickey", "automount", "aliases"};

/// Two letters tell the databases apart.
constexpr std::size_t DatabaseHash(char const* word) {
    return (2U * static_cast<unsigned char>(word[0]) + 11U * static_cast<unsigned char>(word[3])) %
           32;
}

/// What stands on a line of nsswitch.conf before the services.
inline std::size_t DatabaseOf(char const* line) {
    static constexpr auto places = [] {
        std::array<unsigned char, 32> table{};
        for (std::size_t i = 0; i < Databases.size(); ++i) {
            char const word[] = {Databases[i][0], ' ', ' ',
                                 Databases[i].size() > 3 ? Databases[i][3] : ':'};
            table[DatabaseHash(word)] = static_cast<unsigned char>(i);
        }
        return table;
    }();
    return places[DatabaseHash(line)];
}

/// The edit of a name-service switch file whose databases may stand on several lines, which the
/// result joins: measures, and then copies each line's services to their place.
inline void EditNSSConfiguration(char const* source, std::string const& target,
                                 std::string_view service) {
    File const file = Read(source);
    char const* const begin = file.bytes.get();
    char const* const end = begin + file.size;
    std::array<std::size_t, Databases.size()> sizes{};
    auto const forEachLine = [&](auto take) {
        for (char const* line = begin; line != end;) {
            char const* const feed = static_cast<char const*>(
                std::memchr(line, '\n', static_cast<std::size_t>(end - line)));
            std::size_t const database = DatabaseOf(line);
            take(database, Piece(line + Databases[database].size() + 1, feed));
            line = feed + 1;
        }
    };
    forEachLine([&](std::size_t database, iovec services) { sizes[database] += services.iov_len; });

    Bytes const room = Allocate(file.size + 3 * (service.size() + 1));
    std::array<char*, Databases.size()> places{};
    char* at = room.get();
    for (std::size_t i = 0; i < Databases.size(); ++i) {
        if (sizes[i] == 0) {
            continue;
        }
        at += Databases[i].copy(at, Databases[i].size());
        *at++ = ':';
        if (i < 3) {
            *at++ = ' ';
            at += service.copy(at, service.size());
        }
        places[i] = at;
        at += sizes[i];
        *at++ = '\n';
    }
    forEachLine([&](std::size_t database, iovec services) {
        std::memcpy(places[database], services.iov_base, services.iov_len);
        places[database] += services.iov_len;
    });
    iovec const pieces[] = {Piece(room.get(), at)};
    Replace(target, pieces);
}

} // namespace Floor

#endif
