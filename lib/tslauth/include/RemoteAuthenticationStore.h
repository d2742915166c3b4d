// SPDX-License-Identifier: Apache-2.0
#ifndef TSLAUTH_REMOTEAUTHENTICATIONSTORE_H
#define TSLAUTH_REMOTEAUTHENTICATIONSTORE_H

#include "AuthenticationStore.h"

namespace tessel {
namespace authentication {

/// A store whose activity is recorded under "remote-authentication-store" in `authentication.conf`.
class TSLAUTH_EXPORT RemoteAuthenticationStore : public AuthenticationStore {
public:
    /// Reads `authentication.conf` anew and compares the recorded name with `GetDisplayName()`,
    /// byte for byte.
    /// @throws IOError where the file cannot be opened
    /// @throws ConfigurationError where a line of it is malformed
    /// @throws InvalidKeyException where it does not hold the key
    bool IsActive() const override;

    ~RemoteAuthenticationStore() override;

    /// Takes back what `MakeActive` did to the host's log-in configuration. The store that follows
    /// records its own name.
    virtual void MakeInactive() = 0;
};

} // namespace authentication
} // namespace tessel

#endif
