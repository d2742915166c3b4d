// SPDX-License-Identifier: Apache-2.0
#ifndef TSLAUTHCTL_HISTORYARCHIVE_H
#define TSLAUTHCTL_HISTORYARCHIVE_H

#include "history/Snapshot.h"

#include <cstddef>
#include <string>
#include <vector>

/// Where snapshots are kept, as an administrator can read them without this tool: a folder each, by
/// its number, with a document and, below "before" and "after", files under their own paths. For
/// root alone. To be changed by who holds the host's lock.
namespace tessel::tslauthctl {

inline constexpr char HistoryFolder[] = "/var/lib/tslauth/history";

/// How many are kept. Whenever one is added, the oldest beyond that go.
inline constexpr std::size_t SnapshotsKept = 20;

struct History {
    /// Oldest first.
    std::vector<Snapshot> snapshots;
    /// The folders that cannot be read or understood, and why, a sentence each.
    std::vector<std::string> unreadable;

    Snapshot const* Find(unsigned number) const;
};

/// @throws Failure where the folder cannot be listed
History ReadHistory();

/// To be called before anything of a snapshot is read: the folders are not part of any.
/// @throws Failure
void MakeHistoryFolder();

/// Adds a snapshot, whole and durable, and gives it its number.
/// `MakeHistoryFolder` has been called before.
/// @throws Failure; nothing is left then
void KeepSnapshot(Snapshot& snapshot);

/// Adds what the change has made of the host.
/// @throws Failure
void FinishSnapshot(Snapshot const& snapshot);

/// Forgets one whose change has changed nothing.
void DropSnapshot(Snapshot const& snapshot) noexcept;

} // namespace tessel::tslauthctl

#endif
