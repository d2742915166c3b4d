// SPDX-License-Identifier: Apache-2.0
#ifndef TSLAUTH_PROVIDERCONFIGURATION_H
#define TSLAUTH_PROVIDERCONFIGURATION_H

#include "Configuration.h"

namespace tessel {
namespace authentication {

/// Which Active Directory provider is installed: the value of "provider" is the name that
/// `ActiveDirectoryProvider` loads, or empty while none has been chosen.
///
/// Written by whoever installs a provider; the library only reads it.
class TSLAUTH_EXPORT ProviderConfiguration : public Configuration {
public:
    /// Reads "/etc/tessel/tslauth/provider.conf" as it is now.
    /// @throws IOError if it cannot be opened
    /// @throws ConfigurationError at its first bad line
    ProviderConfiguration();
    ProviderConfiguration(ProviderConfiguration const&) = default;
    ProviderConfiguration& operator=(ProviderConfiguration const&) = default;
    ~ProviderConfiguration() override;
};

/// The name of the provider that `provider.conf` chooses.
/// @throws InvalidActiveDirectoryProviderException for the name "(unset)" where the file chooses
///     none, for "(none installed)" where it cannot be opened
/// @throws ConfigurationError where a line of the file is malformed
TSLAUTH_EXPORT std::string ConfiguredProvider();

} // namespace authentication
} // namespace tessel

#endif
