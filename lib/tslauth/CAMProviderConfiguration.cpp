// SPDX-License-Identifier: Apache-2.0
#include <tslauth/CAMProviderConfiguration.h>

#include <tslauth/Paths.h>

namespace tessel::authentication {

CAMProviderConfiguration::CAMProviderConfiguration()
    : Configuration(Paths::CAMProviderConfiguration) {}

CAMProviderConfiguration::~CAMProviderConfiguration() = default;

} // namespace tessel::authentication
