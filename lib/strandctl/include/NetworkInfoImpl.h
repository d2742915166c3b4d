// SPDX-License-Identifier: Apache-2.0
#ifndef STRANDCTL_NETWORKINFOIMPL_H
#define STRANDCTL_NETWORKINFOIMPL_H

#include "Export.h"
#include "NetworkInterface.h"

namespace StrandCtl {
namespace Network {

/// What the host's network looks like. Holds no state: every call asks the kernel anew, about the
/// network namespace of its thread, and may be made from any thread.
class STRANDCTL_EXPORT NetworkInfoImpl {
public:
    NetworkInfoImpl();
    // Out of line: another host's library of this name may keep something in here.
    ~NetworkInfoImpl(); // NOLINT(performance-trivially-destructible)
    NetworkInfoImpl(NetworkInfoImpl const&) = delete;
    NetworkInfoImpl& operator=(NetworkInfoImpl const&) = delete;

    /// The interface through which the host is managed:
    /// 1. the one that "/etc/tessel/host.conf" names, as in `management-interface = "eth0"`; the
    ///    file, and the key in it, may be missing, and an empty value is as good as none;
    /// 2. else the interface of the IPv4 default route in the main table, of several the one with
    ///    the lowest metric;
    /// 3. else the only interface that has an IPv4 address of global scope.
    ///
    /// Its address is the first one of the widest scope, a primary one before a secondary one.
    /// Does not wait for anything beyond the kernel.
    /// @throws HostCtl::Lib::HostCtlException if there is no such interface, or it has no IPv4
    ///         address, or host.conf cannot be read, or the kernel cannot be asked; the text says
    ///         which
    HostCtl::Network::NetworkInterface GetManagementInterface() const;
};

} // namespace Network
} // namespace StrandCtl

#endif
