// SPDX-License-Identifier: Apache-2.0
#include "analysis/JoinedDomain.h"

#include "analysis/Failures.h"
#include "analysis/ProviderCheck.h"

#include <tslauth/ProviderConfiguration.h>

namespace tessel::tslauthctl {

using namespace authentication;

std::shared_ptr<ActiveDirectoryStore> OpenStore(Limit limit) {
    CheckProvider();
    return Explaining(Account::none,
                      [&] { return std::make_shared<ActiveDirectoryStore>(limit.seconds); });
}

std::shared_ptr<ActiveDirectoryProvider> OpenProvider() {
    CheckProvider();
    return Explaining(Account::none, [] {
        return std::make_shared<ActiveDirectoryProvider>(ConfiguredProvider());
    });
}

namespace {

bool IsUnset(Domain const& domain) {
    return domain.DNSName().empty() && domain.NetBIOSName().empty();
}

Domain ActiveDomain(Console& console, Limit limit) {
    auto const provider = OpenProvider();
    return Explaining(Account::none, [&] {
        return Ask(console, "the provider to name the host's domain", limit,
                   [provider] { return provider->GetActiveDomain(); });
    });
}

} // namespace

std::string RequireDomain(Console& console, Limit limit) {
    auto const domain = ActiveDomain(console, limit);
    if (!domain.DNSName().empty()) {
        return domain.DNSName();
    }
    if (!domain.NetBIOSName().empty()) {
        return domain.NetBIOSName();
    }
    throw Failure(ExitCode::notJoined, "The host is not joined to a domain");
}

std::optional<Domain> KnownDomain(Console& console, Limit limit) {
    try {
        auto domain = ActiveDomain(console, limit);
        if (!IsUnset(domain)) {
            return domain;
        }
    } catch (Failure const&) {
        // Whoever goes on is told why.
    }
    return std::nullopt;
}

bool IsKnownToBeUnjoined(Console& console, Limit limit) {
    try {
        return IsUnset(ActiveDomain(console, limit));
    } catch (Failure const&) {
        return false;
    }
}

} // namespace tessel::tslauthctl
