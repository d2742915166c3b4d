// SPDX-License-Identifier: Apache-2.0
#include "ManagementInterface.h"

#include "Paths.h"

#include <algorithm>
#include <linux/rtnetlink.h>
#include <set>
#include <strandctl/HostCtlException.h>
#include <tuple>

namespace StrandCtl {

int ChooseManagementInterface(std::vector<DefaultRoute> const& routes,
                              std::vector<InterfaceAddress> const& addresses) {
    auto const best = std::min_element(routes.begin(), routes.end(),
                                       [](DefaultRoute const& left, DefaultRoute const& right) {
                                           return left.metric < right.metric;
                                       });
    if (best != routes.end()) {
        return best->interface;
    }
    std::set<int> interfaces;
    for (InterfaceAddress const& address : addresses) {
        if (address.scope == RT_SCOPE_UNIVERSE) {
            interfaces.insert(address.interface);
        }
    }
    if (interfaces.size() == 1) {
        return *interfaces.begin();
    }
    throw HostCtl::Lib::HostCtlException(
        "There is no management interface: no IPv4 default route, and " +
        (interfaces.empty()
             ? "no interface with a global IPv4 address"
             : std::to_string(interfaces.size()) + " interfaces with a global IPv4 address") +
        "; '" + Paths::ManagementInterfaceKey + "' in '" + Paths::HostConfiguration +
        "' can name one");
}

std::optional<std::string> ChooseAddress(int interface,
                                         std::vector<InterfaceAddress> const& addresses) {
    InterfaceAddress const* best = nullptr;
    for (InterfaceAddress const& address : addresses) {
        if (address.interface == interface &&
            (!best ||
             std::tie(address.scope, address.secondary) < std::tie(best->scope, best->secondary))) {
            best = &address;
        }
    }
    return best ? std::optional<std::string>(best->address) : std::nullopt;
}

} // namespace StrandCtl
