// SPDX-License-Identifier: Apache-2.0
#ifndef TSLAUTHCTL_SNAPSHOT_H
#define TSLAUTHCTL_SNAPSHOT_H

#include "analysis/ChangeLog.h"

#include <base/WholeFile.h>
#include <nlohmann/json.hpp>

#include <map>
#include <optional>
#include <string>
#include <vector>

/// What the host was before a change, and what the change made of it. No file is opened here.
namespace tessel::tslauthctl {

/// Everything that is there at one path.
struct PathState {
    enum class Kind {
        absent,
        file,
        link,
        folder,
        /// A device or a pipe, which nobody here can put back.
        other
    };
    Kind kind = Kind::absent;
    /// Of a file or folder; of a link the owner alone.
    base::FileAttributes attributes;
    /// The bytes of a file, and where a link leads.
    std::string text;

    bool operator==(PathState const& other) const {
        return kind == other.kind && attributes == other.attributes && text == other.text;
    }
    bool operator!=(PathState const& other) const {
        return !(*this == other);
    }
};

using PathStates = std::map<std::string, PathState>;

struct Snapshot {
    /// Counts up from 1; that of a change which changed nothing is given again.
    unsigned number = 0;
    /// In UTC, as "2026-11-22T01:30:00Z".
    std::string when;
    /// The command's own name, and all that was typed but for secrets.
    std::string verb;
    std::string command;
    ChangeLog::Caller caller;
    PathStates before;
    /// Nothing where the command was killed before it could tell.
    std::optional<PathStates> after;

    /// The paths that the change made something else of.
    std::vector<std::string> Changed() const;
};

/// All but the bytes of the files, which have files of their own.
nlohmann::json Described(PathStates const& states);
nlohmann::json Described(Snapshot const& snapshot);

/// The reverse; the bytes of files are empty.
/// @throws nlohmann::json::exception, std::invalid_argument
PathStates StatesIn(nlohmann::json const& document);
Snapshot SnapshotIn(nlohmann::json const& document);

/// Those of `states` that are not the same in `before`.
PathStates Differing(PathStates const& before, PathStates const& states);

} // namespace tessel::tslauthctl

#endif
