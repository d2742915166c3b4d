// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "SecretText.h"

#include <string>
#include <string_view>

/// What is said to tslauth-cam-service, and what it answers: text in, text out. The service's
/// openapi.json describes both sides.
///
/// The host asks for an account with its code, and says when it has it. Until then the service
/// gives the same host the same account again, which it knows by a key of the host's.
namespace tessel::winbind::cam {

inline constexpr char DomainPath[] = "/v1/domain";
inline constexpr char AccountPath[] = "/v1/accounts";
inline constexpr char ReceivedPath[] = "/v1/accounts/received";

struct DomainInformation {
    std::string netBIOSName;
    std::string dnsName;
    std::string sid;
};

struct MachineAccount {
    SecretText blob; // base64
    std::string controller;
    std::string claim; // under which the service keeps it for the host
};

/// The key by which the service knows this host again: the same for the same code on the same
/// machine, and of no use to find out which machine that is.
/// @param machine the machine's identifier
/// @param code letters, digits and hyphens
std::string HostKey(std::string_view machine, std::string_view code);

/// @throws Failure InvalidComputerName where no host can have the name `account`, which has at most
///         15 characters
void RequireHostName(std::string const& account);

/// @param unit null where the service is to choose
/// @param code letters, digits and hyphens
/// @throws Failure InvalidParameter where the unit is no text in UTF-8
SecretText AccountRequest(std::string const& account, char const* unit, std::string_view code,
                          std::string const& hostKey);

/// Tells that the account has come.
SecretText ReceivedRequest(std::string const& claim);

/// @throws Failure with what the service refused; InvalidAnswer where it is no answer, or holds
///         what no domain has
DomainInformation ReadDomainAnswer(std::string_view answer);

/// @throws Failure as ReadDomainAnswer does
MachineAccount ReadAccountAnswer(std::string_view answer);

} // namespace tessel::winbind::cam
