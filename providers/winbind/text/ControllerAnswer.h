// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <chrono>
#include <optional>
#include <string>
#include <string_view>

/// What a domain controller says of itself, as `net ads lookup` and `net ads info` print it.
namespace tessel::winbind {

/// The answer to `net ads lookup`, which is one datagram each way and needs no account.
struct ControllerAnswer {
    std::string address;       ///< may be empty
    std::string controller;    ///< DNS name
    std::string computer;      ///< NetBIOS name of the controller
    std::string domain;        ///< DNS name
    std::string netBIOSDomain; ///< NetBIOS name
    std::string forest;        ///< DNS name
    std::string site;          ///< the controller's; may be empty
    std::string clientSite;    ///< the host's; may be empty
    bool writable = false;

    /// The Kerberos realm: the domain's DNS name in capitals.
    std::string Realm() const;
};

/// @throws Failure TSLAUTH_PROVIDER_NO_LOGON_SERVERS where the text names no controller or no
///         domain, or a name of it is malformed: it comes over an unauthenticated datagram
ControllerAnswer ReadControllerAnswer(std::string_view text);

/// How far the controller's clock is ahead of the host's, from the text of `net ads info`; negative
/// where it is behind, nothing where the text does not say.
std::optional<std::chrono::seconds> ReadServerTimeOffset(std::string_view text);

} // namespace tessel::winbind
