// SPDX-License-Identifier: Apache-2.0
#include "analysis/Failures.h"
#include "analysis/JoinedDomain.h"
#include "verbs/HostChange.h"
#include "verbs/Verbs.h"

#include <tslauth/CAMThumbprintStore.h>
#include <tslauth/Exceptions.h>

#include <tslauth/Paths.h>

namespace tessel::tslauthctl {

using namespace authentication;

namespace {

/// The thumbprint that is pinned for a server now; empty where there is none, or the store cannot
/// be read, which importing tells.
std::string PinnedFor(std::string const& server) {
    try {
        return CAMThumbprintStore(Paths::CAMThumbprintStore).LookupThumbprint(server);
    } catch (Exception const&) {
        return {};
    }
}

} // namespace

ExitCode RunCAMImport(std::string const& server, std::string const& file, Limit limit,
                      Console& console) {
    RequireRoot("cam import");
    auto& document = console.Document();
    document["server"] = server;
    document["thumbprint"] = nullptr;
    document["replaced"] = nullptr;
    auto const store = OpenStore(limit);
    HostChange const change(console);
    auto const before = PinnedFor(server);
    Explaining(Account::none, [&] { store->PinCertificateForCAM(file, server); });
    auto const now = PinnedFor(server);
    document["thumbprint"] = now;
    console.Line("pinned for " + server + ": " + now);
    if (!before.empty() && before != now) {
        document["replaced"] = before;
        console.Warning("instead of " + before);
    }
    return ExitCode::done;
}

ExitCode RunCAMList(Console& console) {
    auto& servers = console.Document()["servers"] = nlohmann::json::array();
    auto const pinned =
        Explaining(Account::none, [] { return CAMThumbprintStore(Paths::CAMThumbprintStore); });
    for (auto const& [server, thumbprint] : pinned) {
        servers.push_back({{"server", server}, {"thumbprint", thumbprint}});
        auto line = server;
        line += " ";
        line += thumbprint;
        console.Line(line);
    }
    return ExitCode::done;
}

ExitCode RunCAMDomain(std::string const& server, Limit limit, Console& console) {
    auto& document = console.Document();
    document["server"] = server;
    document["domain"] = nullptr;
    auto const store = OpenStore(limit);
    auto const domain = Explaining(Account::none, [&] {
        return Ask(console, "the CAM server " + server + " to name its domain", limit,
                   [store, server] { return store->GetDomainForCAMService(server); });
    });
    document["domain"] = domain;
    console.Line(domain);
    console.Note("The server's certificate was not verified for this answer.");
    return ExitCode::done;
}

} // namespace tessel::tslauthctl
