// SPDX-License-Identifier: Apache-2.0
#ifndef TSLAUTH_DOMAIN_H
#define TSLAUTH_DOMAIN_H

#include "Export.h"

#include <iosfwd>
#include <string>

namespace tessel {
namespace authentication {

/// The two names of an Active Directory domain. A value; an empty name is one that is not known.
class TSLAUTH_EXPORT Domain {
public:
    /// Both names empty.
    Domain() = default;

    /// @param dnsName such as "corp.example"
    /// @param netBIOSName such as "CORP"
    Domain(std::string dnsName, std::string netBIOSName);

    std::string const& DNSName() const noexcept;
    std::string const& NetBIOSName() const noexcept;

private:
    std::string _dnsName;
    std::string _netBIOSName;
};

/// Both names are equal byte for byte; case counts.
TSLAUTH_EXPORT bool operator==(Domain const& left, Domain const& right) noexcept;
TSLAUTH_EXPORT bool operator!=(Domain const& left, Domain const& right) noexcept;

/// Prints "DNS Name: " + DNS name + ", NetBIOS Name: " + NetBIOS name, without a line end; an empty
/// name prints as "(unset)".
TSLAUTH_EXPORT std::ostream& operator<<(std::ostream& stream, Domain const& domain);

} // namespace authentication
} // namespace tessel

#endif
