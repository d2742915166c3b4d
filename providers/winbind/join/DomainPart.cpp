// SPDX-License-Identifier: Apache-2.0
#include "join/DomainPart.h"

#include "Failure.h"
#include "Paths.h"
#include "host/Host.h"
#include "host/Membership.h"
#include "host/OperationLock.h"
#include "host/PreferredControllers.h"
#include "host/StagingFolder.h"
#include "host/SystemLog.h"
#include "join/LocalMembership.h"
#include "samba/Account.h"
#include "samba/DomainDiscovery.h"
#include "samba/SambaTools.h"
#include "tslauth_winbind_provider.h"

#include <optional>

namespace tessel::winbind {

namespace {

/// Of the time for a part, what is kept for the host's half: winbindd is stopped, and started again
/// where it ran before the join.
constexpr auto localTime = std::chrono::seconds(60);
/// How long a host without credentials waits for a controller before it goes without.
constexpr auto ownAccountLimit = std::chrono::seconds(10);

/// A host that is joined by this provider.
struct JoinedHost {
    SambaFolders folders;
    Membership membership;
};

/// Phase 1: the host alone.
JoinedHost LookAtHost(Host const& host, Clock::time_point deadline) {
    SambaFolders folders = ReadSambaFolders(host, deadline);
    if (LocalMembership::CleanUp(host, folders, deadline)) {
        folders = ReadSambaFolders(host, deadline);
    }
    auto const membership = Membership::Read(host);
    if (!membership) {
        throw Failure(TSLAUTH_PROVIDER_NO_SUCH_DOMAIN, "this host is joined to no domain");
    }
    return {folders, *membership};
}

/// Deletes the host's account.
void LeaveDirectory(Host const& host, JoinedHost const& joined, Account const* account,
                    Clock::time_point deadline) {
    Membership const& membership = joined.membership;
    StagingFolder staging(host.At(Paths::Staging));
    SambaDomain domain = membership.domain;
    domain.preferredControllers.clear(); // the one that answers is named to the tools
    staging.Configure(domain, membership.DNSName(), {});
    staging.SetSecrets(LocalMembership::SecretsOfMember(joined.folders));
    SambaTools const tools(host, staging);
    auto const controller = DomainDiscovery::FindController(
        host, tools, membership.DNSName(), PreferredControllers(host.At(Paths::State)).Read(),
        deadline);
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

/// Phase 2: the directory.
/// @return whether the account is gone
bool DeleteAccount(Host const& host, JoinedHost const& joined, Account const* account,
                   Clock::time_point deadline) {
    if (account) {
        LeaveDirectory(host, joined, account, deadline);
        return true;
    }
    try {
        LeaveDirectory(host, joined, nullptr, Clock::now() + ownAccountLimit);
        return true;
    } catch (Failure const& e) {
        LogWarning("the account '" + joined.membership.domain.netbiosName +
                   "$' stays in the directory: " + e.what());
        return false;
    }
}

} // namespace

void PartFromDomain(Host const& host, ActiveDirectoryClientCredentials const* credentials) {
    auto const deadline =
        Clock::now() + std::chrono::seconds(TSLAUTH_WINBIND_PART_SECONDS) - localTime;
    std::optional<Account> account;
    if (credentials) {
        account.emplace(*credentials);
    }
    OperationLock const lock(host.At(Paths::Lock), deadline);
    JoinedHost const joined = LookAtHost(host, deadline);
    bool const isDeleted = DeleteAccount(host, joined, account ? &*account : nullptr, deadline);
    try {
        LocalMembership::Dissolve(host, joined.folders, joined.membership);
    } catch (Failure const& e) {
        if (!isDeleted) {
            throw;
        }
        throw Failure(TSLAUTH_WINBIND_HOST_CHANGED,
                      std::string("the account is deleted in the directory: ") + e.what());
    }
}

} // namespace tessel::winbind
