// SPDX-License-Identifier: Apache-2.0
#include <tslauth/AuthenticationConfiguration.h>

#include <tslauth/Paths.h>

namespace tessel::authentication {

AuthenticationConfiguration::AuthenticationConfiguration()
    : Configuration(Paths::AuthenticationConfiguration) {}

AuthenticationConfiguration::~AuthenticationConfiguration() = default;

std::string RecordedStore() {
    AuthenticationConfiguration const configuration;
    return configuration[Paths::RemoteAuthenticationStoreKey];
}

} // namespace tessel::authentication
