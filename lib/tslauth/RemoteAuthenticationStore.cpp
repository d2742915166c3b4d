// SPDX-License-Identifier: Apache-2.0
#include <tslauth/RemoteAuthenticationStore.h>

#include <tslauth/Paths.h>

#include <tslauth/AuthenticationConfiguration.h>

namespace tessel::authentication {

bool RemoteAuthenticationStore::IsActive() const {
    AuthenticationConfiguration const configuration;
    // Before the key, on every compiler: the name is told by a class that may be a caller's own.
    std::string const name = GetDisplayName();
    return configuration[Paths::RemoteAuthenticationStoreKey] == name;
}

RemoteAuthenticationStore::~RemoteAuthenticationStore() = default;

} // namespace tessel::authentication
