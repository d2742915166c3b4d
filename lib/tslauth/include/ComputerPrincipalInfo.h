// SPDX-License-Identifier: Apache-2.0
#ifndef TSLAUTH_COMPUTERPRINCIPALINFO_H
#define TSLAUTH_COMPUTERPRINCIPALINFO_H

#include <string>

namespace tessel {
namespace authentication {

/// What a CAM server answers when it has made a machine account. A value.
struct ComputerPrincipalInfo {
    /// Always empty today: nothing fills it.
    std::string unused;
    /// The CAM provider's two outputs, in its order. What they denote is that provider's business;
    /// they are passed on to the Active Directory provider as they are.
    std::string firstResult;
    std::string secondResult;
};

} // namespace authentication
} // namespace tessel

#endif
