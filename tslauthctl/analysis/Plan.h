// SPDX-License-Identifier: Apache-2.0
#ifndef TSLAUTHCTL_PLAN_H
#define TSLAUTHCTL_PLAN_H

#include "analysis/Loss.h"

#include <optional>
#include <string>
#include <string_view>
#include <vector>

/// What an activation would write, computed by the functions that the library itself uses.
namespace tessel::tslauthctl {

struct PlannedFile {
    std::string path;
    std::string before;
    std::string after;
    std::vector<std::string> losses;
    std::vector<std::string> notes;
};

/// One file each. They throw what the library's readers throw.
/// @param text the file as it is
PlannedFile PlanPAM(std::string const& path, std::string const& text, Edit edit,
                    SystemConfiguration::PAMEntry const& entry, PAMPolicyReader const& reader);
PlannedFile PlanNSS(std::string const& path, std::string const& text, Edit edit,
                    SystemConfiguration::NSSService const& service);
/// The file with the name of the active store, after `store` has been recorded there.
PlannedFile PlanRecord(std::string const& path, std::string const& text, std::string const& store);

/// The library's refusal.
struct Refusal {
    std::string message;
    std::string exceptionClass;
};

struct Plan {
    std::string store;
    std::string recorded;
    /// In the order in which the library writes them; unchanged ones, too.
    std::vector<PlannedFile> files;
    /// What keeps the store from working although nothing would be lost.
    std::vector<std::string> warnings;
    std::optional<Refusal> refusal;
    /// The refusal comes after the files above have been written, and there is no way around it.
    bool refusedAfterwards = false;

    bool Loses() const;
    bool Changes() const;
};

/// Reads the host and changes nothing. A refusal by the library is part of the plan.
Plan MakePlan(std::string const& store);

} // namespace tessel::tslauthctl

#endif
