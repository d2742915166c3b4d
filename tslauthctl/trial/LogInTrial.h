// SPDX-License-Identifier: Apache-2.0
#ifndef TSLAUTHCTL_LOGINTRIAL_H
#define TSLAUTHCTL_LOGINTRIAL_H

#include "trial/LogIns.h"

#include <map>
#include <optional>
#include <string>

/// Tries with the real libpam and C library whether those who must get in still do, in child
/// processes whose modules and mounts the caller has no part in.
namespace tessel::tslauthctl {

class Console;

/// The texts of files as they would be; nothing for one that would not be there.
using PlannedTexts = std::map<std::string, std::optional<std::string>>;

/// To be called before a change: what is let in now, and what would be.
class LogInTrial {
public:
    /// Asks how it is. Blocks for some twenty milliseconds, and ten seconds at most.
    LogInTrial();

    /// Asks how it would be with these files, in a mount namespace of its own; the host's stay.
    /// Where that cannot be had, it says so to `console`, and nothing is promised.
    /// @throws Failure (locks out), naming whom
    void Require(PlannedTexts const& texts, Console& console) const;

    /// The same for the host as it is by now.
    void RequireNow() const;

private:
    std::vector<LogIn> _logIns;
    LogInAnswers _before;
};

} // namespace tessel::tslauthctl

#endif
