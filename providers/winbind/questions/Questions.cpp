// SPDX-License-Identifier: Apache-2.0
#include "questions/Questions.h"

#include "Failure.h"
#include "Paths.h"
#include "host/Host.h"
#include "host/Membership.h"
#include "host/PreferredControllers.h"
#include "host/SystemLog.h"
#include "questions/LastAnswer.h"
#include "samba/BoundedCall.h"
#include "samba/DirectorySearch.h"
#include "samba/WinbindClient.h"
#include "text/DirectoryNames.h"
#include "tslauth_winbind_provider.h"
#include <base/AsciiText.h>

#include <algorithm>
#include <cstdlib>
#include <memory>
#include <netdb.h>
#include <optional>
#include <string_view>

namespace tessel::winbind {

namespace {

using authentication::Domain;
using base::AsciiText::EndsWith;
using base::AsciiText::EqualsIgnoringCase;
using base::AsciiText::Lower;
using base::AsciiText::Upper;
typedef BoundedCall::Clock Clock;

/// How long winbindd may take to answer what it knows without a controller.
constexpr std::chrono::seconds pingTime(3);

Clock::time_point Deadline() {
    return Clock::now() + std::chrono::seconds(TSLAUTH_WINBIND_QUESTION_SECONDS);
}

/// A DNS name without the dot of the root.
std::string_view WithoutRoot(std::string_view name) {
    return EndsWith(name, ".") ? name.substr(0, name.size() - 1) : name;
}

/// Whether `name` is one of the names of `domain`.
bool Names(std::string_view name, Domain const& domain) {
    std::string_view const wanted = WithoutRoot(name);
    return !wanted.empty() && (EqualsIgnoringCase(wanted, domain.DNSName()) ||
                               EqualsIgnoringCase(wanted, domain.NetBIOSName()));
}

/// The controllers of `domain` as its DNS lists them, the preferred ones that it lists first.
std::vector<std::string> FindDomainControllers(Host const& host, std::string const& domain) {
    auto controllers = host.AskDNS(DomainName(domain));
    auto const preferred = PreferredControllers(host.At(Paths::State)).Read();
    std::stable_partition(controllers.begin(), controllers.end(), [&](std::string const& name) {
        return std::any_of(preferred.begin(), preferred.end(), [&](std::string const& first) {
            return EqualsIgnoringCase(first, name);
        });
    });
    return controllers;
}

/// The host's domain; nothing where it has none.
std::optional<Domain> Joined(Host const& host) {
    Domain domain = GetActiveDomain(host);
    if (domain == Domain()) {
        return std::nullopt;
    }
    return domain;
}

Domain JoinedOrThrow(Host const& host) {
    if (std::optional<Domain> const domain = Joined(host)) {
        return *domain;
    }
    throw Failure(TSLAUTH_PROVIDER_NO_SUCH_DOMAIN, "this host is joined to no domain");
}

/// The numbers of a trusted domain object (MS-ADTS 6.1.6.7.9 and 6.1.6.7.12).
enum TrustDirection : unsigned long { Inbound = 0x1, Outbound = 0x2 };
enum TrustAttributes : unsigned long {
    NonTransitive = 0x1,
    ForestTransitive = 0x8,
    WithinForest = 0x20
};

/// The bits of a trust that the host's domain itself has.
int DirectRelationship(DirectoryEntry const& trust) {
    auto const number = [&](char const* attribute) {
        // The directory writes 32 bits as a signed number.
        return static_cast<unsigned long>(
            std::strtol(ValueIn(trust, attribute).c_str(), nullptr, 10));
    };
    unsigned long const attributes = number("trustAttributes");
    unsigned long const direction = number("trustDirection");
    int bits = 0;
    if ((attributes & WithinForest) != 0) {
        bits |= TSLAUTH_WINBIND_TRUST_IN_FOREST;
    }
    if ((attributes & (WithinForest | ForestTransitive)) != 0 &&
        (attributes & NonTransitive) == 0) {
        bits |= TSLAUTH_WINBIND_TRUST_TRANSITIVE;
    }
    if ((direction & Inbound) != 0) {
        bits |= TSLAUTH_WINBIND_TRUST_INBOUND;
    }
    if ((direction & Outbound) != 0) {
        bits |= TSLAUTH_WINBIND_TRUST_OUTBOUND;
    }
    return bits;
}

/// Whether `domain` is one of `domains`.
bool Contains(std::vector<Domain> const& domains, Domain const& domain) {
    return std::any_of(domains.begin(), domains.end(), [&](Domain const& other) {
        return Names(domain.NetBIOSName(), other) || Names(domain.DNSName(), other);
    });
}

/// The other domains that winbindd remembers: those whose users it has met.
std::vector<Domain> OtherDomains(WinbindClient const& client, Domain const& own) {
    std::vector<Domain> others;
    for (WinbindClient::Domain const& domain : client.ListDomains()) {
        // This machine's own accounts, the built-in groups among them.
        bool const isLocal = domain.trustType == WBC_DOMINFO_TRUSTTYPE_LOCAL;
        if (!isLocal && !Contains({own}, domain.names)) {
            others.push_back(domain.names);
        }
    }
    return others;
}

/// The trusts of the host's domain that `filter` selects.
std::vector<DirectoryEntry> SearchTrusts(Host const& host, std::string const& filter,
                                         Clock::time_point deadline) {
    return SearchDirectory(host, "", filter,
                           {"trustPartner", "flatName", "trustDirection", "trustAttributes"},
                           deadline);
}

std::vector<DirectoryEntry> AllTrusts(Host const& host, Clock::time_point deadline) {
    return SearchTrusts(host, "(objectClass=trustedDomain)", deadline);
}

/// Those to the domain `name`.
std::vector<DirectoryEntry> FindTrusts(Host const& host, std::string const& name,
                                       Clock::time_point deadline) {
    std::string const escaped = EscapedForFilter(WithoutRoot(name));
    if (escaped.empty()) {
        return {};
    }
    return SearchTrusts(host,
                        "(&(objectClass=trustedDomain)(|(trustPartner=" + escaped +
                            ")(flatName=" + escaped + ")))",
                        deadline);
}

/// The domains of trusts whose users may log in here.
std::vector<Domain> DomainsOf(std::vector<DirectoryEntry> const& trusts) {
    std::vector<Domain> domains;
    for (DirectoryEntry const& trust : trusts) {
        if ((DirectRelationship(trust) & TSLAUTH_WINBIND_TRUST_OUTBOUND) != 0) {
            domains.emplace_back(ValueIn(trust, "trustPartner"), ValueIn(trust, "flatName"));
        }
    }
    return domains;
}

/// The domain that `name` means, the host's own or another that winbindd remembers.
std::optional<Domain> FindRemembered(WinbindClient const& client, Domain const& own,
                                     std::string const& name) {
    if (Names(name, own)) {
        return own;
    }
    for (Domain const& domain : OtherDomains(client, own)) {
        if (Names(name, domain)) {
            return domain;
        }
    }
    return std::nullopt;
}

/// The domain that `name` means, the host's own or one that it trusts.
std::optional<Domain> FindDomain(Host const& host, WinbindClient const& client, Domain const& own,
                                 std::string const& name, Clock::time_point deadline) {
    if (auto remembered = FindRemembered(client, own, name)) {
        return remembered;
    }
    std::vector<Domain> const trusted = DomainsOf(FindTrusts(host, name, deadline));
    return trusted.empty() ? std::nullopt : std::optional<Domain>(trusted.front());
}

Domain FindDomainOrThrow(Host const& host, WinbindClient const& client, Domain const& own,
                         std::string const& name, Clock::time_point deadline) {
    if (std::optional<Domain> const domain = FindDomain(host, client, own, name, deadline)) {
        return *domain;
    }
    throw Failure(TSLAUTH_PROVIDER_NO_SUCH_DOMAIN,
                  "'" + name + "' is neither this host's domain nor one that it trusts");
}

/// The account name of the user that the canonical name `text` is of: its last part is the object's
/// name, which may differ from the name that the user logs in with.
std::string AccountOfCanonicalName(Host const& host, WinbindClient const& client, Domain const& own,
                                   Domain const& domain, std::string const& text,
                                   std::string const& name, Clock::time_point deadline) {
    std::string const controller =
        Names(domain.DNSName(), own) ? "" : client.FindDomainController(domain.DNSName(), "");
    // Directories differ in what they escape, and the name itself was searched for.
    auto const plain = [](std::string value) {
        value.erase(std::remove(value.begin(), value.end(), '\\'), value.end());
        return Lower(value);
    };
    std::vector<std::string> accounts;
    for (DirectoryEntry const& entry : SearchDirectory(
             host, controller,
             "(&(objectCategory=person)(objectClass=user)(cn=" + EscapedForFilter(name) + "))",
             {"canonicalName", "sAMAccountName"}, deadline)) {
        if (plain(ValueIn(entry, "canonicalName")) == plain(text)) {
            accounts.push_back(ValueIn(entry, "sAMAccountName"));
        }
    }
    if (accounts.size() != 1) {
        throw Failure(TSLAUTH_PROVIDER_NO_SUCH_USER, "there is no single user '" + text + "'");
    }
    return accounts.front();
}

/// The user of the principal name `text`. What it is of need not be a domain, nor what stands
/// before it an account's name: a controller knows both by the user's own attribute. Only where it
/// does not, they are taken as they look.
std::string UserOfPrincipal(Host const& host, WinbindClient const& client, Domain const& own,
                            UserName const& user, std::string const& text,
                            Clock::time_point deadline) {
    std::optional<Domain> const domain = FindRemembered(client, own, user.domain);
    try {
        return client.GetUserName((domain ? *domain : own).NetBIOSName(), text);
    } catch (Failure const& failure) {
        if (failure.Code() != TSLAUTH_PROVIDER_NO_SUCH_USER) {
            throw;
        }
    }
    return client.GetUserName(
        FindDomainOrThrow(host, client, own, user.domain, deadline).NetBIOSName(), user.name);
}

/// This host's full name, as the join has registered it: what the resolver says of the machine's
/// name, or that name in the domain where the resolver does not know it.
std::string FullHostName(std::string const& machine, Domain const& own,
                         Clock::time_point deadline) {
    std::string const found =
        BoundedCall::Run("the full name of this host", deadline, [machine]() -> std::string {
            addrinfo hints = {};
            hints.ai_flags = AI_CANONNAME | AI_ADDRCONFIG;
            hints.ai_socktype = SOCK_STREAM;
            addrinfo* list = nullptr;
            if (getaddrinfo(machine.c_str(), nullptr, &hints, &list) != 0) {
                return {};
            }
            std::unique_ptr<addrinfo, void (*)(addrinfo*)> const owner(list, &freeaddrinfo);
            return list->ai_canonname == nullptr ? "" : list->ai_canonname;
        });
    return Lower(found.find('.') == std::string::npos ? machine + "." + own.DNSName() : found);
}

} // namespace

Domain GetActiveDomain(Host const& host) {
    auto const membership = Membership::Read(host);
    return membership ? Domain(membership->DNSName(), membership->domain.workgroup) : Domain();
}

std::string GetMachineAccountDN(Host const& host) {
    static constexpr char attribute[] = "distinguishedName";
    auto const membership = Membership::Read(host);
    if (!membership) {
        return {};
    }
    std::string const& computer = membership->domain.netbiosName;
    auto const entries = SearchDirectory(
        host, "", "(sAMAccountName=" + EscapedForFilter(computer) + "$)", {attribute}, Deadline());
    std::string name = entries.empty() ? std::string() : ValueIn(entries.front(), attribute);
    if (name.empty()) {
        throw Failure(TSLAUTH_PROVIDER_NO_TRUST_SAM_ACCOUNT,
                      "the directory has no account '" + computer + "$'");
    }
    return name;
}

std::vector<std::string> GetPreferredDomainControllers(Host const& host) {
    return PreferredControllers(host.At(Paths::State)).Read();
}

int TrustStateOf(ActiveDirectoryClientErrorCode code) {
    switch (code) {
    case TSLAUTH_PROVIDER_SUCCESS:
        return TSLAUTH_WINBIND_TRUST_HEALTHY;
    case TSLAUTH_PROVIDER_ACCESS_DENIED:
    case TSLAUTH_PROVIDER_INVALID_PASSWORD:
    case TSLAUTH_PROVIDER_NO_SUCH_USER:
    case TSLAUTH_PROVIDER_LOGON_FAILURE:
    case TSLAUTH_PROVIDER_PASSWORD_EXPIRED:
    case TSLAUTH_PROVIDER_ACCOUNT_DISABLED:
    case TSLAUTH_PROVIDER_NO_TRUST_LSA_SECRET:
    case TSLAUTH_PROVIDER_NO_TRUST_SAM_ACCOUNT:
    case TSLAUTH_PROVIDER_DOMAIN_TRUST_INCONSISTENT:
        return TSLAUTH_WINBIND_TRUST_SECRET_REFUSED;
    case TSLAUTH_PROVIDER_NO_NETWORK:
    case TSLAUTH_PROVIDER_CONNECTION_REFUSED:
    case TSLAUTH_PROVIDER_CONNECTION_INVALID:
    case TSLAUTH_PROVIDER_NO_LOGON_SERVERS:
    case TSLAUTH_PROVIDER_NO_SUCH_DOMAIN:
    case TSLAUTH_PROVIDER_TIMED_OUT:
        return TSLAUTH_WINBIND_TRUST_NO_CONTROLLER;
    case TSLAUTH_PROVIDER_SERVICE_NOT_ACTIVE:
        return TSLAUTH_WINBIND_TRUST_NOT_RUNNING;
    case TSLAUTH_PROVIDER_TIME_SKEW:
        return TSLAUTH_WINBIND_TRUST_CLOCK;
    default:
        return TSLAUTH_WINBIND_TRUST_UNKNOWN;
    }
}

int GetDomainTrustState(Host const& host) {
    Clock::time_point const deadline = Deadline();
    if (!Joined(host)) {
        return TSLAUTH_WINBIND_TRUST_NOT_JOINED;
    }
    try {
        WinbindClient(std::min(deadline, Clock::now() + pingTime)).Ping();
    } catch (Failure const& failure) {
        LogWarning("get domain trust state: " + std::string(failure.what()));
        return failure.Code() == TSLAUTH_PROVIDER_SERVICE_NOT_ACTIVE
                   ? TSLAUTH_WINBIND_TRUST_NOT_RUNNING
                   : TSLAUTH_WINBIND_TRUST_NOT_ANSWERING;
    }
    try {
        WinbindClient(deadline).CheckTrustCredentials();
        return TSLAUTH_WINBIND_TRUST_HEALTHY;
    } catch (Failure const& failure) {
        LogWarning("get domain trust state: " + std::string(failure.what()));
        return TrustStateOf(failure.Code());
    }
}

/// As long as any thread. Made when the library is loaded, since a fork may meet the first call.
static LastAnswer<std::vector<Domain>>& lastTrustedDomains =
    *std::make_unique<LastAnswer<std::vector<Domain>>>().release();

std::vector<Domain> GetTrustedDomains(Host const& host) {
    Clock::time_point const deadline = Deadline();
    std::optional<Domain> const own = Joined(host);
    if (!own) {
        return {};
    }
    return lastTrustedDomains.Get(*own, [&] {
        // A domain behind another one is nobody's trust in the directory, and known once it was
        // met.
        std::vector<Domain> const remembered = OtherDomains(WinbindClient(deadline), *own);
        std::vector<Domain> domains = DomainsOf(AllTrusts(host, deadline));
        for (Domain const& domain : remembered) {
            if (!Contains(domains, domain)) {
                domains.push_back(domain);
            }
        }
        return domains;
    });
}

std::string GetAnyDomainController(Host const& host, std::string const& site,
                                   std::string const& domain) {
    Clock::time_point const deadline = Deadline();
    std::optional<Domain> const own = Joined(host);
    if (!own) {
        std::vector<std::string> const found = FindDomainControllers(host, domain);
        if (found.empty()) {
            throw Failure(TSLAUTH_PROVIDER_NO_LOGON_SERVERS,
                          "DNS lists no controller of '" + domain + "'");
        }
        return found.front();
    }
    WinbindClient const client(deadline);
    bool const hasDNSName = domain.find('.') != std::string::npos;
    auto const find = [&] { return FindDomain(host, client, *own, domain, deadline); };
    std::optional<Domain> const known = hasDNSName ? FindRemembered(client, *own, domain) : find();
    try {
        // By its DNS name, where it has one: that is the name that sites and DNS know.
        return client.FindDomainController(
            known && !known->DNSName().empty() ? known->DNSName() : DomainName(domain), site);
    } catch (Failure const& failure) {
        // winbindd has one answer for a domain that it cannot find and for one that is silent.
        if (failure.Code() == TSLAUTH_PROVIDER_NO_SUCH_DOMAIN && (known || find())) {
            throw Failure(TSLAUTH_PROVIDER_NO_LOGON_SERVERS, failure.what());
        }
        throw;
    }
}

std::string ConvertCanonicalUsername(Host const& host, std::string const& name) {
    Clock::time_point const deadline = Deadline();
    UserName const user = ReadUserName(name);
    Domain const own = JoinedOrThrow(host);
    WinbindClient const client(deadline);
    switch (user.form) {
    case UserName::Form::canonical: {
        Domain const domain = FindDomainOrThrow(host, client, own, user.domain, deadline);
        return client.GetUserName(
            domain.NetBIOSName(),
            AccountOfCanonicalName(host, client, own, domain, name, user.name, deadline));
    }
    case UserName::Form::principal:
        return UserOfPrincipal(host, client, own, user, name, deadline);
    case UserName::Form::downLevel:
        break;
    }
    return client.GetUserName(
        FindDomainOrThrow(host, client, own, user.domain, deadline).NetBIOSName(), user.name);
}

std::string GetHostPrincipalForDomain(Host const& host, std::string const& domain) {
    Clock::time_point const deadline = Deadline();
    Domain const own = JoinedOrThrow(host);
    WinbindClient const client(deadline);
    (void)FindDomainOrThrow(host, client, own, domain,
                            deadline); // the principal is the same for all of them
    return "host/" + FullHostName(Lower(client.GetHost().netBIOSName), own, deadline) + "@" +
           Upper(own.DNSName());
}

int GetDomainTrustRelationship(Host const& host, std::string const& domain) {
    Clock::time_point const deadline = Deadline();
    std::optional<Domain> const own = Joined(host);
    if (!own) {
        return 0;
    }
    if (Names(domain, *own)) {
        return TSLAUTH_WINBIND_TRUST_IN_FOREST | TSLAUTH_WINBIND_TRUST_TRANSITIVE |
               TSLAUTH_WINBIND_TRUST_INBOUND | TSLAUTH_WINBIND_TRUST_OUTBOUND;
    }
    // winbindd, on a member, knows neither direction nor kind.
    std::vector<DirectoryEntry> const trusts = FindTrusts(host, domain, deadline);
    if (!trusts.empty()) {
        return DirectRelationship(trusts.front());
    }
    WinbindClient const client(deadline);
    std::optional<Domain> const found = FindRemembered(client, *own, domain);
    if (!found) {
        return 0;
    }
    // A domain behind another one, which the host reaches because all trusts between are
    // transitive.
    bool const isInForest = client.GetForest(own->DNSName()) == client.GetForest(found->DNSName());
    return TSLAUTH_WINBIND_TRUST_TRANSITIVE | TSLAUTH_WINBIND_TRUST_OUTBOUND |
           (isInForest ? TSLAUTH_WINBIND_TRUST_IN_FOREST | TSLAUTH_WINBIND_TRUST_INBOUND : 0);
}

} // namespace tessel::winbind
