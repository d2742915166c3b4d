// SPDX-License-Identifier: Apache-2.0
#ifndef TSLAUTHCTL_POLICIES_H
#define TSLAUTHCTL_POLICIES_H

#include <map>
#include <optional>
#include <string>

namespace tessel::tslauthctl {

/// By path; nothing for one that cannot be read.
using PolicyTexts = std::map<std::string, std::optional<std::string>>;

/// Every PAM policy that a service of this host may have.
PolicyTexts PoliciesOnHost();

} // namespace tessel::tslauthctl

#endif
