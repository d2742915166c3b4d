// SPDX-License-Identifier: Apache-2.0
#include "history/HistoryArchive.h"
#include "terminal/UnifiedDiff.h"
#include "verbs/HostChange.h"
#include "verbs/Verbs.h"

#include <base/AsciiText.h>

#include <cstdio>

namespace tessel::tslauthctl {

namespace {

/// Who made a change, for people.
std::string Person(ChangeLog::Caller const& caller) {
    if (!caller.sudoUser.empty()) {
        return caller.sudoUser;
    }
    return "uid " + (caller.loginUid.empty() ? std::to_string(caller.uid) : caller.loginUid);
}

nlohmann::json DescribedChange(Snapshot const& snapshot) {
    nlohmann::json described = {{"number", snapshot.number},
                                {"when", snapshot.when},
                                {"command", snapshot.command},
                                {"uid", snapshot.caller.uid},
                                {"login_uid", nullptr},
                                {"sudo_user", nullptr},
                                {"finished", snapshot.after.has_value()},
                                {"changed", snapshot.Changed()}};
    if (!snapshot.caller.loginUid.empty()) {
        described["login_uid"] = snapshot.caller.loginUid;
    }
    if (!snapshot.caller.sudoUser.empty()) {
        described["sudo_user"] = snapshot.caller.sudoUser;
    }
    return described;
}

std::string Line(Snapshot const& snapshot) {
    auto const extent = snapshot.after ? base::AsciiText::Counted(snapshot.Changed().size(), "path")
                                       : std::string("interrupted");
    return std::to_string(snapshot.number) + "  " + snapshot.when + "  " + Person(snapshot.caller) +
           "  " + snapshot.command + "  (" + extent + ")";
}

/// What there was at a path beside its bytes, for people.
std::string Nature(PathState const& state) {
    switch (state.kind) {
    case PathState::Kind::absent:
        return "nothing";
    case PathState::Kind::link:
        return "a link to " + state.text;
    case PathState::Kind::other:
        return "a device or a pipe";
    case PathState::Kind::file:
    case PathState::Kind::folder:
        break;
    }
    char mode[sizeof "07777"];
    (void)std::snprintf(mode, sizeof mode, "%04o", state.attributes.mode & 07777U);
    std::string names;
    for (auto const& [name, value] : state.attributes.extended) {
        names += ", " + name;
    }
    return (state.kind == PathState::Kind::file ? "a file, " : "a folder, ") + std::string(mode) +
           " " + std::to_string(state.attributes.owner) + ":" +
           std::to_string(state.attributes.group) + names;
}

} // namespace

void DescribePath(std::string const& path, PathState const& before, PathState const& after,
                  nlohmann::json& described, Console& console) {
    auto const isText = [](PathState const& state) {
        return state.kind == PathState::Kind::file || state.kind == PathState::Kind::absent;
    };
    auto const diff =
        isText(before) && isText(after) ? UnifiedDiff(path, before.text, after.text) : "";
    described["path"] = path;
    described["before"] = Nature(before);
    described["after"] = Nature(after);
    described["diff"] = diff;
    console.Diff(diff);
    if (Nature(before) != Nature(after)) {
        console.Note(path + ": " + Nature(before) + " became " + Nature(after));
    }
}

ExitCode RunHistory(Console& console) {
    RequireRoot("history");
    auto const history = ReadHistory();
    auto& document = console.Document();
    document["history"] = nlohmann::json::array();
    for (auto const& snapshot : history.snapshots) {
        document["history"].push_back(DescribedChange(snapshot));
        console.Line(Line(snapshot));
    }
    document["unreadable"] = history.unreadable;
    for (auto const& text : history.unreadable) {
        console.Warning(text);
    }
    if (history.snapshots.empty()) {
        console.Line("No change of this host is remembered.");
    }
    return ExitCode::done;
}

ExitCode RunShowHistory(unsigned number, Console& console) {
    RequireRoot("history");
    auto const history = ReadHistory();
    auto const* const snapshot = history.Find(number);
    if (snapshot == nullptr) {
        throw Failure(ExitCode::usage, "No change " + std::to_string(number) +
                                           " is remembered; see 'tslauthctl history'");
    }
    auto& document = console.Document();
    document["change"] = DescribedChange(*snapshot);
    document["files"] = nlohmann::json::array();
    console.Line(Line(*snapshot));
    if (!snapshot->after) {
        console.Warning("the command was killed; what it was about to write:");
    }
    for (auto const& [path, before] : snapshot->before) {
        auto const& after = snapshot->after ? snapshot->after->at(path) : before;
        if (before == after && snapshot->after) {
            continue;
        }
        nlohmann::json described;
        DescribePath(path, before, after, described, console);
        document["files"].push_back(std::move(described));
        if (!snapshot->after) {
            console.Line("  " + path);
        }
    }
    return ExitCode::done;
}

} // namespace tessel::tslauthctl
