// SPDX-License-Identifier: Apache-2.0
#ifndef TSLAUTHCTL_SETUPPLAN_H
#define TSLAUTHCTL_SETUPPLAN_H

#include "analysis/Policies.h"

#include <meaning/PAMMeaning.h>

#include <map>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

/// What makes a host ready for a provider: its files, and the services that follow the policy.
/// Texts in, texts out; no file is opened here.
namespace tessel::tslauthctl {

/// What a provider asks of a host beyond its entries, by a file of its own.
struct ProviderSetup {
    /// Entries of the policy that stand first among those of their facility, whichever store is
    /// active.
    std::vector<std::string> policyLines;
    /// A profile of pam-auth-update that is switched off while ours is on, and the module by which
    /// it is known; empty for none.
    std::string replacedProfile;
    std::string replacedModule;
    /// A service that is taken out of the name-service switch; empty for none.
    std::string replacedService;
    /// What a join writes beside the files that every join does, none of them with a secret.
    std::vector<std::string> joinPaths = {};
};

/// @param text lines of `policy-FACILITY`, `replaced-profile`, `replaced-module`,
///        `replaced-service` and `join-writes`, which may stand there more than once
/// @throws base::KeyValueError
ProviderSetup ReadProviderSetup(std::string_view text);

/// What there is on the host.
struct SetupFacts {
    std::string provider;
    ProviderSetup asked;
    /// The policy that a host begins with.
    std::string defaultPolicy;
    /// By path; nothing for a file that is not there.
    std::map<std::string, std::optional<std::string>> texts;
    /// Folders, each to be a link, in which builds of libpam look for what the policy names, and do
    /// not find it.
    std::vector<std::string> missingLinks;
    /// Where libpam's modules are.
    std::string moduleFolder;
    /// Those of pam-auth-update that are installed.
    std::vector<std::string> profiles;
};

/// The paths that `SetupFacts::texts` is asked for.
std::vector<std::string> SetupPaths();

struct FileChange {
    std::string path;
    /// Nothing where there is no file.
    std::optional<std::string> before;
    std::string after;

    bool Changes() const {
        return before != after;
    }
};

struct SetupPlan {
    /// In the order in which they are written; unchanged ones, too.
    std::vector<FileChange> files;
    /// Symbolic links that are made first, and where they lead.
    std::vector<std::string> links;
    std::string linkTarget;
    /// Profiles that pam-auth-update switches on and, where they are on, off; both are empty where
    /// all is as it should.
    std::vector<std::string> profilesOn;
    std::vector<std::string> profilesOff;
    /// What is left to the administrator.
    std::vector<std::string> notes;

    bool Changes() const;
};

/// @throws Failure (refused) where the active store would lose what it stands on
/// @throws base::KeyValueError, authentication::ConfigurationError for a file that cannot be read
SetupPlan MakeSetupPlan(SetupFacts const& facts);

/// Whether the file of the access rules decides who logs in, by password and by key.
bool AsksAccessRules(meaning::PAMMeaning const& policy);

/// The default policy with a provider's lines in it.
std::string PolicyWith(std::vector<std::string> const& lines, std::string_view policy);

/// The paths of those of `policies` that include the policy, each in so many words.
std::vector<std::string> FilesThatFollow(PolicyTexts const& policies);

/// The kinds of services that do not follow the policy, by the files that they include: the names
/// of those of `texts` that do not lead to it.
std::vector<std::string>
FilesThatDoNotFollow(std::map<std::string, std::optional<std::string>> const& texts);

} // namespace tessel::tslauthctl

#endif
