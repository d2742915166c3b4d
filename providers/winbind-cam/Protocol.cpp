// SPDX-License-Identifier: Apache-2.0
#include "Protocol.h"

#include "../winbind/Failure.h"
#include "Codes.h"

#include <algorithm>
#include <array>
#include <cstddef>
#include <cstdint>
#include <map>
#include <nlohmann/json.hpp>
#include <openssl/sha.h>
#include <vector>

namespace tessel::winbind::cam {

namespace {

using Json = nlohmann::json;

/// What comes from the service may be a secret: what the parser takes apart is wiped, too.
using SecretString = std::basic_string<char, std::char_traits<char>, WipingAllocator<char>>;
using Answer = nlohmann::basic_json<std::map, std::vector, SecretString, bool, std::int64_t,
                                    std::uint64_t, double, WipingAllocator>;

/// The longest names that a domain and a host can have.
constexpr std::size_t NetBIOSLimit = 15;
constexpr std::size_t DNSLimit = 253;
constexpr std::size_t SIDLimit = 184;
constexpr std::size_t ClaimLimit = 64;

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
    {"busy", Codes::ServiceFailed,
     "the service is making this account already, or has too many to make; try again later"},
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

/// The object of an answer that is no refusal.
Answer Granted(std::string_view text) {
    Answer answer = Answer::parse(text.begin(), text.end(), nullptr, false);
    if (!answer.is_object()) {
        FailAnswer("is none that is known");
    }
    auto const error = answer.find("error");
    if (error == answer.end()) {
        return answer;
    }
    for (Refusal const& refusal : Refusals) {
        if (error->is_string() && error->get_ref<SecretString const&>() == refusal.error) {
            throw Failure(refusal.code, refusal.text);
        }
    }
    FailAnswer("is an error that is not known");
}

/// A member that may be handed on as it is.
SecretString const& Member(Answer const& answer, char const* key, std::string_view others,
                           std::size_t limit) {
    auto const value = answer.find(key);
    if (value == answer.end() || !value->is_string()) {
        FailAnswer(std::string("lacks '") + key + "'");
    }
    auto const& text = value->get_ref<SecretString const&>();
    if (!IsMadeOf({text.data(), text.size()}, others, limit)) {
        FailAnswer(std::string("holds a '") + key + "' that is none");
    }
    return text;
}

/// A name that may be printed and logged as well.
std::string Name(Answer const& answer, char const* key, std::string_view others,
                 std::size_t limit) {
    SecretString const& text = Member(answer, key, others, limit);
    return {text.data(), text.size()};
}

void Append(SecretText& text, std::string_view more) {
    text.insert(text.end(), more.begin(), more.end());
}

} // namespace

std::string HostKey(std::string_view machine, std::string_view code) {
    constexpr std::string_view purpose = "tslauth-cam host key";
    SecretText text;
    text.reserve(purpose.size() + machine.size() + code.size() + 2);
    for (std::string_view const part : {purpose, machine, code}) {
        Append(text, part);
        text.push_back('\0');
    }
    std::array<unsigned char, SHA256_DIGEST_LENGTH> digest = {};
    SHA256(reinterpret_cast<unsigned char const*>(text.data()), text.size(), digest.data());
    std::string key;
    for (unsigned char const byte : digest) {
        constexpr char digits[] = "0123456789abcdef";
        key += digits[byte >> 4U];
        key += digits[byte & 15U];
    }
    return key;
}

void RequireHostName(std::string const& account) {
    if (!IsMadeOf(account, "-", NetBIOSLimit) || account.front() == '-' || account.back() == '-') {
        throw Failure(Codes::InvalidComputerName,
                      "'" + account +
                          "' cannot be a machine account: at most 15 letters, digits and hyphens");
    }
}

SecretText AccountRequest(std::string const& account, char const* unit, std::string_view code,
                          std::string const& hostKey) {
    Json request = {{"host", account}, {"host_key", hostKey}};
    if (unit != nullptr) {
        request["unit"] = unit;
    }
    std::string open;
    try {
        open = request.dump();
    } catch (Json::exception const&) {
        throw Failure(Codes::InvalidParameter, "the organisational unit is no text in UTF-8");
    }
    open.pop_back(); // the brace: the code comes in without a copy that nobody wipes
    constexpr std::string_view member = ",\"code\":\"";
    SecretText text;
    text.reserve(open.size() + member.size() + code.size() + 2);
    for (std::string_view const part : {std::string_view(open), member, code}) {
        Append(text, part);
    }
    Append(text, "\"}");
    return text;
}

SecretText ReceivedRequest(std::string const& claim) {
    SecretText text;
    Append(text, Json({{"claim", claim}}).dump());
    return text;
}

DomainInformation ReadDomainAnswer(std::string_view answer) {
    Answer const granted = Granted(answer);
    DomainInformation information;
    // A NetBIOS name may have more characters than a host's.
    information.netBIOSName = Name(granted, "netbios", "-_.!@#$%^&'(){}~", NetBIOSLimit);
    information.dnsName = Name(granted, "dns", "-_.", DNSLimit);
    information.sid = Name(granted, "sid", "-", SIDLimit);
    if (information.sid.compare(0, 4, "S-1-") != 0) {
        FailAnswer("holds a 'sid' that is none");
    }
    return information;
}

MachineAccount ReadAccountAnswer(std::string_view answer) {
    Answer const granted = Granted(answer);
    MachineAccount account;
    account.controller = Name(granted, "controller", "-_.", DNSLimit);
    account.claim = Name(granted, "claim", "-", ClaimLimit);
    SecretString const& blob = Member(granted, "blob", "+/=", answer.size());
    account.blob.assign(blob.begin(), blob.end());
    return account;
}

} // namespace tessel::winbind::cam
