// SPDX-License-Identifier: Apache-2.0
#ifndef STRANDCTL_IPV4ADDRESS_H
#define STRANDCTL_IPV4ADDRESS_H

#include "Export.h"

#include <string>

namespace HostCtl {
namespace Network {

/// An IPv4 address. A value without locks: copies are independent of each other.
class STRANDCTL_EXPORT Ipv4Address {
public:
    /// @param dotted an address that `IsValidAddress` accepts
    /// @throws HostCtl::Lib::HostCtlException "'" + dotted + "' is not an IPv4 address" otherwise
    explicit Ipv4Address(std::string const& dotted);
    ~Ipv4Address();
    Ipv4Address(Ipv4Address const&) = default;
    Ipv4Address& operator=(Ipv4Address const&) = default;

    /// The dotted decimal form, as in "192.0.2.1".
    std::string ToString() const;

    /// True for strict dotted decimal alone: four decimal numbers from 0 to 255 without leading
    /// zeros, three dots, and nothing else. No blanks, no octal or hexadecimal numbers, no form
    /// with fewer numbers. Opens nothing and asks nobody.
    static bool IsValidAddress(std::string const& address);

private:
    std::string _dotted;
};

} // namespace Network
} // namespace HostCtl

#endif
