// SPDX-License-Identifier: Apache-2.0
#ifndef TSLAUTHCTL_UNDOPLAN_H
#define TSLAUTHCTL_UNDOPLAN_H

#include "history/Snapshot.h"

#include <string>
#include <vector>

/// What undoing a change does to the host. No file is opened here.
namespace tessel::tslauthctl {

/// Whether a command of that name makes the host a member of a domain or takes it out. That is more
/// than files, and no snapshot brings it back.
bool IsMembership(std::string const& verb);

/// What the host becomes where the change `number` and all behind it are undone: each path as the
/// first of them found it. Memberships behind it stay as they are.
/// @param history oldest first
/// @return empty where there is no such change
PathStates StatesBefore(unsigned number, std::vector<Snapshot> const& history);

/// The memberships behind the change `number`, which undoing it passes over.
std::vector<Snapshot> MembershipsBehind(unsigned number, std::vector<Snapshot> const& history);

struct UndoStep {
    std::string path;
    PathState current;
    PathState wanted;
    /// Somebody else has made something else of it since the tool last wrote it.
    bool editedSince = false;
};

/// The steps, in an order in which no service includes what is not there at any moment: what comes
/// back, what becomes another, what goes.
/// @param wanted by `StatesBefore`
/// @param current of the same paths
std::vector<UndoStep> PlanUndo(PathStates const& wanted, PathStates const& current,
                               std::vector<Snapshot> const& history);

} // namespace tessel::tslauthctl

#endif
