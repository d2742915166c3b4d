// SPDX-License-Identifier: Apache-2.0
#include <tslauth/RemoteAuthenticationStore.h>

#include "Paths.h"

#include <tslauth/AuthenticationConfiguration.h>

namespace tessel::authentication {

bool RemoteAuthenticationStore::IsActive() const {
    AuthenticationConfiguration const configuration;
    return configuration[Paths::RemoteAuthenticationStoreKey] == GetDisplayName();
}

RemoteAuthenticationStore::~RemoteAuthenticationStore() = default;

} // namespace tessel::authentication
