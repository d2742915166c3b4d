// SPDX-License-Identifier: Apache-2.0
#ifndef TSLAUTH_CAM_H
#define TSLAUTH_CAM_H

#include <string>

namespace tessel {
namespace authentication {

/// What a CAM server, the authentication proxy, tells about a domain and a host in it. Values.
namespace CAM {

/// The domain that a CAM server serves.
struct ActiveDirectoryDomainInfo {
    /// Always empty today: nothing fills it.
    std::string unused;
    std::string netBIOSDomainName;
    std::string dnsDomainName;
    /// The domain's security identifier, as text.
    std::string domainSID;
};

/// The machine account that a CAM server made for a host.
struct MachineAccountInfo {
    /// The host's name up to its first ".".
    std::string accountName;
    std::string dnsDomainName;
    /// Always empty today: nothing fills it.
    std::string unused;
    /// The CAM provider's two outputs, in its order. What they denote is agreed between that
    /// provider and the Active Directory provider that receives them.
    std::string firstResult;
    std::string secondResult;
};

} // namespace CAM
} // namespace authentication
} // namespace tessel

#endif
