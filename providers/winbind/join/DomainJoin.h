// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "samba/Account.h"

#include <string>
#include <tslauth/tslauth_provider.h>

/// The two joins. Both find a controller, compare clocks, let Samba's tools make the secrets in a
/// staging folder, and only then change the host; see `Directory.h` for what a caller may rely on.
namespace tessel::winbind::DomainJoin {

void WithCredentials(std::string const& domain, std::string const& unit,
                     ActiveDirectoryClientCredentials const& credentials);

void WithMachineAccount(ActiveDirectoryClientDomainInformation const& information,
                        ActiveDirectoryClientMachineAccount const& account);

} // namespace tessel::winbind::DomainJoin
