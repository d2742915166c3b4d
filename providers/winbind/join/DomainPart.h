// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <tslauth/tslauth_provider.h>

namespace tessel::winbind {

class Host;

/// Parts the host. A failure leaves it joined as it was, but for 0xFFFF0002: its account is deleted
/// in the directory, and the host is not local yet, or keeps what the log names; a further part
/// goes on with it.
/// @param credentials null: the host's own account is tried; whether it could be deleted or not,
///        the host is local afterwards
/// @throws Failure
void PartFromDomain(Host const& host, ActiveDirectoryClientCredentials const* credentials);

} // namespace tessel::winbind
