// SPDX-License-Identifier: Apache-2.0
#ifndef TSLAUTHCTL_HOSTCHANGE_H
#define TSLAUTHCTL_HOSTCHANGE_H

#include <tslauth/HostLock.h>

#include <functional>
#include <string>
#include <vector>

namespace tessel::tslauthctl {

class Console;
struct Snapshot;

/// Lives while a command changes the host: keeps every other change of it out, and remembers what
/// the host was.
class HostChange {
public:
    /// Waits until nobody else changes the host, as long as that takes, and says so on a terminal.
    /// @throws Failure
    explicit HostChange(Console& console);

    /// Has the next change undone in so many seconds, unless somebody confirms it.
    /// @param seconds 0 for never
    void ConfirmWithin(int seconds) noexcept {
        _confirmWithin = seconds;
    }

    /// Keeps what there is at `paths`, and then has `write` change it. Where that fails, all of it
    /// becomes what it was, and what does not is told. Signals that end the process wait until it
    /// has said how it ended. A change that has changed nothing is forgotten.
    /// @param verb the command's name
    /// @param paths all that it may write
    /// @throws Failure before the change, where it cannot be kept; what `write` throws
    void Write(std::string const& verb, std::vector<std::string> const& paths,
               std::function<void()> const& write);

    /// The same for what a provider writes, which knows better than files how far it came: nothing
    /// is put back here, and signals end the process.
    void Follow(std::string const& verb, std::vector<std::string> const& paths,
                std::function<void()> const& change);

private:
    void PutBack(Snapshot const& snapshot);
    /// @return whether anything has changed
    bool Conclude(Snapshot snapshot);

    void RequireNothingOpen(std::string const& verb) const;
    void TellConfirmation(Snapshot const& snapshot);
    void ForgetOpenConfirmation();

    int _confirmWithin = 0;
    Console& _console;
    authentication::HostLock _lock;
};

/// @throws Failure (not root), naming what wants to be root
void RequireRoot(char const* what);

} // namespace tessel::tslauthctl

#endif
