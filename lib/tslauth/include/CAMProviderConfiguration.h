// SPDX-License-Identifier: Apache-2.0
#ifndef TSLAUTH_CAMPROVIDERCONFIGURATION_H
#define TSLAUTH_CAMPROVIDERCONFIGURATION_H

#include "Configuration.h"

namespace tessel {
namespace authentication {

/// Which CAM proxy provider is installed: the value of "provider" is the name that `CAMProxy`
/// loads, or empty while none has been chosen.
///
/// Written by whoever installs a provider; the library only reads it.
class TSLAUTH_EXPORT CAMProviderConfiguration : public Configuration {
public:
    /// Reads "/etc/tessel/tslauth/camprovider.conf" as it is now.
    /// @throws IOError if it cannot be opened
    /// @throws ConfigurationError at its first bad line
    CAMProviderConfiguration();
    CAMProviderConfiguration(CAMProviderConfiguration const&) = default;
    CAMProviderConfiguration& operator=(CAMProviderConfiguration const&) = default;
    ~CAMProviderConfiguration() override;
};

} // namespace authentication
} // namespace tessel

#endif
