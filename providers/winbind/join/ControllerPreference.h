// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <string>
#include <vector>

namespace tessel::winbind {

class Host;

/// Keeps the controllers to ask first, in order, for this membership and later ones. A failure
/// leaves all as it was, unless its code is 0xFFFF0002.
/// @throws Failure
void SetPreferredDomainControllers(Host const& host, std::vector<std::string> const& controllers);

} // namespace tessel::winbind
