// SPDX-License-Identifier: Apache-2.0
#ifndef STRANDCTL_NETLINK_H
#define STRANDCTL_NETLINK_H

#include "ManagementInterface.h"

#include <linux/netlink.h>
#include <linux/rtnetlink.h>
#include <optional>
#include <vector>

/// The one place where the library asks the kernel about the network. Nothing here holds state, so
/// that everything may be called from any thread.
namespace StrandCtl {

/// @throws HostCtl::Lib::HostCtlException "Cannot read the network's routes: " + the reason
std::vector<DefaultRoute> ReadDefaultRoutes();

/// @throws HostCtl::Lib::HostCtlException "Cannot read the network's addresses: " + the reason
std::vector<InterfaceAddress> ReadInterfaceAddresses();

/// What the kernel's message about a route says, if it is an IPv4 default route of the main table
/// that leads to an interface which is there. Messages of another type say nothing, and neither do
/// those that are cut short.
std::optional<DefaultRoute> ParseRoute(nlmsghdr const& message);

/// The same for an IPv4 address of an interface.
std::optional<InterfaceAddress> ParseAddressMessage(nlmsghdr const& message);

} // namespace StrandCtl

#endif
