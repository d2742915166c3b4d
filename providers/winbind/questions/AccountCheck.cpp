// SPDX-License-Identifier: Apache-2.0
#include "questions/AccountCheck.h"

#include "Failure.h"
#include "Paths.h"
#include "host/Host.h"
#include "host/HostFile.h"
#include "host/Membership.h"
#include "host/SystemLog.h"
#include "questions/Questions.h"
#include "samba/WinbindClient.h"
#include "text/SambaDomain.h"

#include <base/AsciiText.h>
#include <cstdint>
#include <cstdlib>
#include <exception>
#include <optional>
#include <ratio>
#include <vector>

using tessel::base::AsciiText::EqualsIgnoringCase;

namespace tessel::winbind {

namespace {

constexpr char control[] = "userAccountControl";
constexpr char computed[] = "msDS-User-Account-Control-Computed";
constexpr char expiry[] = "accountExpires";

/// Bits of both of the first two.
constexpr std::uint32_t accountDisable = 0x2;
constexpr std::uint32_t lockout = 0x10;

/// What the directory counts time in, from 1601 on.
typedef std::chrono::duration<std::int64_t, std::ratio<1, 10000000>> Ticks;
constexpr Ticks from1601To1970 = std::chrono::seconds(11644473600);

/// Both mean that the account never expires.
bool IsNever(std::int64_t ticks) {
    return ticks == 0 || ticks == INT64_MAX;
}

/// 0 where the directory says nothing.
std::int64_t NumberIn(DirectoryEntry const& entry, char const* attribute) {
    return std::strtoll(ValueIn(entry, attribute).c_str(), nullptr, 10);
}

bool HasBit(DirectoryEntry const& entry, char const* attribute, std::uint32_t bit) {
    return (static_cast<std::uint32_t>(NumberIn(entry, attribute)) & bit) != 0;
}

/// A name that has its domain in it is nobody else's.
bool NamesADomain(std::string const& user) {
    return user.find_first_of("\\@") != std::string::npos;
}

/// An account that winbindd remembers may be gone meanwhile, or not have come to that controller
/// yet.
AccountAnswer AskDirectory(Host const& host, std::string const& controller,
                           std::string const& identifier, Clock::time_point deadline) {
    std::vector<DirectoryEntry> const entries = SearchDirectory(
        host, controller, "(objectSid=" + identifier + ")", {control, computed, expiry}, deadline);
    return entries.size() == 1 ? StateOfAccount(entries.front(), std::chrono::system_clock::now())
                               : AccountAnswer::NoAnswer;
}

/// Nothing where winbindd knows no such user.
std::optional<WinbindClient::Account> FindAccount(WinbindClient const& client,
                                                  std::string const& user) {
    try {
        return client.GetAccount(user);
    } catch (Failure const& failure) {
        if (failure.Code() == TSLAUTH_PROVIDER_NO_SUCH_USER) {
            return std::nullopt;
        }
        throw;
    }
}

/// Whether a failure means that no controller was reached; then it is for the administrator to say
/// what follows. Any other is no answer, whatever he says.
bool IsSilence(ActiveDirectoryClientErrorCode code) {
    return code == TSLAUTH_PROVIDER_TIMED_OUT || code == TSLAUTH_PROVIDER_NO_LOGON_SERVERS ||
           code == TSLAUTH_PROVIDER_NO_NETWORK || code == TSLAUTH_PROVIDER_CONNECTION_INVALID ||
           code == TSLAUTH_PROVIDER_CONNECTION_REFUSED;
}

AccountAnswer Ask(Host const& host, std::string const& user, Clock::time_point deadline) {
    auto const membership = Membership::Read(host);
    if (!membership) {
        return AccountAnswer::NotOfTheDomain;
    }
    WinbindClient const client(deadline);
    auto const account = FindAccount(client, user);
    if (!account) {
        return NamesADomain(user) ? AccountAnswer::NoAnswer : AccountAnswer::NotOfTheDomain;
    }
    bool const isOwn = EqualsIgnoringCase(account->domain, membership->domain.workgroup);
    return AskDirectory(host, isOwn ? "" : GetAnyDomainController(host, "", account->domain),
                        account->identifier, deadline);
}

} // namespace

AccountAnswer StateOfAccount(DirectoryEntry const& entry,
                             std::chrono::system_clock::time_point now) {
    if (entry.count(control) == 0) {
        return AccountAnswer::NoAnswer;
    }
    if (HasBit(entry, control, accountDisable)) {
        return AccountAnswer::Disabled;
    }
    std::int64_t const end = NumberIn(entry, expiry);
    Ticks const today = std::chrono::duration_cast<Ticks>(now.time_since_epoch()) + from1601To1970;
    if (!IsNever(end) && Ticks(end) <= today) {
        return AccountAnswer::Expired;
    }
    // The controller's own reckoning: when a lock-out ends is the domain's policy.
    if (HasBit(entry, computed, lockout)) {
        return AccountAnswer::LockedOut;
    }
    return AccountAnswer::InOrder;
}

AccountAnswer AskAboutAccount(Host const& host, std::string const& user,
                              Clock::time_point deadline) {
    auto const warn = [&](std::exception const& failure) {
        LogWarning("may '" + user + "' log in: " + failure.what());
    };
    try {
        try {
            return Ask(host, user, deadline);
        } catch (Failure const& failure) {
            warn(failure);
            // winbindd lets users in on the same condition.
            return IsSilence(failure.Code()) &&
                           LetsInOffLine(ReadHostFile(host.At(Paths::OwnSamba)).value_or(""))
                       ? AccountAnswer::OffLine
                       : AccountAnswer::NoAnswer;
        }
    } catch (std::exception const& failure) {
        warn(failure);
        return AccountAnswer::NoAnswer;
    }
}

} // namespace tessel::winbind
