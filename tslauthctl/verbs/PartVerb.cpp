// SPDX-License-Identifier: Apache-2.0
#include "analysis/Failures.h"
#include "analysis/JoinedDomain.h"
#include "history/HistoryPaths.h"
#include "setup/SetupHost.h"
#include "terminal/Password.h"
#include "verbs/HostChange.h"
#include "verbs/Verbs.h"

namespace tessel::tslauthctl {

namespace {

/// The call that parts the host; holds everything that it needs.
std::function<void()> PartCall(AccountArguments const& arguments, Limit limit) {
    auto const store = OpenStore(limit);
    if (!arguments.user) {
        return [store] { WithCause(*store, Account::none, [&] { store->PartDomain(); }); };
    }
    auto const password = std::make_shared<Secret>();
    ReadPassword(arguments.password, "Password of '" + *arguments.user + "': ", *password);
    return [store, user = *arguments.user, password] {
        LastUse const lastUse(*password);
        WithCause(*store, Account::given, [&] {
            store->PartDomain({user.c_str(), password->Text()});
        });
    };
}

} // namespace

ExitCode RunPart(AccountArguments const& arguments, Limit limit, Console& console) {
    if (!arguments.user && arguments.password.IsGiven()) {
        throw Failure(ExitCode::usage, "A password goes with --user NAME");
    }
    RequireRoot("part");
    ProtectMemory();
    auto& document = console.Document();
    document["parted"] = false;
    auto const part = PartCall(arguments, limit);
    HostChange change(console);
    OnJoinedHost(console, limit, [&] {
        change.Follow("part", PathsOfMembership(PathsOfJoinOnHost()), [&] {
            Explaining(arguments.user ? Account::given : Account::none, [&] {
                Wait(console,
                     Start("the provider to part the host from its domain", std::nullopt, part));
            });
        });
    });
    document["parted"] = true;
    console.Line("The host is parted from its domain.");
    return ExitCode::done;
}

} // namespace tessel::tslauthctl
