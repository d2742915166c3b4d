// SPDX-License-Identifier: Apache-2.0
#ifndef STRANDCTL_NETWORKINTERFACE_H
#define STRANDCTL_NETWORKINTERFACE_H

#include "Export.h"
#include "IpConfig.h"

#include <string>

namespace HostCtl {
namespace Network {

/// A network interface that has an IPv4 address, as it was when it was asked for. A value without
/// locks: it does not follow what becomes of the interface.
class STRANDCTL_EXPORT NetworkInterface {
public:
    NetworkInterface(std::string const& name, IpConfig const& configuration);
    ~NetworkInterface();
    NetworkInterface(NetworkInterface const&) = default;
    NetworkInterface& operator=(NetworkInterface const&) = default;

    /// The kernel's name for it, as in "eth0".
    std::string GetName() const;
    IpConfig GetIpConfig() const;

private:
    std::string _name;
    IpConfig _configuration;
};

} // namespace Network
} // namespace HostCtl

#endif
