// SPDX-License-Identifier: Apache-2.0
#include <strandctl/IpConfig.h>

namespace HostCtl::Network {

IpConfig::IpConfig(Ipv4Address const& address) : _address(address) {}

IpConfig::~IpConfig() = default;

Ipv4Address IpConfig::GetIpv4Address() const {
    return _address;
}

} // namespace HostCtl::Network
