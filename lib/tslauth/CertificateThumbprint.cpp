// SPDX-License-Identifier: Apache-2.0
#include "CertificateThumbprint.h"

#include <cstdio>
#include <memory>
#include <openssl/err.h>
#include <openssl/evp.h>
#include <openssl/pem.h>
#include <openssl/x509.h>
#include <tslauth/Exceptions.h>

namespace tessel::authentication {

namespace {

struct CloseFile {
    void operator()(std::FILE* file) const {
        // Only read from, so there is nothing that closing could lose.
        (void)std::fclose(file);
    }
};

struct FreeCertificate {
    void operator()(X509* certificate) const {
        X509_free(certificate);
    }
};

/// Drops the errors that OpenSSL queues while this object lives, and none that were there before:
/// the process may be in the middle of a conversation of its own.
class ErrorQueueGuard {
public:
    ErrorQueueGuard() {
        ERR_set_mark();
    }
    ErrorQueueGuard(ErrorQueueGuard const&) = delete;
    ErrorQueueGuard& operator=(ErrorQueueGuard const&) = delete;
    ~ErrorQueueGuard() {
        ERR_pop_to_mark();
    }
};

std::string Hexadecimal(unsigned char const* bytes, unsigned length) {
    static constexpr char digits[] = "0123456789ABCDEF";
    std::string text;
    for (unsigned i = 0; i < length; ++i) {
        if (i != 0) {
            text += ':';
        }
        text += digits[bytes[i] >> 4];
        text += digits[bytes[i] & 0xf];
    }
    return text;
}

} // namespace

std::string CertificateThumbprint(std::string const& file) {
    std::unique_ptr<std::FILE, CloseFile> input(std::fopen(file.c_str(), "re"));
    if (!input) {
        throw FileNotFoundException(2, "The system cannot find the file specified.");
    }
    ErrorQueueGuard const guard;
    std::unique_ptr<X509, FreeCertificate> const certificate(
        PEM_read_X509(input.get(), nullptr, nullptr, nullptr));
    input.reset();
    if (!certificate) {
        throw InvalidCertificateException();
    }
    unsigned char digest[EVP_MAX_MD_SIZE];
    unsigned length = 0;
    if (X509_digest(certificate.get(), EVP_sha1(), digest, &length) <= 0) {
        throw InvalidCertificateException();
    }
    return Hexadecimal(digest, length);
}

} // namespace tessel::authentication
