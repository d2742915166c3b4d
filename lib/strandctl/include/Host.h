// SPDX-License-Identifier: Apache-2.0
#ifndef STRANDCTL_HOST_H
#define STRANDCTL_HOST_H

#include "AdvancedOptionBranch.h"
#include "Export.h"

namespace HostCtl {

/// The host that this process runs on. Holds no state; may be used from any thread.
class STRANDCTL_EXPORT Host {
public:
    Host();
    // Out of line: another host's library of this name may keep something in here.
    ~Host(); // NOLINT(performance-trivially-destructible)
    Host(Host const&) = default;
    Host& operator=(Host const&) = default;

    /// The root of the host's advanced options, read from "/etc/tessel/advanced.conf" now. A line
    /// of the file is an option, as in `UserVars.Example = "1"`.
    /// @throws HostCtl::Lib::HostCtlException "Unable to get root option branch" if there is no
    ///         such file; the same text + ": " + the reason if it cannot be read or has a bad line
    Adv::AdvancedOptionBranch GetAdvancedOptionRoot() const;
};

} // namespace HostCtl

#endif
