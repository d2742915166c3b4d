// SPDX-License-Identifier: Apache-2.0
#ifndef TSLAUTH_AUTHENTICATIONCONFIGURATION_H
#define TSLAUTH_AUTHENTICATIONCONFIGURATION_H

#include "Configuration.h"

namespace tessel {
namespace authentication {

/// Which authentication store is active on the host: the value of "remote-authentication-store" is
/// the display name of a store, "None" for local accounts only.
///
/// The only one of its kind that the library writes. The file must hold the key already, and other
/// keys in it are kept.
class TSLAUTH_EXPORT AuthenticationConfiguration : public Configuration {
public:
    /// Reads "/etc/tessel/tslauth/authentication.conf" as it is now.
    /// @throws IOError if it cannot be opened
    /// @throws ConfigurationError at its first bad line
    AuthenticationConfiguration();
    AuthenticationConfiguration(AuthenticationConfiguration const&) = default;
    AuthenticationConfiguration& operator=(AuthenticationConfiguration const&) = default;
    ~AuthenticationConfiguration() override;
};

} // namespace authentication
} // namespace tessel

#endif
