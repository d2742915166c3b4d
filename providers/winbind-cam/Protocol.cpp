// SPDX-License-Identifier: Apache-2.0
#include "Protocol.h"

#include "../winbind/Failure.h"
#include "Codes.h"

#include <algorithm>
#include <nlohmann/json.hpp>

namespace tessel::winbind::cam {

namespace {

using Json = nlohmann::json;

constexpr int Version = 1;

/// The longest names that a domain and a host can have.
constexpr std::size_t NetBIOSLimit = 15;
constexpr std::size_t DNSLimit = 253;
constexpr std::size_t SIDLimit = 184;

struct Refusal {
    char const* error;
    Codes::Code code;
    char const* text;
};

/// What the service says and what the host's administrator is told.
constexpr Refusal Refusals[] = {
    {"code-refused", Codes::CodeRefused,
     "the service refuses the one-time code: it is wrong, used, expired, or issued for another "
     "host or unit; the service's log tells which"},
    {"too-many-attempts", Codes::TooManyAttempts,
     "the service has refused too many codes from this address, and takes none for a while"},
    {"account-exists", Codes::AccountExists,
     "the machine account exists already, and the code was not issued to take it over"},
    {"no-such-unit", Codes::InvalidParameter,
     "the domain has no such organisational unit, or the service may not use it"},
    {"bad-request", Codes::InvalidParameter, "the service does not understand the request"},
    {"failed", Codes::ServiceFailed, "the service could not answer; its log tells why"},
};

bool IsLetterOrDigit(char c) {
    return (c >= 'a' && c <= 'z') || (c >= 'A' && c <= 'Z') || (c >= '0' && c <= '9');
}

/// Whether `text` is not empty, not too long, and made of letters, digits and `others`.
bool IsMadeOf(std::string_view text, std::string_view others, std::size_t limit) {
    return !text.empty() && text.size() <= limit &&
           std::all_of(text.begin(), text.end(), [&](char c) {
               return IsLetterOrDigit(c) || others.find(c) != std::string_view::npos;
           });
}

[[noreturn]] void FailAnswer(std::string const& what) {
    throw Failure(Codes::InvalidAnswer, "the service's answer " + what);
}

/// Without its end; empty where there is no such line.
std::string_view Line(std::string_view answer, bool isSecond) {
    std::size_t const end = answer.find('\n');
    if (end == std::string_view::npos) {
        return {};
    }
    if (!isSecond) {
        return answer.substr(0, end);
    }
    answer.remove_prefix(end + 1);
    return answer.substr(0, answer.find('\n'));
}

/// @return the object, or null
Json Parsed(std::string_view answer) {
    std::string_view const line = Line(answer, false);
    Json json = Json::parse(line.begin(), line.end(), nullptr, false);
    auto const isOurs = [&] {
        auto const version = json.find("version");
        return version != json.end() && version->is_number_integer() && *version == Version;
    };
    return json.is_object() && isOurs() ? json : Json();
}

/// The object of an answer that is no refusal.
Json Granted(std::string_view answer) {
    Json json = Parsed(answer);
    if (json.is_null()) {
        FailAnswer("is none that is known");
    }
    auto const error = json.find("error");
    if (error == json.end()) {
        return json;
    }
    for (Refusal const& refusal : Refusals) {
        if (*error == refusal.error) {
            throw Failure(refusal.code, refusal.text);
        }
    }
    FailAnswer("is an error that is not known");
}

/// A name that may be printed, logged and handed on as it is.
std::string Name(Json const& json, char const* key, std::string_view others, std::size_t limit) {
    auto const value = json.find(key);
    if (value == json.end() || !value->is_string()) {
        FailAnswer(std::string("lacks '") + key + "'");
    }
    auto name = value->get<std::string>();
    if (!IsMadeOf(name, others, limit)) {
        FailAnswer(std::string("holds a '") + key + "' that is none");
    }
    return name;
}

std::string RequestText(Json const& json) {
    return json.dump() + '\n';
}

} // namespace

std::string DomainRequest() {
    return RequestText({{"version", Version}, {"request", "domain"}});
}

std::string AccountRequest(std::string const& account, char const* unit) {
    if (!IsMadeOf(account, "-", NetBIOSLimit) || account.front() == '-' || account.back() == '-') {
        throw Failure(Codes::InvalidComputerName,
                      "'" + account +
                          "' cannot be a machine account: at most 15 letters, digits and hyphens");
    }
    Json request = {{"version", Version}, {"request", "account"}, {"account", account}};
    if (unit != nullptr) {
        request["unit"] = unit;
    }
    try {
        return RequestText(request);
    } catch (Json::exception const&) {
        throw Failure(Codes::InvalidParameter, "the organisational unit is no text in UTF-8");
    }
}

DomainInformation ReadDomainAnswer(std::string_view answer) {
    Json const json = Granted(answer);
    DomainInformation information;
    // A NetBIOS name may have more characters than a host's.
    information.netBIOSName = Name(json, "netbios", "-_.!@#$%^&'(){}~", NetBIOSLimit);
    information.dnsName = Name(json, "dns", "-_.", DNSLimit);
    information.sid = Name(json, "sid", "-", SIDLimit);
    if (information.sid.compare(0, 4, "S-1-") != 0) {
        FailAnswer("holds a 'sid' that is none");
    }
    return information;
}

bool IsCodeSpent(std::string_view answer) {
    Json const json = Parsed(answer);
    auto const spent = json.find("spent");
    return spent != json.end() && *spent == true;
}

MachineAccount ReadAccountAnswer(std::string_view answer) {
    Json const json = Granted(answer);
    MachineAccount account;
    account.controller = Name(json, "controller", "-_.", DNSLimit);
    std::string_view const blob = Line(answer, true);
    if (!IsMadeOf(blob, "+/=", MaximumAnswer)) {
        FailAnswer("holds no blob");
    }
    account.blob.assign(blob.begin(), blob.end());
    return account;
}

} // namespace tessel::winbind::cam
