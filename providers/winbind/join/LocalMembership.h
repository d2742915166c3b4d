// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "host/ChildProcess.h"
#include "host/HostFile.h"
#include "host/Membership.h"
#include "host/SambaFolders.h"

#include <string>

namespace tessel::winbind {

class Host;

/// The host's half of a membership: its files and its winbindd.
namespace LocalMembership {

struct Domain {
    SambaDomain samba;
    std::string dnsName;
    ProviderOptions options = {};
};

/// What the controller's half of a join has made.
struct Secrets {
    std::string database;
    std::string keytab; ///< empty: the host's stays as it is
};

/// Whether there is room for what winbindd writes when it starts.
/// @throws Failure 112 where there is not
void RequireRoom(Host const& host, SambaFolders const& folders);

/// Makes the host a member: secrets, configuration, winbindd, in this order, and then has a
/// controller confirm the secret. smb.conf is the last file: with it the host is joined.
/// @param changes takes everything back, winbindd included, where the caller does not keep it
/// @throws Failure, with `changes` holding what has been done so far
void Establish(Host const& host, SambaFolders const& folders, Domain const& domain,
               Secrets const& secrets, HostChanges& changes, Clock::time_point deadline);

/// Makes the host local again: smb.conf first, with which it is parted, then the rest.
/// @throws Failure before smb.conf is changed, and the host is as it was; 0xFFFF0002 later, where
///         the log names what is left, and the next operation goes on with it
void Dissolve(Host const& host, SambaFolders const& folders, Membership const& membership);

/// Puts in order what an operation that was killed has left: of a join, everything is as before it;
/// of a part, the rest is done. To be called under the lock.
/// @return whether smb.conf has changed by that, and with it perhaps the folders
bool CleanUp(Host const& host, SambaFolders const& folders, Clock::time_point deadline);

/// Whether a join or a part that did not end has changed the host. Where smb.conf names a
/// membership as well, that may be whole or not.
bool IsHalf(Host const& host);

/// The secrets that a join starts from, so that what others keep there comes along: those of before
/// a membership that was left in half.
std::string SecretsBeforeJoin(Host const& host, SambaFolders const& folders);

/// The same for the host's keytab.
std::string KeytabBeforeJoin(Host const& host);

/// The secrets of a host that is joined.
std::string SecretsOfMember(SambaFolders const& folders);

} // namespace LocalMembership

} // namespace tessel::winbind
