// SPDX-License-Identifier: Apache-2.0
#ifndef TSLAUTHCTL_CONFIRMATION_H
#define TSLAUTHCTL_CONFIRMATION_H

#include <cstdint>
#include <optional>
#include <string>
#include <string_view>

/// A change that is undone unless somebody confirms it in time. At most one waits.
namespace tessel::tslauthctl {

struct Confirmation {
    /// Of the change.
    unsigned number = 0;
    /// The kernel's name for the run of the host in which it was made.
    std::string boot;
    /// Seconds of that run, which no clock that is set can change.
    std::int64_t until = 0;
};

std::string PrintConfirmation(Confirmation const& confirmation);
/// @throws nlohmann::json::exception
Confirmation ReadConfirmation(std::string_view text);

/// How many seconds are left; 0 where it is due, as it is once the host was restarted.
std::int64_t SecondsLeft(Confirmation const& confirmation, std::string const& boot,
                         std::int64_t now);

/// The same for this host, now.
std::int64_t SecondsLeft(Confirmation const& confirmation);

/// The one that waits.
/// @throws Failure where its file cannot be read or understood
std::optional<Confirmation> OpenConfirmation();

/// Has the change undone in so many seconds, whatever becomes of this process and its session. To
/// be called before the change.
/// @throws Failure
void AwaitConfirmation(unsigned number, int seconds);

/// @throws Failure
void ForgetConfirmation();

} // namespace tessel::tslauthctl

#endif
