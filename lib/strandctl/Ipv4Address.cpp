// SPDX-License-Identifier: Apache-2.0
#include <strandctl/Ipv4Address.h>

#include <algorithm>
#include <strandctl/HostCtlException.h>
#include <string_view>

namespace HostCtl::Network {

namespace {

bool IsDigit(char character) {
    return character >= '0' && character <= '9';
}

/// A decimal number from 0 to 255 without leading zeros.
bool IsOctet(std::string_view text) {
    if (text.empty() || text.size() > 3 || !std::all_of(text.begin(), text.end(), IsDigit)) {
        return false;
    }
    if (text.size() > 1 && text.front() == '0') {
        return false;
    }
    return text.size() < 3 || text <= "255";
}

} // namespace

Ipv4Address::Ipv4Address(std::string const& dotted) : _dotted(dotted) {
    if (!IsValidAddress(dotted)) {
        throw Lib::HostCtlException("'" + dotted + "' is not an IPv4 address");
    }
}

Ipv4Address::~Ipv4Address() = default;

std::string Ipv4Address::ToString() const {
    return _dotted;
}

// By hand: the C library's parsers differ in what they take for a number.
bool Ipv4Address::IsValidAddress(std::string const& address) {
    std::string_view rest = address;
    for (int dots = 0; dots < 3; ++dots) {
        std::string_view::size_type const dot = rest.find('.');
        if (dot == std::string_view::npos || !IsOctet(rest.substr(0, dot))) {
            return false;
        }
        rest.remove_prefix(dot + 1);
    }
    return IsOctet(rest);
}

} // namespace HostCtl::Network
