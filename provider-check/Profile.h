// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <set>
#include <string>

namespace tessel::providercheck {

/// What the author of a provider says of it, and of the host and the directory that it may be
/// checked with. A value; without a file, what is safe on any host.
struct Profile {
    Profile() = default;
    /// @throws IOError, ConfigurationError (<tslauth/Exceptions.h>) where the file, or the one that
    ///     has the password, cannot be read, or a key or a value is not one of these
    explicit Profile(std::string const& path);

    /// Whether there is a directory to join, and an account that may.
    bool HasDirectory() const {
        return !domain.empty() && !user.empty() && !password.empty();
    }

    unsigned seconds = 60;      ///< "seconds": within which every call ends
    std::set<unsigned> codes;   ///< "codes": the provider's own, besides those of the header
    bool hostMayChange = false; ///< "host-may-change": whether joins, parts, settings may be made
    std::string domain;         ///< "domain": to join
    std::string user;           ///< "user": who may join and part the host
    std::string password;       ///< of the file "password-file"; its first line
    std::string account;        ///< "account": of the domain, to convert
    std::string server;         ///< "server": a CAM server to ask
    std::string thumbprint;     ///< "thumbprint": of its certificate
};

} // namespace tessel::providercheck
