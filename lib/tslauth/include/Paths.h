// SPDX-License-Identifier: Apache-2.0
#ifndef TSLAUTH_PATHS_H
#define TSLAUTH_PATHS_H

namespace tessel {
namespace authentication {

/// Every fixed path and key of the system, in one table. They are part of the contract with
/// providers, installers and administrators, and there is no switch for them.
namespace Paths {

/// The PAM policy that follows the active store; other policies include it.
constexpr char PAMPolicyName[] = "system-auth-generic";
constexpr char PAMPolicy[] = "/etc/pam.d/system-auth-generic";
constexpr char NSSConfiguration[] = "/etc/nsswitch.conf";

constexpr char AuthenticationConfiguration[] = "/etc/tessel/tslauth/authentication.conf";
constexpr char ProviderConfiguration[] = "/etc/tessel/tslauth/provider.conf";
constexpr char CAMProviderConfiguration[] = "/etc/tessel/tslauth/camprovider.conf";
constexpr char CAMThumbprintStore[] = "/etc/tessel/tslauth/camservers.conf";

/// A provider's library is this + its name + `ProviderSuffix`.
constexpr char ProviderPrefix[] = "/usr/libexec/tslauth/lib";
constexpr char ProviderSuffix[] = ".so";

/// The module directory that the entries in the PAM policy name; libpam replaces "$ISA".
constexpr char PAMModulePrefix[] = "/lib/security/$ISA/";
/// The module of the access rules, in that directory: a provider's entry stands behind it.
constexpr char PAMAccessModule[] = "pam_access.so";

/// The key of `AuthenticationConfiguration` that records the active store's display name.
constexpr char RemoteAuthenticationStoreKey[] = "remote-authentication-store";
/// The key of `ProviderConfiguration` and `CAMProviderConfiguration` that names the provider.
constexpr char ProviderKey[] = "provider";

/// See `HostLock`. Not in /run/lock, where every user may put a file of that name first.
constexpr char HostLock[] = "/run/tslauthctl.lock";

} // namespace Paths

} // namespace authentication
} // namespace tessel

#endif
