// SPDX-License-Identifier: Apache-2.0
#ifndef STRANDCTL_DNSCONFIGIMPL_H
#define STRANDCTL_DNSCONFIGIMPL_H

#include "Export.h"

#include <string>
#include <vector>

namespace StrandCtl {
namespace Network {

/// The editor of "/etc/resolv.conf". Remembers the domains that were added, and nothing of the
/// file: each call reads it anew, so that what others wrote in between stays. For one thread at a
/// time.
class STRANDCTL_EXPORT DnsConfigImpl {
public:
    /// Opens nothing yet.
    DnsConfigImpl();
    ~DnsConfigImpl();
    DnsConfigImpl(DnsConfigImpl const&) = delete;
    DnsConfigImpl& operator=(DnsConfigImpl const&) = delete;

    /// Adds a domain to the end of the search list, in memory; `SaveConfig` writes it. A domain
    /// that is in the list, in the file or from an earlier call, is not added again; upper and
    /// lower case are the same, and so is the name with a dot at its end.
    ///
    /// The search list is limited to 6 domains and, with a blank between them, 255 characters.
    /// These are the limits of every resolver that a program of the host may carry (`MAXDNSRCH` and
    /// the size of `defdname` in <resolv.h>): the C library of the day has none, but older and
    /// smaller ones silently cut or ignore what is longer.
    /// @throws HostCtl::Lib::HostCtlException if `domain` is no domain name (letters, digits, "-"
    ///         and "_" in labels of at most 63 characters, 253 in all), the list would be longer
    ///         than its limits, or the file cannot be read; nothing is added then
    void AddSearchDomain(std::string const& domain);

    /// Writes the added domains to the file: into the search list that counts, which is the last
    /// one
    /// ("domain" lines included). After a "domain" line, which can hold one name alone, a "search"
    /// line follows; without either one, it is appended. All other lines stay as they are, and
    /// nothing is written where nothing changes.
    ///
    /// The file is replaced atomically and durably, and keeps its mode (and its owner, where the
    /// process may give files away); a missing one is created with mode 0644. Where it is a
    /// symbolic link, it is the file it leads to that is replaced. Blocks as long as the file
    /// system does.
    /// @throws HostCtl::Lib::HostCtlException if a program that would overwrite the change keeps
    ///         the file (it is a link into "/run", or its first comments say so); the text names
    ///         the owner and what to do instead
    /// @throws HostCtl::Lib::HostCtlException if the list has become too long in the meantime, or
    ///         the file cannot be read or replaced; in every case the file is as it was
    void SaveConfig();

private:
    std::vector<std::string> _domains;
};

} // namespace Network
} // namespace StrandCtl

#endif
