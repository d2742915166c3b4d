// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <tslauth/tslauth_provider.h>

namespace tessel::winbind {

/// Parts the host; see `Directory.h`.
/// @param credentials null: the host's own account
void PartFromDomain(ActiveDirectoryClientCredentials const* credentials);

} // namespace tessel::winbind
