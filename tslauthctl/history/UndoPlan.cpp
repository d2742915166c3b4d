// SPDX-License-Identifier: Apache-2.0
#include "history/UndoPlan.h"

#include <algorithm>
#include <optional>
#include <tuple>

namespace tessel::tslauthctl {

namespace {

using Kind = PathState::Kind;

/// What the tool knows to have left at a path.
/// @return nothing where the last command that wrote it was killed, or none did
std::optional<PathState> LeftAt(std::string const& path, std::vector<Snapshot> const& history) {
    for (auto snapshot = history.rbegin(); snapshot != history.rend(); ++snapshot) {
        if (snapshot->before.count(path) > 0) {
            if (!snapshot->after) {
                return std::nullopt;
            }
            auto const found = snapshot->after->find(path);
            return found == snapshot->after->end() ? std::nullopt
                                                   : std::make_optional(found->second);
        }
    }
    return std::nullopt;
}

bool IsPassedOver(Snapshot const& snapshot, unsigned number) {
    return snapshot.number > number && IsMembership(snapshot.verb);
}

/// 0 for what comes back, 1 for what becomes another, 2 for what goes.
int Phase(UndoStep const& step) {
    if (step.wanted.kind == Kind::absent) {
        return 2;
    }
    return step.current.kind == Kind::absent ? 0 : 1;
}

/// Folders come before what is in them and go behind it; links lead to what is there before.
int Rank(UndoStep const& step) {
    bool const goes = Phase(step) == 2;
    switch (goes ? step.current.kind : step.wanted.kind) {
    case Kind::folder:
        return goes ? 2 : 0;
    case Kind::link:
        return 1;
    case Kind::absent:
    case Kind::file:
    case Kind::other:
        break;
    }
    return goes ? 0 : 2;
}

} // namespace

bool IsMembership(std::string const& verb) {
    return verb == "join" || verb == "part";
}

PathStates StatesBefore(unsigned number, std::vector<Snapshot> const& history) {
    PathStates states;
    bool found = false;
    for (auto const& snapshot : history) {
        found = found || snapshot.number == number;
        if (snapshot.number >= number && !IsPassedOver(snapshot, number)) {
            states.insert(snapshot.before.begin(), snapshot.before.end());
        }
    }
    return found ? states : PathStates();
}

std::vector<Snapshot> MembershipsBehind(unsigned number, std::vector<Snapshot> const& history) {
    std::vector<Snapshot> memberships;
    std::copy_if(history.begin(), history.end(), std::back_inserter(memberships),
                 [&](Snapshot const& snapshot) { return IsPassedOver(snapshot, number); });
    return memberships;
}

std::vector<UndoStep> PlanUndo(PathStates const& wanted, PathStates const& current,
                               std::vector<Snapshot> const& history) {
    std::vector<UndoStep> steps;
    for (auto const& [path, state] : wanted) {
        auto const& is = current.at(path);
        if (is != state) {
            auto const left = LeftAt(path, history);
            steps.push_back({path, is, state, left && *left != is});
        }
    }
    std::stable_sort(steps.begin(), steps.end(), [](UndoStep const& left, UndoStep const& right) {
        return std::make_tuple(Phase(left), Rank(left)) <
               std::make_tuple(Phase(right), Rank(right));
    });
    // Of folders that go, the lowest first.
    auto const firstFolder = std::find_if(steps.begin(), steps.end(), [](UndoStep const& step) {
        return Phase(step) == 2 && step.current.kind == Kind::folder;
    });
    std::reverse(firstFolder, steps.end());
    return steps;
}

} // namespace tessel::tslauthctl
