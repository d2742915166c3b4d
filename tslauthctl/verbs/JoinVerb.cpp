// SPDX-License-Identifier: Apache-2.0
#include "analysis/Failures.h"
#include "analysis/JoinedDomain.h"
#include "analysis/NameResolution.h"
#include "history/HistoryPaths.h"
#include "setup/SetupHost.h"
#include "terminal/Password.h"
#include "verbs/HostChange.h"
#include "verbs/Verbs.h"

#include <base/AsciiText.h>
#include <sstream>
#include <unistd.h>

namespace tessel::tslauthctl {

namespace {

using namespace authentication;
using base::AsciiText::EqualsIgnoringCase;

void CheckUsage(JoinArguments const& arguments) {
    auto const refuse = [](char const* text) { throw Failure(ExitCode::usage, text); };
    if (arguments.domain.empty() == arguments.server.empty()) {
        refuse("join needs either a domain or --cam SERVER");
    }
    if (arguments.server.empty()) {
        if (!arguments.account.user && !arguments.dryRun) {
            refuse("join needs --user NAME, an account that may add computers to the domain");
        }
        if (!arguments.unit.empty()) {
            refuse("--ou goes with --cam; write DOMAIN/OU otherwise");
        }
    } else if (arguments.account.user || arguments.account.password.IsGiven()) {
        refuse("A join through a CAM server needs no account");
    }
}

bool IsCAM(JoinArguments const& arguments) {
    return !arguments.server.empty();
}

/// The domain without the unit behind it.
std::string DomainOf(JoinArguments const& arguments) {
    return arguments.domain.substr(0, arguments.domain.find('/'));
}

/// The unit that the machine account is made in; empty where that is left to the domain.
std::string UnitOf(JoinArguments const& arguments) {
    auto const slash = arguments.domain.find('/');
    return IsCAM(arguments) || slash == std::string::npos ? arguments.unit
                                                          : arguments.domain.substr(slash + 1);
}

void Describe(JoinArguments const& arguments, Console& console) {
    auto& document = console.Document();
    document["joined"] = false;
    document["already_joined"] = false;
    document["dry_run"] = arguments.dryRun;
    document["domain"] = nullptr;
    document["organisational_unit"] = nullptr;
    document["cam_server"] = nullptr;
    document["hostname_checked"] = !arguments.skipHostnameCheck;
    document["dropped_names"] = nlohmann::json::array();
    document["put_back"] = nlohmann::json::array();
    document["found"] = nlohmann::json::object();
    if (IsCAM(arguments)) {
        document["cam_server"] = arguments.server;
    } else {
        document["domain"] = DomainOf(arguments);
    }
    if (auto const unit = UnitOf(arguments); !unit.empty()) {
        document["organisational_unit"] = unit;
    }
}

/// The domain that the join is to.
std::string WantedDomain(JoinArguments const& arguments,
                         std::shared_ptr<ActiveDirectoryStore> const& store, Limit limit,
                         Console& console) {
    if (!IsCAM(arguments)) {
        return DomainOf(arguments);
    }
    return Explaining(Account::none, [&] {
        return Ask(
            console, "the CAM server " + arguments.server + " to name its domain", limit,
            [store, server = arguments.server] { return store->GetDomainForCAMService(server); });
    });
}

std::string NameOf(Domain const& domain) {
    return domain.DNSName().empty() ? domain.NetBIOSName() : domain.DNSName();
}

/// Looks first whether there is anything to do: a one-time code and an account are spent by trying.
/// @return whether the host is in that very domain
/// @throws Failure (joined elsewhere) with both names
bool IsJoinedAlready(JoinArguments const& arguments,
                     std::shared_ptr<ActiveDirectoryStore> const& store, Limit limit,
                     Console& console) {
    auto const active = KnownDomain(console, limit);
    if (!active) {
        return false;
    }
    auto const wanted = WantedDomain(arguments, store, limit, console);
    if (EqualsIgnoringCase(wanted, active->DNSName()) ||
        EqualsIgnoringCase(wanted, active->NetBIOSName())) {
        console.Document()["domain"] = wanted;
        return true;
    }
    throw Failure(ExitCode::joinedElsewhere, "The host is joined to " + NameOf(*active) +
                                                 ", and not to " + wanted +
                                                 "; 'tslauthctl part' takes it out");
}

/// Looks whether the domain can be found at all, before anything of the host is touched. What else
/// may be in the way the join itself finds out.
void RequireReachable(std::string const& domain, std::shared_ptr<ActiveDirectoryStore> const& store,
                      Limit limit, Console& console) {
    std::string controller;
    try {
        controller = Explaining(Account::none, [&] {
            return Ask(console, "a domain controller of " + domain + " to be found", limit,
                       [store, domain] {
                           return WithCause(*store, Account::none, [&] {
                               return store->GetDomainControllerForDomain(domain);
                           });
                       });
        });
    } catch (Failure const& e) {
        if (e.Code() == ExitCode::unreachable) {
            throw;
        }
    }
    console.Detail("domain controller: " + (controller.empty() ? "not told" : controller));
}

/// Says which names the join takes out of the hosts file.
void TellDroppedNames(NameResolution const& resolution, Console& console) {
    auto const names = resolution.NamesToBeDropped();
    console.Document()["dropped_names"] = names;
    std::string list;
    for (auto const& name : names) {
        list += (list.empty() ? "'" : ", '") + name + "'";
    }
    if (!list.empty()) {
        console.Warning("/etc/hosts gives the management address to other names as well, which a "
                        "join drops: " +
                        list + "; --skip-hostname-check leaves the file alone");
    }
}

/// Joins, and leaves the name resolution as it was where that fails.
/// @param join what runs on the worker; holds everything that it needs
void Join(Account account, std::string const& what, Console& console, std::function<void()> join) {
    NameResolution const resolution;
    try {
        Explaining(account, [&] { Wait(console, Start(what, std::nullopt, std::move(join))); });
    } catch (Failure const&) {
        auto const paths = resolution.PutBack();
        console.Document()["put_back"] = paths;
        for (auto const& path : paths) {
            console.ErrorDetail("put back as it was: " + path);
        }
        throw;
    }
}

void JoinThroughServer(JoinArguments const& arguments,
                       std::shared_ptr<ActiveDirectoryStore> const& store, Console& console) {
    Join(Account::none, "the join through the CAM server " + arguments.server, console,
         [store, server = arguments.server, unit = arguments.unit,
          skipsCheck = arguments.skipHostnameCheck] {
             WithCause(*store, Account::none,
                       [&] { store->JoinDomainWithCAM(server, unit, skipsCheck); });
         });
    console.Line("The host is joined through the CAM server " + arguments.server + ".");
}

void JoinWithPassword(JoinArguments const& arguments,
                      std::shared_ptr<ActiveDirectoryStore> const& store,
                      std::shared_ptr<Secret> const& password, Console& console) {
    auto const domain = DomainOf(arguments);
    Join(Account::given, "the join to " + domain, console,
         [store, target = arguments.domain, user = *arguments.account.user, password,
          skipsCheck = arguments.skipHostnameCheck] {
             LastUse const lastUse(*password);
             WithCause(*store, Account::given, [&] {
                 store->JoinDomain(target, {user.c_str(), password->Text()}, skipsCheck);
             });
         });
    console.Line("The host is joined to " + domain + ".");
}

std::shared_ptr<Secret> AskForPassword(JoinArguments const& arguments) {
    auto password = std::make_shared<Secret>();
    ReadPassword(arguments.account.password,
                 "Password of '" + *arguments.account.user + "' for " + DomainOf(arguments) + ": ",
                 *password);
    return password;
}

/// What the provider finds in the way of a join; empty where it does not tell.
std::string Preview(JoinArguments const& arguments, std::string const& domain,
                    std::shared_ptr<ActiveDirectoryStore> const& store, Limit limit,
                    Console& console) {
    if (geteuid() != 0) {
        console.Warning("what is in the way of a join is told to root alone");
        return {};
    }
    auto const password = arguments.account.user ? AskForPassword(arguments) : nullptr;
    auto const account = password ? Account::given : Account::none;
    return Explaining(account, [&] {
        return Ask(console, "the provider to look at " + domain, limit,
                   [store, domain, unit = UnitOf(arguments), password, account,
                    user = arguments.account.user.value_or("")] {
                       return WithCause(*store, account, [&] {
                           if (!password) {
                               return store->PreviewJoin(domain, unit, nullptr);
                           }
                           LastUse const lastUse(*password);
                           Credentials const credentials = {user.c_str(), password->Text()};
                           return store->PreviewJoin(domain, unit, &credentials);
                       });
                   });
    });
}

/// @param findings one line each, "what: finding"
void TellFindings(std::string const& findings, Console& console) {
    auto& found = console.Document()["found"];
    found = nlohmann::json::object();
    std::istringstream lines(findings);
    for (std::string line; std::getline(lines, line);) {
        console.Line(line);
        auto const colon = line.find(": ");
        if (colon != std::string::npos) {
            found[line.substr(0, colon)] = line.substr(colon + 2);
        }
    }
    if (findings.empty() && geteuid() == 0) {
        console.Note("The provider does not look at the clock, the unit and the account before it "
                     "joins.");
    }
}

/// What a join would find and write.
ExitCode TellJoin(JoinArguments const& arguments,
                  std::shared_ptr<ActiveDirectoryStore> const& store, Limit limit,
                  Console& console) {
    auto const domain = WantedDomain(arguments, store, limit, console);
    console.Document()["domain"] = domain;
    console.Line("The host would be joined to " + domain + ".");
    auto const unit = UnitOf(arguments);
    console.Line("organisational unit: " + (unit.empty() ? "left to the domain" : unit));
    TellFindings(Preview(arguments, domain, store, limit, console), console);
    if (!arguments.skipHostnameCheck) {
        console.Line("The host's entry in /etc/hosts would be set, and where its full name is of "
                     "another domain, " +
                     domain + " would become a search domain.");
    }
    return ExitCode::changes;
}

} // namespace

ExitCode RunJoin(JoinArguments const& arguments, Limit limit, Console& console) {
    CheckUsage(arguments);
    if (!arguments.dryRun) {
        RequireRoot("join");
    }
    ProtectMemory();
    console.ShowDetails(arguments.verbose);
    auto const store = OpenStore(limit);
    Describe(arguments, console);
    if (IsJoinedAlready(arguments, store, limit, console)) {
        auto& document = console.Document();
        document["joined"] = document["already_joined"] = true;
        console.Line("The host is already joined to " + document["domain"].get<std::string>() +
                     ".");
        return ExitCode::done;
    }
    if (!IsCAM(arguments)) {
        RequireReachable(DomainOf(arguments), store, limit, console);
    }
    if (!arguments.skipHostnameCheck) {
        TellDroppedNames(NameResolution(), console);
    }
    if (arguments.dryRun) {
        return TellJoin(arguments, store, limit, console);
    }
    // Before the lock is taken: whoever has to type it may take their time.
    auto const password = IsCAM(arguments) ? nullptr : AskForPassword(arguments);
    HostChange change(console);
    console.Detail("the provider is asked to join the host");
    change.Follow("join", PathsOfMembership(PathsOfJoinOnHost()), [&] {
        if (IsCAM(arguments)) {
            JoinThroughServer(arguments, store, console);
        } else {
            JoinWithPassword(arguments, store, password, console);
        }
    });
    console.Document()["joined"] = true;
    return ExitCode::done;
}

} // namespace tessel::tslauthctl
