// SPDX-License-Identifier: Apache-2.0
#ifndef TSLAUTHCTL_JOINEDDOMAIN_H
#define TSLAUTHCTL_JOINEDDOMAIN_H

#include "terminal/Await.h"
#include "terminal/Console.h"

#include <tslauth/ActiveDirectoryProvider.h>
#include <tslauth/ActiveDirectoryStore.h>

#include <memory>
#include <optional>
#include <string>

/// The commands' way to the domain.
namespace tessel::tslauthctl {

/// The store "Active Directory". Shared, since a call that is given up may still use it.
/// @throws Failure with what the store's constructor throws
std::shared_ptr<authentication::ActiveDirectoryStore> OpenStore(Limit limit);

/// The configured provider itself, for the questions that the store answers from its cache, and for
/// what it leaves out. A process that has just begun has nothing in its cache, and an empty answer
/// would look like that of a host that is in no domain.
/// @throws Failure with what the store's constructor throws
std::shared_ptr<authentication::ActiveDirectoryProvider> OpenProvider();

/// The domain that the host is joined to.
/// @throws Failure, also where there is none (not joined) or the provider cannot tell (refused)
std::string RequireDomain(Console& console, Limit limit);

/// The same, where the host is known to be in a domain; nothing where it is in none, or the
/// provider does not answer.
std::optional<authentication::Domain> KnownDomain(Console& console, Limit limit);

/// Whether the provider says that the host is in no domain; false where it does not answer.
bool IsKnownToBeUnjoined(Console& console, Limit limit);

/// Runs a call that asks for a joined host. A provider may say of one that is not that its domain
/// does not exist, which would look like an unreachable one; so the provider is then asked whether
/// there is a domain.
/// @throws Failure
template <typename Call> auto OnJoinedHost(Console& console, Limit limit, Call call) {
    try {
        return call();
    } catch (Failure const& e) {
        if (e.Code() == ExitCode::unreachable && !e.ExceptionClass().empty() &&
            IsKnownToBeUnjoined(console, limit)) {
            throw Failure(ExitCode::notJoined,
                          std::string("The host is not joined to a domain: ") + e.what(),
                          e.ExceptionClass());
        }
        throw;
    }
}

} // namespace tessel::tslauthctl

#endif
