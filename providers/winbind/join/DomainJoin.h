// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <string>
#include <tslauth/tslauth_provider.h>

namespace tessel::winbind {

class Host;

/// The two joins. Both look at the host first, find a controller, compare clocks, let Samba's tools
/// make the secrets in a staging folder, and only then change the host.
///
/// A failure leaves the host and the directory as they were, whatever failed: a tool, a write, a
/// controller. Three codes say otherwise, and the log names what is left: 0xFFFF0001, the account
/// stays in the directory; 0xFFFF0002, the host is not as it was; 1311 with a controller that fell
/// silent, which may have made the account.
namespace DomainJoin {

/// @param unit where the machine account is made: empty, a path "A/B" from the top, or a
///        distinguished name "OU=B,OU=A", with the domain's components or without
/// @param credentials an account that may join; neither text may be null
/// @throws Failure
void WithCredentials(Host const& host, std::string const& domain, std::string const& unit,
                     ActiveDirectoryClientCredentials const& credentials);

/// With an account that was made for this host: the first result of `account` is the base64 text of
/// an offline join, the second the controller that made it.
/// @throws Failure
void WithMachineAccount(Host const& host, ActiveDirectoryClientDomainInformation const& information,
                        ActiveDirectoryClientMachineAccount const& account);

/// What `WithCredentials` would meet, one line each, "what: finding", with what would stop it.
/// Changes nothing, neither here nor in the directory; a join or a part that runs meanwhile is not
/// waited for.
/// @param credentials null: nobody's, and the directory tells of no unit and no account
/// @throws Failure where nothing can be told: no controller answers, an argument is malformed, the
///         credentials are refused
std::string Preview(Host const& host, std::string const& domain, std::string const& unit,
                    ActiveDirectoryClientCredentials const* credentials);

/// What can be known before a controller is asked: whether the host is joined already, the programs
/// are there, and a staging folder and room on the disks can be had. Changes nothing, and puts
/// nothing in order either; a join or a part that runs meanwhile is not waited for.
/// @throws Failure 2691, 1060, 112 and others
void RequireJoinable(Host const& host);

} // namespace DomainJoin

} // namespace tessel::winbind
