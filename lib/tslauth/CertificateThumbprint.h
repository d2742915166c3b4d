// SPDX-License-Identifier: Apache-2.0
#ifndef TSLAUTH_CERTIFICATETHUMBPRINT_H
#define TSLAUTH_CERTIFICATETHUMBPRINT_H

#include <string>

namespace tessel::authentication {

/// The SHA-1 thumbprint of the first PEM certificate in `file`: 20 pairs of upper-case hexadecimal
/// digits with ":" between them. Whatever stands before and after the certificate is ignored. The
/// calling thread's queue of OpenSSL errors is left as it was.
/// @throws FileNotFoundException (code 2) if the file cannot be opened, whatever the reason
/// @throws InvalidCertificateException if it holds no certificate in PEM form
std::string CertificateThumbprint(std::string const& file);

} // namespace tessel::authentication

#endif
