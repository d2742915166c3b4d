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
/// @param take called with the entry, where there is one
template <typename Entry, typename Get, typename Take>
void Find(std::string const& name, Get get, Take take) {
    for (std::size_t room = firstRoom; room <= mostRoom; room *= 4) {
        std::vector<char> buffer(room);
        Entry entry = {};
        Entry* found = nullptr;
        int const error = get(name.c_str(), &entry, buffer.data(), buffer.size(), &found);
        if (error != ERANGE) {
            if (found) {
                take(*found);
            }
            return;
        }
    }
}

} // namespace

KnownNames LookUpName(std::string const& name) {
    KnownNames known;
    std::optional<gid_t> ownGroup;
    Find<passwd>(name, getpwnam_r, [&](passwd const& user) {
        known.user = user.pw_name;
        if (user.pw_uid == user.pw_gid) {
            ownGroup = user.pw_gid;
        }
    });
    Find<group>(name, getgrnam_r, [&](group const& group) {
        known.group = group.gr_name;
        known.userIsGroup = ownGroup == group.gr_gid;
    });
    return known;
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
