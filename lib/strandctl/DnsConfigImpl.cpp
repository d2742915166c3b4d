// SPDX-License-Identifier: Apache-2.0
#include <strandctl/DnsConfigImpl.h>

#include "Files.h"
#include "Paths.h"
#include "ResolvConfText.h"

#include <strandctl/HostCtlException.h>

namespace StrandCtl::Network {

namespace {

/// What the file says now. A missing file says as much as an empty one.
std::string Current() {
    return ReadFile(Paths::ResolvConf).value_or("");
}

std::string WithDomains(std::string text, std::vector<std::string> const& domains) {
    for (std::string const& domain : domains) {
        text = AddSearchDomainToText(text, domain);
    }
    return text;
}

} // namespace

DnsConfigImpl::DnsConfigImpl() = default;

DnsConfigImpl::~DnsConfigImpl() = default;

void DnsConfigImpl::AddSearchDomain(std::string const& domain) {
    std::string const before = WithDomains(Current(), _domains);
    if (AddSearchDomainToText(before, domain) != before) {
        _domains.push_back(domain);
    }
}

void DnsConfigImpl::SaveConfig() {
    std::string const old = Current();
    std::string const text = WithDomains(old, _domains);
    if (text == old) {
        return;
    }
    if (auto const owner = OwnerOfResolvConf(Destination(Paths::ResolvConf), old)) {
        throw HostCtl::Lib::HostCtlException("Cannot replace '" + std::string(Paths::ResolvConf) +
                                             "': it is kept by " + owner->name + "; instead, " +
                                             owner->remedy);
    }
    ReplaceFile(Paths::ResolvConf, text);
}

} // namespace StrandCtl::Network
