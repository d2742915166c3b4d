// SPDX-License-Identifier: Apache-2.0
#include <tslauth/AuthenticationConfiguration.h>

#include "ConfigurationFile.h"

namespace tessel::authentication {
namespace {

struct File {
    using Class = AuthenticationConfiguration;
    static constexpr char path[] = "/etc/tessel/tslauth/authentication.conf";
    static constexpr char key[] = "remote-authentication-store";
};

INSTANTIATE_TYPED_TEST_SUITE_P(AuthenticationConfiguration, ConfigurationFileTest, File, );

} // namespace
} // namespace tessel::authentication
