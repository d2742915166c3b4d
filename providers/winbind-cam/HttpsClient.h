// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "SecretText.h"

#include <chrono>
#include <cstddef>
#include <cstdint>
#include <memory>
#include <string>

namespace tessel::winbind::cam {

using Deadline = std::chrono::steady_clock::time_point;

/// What a server has to show before it is told anything.
struct Trust {
    /// Whether the certificate's chain has to end at an authority, be valid now, and name the
    /// server's address as an IP address among its alternative names.
    bool verifiesCertificate = false;
    /// The certificate's SHA-1 digest as pairs of upper-case hexadecimal digits with ":" between
    /// them; empty where none was pinned. Where both are wanted, both must hold.
    std::string thumbprint;
    /// A file of authorities; where there is none, the system's.
    std::string authorities;

    /// Whether a server that passes is known to be the one that was meant.
    bool IsKnown() const {
        return verifiesCertificate || !thumbprint.empty();
    }
};

/// Asks a server that has proved what `Trust` asks for. Requests go one after the other over one
/// connection; all of them end at one deadline. No proxy is used, no other server is followed to,
/// and no signal is raised where the other side has gone.
///
/// What is handed over and what comes back is wiped by its owner. libcurl has no way to wipe the
/// buffers that it sends from and receives into, and gives them back as they are.
class HttpsClient {
public:
    /// No answer is longer: a blob has about 3000 bytes.
    static constexpr std::size_t MaximumAnswer = 65536;

    /// Connects to nobody yet.
    /// @param address an IPv4 address
    /// @throws Failure ConnectionInvalid where the address is none, InvalidCertificate where the
    ///         authorities are no regular file
    HttpsClient(std::string const& address, std::uint16_t port, Trust const& trust,
                Deadline deadline);
    HttpsClient(HttpsClient const&) = delete;
    HttpsClient& operator=(HttpsClient const&) = delete;
    ~HttpsClient();

    /// @return the body of the answer, whatever its status is
    /// @throws Failure ConnectionRefused, ConnectionInvalid where the connection breaks or the
    ///         server speaks no TLS 1.2 or later, TimedOut, InvalidCertificate, InvalidAnswer where
    ///         the server speaks no HTTP or sends more than MaximumAnswer
    SecretText Get(char const* path);

    /// The same, with a request's body as JSON.
    SecretText Post(char const* path, SecretText const& body);

private:
    class Session;

    std::unique_ptr<Session> const _session;
};

} // namespace tessel::winbind::cam
