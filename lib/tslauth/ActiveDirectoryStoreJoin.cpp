// SPDX-License-Identifier: Apache-2.0
#include <tslauth/ActiveDirectoryStore.h>

#include "HostName.h"

#include <tslauth/Exceptions.h>

#include <strandctl/DnsConfigImpl.h>
#include <strandctl/HostsFile.h>
#include <strandctl/NetworkInfoImpl.h>

#include <algorithm>
#include <array>
#include <locale>
#include <netdb.h>
#include <syslog.h>
#include <vector>

namespace tessel::authentication {

namespace {

/// The domain argument of a join: "DOMAIN" or "DOMAIN/UNIT", where the unit may have further "/".
struct JoinTarget {
    std::string domain;
    std::string organisationalUnit;
};

JoinTarget ParseJoinTarget(std::string const& text) {
    std::size_t const slash = text.find('/');
    if (slash == std::string::npos) {
        return {text, std::string()};
    }
    return {text.substr(0, slash), text.substr(slash + 1)};
}

/// The names that installers leave behind: a domain that let them in would soon have several hosts
/// of one name. The comparison is exact, as it is in every host's records.
std::array<std::string, 3> const& HostNameBlacklist() {
    static std::array<std::string, 3> const names = {"localhost", "linux", "hostname"};
    return names;
}

/// The official name of the host that the resolver knows as `name`.
std::string ResolvedName(std::string const& name) {
    // What does not fit counts as an error of the resolver; the buffer does not grow.
    char buffer[1024];
    hostent entry = {};
    hostent* found = nullptr;
    int resolverError = 0;
    if (gethostbyname_r(name.c_str(), &entry, buffer, sizeof buffer, &found, &resolverError) != 0) {
        throw InvalidHostNameException(hstrerror(resolverError));
    }
    if (found == nullptr) {
        throw InvalidHostNameException("hostname cannot be resolved");
    }
    return found->h_name;
}

bool EqualWithoutCase(std::string const& left, std::string const& right) {
    std::locale const locale;
    return std::equal(left.begin(), left.end(), right.begin(), right.end(), [&](char a, char b) {
        return std::toupper(a, locale) == std::toupper(b, locale);
    });
}

/// Makes `domain` a search domain, if there is such a domain at all.
void SearchDomain(std::string const& domain) {
    // The answer stands in memory of the C library's that other threads may write to; only whether
    // there is one is looked at.
    if (gethostbyname(domain.c_str()) != nullptr) {
        StrandCtl::Network::DnsConfigImpl configuration;
        configuration.AddSearchDomain(domain);
        configuration.SaveConfig();
    }
}

} // namespace

void ActiveDirectoryStore::JoinDomain(std::string const& domain, Credentials const& credentials,
                                      bool skipHostnameCheck) {
    // An empty user name passes: what it means is the provider's business.
    if (credentials.userName == nullptr) {
        throw InvalidCredentialsException("no username was specified");
    }
    if (credentials.password == nullptr || *credentials.password == '\0') {
        throw InvalidCredentialsException("empty or no password was specified; the account must "
                                          "have a non-empty password to join the host to domain");
    }
    JoinTarget const target = ParseJoinTarget(domain);
    if (!skipHostnameCheck) {
        SanitiseHostnameForDomain(target.domain);
    }
    _provider->JoinDomain(target.domain, target.organisationalUnit, credentials);
}

void ActiveDirectoryStore::PartDomain() {
    _provider->PartDomain();
}

void ActiveDirectoryStore::PartDomain(Credentials const& credentials) {
    _provider->PartDomain(credentials);
}

void ActiveDirectoryStore::SanitiseHostnameForDomain(std::string const& domain) const {
    std::array<std::string, 3> const& blacklist = HostNameBlacklist();
    StrandCtl::Network::HostsFile hosts;
    StrandCtl::Network::NetworkInfoImpl const network;

    std::string const hostName = CurrentHostName();
    std::string fullName = ResolvedName(hostName);
    std::string const shortName = ShortName(hostName);
    if (ShortName(fullName) != shortName) {
        throw InvalidHostNameException("shortname does not match FQDN");
    }
    std::string const expectedName = shortName + "." + domain;
    if (fullName.find('.') == std::string::npos) {
        fullName = expectedName;
    }
    if (!EqualWithoutCase(fullName, expectedName)) {
        syslog(LOG_WARNING,
               "The fully qualified hostname %s does not match the expected value %s\n",
               fullName.c_str(), expectedName.c_str());
        SearchDomain(domain);
    }
    // Only now, when a search domain may have been added: a name on this list is refused, but what
    // makes the domain reachable is of use to whoever renames the host.
    if (std::find(blacklist.begin(), blacklist.end(), shortName) != blacklist.end()) {
        throw InvalidHostNameException("hostname is in blacklist");
    }
    std::string const address =
        network.GetManagementInterface().GetIpConfig().GetIpv4Address().ToString();
    // The resolved name, also where another was expected: whatever else uses the host's name goes
    // on finding it, and the search domain completes the short one.
    hosts.AddOrReplaceEntry(address, fullName, {shortName});
}

} // namespace tessel::authentication
