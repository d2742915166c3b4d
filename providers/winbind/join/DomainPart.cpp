// SPDX-License-Identifier: Apache-2.0
#include "join/DomainPart.h"

#include "Failure.h"
#include "Paths.h"
#include "host/HostFile.h"
#include "host/Membership.h"
#include "host/OperationLock.h"
#include "host/PreferredControllers.h"
#include "host/SystemLog.h"
#include "join/LocalMembership.h"
#include "samba/Account.h"
#include "samba/DomainDiscovery.h"
#include "samba/SambaTools.h"
#include "samba/StagingFolder.h"
#include "tslauth_winbind_provider.h"

#include <optional>

namespace tessel::winbind {

namespace {

/// Of the time for a part, what is kept for the host's half: winbindd is stopped, and started again
/// where it ran before the join.
constexpr auto localTime = std::chrono::seconds(60);
/// How long a host without credentials waits for a controller before it goes without.
constexpr auto ownAccountLimit = std::chrono::seconds(10);

/// Deletes the host's account.
void LeaveDirectory(Membership const& membership, Account const* account,
                    Clock::time_point deadline) {
    StagingFolder staging;
    SambaDomain domain = membership.domain;
    domain.preferredControllers.clear(); // the one that answers is named to the tools
    staging.Configure(domain, membership.DNSName(), {});
    SambaFolders const folders = SambaFolders::Read(deadline);
    staging.SetSecrets(ReadHostFile(folders.secrets + '/' + Paths::Secrets).value_or(""));
    SambaTools const tools(staging);
    auto const controller = DomainDiscovery::FindController(
        tools, membership.DNSName(), PreferredControllers(Paths::State).Read(), deadline);
    std::string const& computer = membership.domain.netbiosName;
    if (account) {
        // An account that is gone already is no reason to stay joined for ever.
        std::string const name = tools.ComputerAttribute(controller.controller, computer,
                                                         "distinguishedName", *account, deadline);
        if (name.empty()) {
            LogWarning("the directory has no account '" + computer + "$' any more");
            return;
        }
    }
    tools.Leave(controller.controller, account, deadline);
}

} // namespace

void PartFromDomain(ActiveDirectoryClientCredentials const* credentials) {
    auto const deadline =
        Clock::now() + std::chrono::seconds(TSLAUTH_WINBIND_PART_SECONDS) - localTime;
    std::optional<Account> account;
    if (credentials) {
        account.emplace(*credentials);
    }
    OperationLock const lock(deadline);
    LocalMembership::CleanUp(deadline);
    auto const membership = Membership::Read();
    if (!membership) {
        throw Failure(TSLAUTH_PROVIDER_NO_SUCH_DOMAIN, "this host is joined to no domain");
    }
    if (account) {
        LeaveDirectory(*membership, &*account, deadline);
    } else {
        try {
            LeaveDirectory(*membership, nullptr, Clock::now() + ownAccountLimit);
        } catch (Failure const& e) {
            LogWarning("the account '" + membership->domain.netbiosName +
                       "$' stays in the directory: " + e.what());
        }
    }
    LocalMembership::Dissolve(*membership, Clock::now() + localTime / 4);
}

} // namespace tessel::winbind
