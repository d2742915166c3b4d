// SPDX-License-Identifier: Apache-2.0
#ifndef TSLAUTHCTL_NAMELOOKUP_H
#define TSLAUTHCTL_NAMELOOKUP_H

#include <optional>
#include <string>
#include <string_view>

/// Users and groups by the names that the host knows them by.
namespace tessel::tslauthctl {

struct KnownNames {
    /// As the name service has it; nothing where there is no such user.
    std::optional<std::string> user;
    std::optional<std::string> group;
    /// Whether the user may be nobody but the group: a directory whose users and groups share their
    /// numbers, such as winbindd's, gives a group an entry of a user as well.
    bool userIsGroup = false;
};

/// Asks the name service, and with it the domain; blocks for as long as that takes.
KnownNames LookUpName(std::string const& name);

/// Whether a text of passwd(5) has a user of that name.
bool HasUser(std::string_view passwd, std::string_view name);

} // namespace tessel::tslauthctl

#endif
