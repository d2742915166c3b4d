// SPDX-License-Identifier: Apache-2.0
#ifndef TSLAUTHCTL_HOSTPLAN_H
#define TSLAUTHCTL_HOSTPLAN_H

#include "analysis/InsertedEntries.h"
#include "terminal/Console.h"

#include <tslauth/ActivationPlan.h>

#include <optional>
#include <string>
#include <vector>

namespace tessel::tslauthctl {

/// What activating a store would do to this host, for the commands that show it or do it.
struct HostPlan {
    std::string store;
    /// Nothing where it cannot be read.
    std::optional<std::string> recorded;
    /// What is executed: the form that changes only the lines concerned.
    authentication::ActivationPlan steps;
    authentication::ActivationPreview preview;
    /// Whose entries stand in the files, or may do so after an interruption, before the plan is
    /// executed and after it.
    EntriesList insertedMeanwhile;
    EntriesList insertedAfterwards;
    /// What keeps the store from working although nothing would be lost.
    std::vector<std::string> warnings;
    /// Why the library would refuse, or refuse half way: some of the files would be written before.
    std::optional<Failure> refusal;
    /// No other way leads away from the recorded store, so that the refusal is no reason to stay.
    bool refusedAfterwards = false;
};

/// Reads the host and changes nothing. A refusal by the library is part of the plan.
HostPlan MakeHostPlan(std::string const& store);

} // namespace tessel::tslauthctl

#endif
