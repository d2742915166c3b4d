// SPDX-License-Identifier: Apache-2.0
#ifndef TSLAUTH_PATHS_H
#define TSLAUTH_PATHS_H

/// Every fixed path and key of the system, in one table. They are part of the contract with
/// providers, installers and administrators, and there is no switch for them.
namespace tessel::authentication::Paths {

/// The PAM policy that follows the active store; other policies include it.
inline constexpr char PAMPolicyName[] = "system-auth-generic";
inline constexpr char PAMPolicy[] = "/etc/pam.d/system-auth-generic";
/// Where libpam looks for a policy by its name, in this order.
inline constexpr char const* PAMPolicyFolders[] = {"/etc/pam.d/", "/usr/lib/pam.d/"};
inline constexpr char NSSConfiguration[] = "/etc/nsswitch.conf";

inline constexpr char AuthenticationConfiguration[] = "/etc/tessel/tslauth/authentication.conf";
inline constexpr char ProviderConfiguration[] = "/etc/tessel/tslauth/provider.conf";
inline constexpr char CAMProviderConfiguration[] = "/etc/tessel/tslauth/camprovider.conf";
inline constexpr char CAMThumbprintStore[] = "/etc/tessel/tslauth/camservers.conf";

/// A provider's library is this + its name + `ProviderSuffix`.
inline constexpr char ProviderPrefix[] = "/usr/libexec/tslauth/lib";
inline constexpr char ProviderSuffix[] = ".so";

/// The module directory that the entries in the PAM policy name; libpam replaces "$ISA".
inline constexpr char PAMModulePrefix[] = "/lib/security/$ISA/";
/// What builds of libpam put in the place of "$ISA".
inline constexpr char const* PAMModuleDirectories[] = {".", "/lib/security", "../../lib64/security",
                                                       "../../lib/security"};
/// Patterns of the folders that hold the C library's modules.
inline constexpr char const* LibraryDirectories[] = {
    "/lib/*-linux-gnu*/", "/usr/lib/*-linux-gnu*/", "/lib64/", "/usr/lib64/", "/lib/", "/usr/lib/"};
/// The module of the access rules, in that directory: a provider's entry stands behind it.
inline constexpr char PAMAccessModule[] = "pam_access.so";

/// The key of `AuthenticationConfiguration` that records the active store's display name.
inline constexpr char RemoteAuthenticationStoreKey[] = "remote-authentication-store";
/// The key of `ProviderConfiguration` and `CAMProviderConfiguration` that names the provider.
inline constexpr char ProviderKey[] = "provider";

/// Held by every `tslauthctl` command that changes the host. Not in /run/lock, where every user may
/// put a file of that name first.
inline constexpr char ControlLock[] = "/run/tslauthctl.lock";

} // namespace tessel::authentication::Paths

#endif
