// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <tslauth/Domain.h>
#include <tslauth/tslauth_provider.h>

#include <string>
#include <vector>

/// What the provider does to the host and asks of the directory with the host's own account: the
/// part that runs Samba's programs in child processes. Everything here throws `Failure`, and may be
/// called from any thread; joining, parting and setting the controllers exclude each other, in this
/// process and among processes.
namespace tessel::winbind {

/// Joins the host to `domain`. A failure leaves the host as it was, but for
/// `HalfDone` (see `Failure.h`), which says that the directory may keep what the log names.
/// @param unit where the machine account is made: empty, a path "A/B" from the top, or a
///        distinguished name "OU=B,OU=A", with the domain's components or without
/// @param credentials an account that may join; neither text may be null
void JoinDomain(std::string const& domain, std::string const& unit,
                ActiveDirectoryClientCredentials const& credentials);

/// Joins the host with an account that was made for it: the first result of `account` is the
/// base64 text of an offline join, the second the controller that made it.
void JoinDomainWithMachineAccount(ActiveDirectoryClientDomainInformation const& information,
                                  ActiveDirectoryClientMachineAccount const& account);

/// Parts the host.
/// @param credentials null: the host's own account is tried; whether it could be deleted or not,
///        the host is local afterwards
void PartDomain(ActiveDirectoryClientCredentials const* credentials);

/// Keeps the controllers to ask first, in order, for this membership and later ones.
void SetPreferredDomainControllers(std::vector<std::string> const& controllers);
std::vector<std::string> GetPreferredDomainControllers();

/// The domain that the host is joined to, as the join recorded it; both names empty where it is
/// joined to none. Reads one file, and asks nobody.
authentication::Domain GetActiveDomain();

/// The distinguished name of the host's account, asked of a controller with that account; empty
/// where the host is joined to no domain.
std::string GetMachineAccountDN();

/// The controllers of `domain` as its DNS lists them, the preferred ones that it lists first.
/// Asks DNS alone, within 8 seconds.
std::vector<std::string> FindDomainControllers(std::string const& domain);

} // namespace tessel::winbind
