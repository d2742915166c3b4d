// SPDX-License-Identifier: Apache-2.0
#ifndef STRANDCTL_IPCONFIG_H
#define STRANDCTL_IPCONFIG_H

#include "Export.h"
#include "Ipv4Address.h"

namespace HostCtl {
namespace Network {

/// The IP configuration of a network interface, as it was when it was asked for. A value without
/// locks: copies are independent of each other.
class STRANDCTL_EXPORT IpConfig {
public:
    explicit IpConfig(Ipv4Address const& address);
    ~IpConfig();
    IpConfig(IpConfig const&) = default;
    IpConfig& operator=(IpConfig const&) = default;

    /// The interface's own address, not its peer's.
    Ipv4Address GetIpv4Address() const;

private:
    Ipv4Address _address;
};

} // namespace Network
} // namespace HostCtl

#endif
