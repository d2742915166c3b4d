// SPDX-License-Identifier: Apache-2.0
#ifndef STRANDCTL_RESOLVCONFTEXT_H
#define STRANDCTL_RESOLVCONFTEXT_H

#include <optional>
#include <string>
#include <string_view>

namespace StrandCtl {

/// The text of a resolver configuration with `domain` in its search list; see `DnsConfigImpl` for
/// where it goes, what stays as it is, and the limits.
/// @throws HostCtl::Lib::HostCtlException if `domain` is no domain name, or the list would be
///         longer than its limits
std::string AddSearchDomainToText(std::string_view text, std::string const& domain);

/// A program that keeps the resolver configuration, and would overwrite what others write there.
struct ResolvConfOwner {
    std::string name;
    std::string remedy; ///< what to do instead, as an order without a full stop
};

/// The owner of a resolver configuration, if it has one.
/// @param destination where the path leads when its links are followed
/// @param text what is there; its first comments are looked at
std::optional<ResolvConfOwner> OwnerOfResolvConf(std::string_view destination,
                                                 std::string_view text);

} // namespace StrandCtl

#endif
