// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "Connection.h"
#include "SecretText.h"

#include <memory>
#include <openssl/ssl.h>
#include <string>
#include <string_view>

namespace tessel::winbind::cam {

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

/// A TLS connection to a server that has proved what `Trust` asks for.
class TlsConnection {
public:
    /// Connects, and ends the connection again where the server is not to be trusted.
    /// @throws Failure as Connection does; InvalidCertificate; ConnectionInvalid where the server
    ///         speaks no TLS 1.2 or later
    TlsConnection(std::string const& address, std::uint16_t port, Trust const& trust,
                  Deadline deadline);
    TlsConnection(TlsConnection const&) = delete;
    TlsConnection& operator=(TlsConnection const&) = delete;
    ~TlsConnection();

    /// @throws Failure ConnectionInvalid, TimedOut
    void Send(std::string_view text);

    /// The two lines of an answer, with their ends.
    /// @throws Failure ConnectionInvalid where the server ends before the second line does,
    ///         TimedOut, InvalidAnswer where more than `limit` bytes come, or any
    ///         behind the second line
    SecretText ReceiveTwoLines(std::size_t limit);

private:
    template <typename Operation> int Run(Operation operation);
    std::string_view Outgoing() const;
    void Flush();
    void FlushAtOnce() noexcept;
    void Fill();
    [[noreturn]] void Fail() const;
    void CheckThumbprint(std::string const& thumbprint) const;

    template <auto Free> struct Freed {
        template <typename T> void operator()(T* object) const {
            Free(object);
        }
    };

    Connection _connection;
    std::unique_ptr<SSL_CTX, Freed<SSL_CTX_free>> _context;
    std::unique_ptr<SSL, Freed<SSL_free>> _tls;
    BIO* _incoming = nullptr; // both are the session's
    BIO* _outgoing = nullptr;
};

} // namespace tessel::winbind::cam
