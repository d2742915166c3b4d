// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "SecretText.h"

#include <cstddef>
#include <optional>
#include <string>
#include <string_view>

/// What is said to tslauth-cam-service, and what it answers: text in, text out.
///
/// A connection carries one request and one answer. Each is two lines: a JSON object, and a secret,
/// or nothing, behind it. The secrets are not part of the JSON so that nobody's parser keeps a copy
/// of them: a request's is the one-time code, an answer's the blob of an offline join.
///
///     {"version": 1, "request": "domain"}
///     {"version": 1, "netbios": "CORP", "dns": "corp.example", "sid": "S-1-5-21-..."}
///
///     {"version": 1, "request": "account", "account": "host01", "unit": "Servers/Linux"}
///     {"version": 1, "controller": "dc1.corp.example", "spent": true}
///
/// `unit` is missing where the host leaves it to the service. Either may be answered with
/// {"version": 1, "error": "code-refused", "spent": false}; `spent` tells that the one-time code
/// has been taken, and will not be taken again.
namespace tessel::winbind::cam {

/// No answer is longer: a blob has about 3000 bytes.
inline constexpr std::size_t MaximumAnswer = 65536;

struct DomainInformation {
    std::string netBIOSName;
    std::string dnsName;
    std::string sid;
};

struct MachineAccount {
    SecretText blob; // base64
    std::string controller;
};

/// @return the JSON line, with its end
std::string DomainRequest();

/// @param unit null where the service is to choose
/// @throws Failure InvalidComputerName where no host can have the name `account`, which has at most
///         15 characters; InvalidParameter where the unit is no text in UTF-8
std::string AccountRequest(std::string const& account, char const* unit);

/// @param answer both lines
/// @throws Failure with what the service refused; InvalidAnswer where it is no answer, or holds
///         what no domain has
DomainInformation ReadDomainAnswer(std::string_view answer);

/// Whether an answer of either kind says that the service has taken the one-time code; false for
/// what is no answer.
bool IsCodeSpent(std::string_view answer);

/// @throws Failure as ReadDomainAnswer does
MachineAccount ReadAccountAnswer(std::string_view answer);

} // namespace tessel::winbind::cam
