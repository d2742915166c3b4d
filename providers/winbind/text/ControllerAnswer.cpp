// SPDX-License-Identifier: Apache-2.0
#include "text/ControllerAnswer.h"

#include "Failure.h"
#include "text/DirectoryNames.h"
#include <base/AsciiText.h>

#include <algorithm>

using namespace tessel::base::AsciiText;

namespace tessel::winbind {

namespace {

/// What stands behind `label` on the first line that begins with it; empty where none does.
std::string_view Behind(std::string_view text, std::string_view label) {
    while (!text.empty()) {
        auto const line = Trimmed(TakeLine(text));
        if (StartsWith(line, label)) {
            return Trimmed(line.substr(label.size()));
        }
    }
    return {};
}

std::string Name(std::string_view text, std::string_view label) {
    auto const name = Behind(text, label);
    try {
        return DomainName(name);
    } catch (Failure const&) {
        throw Failure(TSLAUTH_PROVIDER_NO_LOGON_SERVERS,
                      "the domain controller gave no proper answer for \"" + std::string(label) +
                          '"');
    }
}

} // namespace

std::string ControllerAnswer::Realm() const {
    return Upper(domain);
}

ControllerAnswer ReadControllerAnswer(std::string_view text) {
    ControllerAnswer answer;
    answer.address = Behind(text, "Information for Domain Controller:");
    answer.controller = Name(text, "Domain Controller:");
    answer.computer = Upper(Name(text, "Pre-Win2k Hostname:"));
    answer.domain = Name(text, "Domain:");
    answer.netBIOSDomain = Upper(Name(text, "Pre-Win2k Domain:"));
    answer.forest = Name(text, "Forest:");
    answer.site = Behind(text, "Server Site Name:");
    answer.clientSite = Behind(text, "Client Site Name:");
    answer.writable = Behind(text, "Is writable:") == "yes";
    return answer;
}

std::optional<std::chrono::seconds> ReadServerTimeOffset(std::string_view text) {
    // Where it gets no time, the tool prints the beginning of Unix time and an offset of 0.
    if (text.find("Failed to get server's current time!") != std::string_view::npos ||
        Behind(text, "Server time:").find(" 1970 ") != std::string_view::npos) {
        return std::nullopt;
    }
    auto number = Behind(text, "Server time offset:");
    bool const behind = StartsWith(number, "-");
    number.remove_prefix(behind ? 1 : 0);
    constexpr std::size_t longest = 10; // as many digits as an int has
    if (number.empty() || number.size() > longest ||
        !std::all_of(number.begin(), number.end(), IsDigit)) {
        return std::nullopt;
    }
    std::chrono::seconds offset{0};
    for (char const c : number) {
        offset = offset * 10 + std::chrono::seconds(c - '0');
    }
    return behind ? -offset : offset;
}

} // namespace tessel::winbind
