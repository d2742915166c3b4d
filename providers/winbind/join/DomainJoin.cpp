// SPDX-License-Identifier: Apache-2.0
#include "join/DomainJoin.h"

#include "Failure.h"
#include "Paths.h"
#include "host/Host.h"
#include "host/HostFile.h"
#include "host/Membership.h"
#include "host/OperationLock.h"
#include "host/PreferredControllers.h"
#include "host/ProviderFile.h"
#include "host/StagingFolder.h"
#include "host/SystemLog.h"
#include "join/AccountUndo.h"
#include "join/LocalMembership.h"
#include "samba/Account.h"
#include "samba/DomainDiscovery.h"
#include "samba/SambaTools.h"
#include "text/DirectoryNames.h"
#include "tslauth_winbind_provider.h"

#include <algorithm>
#include <base/AsciiText.h>
#include <exception>
#include <optional>
#include <string_view>
#include <vector>

namespace tessel::winbind::DomainJoin {

namespace {

/// Of the time for a join, what is kept for undoing it: winbindd is stopped and started again, each
/// of which may have to wait, and the account is deleted.
constexpr auto undoTime = std::chrono::seconds(55);
constexpr auto toolLimit = std::chrono::seconds(45);
constexpr auto dnsLimit = std::chrono::seconds(10);
constexpr auto lookLimit = std::chrono::seconds(10);
constexpr std::size_t longestBlob = std::size_t(1024) * 1024;
constexpr std::size_t longestNetBIOSName = 15;

/// What is asked for.
struct Order {
    std::string domain;
    std::string computer;
    ProviderOptions options;
    Clock::time_point deadline;

    /// The host's full name in the domain.
    std::string DNSHostName(Host const& host) const {
        std::string const name = host.Name();
        return base::AsciiText::Lower(name.substr(0, name.find('.'))) + '.' + domain;
    }
};

/// A host that can be joined.
struct FreeHost {
    SambaFolders folders;
    /// Of a join or a part that did not end: it stays until the new one is sure to succeed in the
    /// directory, because it may be whole.
    std::optional<Membership> half;
};

/// A controller that answers, with what it takes to undo there.
struct Partner {
    ControllerAnswer answer;
    std::string begin; ///< its time, as a directory writes it, just before the join
    std::vector<std::string> preferred; ///< for the host's configuration
};

/// What the controller's half of a join has made.
struct Secrets {
    LocalMembership::Secrets files;
    /// Who can delete the account; null: it was not made by this join.
    Account const* account;
};

Clock::time_point ToolDeadline(Order const& order) {
    return std::min(order.deadline, Clock::now() + toolLimit);
}

/// What the tools need to know before a controller has told the rest.
SambaDomain Guess(Order const& order) {
    using base::AsciiText::Upper;
    std::string const& domain = order.domain;
    return {Upper(domain),
            Upper(domain.substr(0, domain.find('.')).substr(0, longestNetBIOSName)),
            order.computer,
            {}};
}

/// A join could not be finished without them.
void RequirePrograms(Host const& host) {
    for (char const* const program : {"net", "testparm", "winbindd"}) {
        if (!host.Has(program)) {
            throw Failure(TSLAUTH_PROVIDER_SERVICE_DOES_NOT_EXIST,
                          std::string("the program '") + program + "' is not installed");
        }
    }
}

void RequireNotJoined(Host const& host, SambaFolders const& folders, Clock::time_point deadline) {
    if (auto const membership = Membership::Read(host)) {
        if (!LocalMembership::IsHalf(host)) {
            throw Failure(TSLAUTH_PROVIDER_SETUP_ALREADY_JOINED,
                          "this host is joined to '" + membership->DNSName() + "'");
        }
        return;
    }
    if (folders.isDomainController) {
        throw Failure(TSLAUTH_PROVIDER_SETUP_ALREADY_JOINED, "this host is a domain controller");
    }
    // An administrator may have written the settings of a member and never joined.
    if (folders.isDomainMember && SambaTools(host).HasMachineSecret(deadline)) {
        throw Failure(TSLAUTH_PROVIDER_SETUP_ALREADY_JOINED,
                      std::string("this host is joined by other means; '") + Paths::Samba +
                          "' says to which domain");
    }
}

/// Phase 1: the host alone. Puts in order what an earlier operation has left, short of a
/// membership.
FreeHost LookAtHost(Host const& host, Order const& order) {
    RequirePrograms(host);
    SambaFolders folders = ReadSambaFolders(host, order.deadline);
    if (LocalMembership::CleanUp(host, folders, order.deadline)) {
        folders = ReadSambaFolders(host, order.deadline);
    }
    RequireNotJoined(host, folders, order.deadline);
    LocalMembership::RequireRoom(host, folders);
    return {folders, Membership::Read(host)};
}

ControllerAnswer FindController(Host const& host, Order const& order,
                                std::vector<std::string> const& candidates,
                                StagingFolder& staging) {
    staging.Configure(Guess(order), order.domain, {});
    return DomainDiscovery::FindController(host, SambaTools(host, staging), order.domain,
                                           candidates, order.deadline);
}

/// What the tools need to know once a controller has answered.
void Configure(StagingFolder& staging, Order const& order, ControllerAnswer const& answer) {
    staging.Configure({answer.Realm(), answer.netBIOSDomain, order.computer, {}}, order.domain,
                      {answer.controller});
}

/// Phase 2: a controller, whose name and clock fit this host, and the tools' configuration for it.
/// @param first asked before the preferred controllers; may be empty
Partner FindPartner(Host const& host, Order const& order, FreeHost const& free,
                    std::string const& first, StagingFolder& staging) {
    std::vector<std::string> const preferred = PreferredControllers(host.At(Paths::State)).Read();
    std::vector<std::string> candidates = preferred;
    if (!first.empty()) {
        candidates.insert(candidates.begin(), first);
    }
    auto const answer = FindController(host, order, candidates, staging);
    DomainDiscovery::CheckHostName(host, order.computer, answer, order.domain);
    auto const ahead =
        DomainDiscovery::CheckClock(SambaTools(host, staging), answer.controller, order.deadline);
    Configure(staging, order, answer);
    std::string const secrets = LocalMembership::SecretsBeforeJoin(host, free.folders);
    if (!secrets.empty()) {
        staging.SetSecrets(secrets);
    }
    std::string const keytab = LocalMembership::KeytabBeforeJoin(host);
    if (order.options.keytab && !keytab.empty()) {
        staging.SetKeytab(keytab);
    }
    return {answer, AccountUndo::Begin(ahead), preferred};
}

LocalMembership::Secrets SecretsIn(StagingFolder const& staging, SambaTools const& tools,
                                   Order const& order, Partner const& partner) {
    LocalMembership::Secrets secrets;
    secrets.database = staging.Secrets();
    if (secrets.database.empty()) {
        throw Failure(TSLAUTH_WINBIND_SEE_SYSTEM_LOG, "the join has made no secrets");
    }
    if (order.options.keytab) {
        tools.WriteKeytab(partner.answer.controller, staging.KeytabPath(), ToolDeadline(order));
        secrets.keytab = staging.Keytab();
    }
    return secrets;
}

/// Whether a failure may have come after the controller had made the account. What it says of
/// names, rights and passwords comes before.
bool MayComeFromTheMiddle(ActiveDirectoryClientErrorCode code) {
    return code == TSLAUTH_WINBIND_SEE_SYSTEM_LOG || code == TSLAUTH_PROVIDER_TIMED_OUT ||
           code == TSLAUTH_PROVIDER_NO_LOGON_SERVERS || code == TSLAUTH_PROVIDER_NO_NETWORK ||
           code == TSLAUTH_PROVIDER_CONNECTION_INVALID ||
           code == TSLAUTH_PROVIDER_CONNECTION_REFUSED || code == TSLAUTH_WINBIND_DISK_FULL ||
           code == TSLAUTH_PROVIDER_INTERNAL_ERROR || code == TSLAUTH_PROVIDER_NOT_ENOUGH_MEMORY;
}

/// Phase 3: the directory. The host is untouched as yet.
Secrets MakeSecrets(Host const& host, Order const& order, Partner const& partner,
                    Account const& account, std::string const& unit, StagingFolder const& staging) {
    SambaTools const tools(host, staging);
    bool isMade = false;
    try {
        tools.Join(partner.answer.controller, account, unit,
                   order.options.computerName.empty() ? "" : order.DNSHostName(host),
                   ToolDeadline(order));
        isMade = true;
        return {SecretsIn(staging, tools, order, partner), &account};
    } catch (Failure const& e) {
        if (!isMade && !MayComeFromTheMiddle(e.Code())) {
            throw;
        }
        AccountUndo const undo = {tools, partner.answer.controller, order.computer, partner.begin};
        if (!undo.Answers()) {
            throw Failure(TSLAUTH_PROVIDER_NO_LOGON_SERVERS,
                          "'" + partner.answer.controller +
                              "' has fallen silent, and may have made the account '" +
                              order.computer + "$': " + e.what());
        }
        std::string const left = undo.Run(account);
        if (!left.empty()) {
            throw Failure(TSLAUTH_WINBIND_ACCOUNT_LEFT, left + ": " + e.what());
        }
        throw;
    }
}

Secrets MakeSecrets(Host const& host, Order const& order, Partner const& partner,
                    SecretFile const& blob, StagingFolder const& staging) {
    SambaTools const tools(host, staging);
    tools.JoinOffline(blob, ToolDeadline(order));
    return {SecretsIn(staging, tools, order, partner), nullptr};
}

/// What has become of the half of a membership that was in the way.
void GiveUp(Host const& host, FreeHost const& free) {
    if (free.half) {
        LogWarning(
            "parting from a domain that a join or a part which did not end has left in half; "
            "an account that is there stays in the directory");
        LocalMembership::Dissolve(host, free.folders, *free.half);
    }
}

/// Takes everything back that a join has done, and tells what cannot be.
[[noreturn]] void ThrowUndone(Order const& order, Partner const& partner, Secrets const& secrets,
                              SambaTools const& tools, HostChanges& changes, bool isHostChanged,
                              ActiveDirectoryClientErrorCode code, std::string const& why) {
    isHostChanged = !changes.Undo() || isHostChanged;
    std::string text = "'" + partner.answer.controller +
                       "' accepted the join, and it could not be finished here: " + why;
    std::string left;
    if (secrets.account) {
        left = AccountUndo{tools, partner.answer.controller, order.computer, partner.begin}.Run(
            *secrets.account);
        text += left.empty() ? "; the account was deleted again" : "; " + left;
    } else {
        // Whoever made the account knows of it, and this join has changed nothing of it.
        text += "; the account that was made for it stays in the directory";
    }
    if (isHostChanged) {
        throw Failure(TSLAUTH_WINBIND_HOST_CHANGED, text + "; the host is not as it was");
    }
    throw Failure(left.empty() ? code : TSLAUTH_WINBIND_ACCOUNT_LEFT, text);
}

/// Phase 4: the host.
void TakeOver(Host const& host, Order const& order, FreeHost const& free, Partner const& partner,
              Secrets const& secrets, SambaTools const& tools) {
    HostChanges changes;
    bool isDissolved = false;
    try {
        GiveUp(host, free);
        isDissolved = free.half.has_value();
        LocalMembership::Establish(host, free.folders,
                                   {{partner.answer.Realm(), partner.answer.netBIOSDomain,
                                     order.computer, partner.preferred},
                                    order.domain,
                                    order.options},
                                   secrets.files, changes, order.deadline);
    } catch (Failure const& e) {
        ThrowUndone(order, partner, secrets, tools, changes,
                    isDissolved || e.Code() == TSLAUTH_WINBIND_HOST_CHANGED, e.Code(), e.what());
    } catch (std::exception const& e) {
        ThrowUndone(order, partner, secrets, tools, changes, isDissolved,
                    TSLAUTH_PROVIDER_INTERNAL_ERROR, e.what());
    }
    changes.Keep();
}

/// An account that exists already stays where it is; whoever asked for a unit should know.
void TellOfUnit(Order const& order, Partner const& partner, std::string const& unit,
                Account const& account, SambaTools const& tools) {
    try {
        std::string const name =
            tools.ComputerAttribute(partner.answer.controller, order.computer, "distinguishedName",
                                    account, ToolDeadline(order));
        std::string const parent = name.substr(std::min(name.size(), name.find(',') + 1));
        if (!base::AsciiText::EqualsIgnoringCase(parent, unit)) {
            LogWarning("the account existed already, and stays at '" + name + "'");
        }
    } catch (Failure const& e) {
        LogWarning(std::string("where the account is could not be found out: ") + e.what());
    }
}

/// A matter of convenience: the host is joined, whatever DNS says.
void RegisterInDNS(Host const& host, Order const& order, Partner const& partner,
                   SambaTools const& tools) {
    if (!order.options.registerInDNS) {
        return;
    }
    try {
        tools.RegisterInDNS(partner.answer.controller, order.DNSHostName(host),
                            std::min(order.deadline, Clock::now() + dnsLimit));
    } catch (Failure const& e) {
        LogWarning(std::string("the host's name is not registered in DNS: ") + e.what());
    }
}

void CheckBlob(std::string_view blob) {
    static constexpr std::string_view allowed = "ABCDEFGHIJKLMNOPQRSTUVWXYZ"
                                                "abcdefghijklmnopqrstuvwxyz"
                                                "0123456789+/=\r\n";
    if (blob.empty() || blob.size() > longestBlob ||
        blob.find_first_not_of(allowed) != std::string_view::npos) {
        throw Failure(TSLAUTH_PROVIDER_INVALID_PARAMETER,
                      "the machine account's first result is no text of an offline join");
    }
}

/// A host whose own name does not serve has another one in the options.
std::string ComputerNameOf(Host const& host, ProviderOptions const& options) {
    return ComputerName(options.computerName.empty() ? host.Name() : options.computerName);
}

Order OrderOf(Host const& host, std::string const& domain) {
    ProviderOptions const options = ReadProviderOptions(host.At(Paths::State));
    return {DomainName(domain), ComputerNameOf(host, options), options,
            Clock::now() + std::chrono::seconds(TSLAUTH_WINBIND_JOIN_SECONDS) - undoTime};
}

std::string PlaceOf(Order const& order, std::string const& unit) {
    return unit.empty() ? unit : ReadOrganisationalUnit(unit, order.domain).distinguishedName;
}

/// Of a preview: what was looked at, and what was found.
std::string Finding(char const* what, std::string const& found) {
    return std::string(what) + ": " + found + '\n';
}

/// What `look` finds; where it fails, what would stop a join.
template <typename Look> std::string Finding(char const* what, Look look) {
    std::string found;
    try {
        found = look();
    } catch (Failure const& e) {
        found = std::string(e.what()) + "; the join would be refused";
    }
    return Finding(what, found);
}

std::string ClockText(std::chrono::seconds ahead) {
    std::string const seconds = std::to_string(std::chrono::abs(ahead).count());
    return ahead.count() == 0
               ? "as the controller's"
               : seconds + " seconds " + (ahead.count() > 0 ? "behind" : "ahead of") +
                     " the controller's";
}

/// What the directory says, asked as `account`; as nobody it says nothing.
std::string DirectoryFindings(Order const& order, std::string const& controller,
                              std::string const& place, Account const* account,
                              SambaTools const& tools) {
    if (!account) {
        std::string const unknown = "not looked at, which takes an account";
        return Finding("unit", place.empty() ? "left to the domain" : place + ": " + unknown) +
               Finding("account", unknown);
    }
    std::string const name = tools.ComputerAttribute(
        controller, order.computer, "distinguishedName", *account, ToolDeadline(order));
    return Finding("unit",
                   [&] {
                       if (place.empty()) {
                           return std::string("left to the domain");
                       }
                       if (!tools.Exists(controller, place, *account, ToolDeadline(order))) {
                           throw Failure(TSLAUTH_PROVIDER_INVALID_PARAMETER,
                                         "'" + place + "' is not there");
                       }
                       return place;
                   }) +
           Finding("account", name.empty() ? "there is none of this name yet"
                                           : "'" + name + "' is there, and would be taken over");
}

} // namespace

std::string Preview(Host const& host, std::string const& domain, std::string const& unit,
                    ActiveDirectoryClientCredentials const* credentials) {
    Order const order = OrderOf(host, domain);
    std::string const place = PlaceOf(order, unit);
    std::optional<Account> account;
    if (credentials) {
        account.emplace(*credentials);
    }
    RequirePrograms(host);
    SambaFolders const folders = ReadSambaFolders(host, order.deadline);
    StagingFolder staging(host.At(Paths::Staging));
    auto const answer =
        FindController(host, order, PreferredControllers(host.At(Paths::State)).Read(), staging);
    Configure(staging, order, answer);
    SambaTools const tools(host, staging);
    return Finding("host",
                   [&] {
                       RequireNotJoined(host, folders, order.deadline);
                       LocalMembership::RequireRoom(host, folders);
                       return std::string("can be joined");
                   }) +
           Finding("controller", answer.controller) +
           Finding("clock",
                   [&] {
                       return ClockText(
                           DomainDiscovery::CheckClock(tools, answer.controller, order.deadline));
                   }) +
           Finding("computer",
                   [&] {
                       DomainDiscovery::CheckHostName(host, order.computer, answer, order.domain);
                       return order.computer;
                   }) +
           DirectoryFindings(order, answer.controller, place, account ? &*account : nullptr, tools);
}

void WithCredentials(Host const& host, std::string const& domain, std::string const& unit,
                     ActiveDirectoryClientCredentials const& credentials) {
    Order const order = OrderOf(host, domain);
    std::string const place = PlaceOf(order, unit);
    Account const account(credentials);

    OperationLock const lock(host.At(Paths::Lock), order.deadline);
    FreeHost const free = LookAtHost(host, order);
    StagingFolder staging(host.At(Paths::Staging));
    Partner const partner = FindPartner(host, order, free, "", staging);
    Secrets const secrets = MakeSecrets(host, order, partner, account, place, staging);
    SambaTools const tools(host, staging);
    TakeOver(host, order, free, partner, secrets, tools);
    RegisterInDNS(host, order, partner, tools);
    if (!place.empty()) {
        TellOfUnit(order, partner, place, account, tools);
    }
}

void WithMachineAccount(Host const& host, ActiveDirectoryClientDomainInformation const& information,
                        ActiveDirectoryClientMachineAccount const& account) {
    Order const order = OrderOf(host, information.dnsDomainName);
    if (ComputerName(account.accountName) != order.computer) {
        throw Failure(TSLAUTH_PROVIDER_INVALID_COMPUTER_NAME,
                      "the machine account is for '" + std::string(account.accountName) +
                          "', and this host is '" + order.computer + "'");
    }
    CheckBlob(account.firstResult);
    std::string const controller = account.secondResult;
    if (!controller.empty() && !IsControllerName(controller)) {
        throw Failure(TSLAUTH_PROVIDER_INVALID_PARAMETER,
                      "the machine account's second result is no controller's name");
    }
    SecretFile const blob({account.firstResult});

    OperationLock const lock(host.At(Paths::Lock), order.deadline);
    FreeHost const free = LookAtHost(host, order);
    StagingFolder staging(host.At(Paths::Staging));
    Partner partner = FindPartner(host, order, free, controller, staging);
    if (partner.preferred.empty() && !controller.empty()) {
        // The others may not have heard of the account yet.
        partner.preferred.push_back(controller);
    }
    Secrets const secrets = MakeSecrets(host, order, partner, blob, staging);
    SambaTools const tools(host, staging);
    TakeOver(host, order, free, partner, secrets, tools);
    RegisterInDNS(host, order, partner, tools);
}

void RequireJoinable(Host const& host) {
    auto const deadline = Clock::now() + lookLimit;
    (void)ComputerNameOf(host, ReadProviderOptions(host.At(Paths::State)));
    RequirePrograms(host);
    SambaFolders const folders = ReadSambaFolders(host, deadline);
    RequireNotJoined(host, folders, deadline);
    LocalMembership::RequireRoom(host, folders);
    StagingFolder const staging(host.At(Paths::Staging));
}

} // namespace tessel::winbind::DomainJoin
