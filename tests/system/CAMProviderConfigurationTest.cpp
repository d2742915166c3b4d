// SPDX-License-Identifier: Apache-2.0
#include <tslauth/CAMProviderConfiguration.h>

#include "ConfigurationFile.h"

namespace tessel::authentication {
namespace {

struct File {
    using Class = CAMProviderConfiguration;
    static constexpr char path[] = "/etc/tessel/tslauth/camprovider.conf";
    static constexpr char key[] = "provider";
};

INSTANTIATE_TYPED_TEST_SUITE_P(CAMProviderConfiguration, ConfigurationFileTest, File, );

} // namespace
} // namespace tessel::authentication
