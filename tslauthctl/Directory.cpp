// SPDX-License-Identifier: Apache-2.0
#include "Directory.h"

#include "Failures.h"
#include "Host.h"

#include <tslauth/Exceptions.h>

namespace tessel::tslauthctl {

using namespace authentication;

std::shared_ptr<ActiveDirectoryStore> OpenStore(Limit limit) {
    return Explaining(Account::none,
                      [&] { return std::make_shared<ActiveDirectoryStore>(limit.seconds); });
}

std::shared_ptr<ActiveDirectoryProvider> OpenProvider(Limit limit) {
    // The store first, for its exceptions.
    (void)OpenStore(limit);
    return Explaining(Account::none, [] {
        return std::make_shared<ActiveDirectoryProvider>(ConfiguredProvider());
    });
}

namespace {

Domain ActiveDomain(Output& output, Limit limit) {
    auto const provider = OpenProvider(limit);
    return Explaining(Account::none, [&] {
        return Ask(output, "the provider to name the host's domain", limit,
                   [provider] { return provider->GetActiveDomain(); });
    });
}

} // namespace

std::string RequireDomain(Output& output, Limit limit) {
    auto const domain = ActiveDomain(output, limit);
    if (!domain.DNSName().empty()) {
        return domain.DNSName();
    }
    if (!domain.NetBIOSName().empty()) {
        return domain.NetBIOSName();
    }
    throw Failure(ExitCode::notJoined, "The host is not joined to a domain");
}

bool IsKnownToBeUnjoined(Output& output, Limit limit) {
    try {
        auto const domain = ActiveDomain(output, limit);
        return domain.DNSName().empty() && domain.NetBIOSName().empty();
    } catch (Failure const&) {
        return false;
    }
}

} // namespace tessel::tslauthctl
