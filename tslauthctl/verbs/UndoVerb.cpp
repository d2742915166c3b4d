// SPDX-License-Identifier: Apache-2.0
#include "history/Confirmation.h"
#include "history/HistoryArchive.h"
#include "history/PathOnHost.h"
#include "history/UndoPlan.h"
#include "trial/LogInTrial.h"
#include "verbs/HostChange.h"
#include "verbs/Verbs.h"

#include <base/AsciiText.h>
#include <base/FileError.h>

#include <algorithm>

namespace tessel::tslauthctl {

namespace {

/// The change that is meant.
Snapshot const& Chosen(UndoArguments const& arguments, History const& history) {
    if (arguments.number == 0) {
        if (history.snapshots.empty()) {
            throw Failure(ExitCode::refused, "No change of this host is remembered");
        }
        return history.snapshots.back();
    }
    auto const* const snapshot = history.Find(arguments.number);
    if (snapshot == nullptr) {
        throw Failure(ExitCode::usage, "No change " + std::to_string(arguments.number) +
                                           " is remembered; see 'tslauthctl history'");
    }
    return *snapshot;
}

/// A member of a domain stays one, whatever becomes of the files.
void RequireNoMembership(Snapshot const& snapshot) {
    if (IsMembership(snapshot.verb)) {
        throw Failure(ExitCode::refused, "Change " + std::to_string(snapshot.number) + " was '" +
                                             snapshot.verb +
                                             "', which is more than files: 'tslauthctl " +
                                             (snapshot.verb == "join" ? "part" : "join") +
                                             "' takes it back; --force restores the files alone");
    }
}

void TellMemberships(std::vector<Snapshot> const& memberships, Console& console) {
    auto& list = console.Document()["memberships"] = nlohmann::json::array();
    for (auto const& snapshot : memberships) {
        list.push_back({{"number", snapshot.number}, {"command", snapshot.command}});
        console.Note("change " + std::to_string(snapshot.number) + " (" + snapshot.command +
                     ") stays, for it is more than files");
    }
}

void Describe(std::vector<UndoStep> const& steps, Console& console) {
    auto& files = console.Document()["files"] = nlohmann::json::array();
    for (auto const& step : steps) {
        nlohmann::json described = {{"edited_since", step.editedSince}};
        DescribePath(step.path, step.current, step.wanted, described, console);
        files.push_back(std::move(described));
    }
}

bool AnyEditedSince(std::vector<UndoStep> const& steps) {
    return std::any_of(steps.begin(), steps.end(),
                       [](UndoStep const& step) { return step.editedSince; });
}

void TellEdits(std::vector<UndoStep> const& steps, Console& console) {
    for (auto const& step : steps) {
        if (step.editedSince) {
            console.ErrorDetail(step.path);
        }
    }
}

std::vector<std::string> PathsOf(std::vector<UndoStep> const& steps) {
    std::vector<std::string> paths;
    paths.reserve(steps.size());
    for (auto const& step : steps) {
        paths.push_back(step.path);
    }
    return paths;
}

std::vector<UndoStep> Planned(Snapshot const& chosen, History const& history) {
    auto const wanted = StatesBefore(chosen.number, history.snapshots);
    try {
        return PlanUndo(wanted, CurrentOf(wanted), history.snapshots);
    } catch (base::FileError const& e) {
        throw Failure(ExitCode::failure, std::string("Nothing was changed: ") + e.what());
    }
}

/// Of files alone; nobody's log-in depends on the links and folders.
PlannedTexts TextsAfter(std::vector<UndoStep> const& steps) {
    PlannedTexts texts;
    for (auto const& step : steps) {
        if (step.wanted.kind == PathState::Kind::file) {
            texts[step.path] = step.wanted.text;
        } else if (step.wanted.kind == PathState::Kind::absent &&
                   step.current.kind == PathState::Kind::file) {
            texts[step.path] = std::nullopt;
        }
    }
    return texts;
}

void CarryOut(std::vector<UndoStep> const& steps) {
    for (auto const& step : steps) {
        try {
            PutStateOnHost(step.path, step.wanted);
        } catch (base::FileError const& e) {
            throw Failure(ExitCode::failure, e.what());
        }
    }
}

/// What is undone needs nobody's confirmation any more.
void ForgetUndone(unsigned number) {
    auto const open = OpenConfirmation();
    if (open && open->number >= number) {
        ForgetConfirmation();
    }
}

/// The change that is due to be undone by itself.
std::optional<unsigned> Unconfirmed(Console& console) {
    auto const open = OpenConfirmation();
    if (!open) {
        console.Line("No change waits to be confirmed.");
        return std::nullopt;
    }
    if (auto const left = SecondsLeft(*open); left > 0) {
        console.Line("Change " + std::to_string(open->number) + " waits to be confirmed for " +
                     std::to_string(left) + " seconds more.");
        return std::nullopt;
    }
    return open->number;
}

ExitCode Undo(UndoArguments const& arguments, HostChange* change, Console& console) {
    auto const history = ReadHistory();
    for (auto const& text : history.unreadable) {
        console.Warning(text);
    }
    auto const& chosen = Chosen(arguments, history);
    auto& document = console.Document();
    document["number"] = chosen.number;
    document["undone"] = false;
    if (!arguments.force) {
        RequireNoMembership(chosen);
    }
    auto const steps = Planned(chosen, history);
    TellMemberships(MembershipsBehind(chosen.number, history.snapshots), console);
    Describe(steps, console);
    auto const name = "change " + std::to_string(chosen.number) + " (" + chosen.command + ")";
    if (steps.empty()) {
        if (change != nullptr) {
            ForgetUndone(chosen.number);
        }
        document["undone"] = true;
        console.Line("The host is as it was before " + name + "; nothing had to be changed.");
        return ExitCode::done;
    }
    if (AnyEditedSince(steps) && !arguments.force) {
        console.Error(Failure(ExitCode::loss, "Somebody has edited what follows since; nothing was "
                                              "changed"));
        TellEdits(steps, console);
        console.ErrorDetail("--force restores it all the same, and remembers what it was");
        return ExitCode::loss;
    }
    if (change == nullptr) {
        return ExitCode::changes;
    }
    if (!arguments.unconfirmed) { // nobody is there to do something about it
        LogInTrial().Require(TextsAfter(steps), console);
    }
    change->Write("undo", PathsOf(steps), [&] { CarryOut(steps); });
    ForgetUndone(chosen.number);
    document["undone"] = true;
    console.Line("The host is as it was before " + name + "; " +
                 base::AsciiText::Counted(steps.size(), "path") +
                 " restored. 'tslauthctl undo' takes that back.");
    return ExitCode::done;
}

} // namespace

ExitCode RunUndo(UndoArguments const& arguments, Console& console) {
    RequireRoot("undo");
    if (arguments.dryRun) {
        return Undo(arguments, nullptr, console);
    }
    HostChange change(console);
    if (!arguments.unconfirmed) {
        return Undo(arguments, &change, console);
    }
    auto due = arguments;
    due.force = true;
    auto const number = Unconfirmed(console);
    if (!number) {
        return ExitCode::done;
    }
    due.number = *number;
    return Undo(due, &change, console);
}

} // namespace tessel::tslauthctl
