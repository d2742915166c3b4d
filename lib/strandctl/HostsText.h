// SPDX-License-Identifier: Apache-2.0
#ifndef STRANDCTL_HOSTSTEXT_H
#define STRANDCTL_HOSTSTEXT_H

#include <string>
#include <string_view>
#include <vector>

namespace StrandCtl {

/// The text of a hosts file in which `address` stands for `name` and the `aliases`, and for nothing
/// else; see `HostsFile::AddOrReplaceEntry` for what stays as it is.
/// @throws HostCtl::Lib::HostCtlException if `address` is no IP address, or a name would be read as
///         something else
std::string AddOrReplaceHostsEntry(std::string_view text, std::string const& address,
                                   std::string const& name,
                                   std::vector<std::string> const& aliases);

} // namespace StrandCtl

#endif
