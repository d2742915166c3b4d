// SPDX-License-Identifier: Apache-2.0
#include "samba/DomainDiscovery.h"

#include "Failure.h"
#include "host/Host.h"
#include "host/SystemLog.h"
#include "samba/SambaTools.h"

#include <algorithm>
#include <base/AsciiText.h>
#include <optional>

namespace tessel::winbind::DomainDiscovery {

namespace {

/// How far apart Kerberos lets two clocks be.
constexpr auto mostSkew = std::chrono::seconds(300);
constexpr auto lookupLimit = std::chrono::seconds(4);
constexpr auto lookupsLimit = std::chrono::seconds(20);
constexpr auto clockLimit = std::chrono::seconds(10);
constexpr std::size_t longestNetBIOSName = 15;

bool Contains(std::vector<std::string> const& names, std::string const& name) {
    return std::any_of(names.begin(), names.end(), [&](std::string const& other) {
        return base::AsciiText::EqualsIgnoringCase(other, name);
    });
}

} // namespace

ControllerAnswer FindController(Host const& host, SambaTools const& tools,
                                std::string const& domain,
                                std::vector<std::string> const& preferred,
                                Clock::time_point deadline) {
    deadline = std::min(deadline, Clock::now() + lookupsLimit);
    std::string reasons;
    auto const ask = [&](std::vector<std::string> const& names) -> std::optional<ControllerAnswer> {
        for (std::string const& name : names) {
            auto const now = Clock::now();
            if (now >= deadline) {
                break;
            }
            try {
                auto answer = tools.Lookup(name, std::min(deadline, now + lookupLimit));
                if (base::AsciiText::EqualsIgnoringCase(answer.domain, domain) && answer.writable) {
                    return answer;
                }
                reasons += "; '" + name + "' is no writable controller of it";
            } catch (Failure const& e) {
                if (e.Code() == TSLAUTH_PROVIDER_SERVICE_DOES_NOT_EXIST) {
                    throw; // Samba's tools are missing, whomever one asks
                }
                reasons += std::string("; ") + e.what();
            }
        }
        return std::nullopt;
    };
    if (auto answer = ask(preferred)) {
        return *answer;
    }
    auto names = host.AskDNS(domain);
    names.erase(std::remove_if(names.begin(), names.end(),
                               [&](std::string const& name) { return Contains(preferred, name); }),
                names.end());
    if (auto answer = ask(names)) {
        return *answer;
    }
    throw Failure(TSLAUTH_PROVIDER_NO_LOGON_SERVERS,
                  "no controller of '" + domain + "' answers" + reasons);
}

bool IsNameOfController(std::string const& computer, ControllerAnswer const& answer,
                        std::vector<std::string> const& others) {
    auto const isSame = [&](std::string const& name) {
        return base::AsciiText::EqualsIgnoringCase(name, computer);
    };
    return isSame(answer.computer) ||
           std::any_of(others.begin(), others.end(), [&](std::string const& other) {
               return isSame(other.substr(0, other.find('.')).substr(0, longestNetBIOSName));
           });
}

void CheckHostName(Host const& host, std::string const& computer, ControllerAnswer const& answer,
                   std::string const& domain) {
    std::vector<std::string> others;
    try {
        others = host.AskDNS(domain);
    } catch (Failure const& e) {
        // A preferred controller answered, and DNS is not needed any more.
        LogWarning(std::string("the names of the other controllers are not known: ") + e.what());
    }
    if (IsNameOfController(computer, answer, others)) {
        throw Failure(TSLAUTH_PROVIDER_INVALID_COMPUTER_NAME,
                      "'" + computer + "' is the name of a controller of '" + domain + "'");
    }
}

std::chrono::seconds CheckClock(SambaTools const& tools, std::string const& controller,
                                Clock::time_point deadline) {
    auto const offset =
        tools.ClockOffset(controller, std::min(deadline, Clock::now() + clockLimit));
    if (!offset) {
        LogWarning("'" + controller + "' does not say what time it is");
        return std::chrono::seconds(0);
    }
    if (std::chrono::abs(*offset) > mostSkew) {
        throw Failure(TSLAUTH_PROVIDER_TIME_SKEW, "the clock of '" + controller + "' is ahead by " +
                                                      std::to_string(offset->count()) + " seconds");
    }
    return *offset;
}

} // namespace tessel::winbind::DomainDiscovery
