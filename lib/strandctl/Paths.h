// SPDX-License-Identifier: Apache-2.0
#ifndef STRANDCTL_PATHS_H
#define STRANDCTL_PATHS_H

/// Every fixed path and key of the host-control library, in one table.
namespace StrandCtl::Paths {

inline constexpr char Hosts[] = "/etc/hosts";
inline constexpr char ResolvConf[] = "/etc/resolv.conf";

/// The administrator's choices for this host, and the key in it that fixes the interface.
inline constexpr char HostConfiguration[] = "/etc/tessel/host.conf";
inline constexpr char ManagementInterfaceKey[] = "management-interface";

inline constexpr char AdvancedOptions[] = "/etc/tessel/advanced.conf";

} // namespace StrandCtl::Paths

#endif
