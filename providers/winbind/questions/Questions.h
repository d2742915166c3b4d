// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <tslauth/Domain.h>
#include <tslauth/tslauth_provider.h>

#include <string>
#include <vector>

/// What the provider answers about the host's domain, from winbindd where it knows. Every question
/// ends within `TSLAUTH_WINBIND_QUESTION_SECONDS`, may be asked from any thread, and fails with
/// `Failure` where nothing else is said.
namespace tessel::winbind {

class Host;

/// The domain that the host is joined to, as the join recorded it; both names empty where it is
/// joined to none. Reads two files, and asks nobody.
authentication::Domain GetActiveDomain(Host const& host);

/// The controllers to ask first, as they were set.
std::vector<std::string> GetPreferredDomainControllers(Host const& host);

/// The distinguished name of the host's account, asked of a controller with that account; empty
/// where the host is joined to no domain.
std::string GetMachineAccountDN(Host const& host);

/// One of TSLAUTH_WINBIND_TRUST_...; never fails for what winbindd or a controller do.
int GetDomainTrustState(Host const& host);

/// The state that a failed check of the host's secret means.
int TrustStateOf(ActiveDirectoryClientErrorCode code);

/// The domains whose users the host may know, its own domain not among them. None for a host that
/// is not joined.
std::vector<authentication::Domain> GetTrustedDomains(Host const& host);

/// The name of a controller of `domain`, which is a DNS or a NetBIOS name. A host that is not
/// joined asks DNS, which knows no NetBIOS names, and takes the first of what it lists.
/// @param site where the controller is to be; empty: anywhere. DNS alone is not asked for sites.
std::string GetAnyDomainController(Host const& host, std::string const& site,
                                   std::string const& domain);

/// The name under which the host knows the user `name`.
std::string ConvertCanonicalUsername(Host const& host, std::string const& name);

/// The host's Kerberos principal for users of `domain`, which is the host's own domain or one that
/// it trusts. It is the same for all of them: the host's account stands in its own domain, and the
/// controllers of the others refer to that.
std::string GetHostPrincipalForDomain(Host const& host, std::string const& domain);

/// Bits of TSLAUTH_WINBIND_TRUST_...; 0 for a domain without a trust.
int GetDomainTrustRelationship(Host const& host, std::string const& domain);

} // namespace tessel::winbind
