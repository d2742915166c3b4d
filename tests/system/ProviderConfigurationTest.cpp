// SPDX-License-Identifier: Apache-2.0
#include <tslauth/ProviderConfiguration.h>

#include "ConfigurationFile.h"

namespace tessel::authentication {
namespace {

struct File {
    using Class = ProviderConfiguration;
    static constexpr char path[] = "/etc/tessel/tslauth/provider.conf";
    static constexpr char key[] = "provider";
};

INSTANTIATE_TYPED_TEST_SUITE_P(ProviderConfiguration, ConfigurationFileTest, File, );

} // namespace
} // namespace tessel::authentication
