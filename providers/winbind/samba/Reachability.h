// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "host/ChildProcess.h"

#include <string>
#include <vector>

namespace tessel::winbind {

class Host;

/// Whether one of the first controllers of `domain` takes a connection. Says no as well where their
/// names cannot be had in time.
bool IsReachable(Host const& host, std::string const& domain, Clock::time_point deadline);

} // namespace tessel::winbind
