// SPDX-License-Identifier: Apache-2.0
#include "questions/Directory.h"

#include "Failure.h"
#include "Paths.h"
#include "host/HostFile.h"
#include "host/Membership.h"
#include "host/OperationLock.h"
#include "host/PreferredControllers.h"
#include "join/DomainJoin.h"
#include "join/DomainPart.h"
#include "join/LocalMembership.h"
#include "samba/DirectorySearch.h"
#include "samba/DomainDiscovery.h"
#include "samba/SambaTools.h"
#include "samba/WinbindDaemon.h"
#include "text/DirectoryNames.h"
#include "tslauth_winbind_provider.h"

#include <algorithm>
#include <strings.h>

namespace tessel::winbind {

namespace {

Clock::time_point QuestionDeadline() {
    return Clock::now() + std::chrono::seconds(TSLAUTH_WINBIND_QUESTION_SECONDS);
}

} // namespace

void JoinDomain(std::string const& domain, std::string const& unit,
                ActiveDirectoryClientCredentials const& credentials) {
    DomainJoin::WithCredentials(domain, unit, credentials);
}

void JoinDomainWithMachineAccount(ActiveDirectoryClientDomainInformation const& information,
                                  ActiveDirectoryClientMachineAccount const& account) {
    DomainJoin::WithMachineAccount(information, account);
}

void PartDomain(ActiveDirectoryClientCredentials const* credentials) {
    PartFromDomain(credentials);
}

void SetPreferredDomainControllers(std::vector<std::string> const& controllers) {
    // A join or a part that runs is waited for: what it writes would be written over.
    OperationLock const lock(Clock::now() + std::chrono::seconds(TSLAUTH_WINBIND_JOIN_SECONDS));
    PreferredControllers const file(Paths::State);
    auto const before = file.Read();
    file.Write(controllers);
    if (!Membership::Read()) {
        return;
    }
    try {
        HostChanges changes;
        changes.Replace(
            Paths::OwnSamba,
            WithPreferredControllers(ReadHostFile(Paths::OwnSamba).value_or(""), controllers),
            0644);
        changes.Keep();
    } catch (Failure const&) {
        file.Write(before); // both files or none
        throw;
    }
    WinbindDaemon(SambaFolders::Read(QuestionDeadline())).Reload();
}

std::vector<std::string> GetPreferredDomainControllers() {
    return PreferredControllers(Paths::State).Read();
}

authentication::Domain GetActiveDomain() {
    auto const membership = Membership::Read();
    return membership ? authentication::Domain(membership->DNSName(), membership->domain.workgroup)
                      : authentication::Domain();
}

std::string GetMachineAccountDN() {
    static constexpr char attribute[] = "distinguishedName";
    auto const membership = Membership::Read();
    if (!membership) {
        return {};
    }
    std::string const& computer = membership->domain.netbiosName;
    auto const entries = SearchDirectory("", "(sAMAccountName=" + EscapedForFilter(computer) + "$)",
                                         {attribute}, QuestionDeadline());
    std::string name = entries.empty() ? std::string() : ValueIn(entries.front(), attribute);
    if (name.empty()) {
        throw Failure(TSLAUTH_PROVIDER_NO_TRUST_SAM_ACCOUNT,
                      "the directory has no account '" + computer + "$'");
    }
    return name;
}

std::vector<std::string> FindDomainControllers(std::string const& domain) {
    auto controllers = DomainDiscovery::AskDNS(DomainName(domain));
    auto const preferred = PreferredControllers(Paths::State).Read();
    std::stable_partition(controllers.begin(), controllers.end(), [&](std::string const& name) {
        return std::any_of(preferred.begin(), preferred.end(), [&](std::string const& first) {
            return ::strcasecmp(first.c_str(), name.c_str()) == 0;
        });
    });
    return controllers;
}

} // namespace tessel::winbind
