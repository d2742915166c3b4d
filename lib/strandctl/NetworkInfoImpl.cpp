// SPDX-License-Identifier: Apache-2.0
#include <strandctl/NetworkInfoImpl.h>

#include "Files.h"
#include "KeyValueText.h"
#include "Netlink.h"
#include "Paths.h"

#include <cerrno>
#include <net/if.h>
#include <strandctl/HostCtlException.h>

namespace StrandCtl::Network {

namespace {

using HostCtl::Lib::HostCtlException;

/// The interface that the administrator chose; empty if the choice is ours.
std::string FixedInterface() {
    auto const text = ReadFile(Paths::HostConfiguration);
    if (!text) {
        return {};
    }
    try {
        auto const assignments = ParseKeyValueText(*text);
        auto const chosen = assignments.find(Paths::ManagementInterfaceKey);
        return chosen == assignments.end() ? std::string() : chosen->second;
    } catch (HostCtlException const& exception) {
        throw HostCtlException("Cannot read '" + std::string(Paths::HostConfiguration) +
                               "': " + exception.what());
    }
}

int IndexOf(std::string const& name) {
    unsigned const index = ::if_nametoindex(name.c_str());
    if (index == 0) {
        int const error = errno;
        if (error == ENODEV) {
            throw HostCtlException("The management interface '" + name + "' that '" +
                                   Paths::HostConfiguration + "' names does not exist");
        }
        ThrowSystemError("Cannot look for the interface '" + name + "'", error);
    }
    return static_cast<int>(index);
}

std::string NameOf(int index) {
    char name[IF_NAMESIZE];
    if (!::if_indextoname(static_cast<unsigned>(index), name)) {
        int const error = errno;
        ThrowSystemError("Cannot look for the management interface", error);
    }
    return name;
}

} // namespace

NetworkInfoImpl::NetworkInfoImpl() = default;

NetworkInfoImpl::~NetworkInfoImpl() = default;

HostCtl::Network::NetworkInterface NetworkInfoImpl::GetManagementInterface() const {
    std::string name = FixedInterface();
    bool const fixed = !name.empty();
    int const fixedIndex = fixed ? IndexOf(name) : 0;
    auto const addresses = ReadInterfaceAddresses();
    int const index =
        fixed ? fixedIndex : ChooseManagementInterface(ReadDefaultRoutes(), addresses);
    if (!fixed) {
        name = NameOf(index);
    }
    auto const address = ChooseAddress(index, addresses);
    if (!address) {
        throw HostCtlException("The management interface '" + name + "' has no IPv4 address");
    }
    return {name, HostCtl::Network::IpConfig(HostCtl::Network::Ipv4Address(*address))};
}

} // namespace StrandCtl::Network
