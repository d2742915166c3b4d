// SPDX-License-Identifier: Apache-2.0
#include "ControlLock.h"
#include "Directory.h"
#include "Failures.h"
#include "Verbs.h"

#include <tslauth/CAMThumbprintStore.h>
#include <tslauth/Exceptions.h>

#include <Paths.h>

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
                      Output& output) {
    RequireRoot("cam import");
    auto& document = output.Document();
    document["server"] = server;
    document["thumbprint"] = nullptr;
    document["replaced"] = nullptr;
    auto const store = OpenStore(limit);
    ControlLock const lock(output);
    auto const before = PinnedFor(server);
    Explaining(Account::none, [&] { store->ImportCertificateForCAM(file, server); });
    auto const now = PinnedFor(server);
    document["thumbprint"] = now;
    output.Line("pinned for " + server + ": " + now);
    if (!before.empty() && before != now) {
        document["replaced"] = before;
        output.Warning("instead of " + before);
    }
    return ExitCode::done;
}

ExitCode RunCAMList(Output& output) {
    auto& servers = output.Document()["servers"] = nlohmann::json::array();
    auto const pinned =
        Explaining(Account::none, [] { return CAMThumbprintStore(Paths::CAMThumbprintStore); });
    for (auto const& [server, thumbprint] : pinned) {
        servers.push_back({{"server", server}, {"thumbprint", thumbprint}});
        auto line = server;
        line += " ";
        line += thumbprint;
        output.Line(line);
    }
    return ExitCode::done;
}

ExitCode RunCAMDomain(std::string const& server, Limit limit, Output& output) {
    auto& document = output.Document();
    document["server"] = server;
    document["domain"] = nullptr;
    auto const store = OpenStore(limit);
    auto const domain = Explaining(Account::none, [&] {
        return Ask(output, "the CAM server " + server + " to name its domain", limit,
                   [store, server] { return store->GetDomainForCAMService(server); });
    });
    document["domain"] = domain;
    output.Line(domain);
    output.Note("The server's certificate was not verified for this answer.");
    return ExitCode::done;
}

} // namespace tessel::tslauthctl
