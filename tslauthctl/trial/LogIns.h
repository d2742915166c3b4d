// SPDX-License-Identifier: Apache-2.0
#ifndef TSLAUTHCTL_LOGINS_H
#define TSLAUTHCTL_LOGINS_H

#include <map>
#include <string>
#include <string_view>
#include <utility>
#include <vector>

/// Who of this host must still get in after a change, and whether they do. No file is opened here.
namespace tessel::tslauthctl {

/// One way in: a service and a user of this host.
using LogIn = std::pair<std::string, std::string>;

/// The service that stands for the name service: whether a user is found as the one he was.
inline constexpr char NameServiceTrial[] = "the name service";

/// What libpam says to each, as "Success" or in its other words; what the name service gives.
using LogInAnswers = std::map<LogIn, std::string>;

inline constexpr char LetIn[] = "Success";
/// Of a service that the host does not have: nobody comes in through it, before or after.
inline constexpr char NoSuchService[] = "no such service";

/// Root, and a local user with the right to become root: `caller` where that is one, or else the
/// first member of a group that has it.
/// @param passwd, group the texts of /etc/passwd and /etc/group
/// @param caller who has become root to run this; may be empty
std::vector<std::string> UsersToTry(std::string_view passwd, std::string_view group,
                                    std::string const& caller);

/// A sentence for each way in that there was before and is no longer.
std::vector<std::string> LogInsLost(LogInAnswers const& before, LogInAnswers const& after);

} // namespace tessel::tslauthctl

#endif
