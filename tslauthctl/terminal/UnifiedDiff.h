// SPDX-License-Identifier: Apache-2.0
#ifndef TSLAUTHCTL_UNIFIEDDIFF_H
#define TSLAUTHCTL_UNIFIEDDIFF_H

#include <string>
#include <string_view>

namespace tessel::tslauthctl {

/// The difference of two texts in the unified format that patch(1) takes, with three lines around
/// each change. Empty for equal texts.
///
/// Where more than two thousand lines differ, the shortest difference is not looked for: its cost
/// grows with the square, and all of them are shown as replaced.
std::string UnifiedDiff(std::string const& path, std::string_view before, std::string_view after);

} // namespace tessel::tslauthctl

#endif
