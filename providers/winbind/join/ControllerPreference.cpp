// SPDX-License-Identifier: Apache-2.0
#include "join/ControllerPreference.h"

#include "Failure.h"
#include "Paths.h"
#include "host/Host.h"
#include "host/HostFile.h"
#include "host/Membership.h"
#include "host/OperationLock.h"
#include "host/PreferredControllers.h"
#include "samba/SambaTools.h"
#include "tslauth_winbind_provider.h"

namespace tessel::winbind {

namespace {

/// Takes back the first of the two files.
void PutBack(PreferredControllers const& file, std::vector<std::string> const& before,
             Failure const& why) {
    try {
        file.Write(before);
    } catch (Failure const& e) {
        throw Failure(TSLAUTH_WINBIND_HOST_CHANGED,
                      std::string(why.what()) + "; and what was set before is lost: " + e.what());
    }
}

} // namespace

void SetPreferredDomainControllers(Host const& host, std::vector<std::string> const& controllers) {
    // A join or a part that runs is waited for: what it writes would be written over.
    OperationLock const lock(host.At(Paths::Lock),
                             Clock::now() + std::chrono::seconds(TSLAUTH_WINBIND_JOIN_SECONDS));
    PreferredControllers const file(host.At(Paths::State));
    if (!Membership::Read(host)) {
        file.Write(controllers);
        return;
    }
    auto const daemon = host.Winbindd(ReadSambaFolders(
        host, Clock::now() + std::chrono::seconds(TSLAUTH_WINBIND_QUESTION_SECONDS)));
    auto const before = file.Read();
    file.Write(controllers);
    try {
        std::string const own = host.At(Paths::OwnSamba);
        HostChanges changes;
        changes.Replace(own, WithPreferredControllers(ReadHostFile(own).value_or(""), controllers),
                        0644);
        changes.Keep();
    } catch (Failure const& e) {
        PutBack(file, before, e);
        throw;
    }
    daemon->Reload();
}

} // namespace tessel::winbind
