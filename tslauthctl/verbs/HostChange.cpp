// SPDX-License-Identifier: Apache-2.0
#include "verbs/HostChange.h"

#include "analysis/ChangeLog.h"
#include "history/Confirmation.h"
#include "history/HistoryArchive.h"
#include "history/PathOnHost.h"
#include "history/UndoPlan.h"
#include "terminal/Console.h"
#include "terminal/EscapedText.h"
#include "terminal/HeldSignals.h"

#include <tslauth/Exceptions.h>

#include <base/FileError.h>

#include <ctime>
#include <string>
#include <unistd.h>

namespace tessel::tslauthctl {

namespace {

std::string Now() {
    std::time_t const now = std::time(nullptr);
    std::tm parts = {};
    gmtime_r(&now, &parts);
    char text[sizeof "2026-11-22T01:30:00Z"];
    return {text, std::strftime(text, sizeof text, "%Y-%m-%dT%H:%M:%SZ", &parts)};
}

Snapshot Kept(std::string const& verb, std::vector<std::string> const& paths) {
    Snapshot snapshot;
    snapshot.when = Now();
    snapshot.verb = verb;
    snapshot.command = Escaped(ChangeLog::ShownCommand());
    snapshot.caller = ChangeLog::ThisCaller();
    MakeHistoryFolder(); // not part of what the host was
    try {
        snapshot.before = StatesOnHost(paths);
    } catch (base::FileError const& e) {
        throw Failure(ExitCode::failure, std::string("Nothing was changed: ") + e.what());
    }
    KeepSnapshot(snapshot);
    return snapshot;
}

} // namespace

HostChange::HostChange(Console& console) try : _console(console) {
    if (!_lock.TryLock()) {
        console.Waiting("waiting for another tslauthctl to finish ...");
        _lock.Lock();
    }
    ChangeLog::Begin();
} catch (authentication::IOError const& e) {
    throw Failure(ExitCode::failure, e.what());
}

void HostChange::Write(std::string const& verb, std::vector<std::string> const& paths,
                       std::function<void()> const& write) {
    RequireNothingOpen(verb);
    HoldSignals();
    auto const snapshot = Kept(verb, paths);
    try {
        if (_confirmWithin > 0) {
            AwaitConfirmation(snapshot.number, _confirmWithin);
        }
        write();
    } catch (...) {
        PutBack(snapshot);
        (void)Conclude(snapshot);
        if (_confirmWithin > 0) {
            ForgetOpenConfirmation();
        }
        throw;
    }
    bool const changed = Conclude(snapshot);
    if (_confirmWithin > 0 && changed) {
        TellConfirmation(snapshot);
    } else if (_confirmWithin > 0) {
        ForgetConfirmation();
    }
}

void HostChange::ForgetOpenConfirmation() {
    try {
        ForgetConfirmation();
    } catch (std::exception const& e) {
        // Why the change failed counts for more.
        _console.ErrorDetail(std::string(e.what()) + "; 'tslauthctl confirm' takes it away");
    }
}

void HostChange::RequireNothingOpen(std::string const& verb) const {
    auto const open = OpenConfirmation();
    if (open && verb != "undo") {
        throw Failure(ExitCode::refused,
                      "Change " + std::to_string(open->number) +
                          " waits to be confirmed, and is "
                          "undone in " +
                          std::to_string(SecondsLeft(*open)) +
                          " seconds: "
                          "'tslauthctl confirm' keeps it, 'tslauthctl undo' takes it back");
    }
}

void HostChange::TellConfirmation(Snapshot const& snapshot) {
    _console.Document()["confirm"] = {{"number", snapshot.number}, {"seconds", _confirmWithin}};
    _console.Warning("This is undone in " + std::to_string(_confirmWithin) +
                     " seconds. Log in anew, and type there: tslauthctl confirm");
}

void HostChange::Follow(std::string const& verb, std::vector<std::string> const& paths,
                        std::function<void()> const& change) {
    RequireNothingOpen(verb);
    auto const snapshot = Kept(verb, paths);
    try {
        change();
    } catch (...) {
        (void)Conclude(snapshot);
        throw;
    }
    (void)Conclude(snapshot);
}

void HostChange::PutBack(Snapshot const& snapshot) {
    auto& document = _console.Document();
    auto const put = [&](UndoStep const& step) {
        try {
            PutStateOnHost(step.path, step.wanted);
            document["put_back"].push_back(step.path);
            _console.ErrorDetail("put back as it was: " + step.path);
        } catch (std::exception const& e) {
            document["not_put_back"].push_back(step.path);
            _console.ErrorDetail("could not be put back: " + step.path + ": " + e.what());
        }
    };
    try {
        for (auto const& step : PlanUndo(snapshot.before, CurrentOf(snapshot.before), {})) {
            put(step);
        }
    } catch (std::exception const& e) {
        _console.ErrorDetail(std::string("what was written before that could not be put back: ") +
                             e.what());
    }
}

bool HostChange::Conclude(Snapshot snapshot) {
    try {
        snapshot.after = CurrentOf(snapshot.before);
        if (snapshot.Changed().empty()) {
            DropSnapshot(snapshot);
            return false;
        }
        FinishSnapshot(snapshot);
    } catch (std::exception const& e) {
        // The change stands, and what the host was before is kept.
        _console.Warning(e.what());
    }
    return true;
}

void RequireRoot(char const* what) {
    if (geteuid() != 0) {
        throw Failure(ExitCode::notRoot, std::string(what) + " must be run as root");
    }
}

} // namespace tessel::tslauthctl
