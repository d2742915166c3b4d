// SPDX-License-Identifier: Apache-2.0
#include "analysis/Failures.h"
#include "analysis/JoinedDomain.h"
#include "verbs/HostChange.h"
#include "verbs/Verbs.h"

#include <tslauth/Exceptions.h>

namespace tessel::tslauthctl {

namespace {

using namespace authentication;

/// A question about a domain that the store answers with a name.
/// @param whose completes "the provider to name ..."
/// @param field of the JSON document
template <typename Question>
ExitCode TellName(std::string const& domain, std::string const& whose, char const* field,
                  Limit limit, Console& console, Question question) {
    auto& document = console.Document();
    document["domain"] = domain;
    document[field] = nullptr;
    auto const store = OpenStore(limit);
    auto const answer = Explaining(Account::none, [&] {
        return Ask(console, "the provider to name " + whose, limit, [store, domain, question] {
            return WithCause(*store, Account::none, [&] { return question(*store, domain); });
        });
    });
    if (answer.empty()) {
        throw Failure(ExitCode::refused, "The provider does not name " + whose);
    }
    document[field] = answer;
    console.Line(answer);
    return ExitCode::done;
}

} // namespace

ExitCode RunDC(std::string const& domain, Limit limit, Console& console) {
    auto const asked = domain.empty() ? RequireDomain(console, limit) : domain;
    return TellName(asked, "a domain controller of " + asked, "controller", limit, console,
                    [](ActiveDirectoryStore const& store, std::string const& of) {
                        return store.GetDomainControllerForDomain(of);
                    });
}

ExitCode RunPrincipal(std::string const& domain, Limit limit, Console& console) {
    auto const asked = domain.empty() ? RequireDomain(console, limit) : domain;
    return OnJoinedHost(console, limit, [&] {
        return TellName(asked, "the host's principal in " + asked, "principal", limit, console,
                        [](ActiveDirectoryStore const& store, std::string const& of) {
                            return store.GetHostPrincipalForDomain(of);
                        });
    });
}

ExitCode RunCanonical(std::string const& name, Limit limit, Console& console) {
    auto& document = console.Document();
    document["name"] = name;
    document["canonical"] = nullptr;
    auto const store = OpenStore(limit);
    auto const canonical = Explaining(Account::none, [&] {
        return Ask(console, "the provider to convert the name of a user", limit, [store, name] {
            return WithCause(*store, Account::none,
                             [&] { return store->ConvertCanonicalUsername(name); });
        });
    });
    document["canonical"] = canonical;
    console.Line(canonical);
    return ExitCode::done;
}

ExitCode RunPreferredDCs(Limit limit, Console& console) {
    auto& document = console.Document();
    document["controllers"] = nullptr;
    auto const provider = OpenProvider();
    auto const controllers = Explaining(Account::none, [&] {
        return Ask(console, "the provider's list of preferred domain controllers", limit,
                   [provider] { return provider->GetPreferredDomainControllers(); });
    });
    document["controllers"] = controllers;
    for (auto const& controller : controllers) {
        console.Line(controller);
    }
    return ExitCode::done;
}

ExitCode RunSetPreferredDCs(std::vector<std::string> const& controllers, Console& console) {
    RequireRoot("preferred-dcs");
    auto& document = console.Document();
    document["controllers"] = nullptr;
    // Not through the store, which takes it for done where the provider cannot do it.
    auto const provider = OpenProvider();
    std::deque<std::string> const list(controllers.begin(), controllers.end());
    HostChange const change(console);
    Explaining(Account::none, [&] {
        Wait(console, Start("the provider to take the list of preferred domain controllers",
                            std::nullopt, [provider, list] {
                                WithCause(*provider, Account::none,
                                          [&] { provider->SetPreferredDomainControllers(list); });
                            }));
    });
    document["controllers"] = controllers;
    console.Line(controllers.empty() ? "No domain controller is preferred any more."
                                     : "The preferred domain controllers are set.");
    return ExitCode::done;
}

} // namespace tessel::tslauthctl
