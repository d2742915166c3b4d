// SPDX-License-Identifier: Apache-2.0
#ifndef TSLAUTH_CAMTHUMBPRINTSTORE_H
#define TSLAUTH_CAMTHUMBPRINTSTORE_H

#include "Configuration.h"

namespace tessel {
namespace authentication {

/// The certificates that CAM servers are expected to present, as SHA-1 thumbprints: the keys are
/// the servers' IPv4 addresses as the caller wrote them, the values are 59 characters such as
/// "0A:1B:...:FF". Neither is examined here.
///
/// Like every `Configuration` it is a value of one thread, read when it is made.
class TSLAUTH_EXPORT CAMThumbprintStore : public Configuration {
public:
    /// Reads `path`, which must exist, if only empty.
    /// @throws IOError if it cannot be opened
    /// @throws ConfigurationError at its first bad line
    explicit CAMThumbprintStore(std::string const& path);

    /// The same, with a choice for who imports into it; see `Configuration`.
    CAMThumbprintStore(std::string const& path, OnReadError onReadError);

    CAMThumbprintStore(CAMThumbprintStore const&) = default;
    CAMThumbprintStore& operator=(CAMThumbprintStore const&) = default;
    ~CAMThumbprintStore() override;

    /// The thumbprint of `server`, or an empty string if there is none.
    std::string LookupThumbprint(std::string const& server) const;

    /// Makes `thumbprint` the one of `server`, and writes the file if that changes anything.
    /// @throws IOError, FilePermissionError as `Write`; the file is then as `Write` leaves it,
    ///         while this object already has the new thumbprint
    void ImportThumbprint(std::string const& thumbprint, std::string const& server);
};

} // namespace authentication
} // namespace tessel

#endif
