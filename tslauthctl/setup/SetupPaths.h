// SPDX-License-Identifier: Apache-2.0
#ifndef TSLAUTHCTL_SETUPPATHS_H
#define TSLAUTHCTL_SETUPPATHS_H

#include <tslauth/Paths.h>

/// The fixed paths of a host that the library knows nothing of.
namespace tessel::tslauthctl::Paths {

using namespace authentication::Paths;

/// What is installed: the policy that a host begins with, and what each provider asks of a host.
inline constexpr char DefaultPolicy[] = "/usr/share/tslauth/system-auth-generic";
inline constexpr char ProviderSetupPrefix[] = "/usr/share/tslauth/setup/";
inline constexpr char ProviderSetupSuffix[] = ".conf";

/// Who of the domain may log in; the policy names it to pam_access.
inline constexpr char AccessRules[] = "/etc/tessel/tslauth/access.conf";

/// What Debian's services include, each for one facility or more. pam-auth-update writes them.
inline constexpr char const* ServicePolicies[] = {
    "/etc/pam.d/common-auth", "/etc/pam.d/common-account", "/etc/pam.d/common-password",
    "/etc/pam.d/common-session", "/etc/pam.d/common-session-noninteractive"};
/// Where a service's policy is, under its name.
inline constexpr char ServiceFolder[] = "/etc/pam.d/";
/// The beginning of the names of those, by which a policy includes them.
inline constexpr char ServicePolicyPrefix[] = "common-";

/// The profiles by which they lead to the policy, and where pam-auth-update finds those.
inline constexpr char ProfileFolder[] = "/usr/share/pam-configs/";
inline constexpr char const* Profiles[] = {"tslauth", "tslauth-password"};
inline constexpr char ProfileProgram[] = "/usr/sbin/pam-auth-update";

/// Where Debian's libpam looks for "/lib/security/$ISA/": that of Debian 12, and that of 13.
inline constexpr char const* ModuleLinks[] = {"/lib/security/lib/security",
                                              "/lib/security/usr/lib/security"};

/// What the host was before it was set up, and what setting up made of it.
inline constexpr char SetupRecord[] = "/var/lib/tslauth/setup";

} // namespace tessel::tslauthctl::Paths

#endif
