// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "host/ChildProcess.h"

#include <functional>
#include <string>

namespace tessel::winbind {

class Host;

/// Says of a domain, by its DNS name, whether one of its controllers can be reached.
typedef std::function<bool(std::string const& domain)> Reach;

/// Before a password is tried, on a host whose users may log in while no controller answers: tells
/// winbindd to go by its memory where none can be reached, and not to where one can again. By
/// itself it notices after minutes, in which it lets nobody in. Does nothing on other hosts. Needs
/// root.
///
/// Where none was reached, the next half minute does without a look, so that only the first of
/// several log-ins waits for one.
void TellWinbinddOfControllers(Host const& host, Reach const& isReachable,
                               Clock::time_point deadline);

} // namespace tessel::winbind
