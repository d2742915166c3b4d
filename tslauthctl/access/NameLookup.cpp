// SPDX-License-Identifier: Apache-2.0
#include "access/NameLookup.h"

#include <base/AsciiText.h>

#include <cerrno>
#include <grp.h>
#include <pwd.h>
#include <vector>

namespace tessel::tslauthctl {

namespace {

/// A group has room for its members in it.
constexpr std::size_t firstRoom = 4096;
constexpr std::size_t mostRoom = std::size_t(64) << 20;

/// @param get getpwnam_r or getgrnam_r
template <typename Entry, typename Get>
std::optional<std::string> Find(std::string const& name, Get get, char* Entry::*field) {
    for (std::size_t room = firstRoom; room <= mostRoom; room *= 4) {
        std::vector<char> buffer(room);
        Entry entry = {};
        Entry* found = nullptr;
        int const error = get(name.c_str(), &entry, buffer.data(), buffer.size(), &found);
        if (error != ERANGE) {
            return found ? std::optional<std::string>(found->*field) : std::nullopt;
        }
    }
    return std::nullopt;
}

} // namespace

KnownNames LookUpName(std::string const& name) {
    return {Find<passwd>(name, getpwnam_r, &passwd::pw_name),
            Find<group>(name, getgrnam_r, &group::gr_name)};
}

bool HasUser(std::string_view passwd, std::string_view name) {
    while (!passwd.empty()) {
        auto const line = base::AsciiText::TakeLine(passwd);
        if (line.substr(0, line.find(':')) == name) {
            return true;
        }
    }
    return false;
}

} // namespace tessel::tslauthctl
