// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "host/ChildProcess.h"
#include "host/SambaFolders.h"

#include <memory>
#include <string>
#include <utility>
#include <vector>

namespace tessel::winbind {

/// The host's winbindd.
class Daemon {
public:
    Daemon() = default;
    Daemon(Daemon const&) = delete;
    Daemon& operator=(Daemon const&) = delete;
    virtual ~Daemon() = default;

    virtual bool Runs() const = 0;
    /// Whether no other server of Samba's writes to the same folders now.
    virtual bool IsAlone() const = 0;

    /// Starts it, anew where it runs already, and waits until it answers.
    /// @throws Failure 1060 where it is not installed, 1062 where it does not answer by `deadline`
    virtual void Restart(Clock::time_point deadline) const = 0;

    /// Returns when it has ended, with all that it has started and smbd does not use; where it does
    /// not run, at once.
    /// @throws Failure
    virtual void Stop(Clock::time_point deadline) const = 0;

    /// Has it read its configuration again, if it runs.
    virtual void Reload() const noexcept = 0;

    /// Returns when a controller has accepted the host's secret. winbindd may need several attempts
    /// just after its start, while it looks for a controller.
    /// @throws Failure what the last attempt has thrown before `deadline`
    virtual void CheckTrust(Clock::time_point deadline) const = 0;
};

/// The host that an operation works on, with everything that is not a file of its own to be read or
/// replaced: its programs, its winbindd, DNS. Tests have hosts of theirs, below a folder.
class Host {
public:
    /// @param root where its fixed paths begin; empty for this machine
    explicit Host(std::string root) : _root(std::move(root)) {}
    Host(Host const&) = delete;
    Host& operator=(Host const&) = delete;
    virtual ~Host() = default;

    /// Where one of `Paths` lies.
    std::string At(std::string const& path) const {
        return _root + path;
    }

    /// As gethostname(2) has it.
    /// @throws Failure 1210
    virtual std::string Name() const = 0;

    virtual bool Has(std::string const& program) const = 0;

    /// See `ChildProcess::Run`.
    virtual ChildProcess::Outcome Run(ChildProcess::Task const& task,
                                      Clock::time_point deadline) const = 0;

    /// The controllers of `domain` in the order of DNS (priority, then weight); at least one. Ends
    /// within 8 seconds.
    /// @throws Failure 1355 where DNS knows no such domain or cannot be asked, 10060 where it is
    ///         silent
    virtual std::vector<std::string> AskDNS(std::string const& domain) const = 0;

    virtual std::shared_ptr<Daemon const> Winbindd(SambaFolders const& folders) const = 0;

    /// How many bytes the file system of `folder` has left for root; of its nearest parent where
    /// there is no such folder.
    /// @throws Failure
    virtual unsigned long long FreeBytes(std::string const& folder) const = 0;

private:
    std::string _root;
};

} // namespace tessel::winbind
