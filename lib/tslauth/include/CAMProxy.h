// SPDX-License-Identifier: Apache-2.0
#ifndef TSLAUTH_CAMPROXY_H
#define TSLAUTH_CAMPROXY_H

#include "ComputerPrincipalInfo.h"
#include "Export.h"
#include "LibraryHandle.h"

#include <string>

struct CAMProxyClientOperationsRecord;

namespace tessel {
namespace authentication {

/// A CAM server, reached through a loaded CAM provider: a shared library that implements
/// `tslauth_cam_provider.h`. It makes the host's machine account, and tells about its domain.
///
/// One is made for one join or one question, bound to one server and what is known of its
/// certificate, and never copied. It decides nothing: whether the server may be trusted is the
/// provider's business, what to do with the answers the caller's.
///
/// Each operation that asks the server calls one entry of the provider on the calling thread and
/// may block as long as the provider does. The proxy has no lock and no state that changes; a call
/// that failed leaves it usable.
///
/// What every such operation throws:
/// - `CallNotImplementedException` where the provider lacks the entry;
/// - for the codes 8, 1225, 1229, 10060 and 0x80090325 `NotEnoughMemoryException`,
///   `ConnectionRefusedException`, `ConnectionInvalidException`, `WSATimedOutException` and
///   `InvalidCAMCertificateException`, each carrying the code; for every other `UnknownException`
///   with it. An Active Directory provider's codes mean more; these are all that count here.
class TSLAUTH_EXPORT CAMProxy {
public:
    /// Loads the library "/usr/libexec/tslauth/lib" + `providerName` + ".so". The server is not
    /// asked yet.
    /// @param serverAddress handed to the provider as it is
    /// @param verifyCertificate whether the provider is to verify the server's certificate
    /// @param thumbprint of the certificate that the server is expected to present; empty if it is
    ///     not known
    /// @throws IOError "Unable to open CAM provider: " + the loader's text, if it cannot be loaded;
    ///     also for a pipe or a device, neither of which is waited for
    /// @throws InvalidCAMProxyProviderException with the loader's text, if it lacks its record; it
    ///     has been unloaded again then
    CAMProxy(std::string const& providerName, std::string const& serverAddress,
             bool verifyCertificate, std::string const& thumbprint);

    CAMProxy(CAMProxy const&) = delete;
    CAMProxy& operator=(CAMProxy const&) = delete;

    /// Unloads the library. No operation may be running.
    ~CAMProxy();

    /// Asks the server about its domain. The three texts are the provider's and must not be freed;
    /// they are valid until the next call of the proxy on this thread, or its end. None of the
    /// arguments may be null.
    void GetDomainInfo(char** netBIOSName, char** dnsName, char** domainSID) const;

    /// One of the three texts. Each call asks the server afresh.
    std::string GetNetBIOSDomainName() const;
    std::string GetDNSDomainName() const;
    std::string GetDomainSID() const;

    /// Has the server make a machine account. Nothing takes it back.
    /// @param accountName the host's name without its domain
    /// @param organisationalUnit where the account is made; empty leaves it to the server
    ComputerPrincipalInfo CreateMachineAccount(std::string const& accountName,
                                               std::string const& organisationalUnit) const;

    /// Always empty: no CAM server is asked for either, and an empty container leaves the choice to
    /// it.
    std::string GetDomainController() const;
    std::string GetDefaultComputerContainer() const;

private:
    LibraryHandle _library;
    CAMProxyClientOperationsRecord const* _operations;
    bool _verifyCertificate;
    std::string _server;
    std::string _thumbprint;
};

} // namespace authentication
} // namespace tessel

#endif
