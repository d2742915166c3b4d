// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <string>
#include <string_view>
#include <vector>

/// The administrator's krb5.conf(5) of MIT Kerberos, and the file of this provider's own that it
/// includes. Text in, text out: no file is opened here.
namespace tessel::winbind {

/// Whether a line of `text` includes the file `path`.
bool HasKerberosInclude(std::string_view text, std::string_view path);

/// `text` with `path` included before everything else: of several values, Kerberos takes the first.
/// `text` itself where it is included already. WithoutKerberosInclude() gives back the very bytes
/// of a `text` that did not include it.
std::string WithKerberosInclude(std::string_view text, std::string_view path);

/// `text` without the lines that WithKerberosInclude() added, wherever they have got to since, and
/// without any other line that includes `path`.
std::string WithoutKerberosInclude(std::string_view text, std::string_view path);

/// What the provider's own file says about the domain.
struct KerberosDomain {
    std::string realm;   ///< in capitals
    std::string dnsName; ///< the domain's
    /// The only controllers that Kerberos is to ask; empty where it is to find them in DNS, as it
    /// should on a host that stays joined.
    std::vector<std::string> controllers = {};
    /// The domain's NetBIOS name, with which the host's names of its users begin; empty where no
    /// user is to be known by a ticket.
    std::string workgroup = {};
};

/// The provider's own file.
/// @throws Failure TSLAUTH_PROVIDER_INVALID_PARAMETER for a value that is not one plain word
std::string KerberosDomainText(KerberosDomain const& domain);

} // namespace tessel::winbind
