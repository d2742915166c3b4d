// SPDX-License-Identifier: Apache-2.0
#include <strandctl/HostsFile.h>

#include "Files.h"
#include "HostsText.h"
#include "Paths.h"

namespace StrandCtl::Network {

HostsFile::HostsFile() = default;

HostsFile::~HostsFile() = default;

void HostsFile::AddOrReplaceEntry(std::string const& address, std::string const& name,
                                  std::vector<std::string> const& aliases) {
    // A missing file says as much as an empty one.
    std::string const old = ReadFile(Paths::Hosts).value_or("");
    std::string const text = AddOrReplaceHostsEntry(old, address, name, aliases);
    if (text != old) {
        ReplaceFile(Paths::Hosts, text);
    }
}

} // namespace StrandCtl::Network
