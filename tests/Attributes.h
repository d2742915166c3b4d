// SPDX-License-Identifier: Apache-2.0
#ifndef TESTS_ATTRIBUTES_H
#define TESTS_ATTRIBUTES_H

#include <cstddef>
#include <cstdint>
#include <map>
#include <string>
#include <sys/types.h>
#include <sys/xattr.h>

/// The extended attributes of files, as tests set and compare them.
namespace attributes {

constexpr char AccessList[] = "system.posix_acl_access";
constexpr char DefaultList[] = "system.posix_acl_default";

/// What acl(5) calls an access control list, in the kernel's form: rw for the owner, r for the user
/// with that number, r for the group, nothing for others.
inline std::string ListFor(std::uint32_t user) {
    struct Entry {
        std::uint16_t tag, permissions;
        std::uint32_t id;
    };
    constexpr std::uint32_t none = 0xffffffff;
    Entry const entries[] = {
        {0x01, 6, none}, {0x02, 4, user}, {0x04, 4, none}, {0x10, 4, none}, {0x20, 0, none}};
    std::uint32_t const version = 2;
    std::string list(reinterpret_cast<char const*>(&version), sizeof version);
    return list.append(reinterpret_cast<char const*>(entries), sizeof entries);
}

/// @return whether the file system and the process's rights allow it
inline bool Set(std::string const& path, char const* name, std::string const& value) {
    return ::setxattr(path.c_str(), name, value.data(), value.size(), 0) == 0;
}

inline std::map<std::string, std::string> Of(std::string const& path) {
    char names[4096];
    char value[4096];
    std::map<std::string, std::string> result;
    ssize_t const size = ::listxattr(path.c_str(), names, sizeof names);
    for (ssize_t at = 0; at < size;) {
        std::string const name = names + at;
        at += static_cast<ssize_t>(name.size()) + 1;
        ssize_t const length = ::getxattr(path.c_str(), name.c_str(), value, sizeof value);
        result[name] =
            length < 0 ? "(unreadable)" : std::string(value, static_cast<std::size_t>(length));
    }
    return result;
}

} // namespace attributes

#endif
