// SPDX-License-Identifier: Apache-2.0
#ifndef STRANDCTL_MANAGEMENTINTERFACE_H
#define STRANDCTL_MANAGEMENTINTERFACE_H

#include <cstdint>
#include <optional>
#include <string>
#include <vector>

/// Which interface the host is managed through, decided from what the kernel told. Nothing here
/// asks it.
namespace StrandCtl {

/// An IPv4 default route of the main table.
struct DefaultRoute {
    int interface;        ///< the kernel's index
    std::uint32_t metric; ///< the lower, the better
};

/// An IPv4 address of an interface.
struct InterfaceAddress {
    int interface;       ///< the kernel's index
    std::string address; ///< dotted decimal
    unsigned scope;      ///< RT_SCOPE_...: the lower, the wider
    bool secondary;
};

/// The index of the management interface where none is fixed: that of the best default route, else
/// of the only interface with an address of global scope.
/// @throws HostCtl::Lib::HostCtlException if there is neither
int ChooseManagementInterface(std::vector<DefaultRoute> const& routes,
                              std::vector<InterfaceAddress> const& addresses);

/// The address of an interface: the first one of the widest scope, a primary one before a secondary
/// one; nothing if it has none.
std::optional<std::string> ChooseAddress(int interface,
                                         std::vector<InterfaceAddress> const& addresses);

} // namespace StrandCtl

#endif
