// SPDX-License-Identifier: Apache-2.0
#ifndef STRANDCTL_HOSTSFILE_H
#define STRANDCTL_HOSTSFILE_H

#include "Export.h"

#include <string>
#include <vector>

namespace StrandCtl {
namespace Network {

/// The editor of "/etc/hosts". Holds no state: each call reads the file anew, so that an object may
/// live as long as it likes. Not a lock: of two processes that edit at the same time the last one
/// wins, with a whole file.
class STRANDCTL_EXPORT HostsFile {
public:
    /// Opens nothing yet.
    HostsFile();
    // Out of line: another host's library of this name may keep something in here.
    ~HostsFile(); // NOLINT(performance-trivially-destructible)
    HostsFile(HostsFile const&) = delete;
    HostsFile& operator=(HostsFile const&) = delete;

    /// Makes `name`, then the `aliases`, what the file says for `address`. The first line of that
    /// address gets the new names and keeps its place, its comment and its blanks; without one, a
    /// line is appended. Further lines of the address go, since the resolver would still answer
    /// them; a comment on one of them stays, on a line of its own. Every other byte stays as it is,
    /// and nothing is written where nothing changes.
    ///
    /// Two spellings of an address are one address, "::ffff:192.0.2.1" and "192.0.2.1" among them.
    ///
    /// The file is replaced atomically and durably, and keeps its mode (and its owner, where the
    /// process may give files away); a missing one is created with mode 0644. Where "/etc/hosts"
    /// is a symbolic link, it is the file it leads to that is replaced, and the link stays. Blocks
    /// as long as the file system does.
    /// @param address an IPv4 or IPv6 address
    /// @throws HostCtl::Lib::HostCtlException if `address` is none, a name is empty or holds
    ///         blanks, control characters or "#", or the file cannot be read or replaced, and then
    ///         is as it was
    void AddOrReplaceEntry(std::string const& address, std::string const& name,
                           std::vector<std::string> const& aliases);
};

} // namespace Network
} // namespace StrandCtl

#endif
