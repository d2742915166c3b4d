// SPDX-License-Identifier: Apache-2.0
#include <tslauth/ProviderConfiguration.h>

#include <tslauth/Paths.h>

#include <tslauth/Exceptions.h>

namespace tessel::authentication {

ProviderConfiguration::ProviderConfiguration() : Configuration(Paths::ProviderConfiguration) {}

ProviderConfiguration::~ProviderConfiguration() = default;

std::string ConfiguredProvider() {
    try {
        ProviderConfiguration const configuration;
        auto const provider = configuration.find(Paths::ProviderKey);
        if (provider == configuration.end() || provider->second.empty()) {
            throw InvalidActiveDirectoryProviderException("(unset)");
        }
        return provider->second;
    } catch (IOError const&) {
        throw InvalidActiveDirectoryProviderException("(none installed)");
    }
}

} // namespace tessel::authentication
