// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "text/ProviderOptions.h"

#include <string>

namespace tessel::winbind {

/// The options in the provider's own file; where there is none, as everybody has them.
/// @param path of `Paths::State`
/// @throws Failure where it cannot be read, and as `OptionsIn`
ProviderOptions ReadProviderOptions(std::string const& path);

} // namespace tessel::winbind
