// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "Profile.h"
#include "Report.h"

#include <string>

namespace tessel::providercheck {

/// Looks at the provider whose library is the file `path`, each time in a child process.
Report Check(std::string const& path, Profile const& profile);

} // namespace tessel::providercheck
