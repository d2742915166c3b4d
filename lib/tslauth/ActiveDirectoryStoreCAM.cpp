// SPDX-License-Identifier: Apache-2.0
#include <tslauth/ActiveDirectoryStore.h>

#include "CertificateThumbprint.h"
#include "HostName.h"
#include <tslauth/Paths.h>

#include <tslauth/CAMProviderConfiguration.h>
#include <tslauth/CAMProxy.h>
#include <tslauth/CAMThumbprintStore.h>
#include <tslauth/Exceptions.h>

#include <strandctl/HostFactory.h>
#include <strandctl/Ipv4Address.h>

namespace tessel::authentication {

namespace {

void CheckServerAddress(std::string const& address) {
    if (!HostCtl::Network::Ipv4Address::IsValidAddress(address)) {
        throw InvalidIPAddressException("The IP Address is invalid: IPv4 address '" + address +
                                        "' cannot be parsed as an IP address");
    }
}

/// Whether the host's administrator wants the certificates of CAM servers verified.
bool VerifiesCertificates() {
    int const value = HostCtl::HostFactory::GetHost()
                          .GetAdvancedOptionRoot()
                          .GetBranch("UserVars")
                          .GetIntegerOption("ActiveDirectoryVerifyCAMCertificate")
                          .GetValue();
    if (value != 0 && value != 1) {
        throw InvalidVerifyCAMCertificateOptionException(
            "Invalid value for UserVars.ActiveDirectoryVerifyCAMCertificate");
    }
    return value != 0;
}

/// What `use(store)` returns, where `store` is the thumbprint store as it is now. A store that
/// cannot be opened or replaced is what has to be repaired.
template <typename Use> auto WithThumbprintStore(Use use) {
    try {
        CAMThumbprintStore store(Paths::CAMThumbprintStore);
        return use(store);
    } catch (IOError const&) {
        throw InvalidThumbprintStoreException(Paths::CAMThumbprintStore);
    }
}

std::string ThumbprintOf(std::string const& serverAddress) {
    return WithThumbprintStore(
        [&](CAMThumbprintStore const& store) { return store.LookupThumbprint(serverAddress); });
}

/// A proxy of the CAM provider that the host is configured for.
/// @param thumbprint gives the thumbprint, when the provider's name is known
template <typename Thumbprint>
CAMProxy ConfiguredProxy(std::string const& serverAddress, bool verifyCertificate,
                         Thumbprint thumbprint) {
    try {
        CAMProviderConfiguration const configuration;
        std::string const& provider = configuration[Paths::ProviderKey];
        if (provider.empty()) {
            throw InvalidCAMProxyProviderException("(unset)");
        }
        return CAMProxy(provider, serverAddress, verifyCertificate, thumbprint());
    } catch (IOError const&) {
        throw InvalidCAMProxyProviderException("(none installed)");
    }
}

} // namespace

void ActiveDirectoryStore::ImportCertificateForCAM(std::string const& certificateFile,
                                                   std::string const& serverAddress) {
    CheckServerAddress(serverAddress);
    std::string const thumbprint = CertificateThumbprint(certificateFile);
    WithThumbprintStore(
        [&](CAMThumbprintStore& store) { store.ImportThumbprint(thumbprint, serverAddress); });
}

void ActiveDirectoryStore::PinCertificateForCAM(std::string const& certificateFile,
                                                std::string const& serverAddress) {
    CheckServerAddress(serverAddress);
    std::string const thumbprint = CertificateThumbprint(certificateFile);
    CAMThumbprintStore store(Paths::CAMThumbprintStore, OnReadError::Throw);
    store.ImportThumbprint(thumbprint, serverAddress);
}

void ActiveDirectoryStore::JoinDomainWithCAM(std::string const& serverAddress,
                                             std::string const& organisationalUnit,
                                             bool skipHostnameCheck) {
    CheckServerAddress(serverAddress);
    bool const verifyCertificate = VerifiesCertificates();
    std::string const accountName = ShortName(CurrentHostName());
    CAMProxy const proxy = ConfiguredProxy(serverAddress, verifyCertificate,
                                           [&] { return ThumbprintOf(serverAddress); });
    if (!skipHostnameCheck) {
        SanitiseHostnameForDomain(proxy.GetDNSDomainName());
    }
    ComputerPrincipalInfo const principal = proxy.CreateMachineAccount(
        accountName,
        organisationalUnit.empty() ? proxy.GetDefaultComputerContainer() : organisationalUnit);

    CAM::ActiveDirectoryDomainInfo domain;
    domain.netBIOSDomainName = proxy.GetNetBIOSDomainName();
    domain.dnsDomainName = proxy.GetDNSDomainName();
    domain.domainSID = proxy.GetDomainSID();
    CAM::MachineAccountInfo account;
    account.accountName = accountName;
    account.dnsDomainName = domain.dnsDomainName;
    account.firstResult = principal.firstResult;
    account.secondResult = principal.secondResult;
    _provider->JoinDomainWithMachineAccount(domain, account);
}

std::string ActiveDirectoryStore::GetDomainForCAMService(std::string const& serverAddress) const {
    CheckServerAddress(serverAddress);
    // Whatever the host's option says: which domain a server serves is asked in order to decide
    // whether to trust it.
    return ConfiguredProxy(serverAddress, false, [] { return std::string(); }).GetDNSDomainName();
}

} // namespace tessel::authentication
