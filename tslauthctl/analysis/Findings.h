// SPDX-License-Identifier: Apache-2.0
#ifndef TSLAUTHCTL_FINDINGS_H
#define TSLAUTHCTL_FINDINGS_H

#include "analysis/InsertedEntries.h"

#include <map>
#include <optional>
#include <string>
#include <vector>

/// What keeps a host from doing what its recorded store says, beside the two files of the store. No
/// file is opened here.
namespace tessel::tslauthctl {

struct Finding {
    /// For programs: it does not change.
    std::string word;
    std::string text;
    /// What to do about it; empty where that is left to the administrator.
    std::string advice;
};

struct HostFacts {
    /// Whether the recorded store is "Active Directory".
    bool wanted = false;
    bool root = true;
    /// Of the configured provider; nothing where it cannot be loaded.
    std::optional<authentication::ProviderEntries> configured;
    /// Whose entries the record says were inserted.
    EntriesList inserted;
    /// The policies of the host by their paths, and its name-service switch.
    std::map<std::string, std::optional<std::string>> policies;
    std::optional<std::string> nameServices;
    std::vector<std::string> missingModules;
    /// Nothing where it was not asked for, or the provider does not say.
    std::optional<bool> joined;
    std::optional<int> trustState;
    /// Why the provider did not say it.
    std::string notTold;
};

std::vector<Finding> FindingsOf(HostFacts const& facts);

} // namespace tessel::tslauthctl

#endif
