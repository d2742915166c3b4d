// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "host/ChildProcess.h"

#include <string>
#include <sys/types.h>
#include <vector>

namespace tessel::winbind {

struct SambaFolders;

/// The host's winbindd: a unit of systemd where that runs, otherwise a daemon of its own.
class WinbindDaemon {
public:
    explicit WinbindDaemon(SambaFolders const& folders);

    bool Runs() const;
    /// Whether no other server of Samba's writes to the same folders now.
    bool IsAlone() const;

    /// Starts it, anew where it runs already, and waits until it answers.
    /// @throws Failure 1060 where it is not installed, 1062 where it does not answer by `deadline`
    void Restart(Clock::time_point deadline) const;

    /// Returns when it has ended, with all that it has started and smbd does not use; where it does
    /// not run, at once.
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

    /// Those of Samba's processes that came with winbindd.
    std::vector<pid_t> Companions() const;
    void StopCompanions() const;

    std::string _pidFolder;
    std::string
        _messagingFolder; ///< each of Samba's processes has a file there, named by its number
};

} // namespace tessel::winbind
