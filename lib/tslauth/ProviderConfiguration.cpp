// SPDX-License-Identifier: Apache-2.0
#include <tslauth/ProviderConfiguration.h>

#include "Paths.h"

namespace tessel::authentication {

ProviderConfiguration::ProviderConfiguration() : Configuration(Paths::ProviderConfiguration) {}

ProviderConfiguration::~ProviderConfiguration() = default;

} // namespace tessel::authentication
