// SPDX-License-Identifier: Apache-2.0
#include <tslauth/AuthenticationConfiguration.h>

#include "Paths.h"

namespace tessel::authentication {

AuthenticationConfiguration::AuthenticationConfiguration()
    : Configuration(Paths::AuthenticationConfiguration) {}

AuthenticationConfiguration::~AuthenticationConfiguration() = default;

} // namespace tessel::authentication
