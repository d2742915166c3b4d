// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "host/ChildProcess.h"
#include "text/ControllerAnswer.h"

#include <string>
#include <vector>

namespace tessel::winbind {

class Host;
class SambaTools;

/// Finds a domain's controllers: DNS names them, and each of them is asked what it is.
namespace DomainDiscovery {

/// The first writable controller of `domain` that answers: the preferred ones, then DNS's.
/// @throws Failure as `Host::AskDNS` where DNS is needed, 1311 where none of them answers by
///         `deadline`
ControllerAnswer FindController(Host const& host, SambaTools const& tools,
                                std::string const& domain,
                                std::vector<std::string> const& preferred,
                                Clock::time_point deadline);

/// Whether an account with the NetBIOS name `computer` would be that of the controller that gave
/// `answer`, or of one of the `others`, which are DNS names.
bool IsNameOfController(std::string const& computer, ControllerAnswer const& answer,
                        std::vector<std::string> const& others);

/// Keeps a host from the name of a controller: Samba's `net` joins as any account that the user may
/// change, and a controller whose secret is changed serves nobody any more.
/// @throws Failure 1210
void CheckHostName(Host const& host, std::string const& computer, ControllerAnswer const& answer,
                   std::string const& domain);

/// @throws Failure 1398 where the controller's clock and the host's are more apart than Kerberos
///         stands
/// @return how far the controller's is ahead
std::chrono::seconds CheckClock(SambaTools const& tools, std::string const& controller,
                                Clock::time_point deadline);

} // namespace DomainDiscovery

} // namespace tessel::winbind
