// SPDX-License-Identifier: Apache-2.0
#include "TlsConnection.h"

#include "../winbind/Failure.h"
#include "Codes.h"

#include <algorithm>
#include <array>
#include <climits>
#include <cstdio>
#include <new>
#include <openssl/bio.h>
#include <openssl/err.h>
#include <openssl/evp.h>
#include <openssl/x509.h>
#include <openssl/x509_vfy.h>
#include <sys/stat.h>

namespace tessel::winbind::cam {

namespace {

/// What OpenSSL has to say about the last failure, without its numbers.
std::string LastError() {
    char const* const reason = ERR_reason_error_string(ERR_peek_last_error());
    return reason == nullptr ? "the connection ended" : reason;
}

/// The form that the library pins.
std::string Thumbprint(X509 const* certificate) {
    std::array<unsigned char, EVP_MAX_MD_SIZE> digest = {};
    unsigned size = 0;
    if (X509_digest(certificate, EVP_sha1(), digest.data(), &size) != 1) {
        return {};
    }
    std::string text;
    for (unsigned i = 0; i < size; ++i) {
        std::array<char, 4> pair = {};
        // Two digits and a colon fit.
        (void)snprintf(pair.data(), pair.size(), "%s%02X", i == 0 ? "" : ":", digest[i]);
        text += pair.data();
    }
    return text;
}

void UseAuthorities(SSL_CTX* context, std::string const& file) {
    // An authority of one's own replaces the system's: nobody else's may then vouch for the
    // service.
    struct stat status = {};
    bool const hasFile = !file.empty() && stat(file.c_str(), &status) == 0;
    if (hasFile && !S_ISREG(status.st_mode)) { // a pipe would be waited for
        throw Failure(Codes::InvalidCertificate, "'" + file + "' is not a regular file");
    }
    if ((hasFile ? SSL_CTX_load_verify_locations(context, file.c_str(), nullptr)
                 : SSL_CTX_set_default_verify_paths(context)) != 1) {
        throw Failure(Codes::InvalidCertificate,
                      "cannot read the authorities " +
                          (hasFile ? "'" + file + "'" : "of the system") + ": " + LastError());
    }
}

/// The thread's error queue has to be empty before each call whose failure is looked into; what a
/// caller has left there is stale.
class ErrorQueue {
public:
    ErrorQueue() {
        ERR_clear_error();
    }
    ErrorQueue(ErrorQueue const&) = delete;
    ErrorQueue& operator=(ErrorQueue const&) = delete;
    ~ErrorQueue() {
        ERR_clear_error();
    }
};

} // namespace

TlsConnection::TlsConnection(std::string const& address, std::uint16_t port, Trust const& trust,
                             Deadline deadline)
    : _connection(address, port, deadline), _context(SSL_CTX_new(TLS_client_method())) {
    ErrorQueue const errors;
    if (_context == nullptr || SSL_CTX_set_min_proto_version(_context.get(), TLS1_2_VERSION) != 1) {
        throw std::bad_alloc();
    }
    SSL_CTX_set_options(_context.get(), SSL_OP_CLEANSE_PLAINTEXT | SSL_OP_NO_RENEGOTIATION);
    SSL_CTX_set_verify(_context.get(),
                       trust.verifiesCertificate ? SSL_VERIFY_PEER : SSL_VERIFY_NONE, nullptr);
    if (trust.verifiesCertificate) {
        UseAuthorities(_context.get(), trust.authorities);
    }
    _tls.reset(SSL_new(_context.get()));
    // Memory in between, since a socket of OpenSSL's raises SIGPIPE and knows no deadline.
    _incoming = BIO_new(BIO_s_mem());
    _outgoing = BIO_new(BIO_s_mem());
    if (_tls == nullptr || _incoming == nullptr || _outgoing == nullptr) {
        BIO_free(_incoming);
        BIO_free(_outgoing);
        throw std::bad_alloc();
    }
    BIO_set_mem_eof_return(_incoming, -1); // empty means: wait
    SSL_set_bio(_tls.get(), _incoming, _outgoing);
    if (trust.verifiesCertificate &&
        X509_VERIFY_PARAM_set1_ip_asc(SSL_get0_param(_tls.get()), address.c_str()) != 1) {
        throw Failure(Codes::InvalidCertificate, "no certificate can name '" + address + "'");
    }
    (void)Run([this] { return SSL_connect(_tls.get()); });
    if (!trust.thumbprint.empty()) {
        CheckThumbprint(trust.thumbprint);
    }
}

TlsConnection::~TlsConnection() {
    ErrorQueue const errors;
    if (SSL_is_init_finished(_tls.get()) != 0 && SSL_shutdown(_tls.get()) >= 0) {
        FlushAtOnce();
    }
}

void TlsConnection::Send(std::string_view text) {
    ErrorQueue const errors;
    // A request is far smaller than an int can tell.
    int const size = static_cast<int>(std::min<std::size_t>(text.size(), INT_MAX));
    (void)Run([&] { return SSL_write(_tls.get(), text.data(), size); });
}

SecretText TlsConnection::ReceiveTwoLines(std::size_t limit) {
    ErrorQueue const errors;
    SecretText text;
    std::size_t ends = 0;
    while (ends < 2) {
        std::size_t const size = text.size();
        constexpr std::size_t step = 4096;
        text.resize(size + step);
        int const count =
            Run([&] { return SSL_read(_tls.get(), text.data() + size, static_cast<int>(step)); });
        text.resize(size + static_cast<std::size_t>(count));
        ends += static_cast<std::size_t>(
            std::count(text.begin() + static_cast<std::ptrdiff_t>(size), text.end(), '\n'));
        if (text.size() > limit) {
            throw Failure(Codes::InvalidAnswer, "the answer is longer than any can be");
        }
    }
    if (ends > 2 || text.back() != '\n') {
        throw Failure(Codes::InvalidAnswer, "the answer has more than two lines");
    }
    return text;
}

/// Runs one of OpenSSL's calls until it has succeeded, and moves bytes meanwhile.
template <typename Operation> int TlsConnection::Run(Operation operation) {
    for (;;) {
        ERR_clear_error();
        int const result = operation();
        int const error = SSL_get_error(_tls.get(), result);
        if (result <= 0 && error != SSL_ERROR_WANT_READ && error != SSL_ERROR_WANT_WRITE) {
            FlushAtOnce(); // the server's log is to name the reason too
            Fail();
        }
        Flush();
        if (result > 0) {
            return result;
        }
        if (error == SSL_ERROR_WANT_READ) {
            Fill();
        }
    }
}

std::string_view TlsConnection::Outgoing() const {
    char* data = nullptr;
    long const size = BIO_get_mem_data(_outgoing, &data);
    return size > 0 ? std::string_view(data, static_cast<std::size_t>(size)) : std::string_view();
}

void TlsConnection::Flush() {
    _connection.Send(Outgoing());
    (void)BIO_reset(_outgoing); // a memory's cannot fail
}

void TlsConnection::FlushAtOnce() noexcept {
    _connection.SendAtOnce(Outgoing());
}

void TlsConnection::Fill() {
    std::array<char, 16384> data; // filled below
    std::size_t const size = _connection.Receive(data.data(), data.size());
    if (size == 0) {
        throw Failure(Codes::ConnectionInvalid, "the server ended the connection too early");
    }
    if (BIO_write(_incoming, data.data(), static_cast<int>(size)) != static_cast<int>(size)) {
        throw std::bad_alloc();
    }
}

void TlsConnection::Fail() const {
    long const verdict = SSL_get_verify_result(_tls.get());
    if ((SSL_get_verify_mode(_tls.get()) & SSL_VERIFY_PEER) != 0 && verdict != X509_V_OK) {
        throw Failure(Codes::InvalidCertificate, std::string("the server's certificate: ") +
                                                     X509_verify_cert_error_string(verdict));
    }
    throw Failure(Codes::ConnectionInvalid, "TLS: " + LastError());
}

void TlsConnection::CheckThumbprint(std::string const& thumbprint) const {
    std::unique_ptr<X509, Freed<X509_free>> const certificate(
        SSL_get1_peer_certificate(_tls.get()));
    std::string const presented = certificate == nullptr ? "" : Thumbprint(certificate.get());
    if (presented.size() != thumbprint.size() ||
        CRYPTO_memcmp(presented.data(), thumbprint.data(), presented.size()) != 0) {
        throw Failure(Codes::InvalidCertificate, "the server presents a certificate with the "
                                                 "thumbprint " +
                                                     presented + ", and " + thumbprint +
                                                     " is pinned for it");
    }
}

} // namespace tessel::winbind::cam
