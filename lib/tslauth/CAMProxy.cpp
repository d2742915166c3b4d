// SPDX-License-Identifier: Apache-2.0
#include <tslauth/CAMProxy.h>

#include "ProviderLibrary.h"
#include "ThrowMappedException.h"

#include <tslauth/tslauth_cam_provider.h>

namespace tessel::authentication {

namespace {

// Their texts stand in the table of the other providers' codes, which numbers them alike.
static_assert(int{TSLAUTH_CAM_PROVIDER_NOT_ENOUGH_MEMORY} == TSLAUTH_PROVIDER_NOT_ENOUGH_MEMORY);
static_assert(int{TSLAUTH_CAM_PROVIDER_CONNECTION_REFUSED} == TSLAUTH_PROVIDER_CONNECTION_REFUSED);
static_assert(int{TSLAUTH_CAM_PROVIDER_CONNECTION_INVALID} == TSLAUTH_PROVIDER_CONNECTION_INVALID);
static_assert(int{TSLAUTH_CAM_PROVIDER_TIMED_OUT} == TSLAUTH_PROVIDER_TIMED_OUT);

/// Ends an operation whose entry has failed. Of the many codes that an Active Directory provider's
/// failure may have, a CAM provider speaks four, and one that is its own.
void Check(int code) {
    auto const number = static_cast<ActiveDirectoryClientErrorCode>(code);
    switch (code) {
    case TSLAUTH_CAM_PROVIDER_SUCCESS:
        return;
    case TSLAUTH_CAM_PROVIDER_NOT_ENOUGH_MEMORY:
    case TSLAUTH_CAM_PROVIDER_CONNECTION_REFUSED:
    case TSLAUTH_CAM_PROVIDER_CONNECTION_INVALID:
    case TSLAUTH_CAM_PROVIDER_TIMED_OUT:
        ThrowMappedException(number);
    case TSLAUTH_CAM_PROVIDER_INVALID_CERTIFICATE:
        throw InvalidCAMCertificateException(number,
                                             "The CAM server's certificate cannot be verified.");
    default:
        throw UnknownException(number);
    }
}

} // namespace

CAMProxy::CAMProxy(std::string const& providerName, std::string const& serverAddress,
                   bool verifyCertificate, std::string const& thumbprint)
    : _library(nullptr, nullptr), _operations(nullptr), _verifyCertificate(verifyCertificate),
      _server(serverAddress), _thumbprint(thumbprint) {
    // Global, because CAM providers load parts of their own that look for their symbols.
    _library = LoadProvider(providerName, RTLD_LAZY | RTLD_GLOBAL, "Unable to open CAM provider: ");
    _operations = FindRecord<CAMProxyClientOperationsRecord>(_library, "CAMProxyClientOperations");
    if (_operations == nullptr) {
        throw InvalidCAMProxyProviderException(providerName, LoaderError());
    }
}

CAMProxy::~CAMProxy() {
    _library.reset(); // before the texts
}

void CAMProxy::GetDomainInfo(char** netBIOSName, char** dnsName, char** domainSID) const {
    Check(Implemented(_operations->getDomainInformation)(
        _server.c_str(), _verifyCertificate ? 1 : 0, _thumbprint.c_str(), netBIOSName, dnsName,
        domainSID));
}

namespace {

/// What a CAM server told about its domain; the texts are the provider's.
struct DomainInfo {
    explicit DomainInfo(CAMProxy const& proxy) {
        proxy.GetDomainInfo(&netBIOSName, &dnsName, &sid);
    }
    char* netBIOSName = nullptr;
    char* dnsName = nullptr;
    char* sid = nullptr;
};

} // namespace

std::string CAMProxy::GetNetBIOSDomainName() const {
    return DomainInfo(*this).netBIOSName;
}

std::string CAMProxy::GetDNSDomainName() const {
    return DomainInfo(*this).dnsName;
}

std::string CAMProxy::GetDomainSID() const {
    return DomainInfo(*this).sid;
}

ComputerPrincipalInfo CAMProxy::CreateMachineAccount(std::string const& accountName,
                                                     std::string const& organisationalUnit) const {
    char* firstResult = nullptr;
    char* secondResult = nullptr;
    Check(Implemented(_operations->createMachineAccount)(
        _server.c_str(), accountName.c_str(), OptionalText(organisationalUnit),
        _verifyCertificate ? 1 : 0, _thumbprint.c_str(), &firstResult, &secondResult));
    return {std::string(), firstResult, secondResult};
}

std::string CAMProxy::GetDomainController() const {
    return std::string();
}

std::string CAMProxy::GetDefaultComputerContainer() const {
    return std::string();
}

} // namespace tessel::authentication
