// SPDX-License-Identifier: Apache-2.0
#include <tslauth/Domain.h>

#include <ostream>
#include <string_view>
#include <utility>

namespace tessel::authentication {

Domain::Domain(std::string dnsName, std::string netBIOSName)
    : _dnsName(std::move(dnsName)), _netBIOSName(std::move(netBIOSName)) {}

std::string const& Domain::DNSName() const noexcept {
    return _dnsName;
}

std::string const& Domain::NetBIOSName() const noexcept {
    return _netBIOSName;
}

bool operator==(Domain const& left, Domain const& right) noexcept {
    return left.DNSName() == right.DNSName() && left.NetBIOSName() == right.NetBIOSName();
}

bool operator!=(Domain const& left, Domain const& right) noexcept {
    return !(left == right);
}

std::ostream& operator<<(std::ostream& stream, Domain const& domain) {
    auto const shown = [](std::string const& name) {
        return name.empty() ? std::string_view("(unset)") : std::string_view(name);
    };
    return stream << "DNS Name: " << shown(domain.DNSName())
                  << ", NetBIOS Name: " << shown(domain.NetBIOSName());
}

} // namespace tessel::authentication
