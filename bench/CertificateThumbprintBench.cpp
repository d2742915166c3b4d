// SPDX-License-Identifier: Apache-2.0
#include "Cases.h"

#include <CertificateThumbprint.h>

#include <cstdio>
#include <openssl/evp.h>
#include <openssl/pem.h>
#include <openssl/x509.h>
#include <stdexcept>

namespace bench {

namespace {

constexpr char File[] = BENCH_CERTIFICATE;

/// The calls that a thumbprint cannot do without.
unsigned ByHand(unsigned char* digest) {
    std::FILE* const file = std::fopen(File, "re");
    if (file == nullptr) {
        throw std::runtime_error("no certificate");
    }
    X509* const certificate = PEM_read_X509(file, nullptr, nullptr, nullptr);
    (void)std::fclose(file); // only read
    unsigned length = 0;
    if (certificate == nullptr || X509_digest(certificate, EVP_sha1(), digest, &length) <= 0) {
        throw std::runtime_error("no thumbprint");
    }
    X509_free(certificate);
    return length;
}

void Ours(benchmark::State& state) {
    Measure(state,
            [] { benchmark::DoNotOptimize(tessel::authentication::CertificateThumbprint(File)); });
}

void Floor(benchmark::State& state) {
    Measure(state, [] {
        unsigned char digest[EVP_MAX_MD_SIZE];
        benchmark::DoNotOptimize(ByHand(digest));
        benchmark::DoNotOptimize(digest);
    });
}

} // namespace

void AddCertificateThumbprintCases(Table& table) {
    table.Add("a certificate's thumbprint", {Bar::Of::Ratio, 1.1}, Clock::Processor, 15,
              {{"ours", Ours}, {"floor", Floor}});
}

} // namespace bench
