// SPDX-License-Identifier: Apache-2.0
#ifndef TSLAUTHCTL_NEARESTNAME_H
#define TSLAUTHCTL_NEARESTNAME_H

#include <string>
#include <vector>

namespace tessel::tslauthctl {

/// Which of `names` may have been meant by `word`: the one that takes the fewest letters left out,
/// put in, changed or swapped with their neighbours, or one that begins with it. Empty where none
/// is near.
std::string NearestName(std::string const& word, std::vector<std::string> const& names);

} // namespace tessel::tslauthctl

#endif
