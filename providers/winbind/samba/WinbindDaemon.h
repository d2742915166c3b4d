// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "host/Host.h"

#include <string>
#include <sys/types.h>
#include <vector>

namespace tessel::winbind {

/// The host's winbindd: a unit of systemd where that runs, otherwise a daemon of its own.
class WinbindDaemon : public Daemon {
public:
    explicit WinbindDaemon(SambaFolders const& folders);

    bool Runs() const override;
    bool IsAlone() const override;
    void Restart(Clock::time_point deadline) const override;
    void Stop(Clock::time_point deadline) const override;
    void Reload() const noexcept override;
    void CheckTrust(Clock::time_point deadline) const override;

private:
    /// The daemon of that name; 0 where it does not run.
    pid_t Process(std::string const& program) const;
    void StopProcess(Clock::time_point deadline) const;

    /// Those of Samba's processes that came with winbindd.
    std::vector<pid_t> Companions() const;
    void StopCompanions() const;

    std::string _pidFolder;
    /// Each of Samba's processes has a file there, named by its number.
    std::string _messagingFolder;
};

} // namespace tessel::winbind
