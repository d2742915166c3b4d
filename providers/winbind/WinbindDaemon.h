// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "ChildProcess.h"

#include <string>
#include <sys/types.h>

namespace tessel::winbind {

/// The host's winbindd: a unit of systemd where that runs, otherwise a daemon of its own.
class WinbindDaemon {
public:
    /// @param pidFolder where it writes the number of its process
    explicit WinbindDaemon(std::string pidFolder);

    bool Runs() const;

    /// Starts it, anew where it runs already, and waits until it answers.
    /// @throws Failure 1060 where it is not installed, 1062 where it does not answer by `deadline`
    void Restart(Clock::time_point deadline) const;

    /// Returns when it has ended; where it does not run, at once.
    /// @throws Failure
    void Stop(Clock::time_point deadline) const;

    /// Has it read its configuration again, if it runs.
    void Reload() const noexcept;

    /// Returns when a controller has accepted the host's secret. winbindd may need several attempts
    /// just after its start, while it looks for a controller.
    /// @throws Failure what the last attempt has thrown before `deadline`
    static void CheckTrust(Clock::time_point deadline);

private:
    /// The daemon of that name; 0 where it does not run.
    pid_t Process(std::string const& program) const;
    void StopProcess(Clock::time_point deadline) const;

    std::string _pidFolder;
};

} // namespace tessel::winbind
