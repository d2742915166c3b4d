// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <string>

namespace tessel::winbind {

/// The folders in which the Samba of this host keeps its files, and the host's role, as its own
/// programs resolve them.
struct SambaFolders {
    std::string secrets; ///< "private dir"
    std::string state;
    std::string cache;
    std::string lock;
    std::string pid;
    /// The host's role, as `server role` and `security` together make it.
    bool isDomainMember = false;
    bool isDomainController = false;
};

} // namespace tessel::winbind
