// SPDX-License-Identifier: Apache-2.0
#include "questions/OffLine.h"

#include "Failure.h"
#include "Paths.h"
#include "host/Host.h"
#include "host/HostFile.h"
#include "host/Membership.h"
#include "host/SystemLog.h"
#include "text/SambaDomain.h"

#include <ctime>
#include <sys/stat.h>

namespace tessel::winbind {

namespace {

constexpr std::time_t patience = 30;

/// Whether winbindd was told a short while ago. A clock that was set back makes that longer.
bool WasToldJustNow(std::string const& mark) {
    struct stat status = {};
    return ::stat(mark.c_str(), &status) == 0 && std::time(nullptr) - status.st_mtime < patience;
}

void Tell(Host const& host, char const* word, Clock::time_point deadline) {
    ChildProcess::Outcome const outcome = host.Run({{"smbcontrol", "winbindd", word}}, deadline);
    if (outcome.timedOut || outcome.code != 0) {
        LogWarning(std::string("winbindd cannot be told '") + word + "': " + outcome.output);
    }
}

void Mark(std::string const& mark) {
    HostChanges changes;
    changes.Replace(mark, "", 0600);
    changes.Keep();
}

} // namespace

void TellWinbinddOfControllers(Host const& host, Reach const& isReachable,
                               Clock::time_point deadline) {
    auto const membership = Membership::Read(host);
    if (!membership || !LetsInOffLine(ReadHostFile(host.At(Paths::OwnSamba)).value_or(""))) {
        return;
    }
    std::string const mark = host.At(Paths::OffLine);
    if (WasToldJustNow(mark)) {
        return;
    }
    if (!isReachable(membership->DNSName())) {
        LogWarning("no controller can be reached; users are let in from memory");
        Tell(host, "offline", deadline);
        Mark(mark);
    } else if (FileExists(mark)) {
        Tell(host, "online", deadline);
        RemoveHostFile(mark);
    }
}

} // namespace tessel::winbind
