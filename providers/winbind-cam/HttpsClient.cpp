// SPDX-License-Identifier: Apache-2.0
#include "HttpsClient.h"

#include "../winbind/Failure.h"
#include "Codes.h"

#include <algorithm>
#include <arpa/inet.h>
#include <array>
#include <cerrno>
#include <cstdio>
#include <curl/curl.h>
#include <new>
#include <openssl/err.h>
#include <openssl/evp.h>
#include <openssl/ssl.h>
#include <openssl/x509.h>
#include <openssl/x509_vfy.h>
#include <sys/stat.h>

namespace tessel::winbind::cam {

namespace {

/// libcurl's and OpenSSL's own ways to give something back.
template <auto Free> struct Freed {
    template <typename T> void operator()(T* object) const {
        Free(object);
    }
};

/// libcurl counts who uses it, so that nothing of it stays where the provider is unloaded.
class Library {
public:
    Library() {
        if (curl_global_init(CURL_GLOBAL_DEFAULT) != CURLE_OK) {
            throw std::bad_alloc();
        }
    }
    Library(Library const&) = delete;
    Library& operator=(Library const&) = delete;
    ~Library() {
        curl_global_cleanup();
    }
};

/// The thread's error queue has to be empty before a failure is looked into; what a caller has left
/// there is stale.
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

bool IsIPv4(std::string const& address) {
    in_addr parsed = {};
    return inet_pton(AF_INET, address.c_str(), &parsed) == 1;
}

bool IsRegularFile(std::string const& file) {
    struct stat status = {};
    if (file.empty() || stat(file.c_str(), &status) != 0) {
        return false;
    }
    if (!S_ISREG(status.st_mode)) { // a pipe would be waited for
        throw Failure(Codes::InvalidCertificate, "'" + file + "' is not a regular file");
    }
    return true;
}

} // namespace

class HttpsClient::Session {
public:
    Session(std::string const& address, std::uint16_t port, Trust const& trust, Deadline deadline)
        : _address(address), _name(address + ":" + std::to_string(port)), _trust(trust),
          _deadline(deadline) {
        if (!IsIPv4(address)) {
            throw Failure(Codes::ConnectionInvalid, "'" + address + "' is no IPv4 address");
        }
        _curl.reset(curl_easy_init());
        _headers.reset(curl_slist_append(nullptr, "Content-Type: application/json"));
        if (_curl == nullptr || _headers == nullptr) {
            throw std::bad_alloc();
        }
        SetTransport();
        SetTrust();
    }

    SecretText Ask(char const* path, SecretText const* body) {
        ErrorQueue const errors;
        std::string const url = "https://" + _name + path;
        Set(CURLOPT_URL, url.c_str());
        if (body == nullptr) {
            Set(CURLOPT_HTTPGET, 1L);
        } else {
            Set(CURLOPT_POST, 1L);
            Set(CURLOPT_POSTFIELDS, body->data());
            Set(CURLOPT_POSTFIELDSIZE, static_cast<long>(body->size()));
            Set(CURLOPT_HTTPHEADER, _headers.get());
        }
        Set(CURLOPT_TIMEOUT_MS, Remaining());
        _answer.clear();
        _answer.reserve(MaximumAnswer); // what grows leaves copies, though wiped ones
        _isTooLong = false;
        CURLcode const result = curl_easy_perform(_curl.get());
        if (result != CURLE_OK) {
            Fail(result);
        }
        return std::move(_answer);
    }

private:
    template <typename Value> void Set(CURLoption option, Value value) {
        // What an option is called with is of its own type, so that only memory can be missing.
        if (curl_easy_setopt(_curl.get(), option, value) != CURLE_OK) {
            throw std::bad_alloc();
        }
    }

    void SetTransport() {
        Set(CURLOPT_PROTOCOLS_STR, "https");
        Set(CURLOPT_HTTP_VERSION, static_cast<long>(CURL_HTTP_VERSION_1_1));
        Set(CURLOPT_PROXY, ""); // and none of the environment's
        Set(CURLOPT_NOSIGNAL, 1L);
        Set(CURLOPT_BUFFERSIZE, static_cast<long>(MaximumAnswer / 4));
        Set(CURLOPT_WRITEFUNCTION, &Session::Take);
        Set(CURLOPT_WRITEDATA, this);
        Set(CURLOPT_ERRORBUFFER, _error.data());
    }

    void SetTrust() {
        Set(CURLOPT_SSLVERSION, static_cast<long>(CURL_SSLVERSION_TLSv1_2));
        Set(CURLOPT_SSL_VERIFYPEER, _trust.verifiesCertificate ? 1L : 0L);
        Set(CURLOPT_SSL_VERIFYHOST, _trust.verifiesCertificate ? 2L : 0L);
        Set(CURLOPT_SSL_SESSIONID_CACHE, 0L);
        Set(CURLOPT_SSL_CTX_FUNCTION, &Session::Prepare);
        Set(CURLOPT_SSL_CTX_DATA, this);
        if (_trust.verifiesCertificate && IsRegularFile(_trust.authorities)) {
            // An authority of one's own replaces the system's: nobody else's may then vouch for the
            // service.
            Set(CURLOPT_CAINFO, _trust.authorities.c_str());
            Set(CURLOPT_CAPATH, static_cast<char const*>(nullptr));
        }
    }

    long Remaining() const {
        using std::chrono::milliseconds;
        auto const left = std::chrono::ceil<milliseconds>(_deadline - Deadline::clock::now());
        // For libcurl, 0 is for ever.
        return static_cast<long>(std::clamp(left, milliseconds(1), milliseconds(3600000)).count());
    }

    static std::size_t Take(char* data, std::size_t, std::size_t size, void* session) noexcept {
        auto& self = *static_cast<Session*>(session);
        if (size > MaximumAnswer - self._answer.size()) {
            self._isTooLong = true;
            return 0; // which ends the transfer
        }
        // Within what was reserved.
        self._answer.insert(self._answer.end(), data, data + size);
        return size;
    }

    /// Called before each handshake. The certificate is looked at here, within the handshake, so
    /// that nothing is said to a server that is not to be trusted.
    static CURLcode Prepare(CURL*, void* context, void* session) noexcept {
        auto* const tls = static_cast<SSL_CTX*>(context);
        SSL_CTX_set_options(tls, SSL_OP_CLEANSE_PLAINTEXT | SSL_OP_NO_RENEGOTIATION);
        // libcurl writes the keys of its connections to a file that the environment may name.
        SSL_CTX_set_keylog_callback(tls, nullptr);
        // Also where libcurl is not to verify: the pin is held against the certificate there.
        SSL_CTX_set_verify(tls, SSL_VERIFY_PEER, nullptr);
        SSL_CTX_set_cert_verify_callback(tls, &Session::Judge, session);
        return CURLE_OK;
    }

    /// @return 1 where the server may be spoken to
    static int Judge(X509_STORE_CTX* chain, void* session) noexcept {
        try {
            auto& self = *static_cast<Session*>(session);
            self._refusal = self.WhyRefused(chain);
            if (self._refusal.empty()) {
                X509_STORE_CTX_set_error(chain, X509_V_OK);
            } else if (X509_STORE_CTX_get_error(chain) == X509_V_OK) {
                X509_STORE_CTX_set_error(chain, X509_V_ERR_CERT_REJECTED);
            }
            return self._refusal.empty() ? 1 : 0;
        } catch (std::bad_alloc const&) {
            return 0;
        }
    }

    std::string WhyRefused(X509_STORE_CTX* chain) const {
        if (_trust.verifiesCertificate) {
            // libcurl would take the name of a certificate without addresses for one.
            if (X509_VERIFY_PARAM_set1_ip_asc(X509_STORE_CTX_get0_param(chain), _address.c_str()) !=
                    1 ||
                X509_verify_cert(chain) != 1) {
                return std::string("the server's certificate: ") +
                       X509_verify_cert_error_string(X509_STORE_CTX_get_error(chain));
            }
        }
        X509* const certificate = X509_STORE_CTX_get0_cert(chain);
        std::string const presented = certificate == nullptr ? "" : Thumbprint(certificate);
        if (!_trust.thumbprint.empty() &&
            (presented.size() != _trust.thumbprint.size() ||
             CRYPTO_memcmp(presented.data(), _trust.thumbprint.data(), presented.size()) != 0)) {
            return "the server presents a certificate with the thumbprint " + presented + ", and " +
                   _trust.thumbprint + " is pinned for it";
        }
        return {};
    }

    [[noreturn]] void Fail(CURLcode result) const {
        if (!_refusal.empty()) {
            throw Failure(Codes::InvalidCertificate, _refusal);
        }
        if (_isTooLong) {
            throw Failure(Codes::InvalidAnswer, "the answer is longer than any can be");
        }
        std::string const said = _error[0] != '\0' ? _error.data() : curl_easy_strerror(result);
        throw Failure(CodeOf(result), _name + ": " + said);
    }

    Codes::Code CodeOf(CURLcode result) const {
        switch (result) {
        case CURLE_OPERATION_TIMEDOUT:
            return Codes::TimedOut;
        case CURLE_OUT_OF_MEMORY:
            throw std::bad_alloc();
        case CURLE_SSL_CACERT_BADFILE:
        case CURLE_PEER_FAILED_VERIFICATION:
        case CURLE_SSL_ISSUER_ERROR:
            return Codes::InvalidCertificate;
        case CURLE_UNSUPPORTED_PROTOCOL:
        case CURLE_WEIRD_SERVER_REPLY:
            return Codes::InvalidAnswer;
        case CURLE_COULDNT_CONNECT:
            return CodeOfConnecting();
        default:
            return Codes::ConnectionInvalid;
        }
    }

    Codes::Code CodeOfConnecting() const {
        long error = 0;
        (void)curl_easy_getinfo(_curl.get(), CURLINFO_OS_ERRNO, &error); // 0 where it is not known
        switch (error) {
        case ECONNREFUSED:
            return Codes::ConnectionRefused;
        case ETIMEDOUT:
            return Codes::TimedOut;
        default:
            return Codes::ConnectionInvalid;
        }
    }

    Library const _library; // goes last
    std::string const _address;
    std::string const _name;
    Trust const _trust;
    Deadline const _deadline;
    std::array<char, CURL_ERROR_SIZE> _error = {};
    std::unique_ptr<CURL, Freed<curl_easy_cleanup>> _curl;
    std::unique_ptr<curl_slist, Freed<curl_slist_free_all>> _headers;
    SecretText _answer;
    bool _isTooLong = false;
    std::string _refusal; // why the certificate is not to be trusted
};

HttpsClient::HttpsClient(std::string const& address, std::uint16_t port, Trust const& trust,
                         Deadline deadline)
    : _session(std::make_unique<Session>(address, port, trust, deadline)) {}

HttpsClient::~HttpsClient() = default;

SecretText HttpsClient::Get(char const* path) {
    return _session->Ask(path, nullptr);
}

SecretText HttpsClient::Post(char const* path, SecretText const& body) {
    return _session->Ask(path, &body);
}

} // namespace tessel::winbind::cam
