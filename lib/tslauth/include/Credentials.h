// SPDX-License-Identifier: Apache-2.0
#ifndef TSLAUTH_CREDENTIALS_H
#define TSLAUTH_CREDENTIALS_H

namespace tessel {
namespace authentication {

/// The account in whose name a host is joined or parted: `Credentials c = {user, password};`.
///
/// It owns nothing: both texts are the caller's and must outlive the call that they are given to.
/// Either may be null or empty. They are handed to the provider as they are, without a copy, so
/// that a caller can overwrite a password in the one place where it stands.
struct Credentials {
    /// Whether it carries a domain is between the user and the provider.
    char const* userName = nullptr;
    char const* password = nullptr;
};

} // namespace authentication
} // namespace tessel

#endif
