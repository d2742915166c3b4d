// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "samba/DirectorySearch.h"
#include "text/AccountAnswer.h"

#include <chrono>
#include <string>

/// Whether the domain lets a user log in, for who asks without a password: a key, a ticket or a job
/// is none of a controller's business, unless somebody asks.
namespace tessel::winbind {

class Host;

/// What an account's attributes say. An account whose state the host may not read is `NoAnswer`.
/// @param entry `userAccountControl`, `msDS-User-Account-Control-Computed` and `accountExpires`, as
///     the directory has them (MS-ADTS 2.2.16, 3.1.1.4.5.17, MS-ADA1 2.2)
/// @param now by the host's clock
AccountAnswer StateOfAccount(DirectoryEntry const& entry,
                             std::chrono::system_clock::time_point now);

/// Asks winbindd who `user` is, a name in any form that the name service takes, and a controller of
/// his domain for his account. Needs root. Every failure is `NoAnswer`, with its cause in the
/// system log; where no controller is reached it is `OffLine` on a host that lets users in then.
/// @param deadline for each of them; a controller of another domain may have to be found before, in
///     the time of a question
AccountAnswer AskAboutAccount(Host const& host, std::string const& user,
                              Clock::time_point deadline);

} // namespace tessel::winbind
