// SPDX-License-Identifier: Apache-2.0
#include <strandctl/NetworkInterface.h>

namespace HostCtl::Network {

NetworkInterface::NetworkInterface(std::string const& name, IpConfig const& configuration)
    : _name(name), _configuration(configuration) {}

NetworkInterface::~NetworkInterface() = default;

std::string NetworkInterface::GetName() const {
    return _name;
}

IpConfig NetworkInterface::GetIpConfig() const {
    return _configuration;
}

} // namespace HostCtl::Network
