// SPDX-License-Identifier: Apache-2.0
#include "analysis/Policies.h"

#include "analysis/HostFile.h"

#include <base/AsciiText.h>

#include <algorithm>
#include <filesystem>
#include <iterator>
#include <string_view>
#include <system_error>

namespace tessel::tslauthctl {

namespace {

constexpr char PolicyFolder[] = "/etc/pam.d";

/// Whether a file is what pam-auth-update, dpkg, this tool or a person have left of a policy: no
/// service has such a name. keep-policy goes by the same ends.
bool IsCopy(std::string const& path) {
    constexpr std::string_view ends[] = {".bak", ".orig", "~", ".pam-old", ".tslauth-orig"};
    constexpr std::string_view packageManagers[] = {".dpkg-", ".ucf-"};
    return std::any_of(
               std::begin(ends), std::end(ends),
               [&](std::string_view end) { return base::AsciiText::EndsWith(path, end); }) ||
           std::any_of(std::begin(packageManagers), std::end(packageManagers),
                       [&](std::string_view part) { return path.find(part) != path.npos; });
}

} // namespace

PolicyTexts PoliciesOnHost() {
    PolicyTexts policies;
    std::error_code error;
    for (auto const& entry : std::filesystem::directory_iterator(PolicyFolder, error)) {
        auto const path = entry.path().string();
        if (!IsCopy(path)) {
            policies[path] = HostFileOrNothing(path);
        }
    }
    return policies;
}

} // namespace tessel::tslauthctl
