// SPDX-License-Identifier: Apache-2.0
#include "analysis/Failures.h"
#include "analysis/JoinedDomain.h"
#include "terminal/Password.h"
#include "verbs/HostChange.h"
#include "verbs/Verbs.h"

namespace tessel::tslauthctl {

namespace {

void CheckUsage(JoinArguments const& arguments) {
    auto const refuse = [](char const* text) { throw Failure(ExitCode::usage, text); };
    if (arguments.domain.empty() == arguments.server.empty()) {
        refuse("join needs either a domain or --cam SERVER");
    }
    if (arguments.server.empty()) {
        if (!arguments.account.user) {
            refuse("join needs --user NAME, an account that may add computers to the domain");
        }
        if (!arguments.unit.empty()) {
            refuse("--ou goes with --cam; write DOMAIN/OU otherwise");
        }
    } else if (arguments.account.user || arguments.account.password.IsGiven()) {
        refuse("A join through a CAM server needs no account");
    }
}

/// @param join what runs on the worker; holds everything that it needs
void Join(Account account, std::string const& what, Console& console, std::function<void()> join) {
    HostChange const change(console);
    Explaining(account, [&] { Wait(console, Start(what, std::nullopt, std::move(join))); });
}

} // namespace

ExitCode RunJoin(JoinArguments const& arguments, Limit limit, Console& console) {
    CheckUsage(arguments);
    RequireRoot("join");
    ProtectMemory();
    auto const store = OpenStore(limit);
    bool const skipsCheck = arguments.skipHostnameCheck;
    auto& document = console.Document();
    document["joined"] = false;
    document["domain"] = nullptr;
    document["organisational_unit"] = nullptr;
    document["cam_server"] = nullptr;
    document["hostname_checked"] = !skipsCheck;
    if (!arguments.server.empty()) {
        document["cam_server"] = arguments.server;
        if (!arguments.unit.empty()) {
            document["organisational_unit"] = arguments.unit;
        }
        Join(Account::none, "the join through the CAM server " + arguments.server, console,
             [store, server = arguments.server, unit = arguments.unit, skipsCheck] {
                 store->JoinDomainWithCAM(server, unit, skipsCheck);
             });
        document["joined"] = true;
        console.Line("The host is joined through the CAM server " + arguments.server + ".");
        return ExitCode::done;
    }
    auto const slash = arguments.domain.find('/');
    auto const domain = arguments.domain.substr(0, slash);
    document["domain"] = domain;
    if (slash != std::string::npos && slash + 1 < arguments.domain.size()) {
        document["organisational_unit"] = arguments.domain.substr(slash + 1);
    }
    auto const& user = *arguments.account.user;
    auto const password = std::make_shared<Secret>();
    // Before the lock is taken: whoever has to type it may take their time.
    ReadPassword(arguments.account.password, "Password of '" + user + "' for " + domain + ": ",
                 *password);
    Join(Account::given, "the join to " + domain, console,
         [store, target = arguments.domain, user, password, skipsCheck] {
             LastUse const lastUse(*password);
             store->JoinDomain(target, {user.c_str(), password->Text()}, skipsCheck);
         });
    document["joined"] = true;
    console.Line("The host is joined to " + domain + ".");
    return ExitCode::done;
}

} // namespace tessel::tslauthctl
