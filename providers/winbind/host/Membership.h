// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "text/SambaDomain.h"

#include <optional>
#include <set>
#include <string>

namespace tessel::winbind {

class Host;

/// The host's membership, as a join of this provider recorded it in its own file for Samba.
struct Membership {
    /// What a join made that a part is to take away again.
    enum class Made {
        SambaFile,      ///< there was no smb.conf
        KerberosFile,   ///< there was no krb5.conf
        KerberosFolder, ///< there was no folder for files that krb5.conf includes
        Daemon,         ///< winbindd did not run
    };

    SambaDomain domain;
    std::set<Made> made;

    /// The domain's DNS name.
    std::string DNSName() const;

    /// Nothing where the host is joined to no domain by this provider: its own file is not there,
    /// or smb.conf, which decides, does not include it.
    /// @throws Failure where a file cannot be read
    static std::optional<Membership> Read(Host const& host);

    /// The same where smb.conf does not count: also what a join has not reached, or a part left.
    static std::optional<Membership> ReadOwnFile(Host const& host);

    /// What is put before the text of the own file, for `Read`. Not behind it: its last line may be
    /// one that nothing can follow.
    static std::string Record(std::set<Made> const& made);

    /// What a text that begins with a `Record` says.
    static std::set<Made> ReadRecord(std::string const& text);
};

} // namespace tessel::winbind
