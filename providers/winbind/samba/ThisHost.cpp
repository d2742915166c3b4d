// SPDX-License-Identifier: Apache-2.0
#include "samba/ThisHost.h"

#include "Failure.h"
#include "host/Host.h"
#include "host/HostFile.h"
#include "host/ServiceRecords.h"
#include "samba/WinbindDaemon.h"

#include <cerrno>
#include <climits>
#include <sys/statvfs.h>
#include <unistd.h>

namespace tessel::winbind {

namespace {

class Machine : public Host {
public:
    Machine() : Host("") {}

    std::string Name() const override {
        char name[HOST_NAME_MAX + 1] = {};
        if (::gethostname(name, sizeof name - 1) != 0) {
            throw Failure(TSLAUTH_PROVIDER_INVALID_COMPUTER_NAME, "the host's name cannot be read");
        }
        return name;
    }

    bool Has(std::string const& program) const override {
        return !ChildProcess::Find(program).empty();
    }

    ChildProcess::Outcome Run(ChildProcess::Task const& task,
                              Clock::time_point deadline) const override {
        return ChildProcess::Run(task, deadline);
    }

    std::vector<std::string> AskDNS(std::string const& domain) const override {
        return ServiceRecords::Ask(domain);
    }

    std::shared_ptr<Daemon const> Winbindd(SambaFolders const& folders) const override {
        return std::make_shared<WinbindDaemon>(folders);
    }

    unsigned long long FreeBytes(std::string const& folder) const override {
        std::string nearest = folder;
        while (nearest.size() > 1 && !FileExists(nearest)) {
            nearest.erase(nearest.rfind('/') == 0 ? 1 : nearest.rfind('/'));
        }
        struct statvfs status = {};
        if (::statvfs(nearest.c_str(), &status) != 0) {
            ThrowSystemFailure("cannot look at the file system of '" + folder + "'", errno);
        }
        return static_cast<unsigned long long>(status.f_bfree) * status.f_frsize;
    }
};

/// Never destroyed: a question that was abandoned may still use it. Made when the library is
/// loaded, since a fork may meet the first call.
Host const& machine = *new Machine;

} // namespace

Host const& ThisHost() {
    return machine;
}

} // namespace tessel::winbind
