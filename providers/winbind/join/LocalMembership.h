// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "host/HostFile.h"
#include "host/Membership.h"
#include "samba/SambaTools.h"

#include <string>

/// The host's half of a membership: its files and its winbindd.
namespace tessel::winbind::LocalMembership {

struct Domain {
    SambaDomain samba;
    std::string dnsName;
};

/// Makes the host a member: secrets, configuration, winbindd, in this order, and then has a
/// controller confirm the secret. smb.conf is the last file: with it the host is joined.
/// @param changes takes everything back, winbindd included, where the caller does not keep it
/// @throws Failure, with `changes` holding what has been done so far
void Establish(Domain const& domain, std::string const& secrets, HostChanges& changes,
               Clock::time_point deadline);

/// Makes the host local again: smb.conf first, with which it is parted, then the rest.
/// @throws Failure before smb.conf is changed; what fails later is logged, and the next operation
///         goes on with it
void Dissolve(Membership const& membership, Clock::time_point deadline);

/// Puts in order what an operation that was killed has left: of a join, everything is as before it;
/// of a part, the rest is done. To be called under the lock.
void CleanUp(Clock::time_point deadline);

/// Makes a host local again that a join or a part which was killed has left with a membership in half.
/// A host that is joined, or not, stays as it is. To be called after `CleanUp`, where a part, which would
/// delete the account as well, is not what is asked for.
void FinishOpenChange(Clock::time_point deadline);

} // namespace tessel::winbind::LocalMembership
