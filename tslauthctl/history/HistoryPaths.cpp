// SPDX-License-Identifier: Apache-2.0
#include "history/HistoryPaths.h"

#include "analysis/InsertedEntries.h"
#include "setup/SetupArchive.h"
#include "setup/SetupPaths.h"
#include "setup/SetupPlan.h"

#include <iterator>

namespace tessel::tslauthctl {

namespace {

/// What pam-auth-update keeps for itself.
constexpr char const* profileState[] = {
    "/var/lib/pam/seen",     "/var/lib/pam/auth",    "/var/lib/pam/account",
    "/var/lib/pam/password", "/var/lib/pam/session", "/var/lib/pam/session-noninteractive"};

void Append(std::vector<std::string>& paths, std::vector<std::string> const& more) {
    paths.insert(paths.end(), more.begin(), more.end());
}

} // namespace

std::vector<std::string> PathsOfActivation() {
    return {Paths::PAMPolicy, Paths::NSSConfiguration, Paths::AuthenticationConfiguration,
            InsertedRecord};
}

std::vector<std::string> PathsOfSetup() {
    auto paths = SetupPaths();
    paths.emplace_back(InsertedRecord);
    Append(paths, SetupRecordPaths());
    paths.insert(paths.end(), std::begin(Paths::ModuleLinks), std::end(Paths::ModuleLinks));
    paths.insert(paths.end(), std::begin(profileState), std::end(profileState));
    return paths;
}

std::vector<std::string> PathsOfAccess() {
    return {Paths::AccessRules, SetUpCopy(Paths::AccessRules)};
}

std::vector<std::string> PathsOfMembership(std::vector<std::string> const& ofProvider) {
    std::vector<std::string> paths = {"/etc/hosts", "/etc/resolv.conf"};
    Append(paths, ofProvider);
    return paths;
}

} // namespace tessel::tslauthctl
