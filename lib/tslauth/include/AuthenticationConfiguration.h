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

/// The display name of the store that the host has recorded as active. It may be one that no
/// factory knows.
/// @throws IOError, ConfigurationError, InvalidKeyException where the file or its key is missing,
///     or a line of it malformed
TSLAUTH_EXPORT std::string RecordedStore();

} // namespace authentication
} // namespace tessel

#endif
