// SPDX-License-Identifier: Apache-2.0
#ifndef TSLAUTH_ACTIVEDIRECTORYPROVIDER_H
#define TSLAUTH_ACTIVEDIRECTORYPROVIDER_H

#include "CAM.h"
#include "Credentials.h"
#include "Domain.h"
#include "Export.h"
#include "LibraryHandle.h"

#include <deque>
#include <list>
#include <string>

struct ActiveDirectoryClientMetadataRecord;
struct ActiveDirectoryClientOperationsRecord;

namespace tessel {
namespace authentication {

/// A loaded Active Directory provider: a shared library that implements `tslauth_provider.h`.
///
/// A constructed adapter is usable until it is destroyed, and the library stays loaded as long. It
/// is shared between a store and its worker threads through a shared pointer, and never copied. It
/// decides nothing: which domain, which account and what an answer means are the callers' business.
///
/// Every operation calls one entry of the provider on the calling thread and may block as long as
/// the provider does. The adapter has no lock and no state that changes, so that operations may run
/// at once on several threads; the provider has to stand that.
///
/// What every operation throws:
/// - `CallNotImplementedException` where the provider lacks the entry;
/// - where the entry returns a code, the exception of that code (`Exceptions.h`), and
///   `UnknownException` for a code that has none. Nothing has been taken from the provider then;
/// - `std::bad_alloc`. What the provider handed out has been released then too.
///
/// A text that a provider leaves null comes back empty.
class TSLAUTH_EXPORT ActiveDirectoryProvider {
public:
    /// Loads the library "/usr/libexec/tslauth/lib" + `name` + ".so".
    /// @throws IOError "Unable to open provider: " + the loader's text, if it cannot be loaded;
    ///     also for a pipe or a device, neither of which is waited for
    /// @throws InvalidActiveDirectoryProviderException if it lacks one of the two records, with the
    ///     loader's text, or was written for a newer interface than this library knows; it has been
    ///     unloaded again then
    explicit ActiveDirectoryProvider(std::string const& name);

    ActiveDirectoryProvider(ActiveDirectoryProvider const&) = delete;
    ActiveDirectoryProvider& operator=(ActiveDirectoryProvider const&) = delete;

    /// Unloads the library. No operation may be running.
    ~ActiveDirectoryProvider();

    /// File name of the PAM module through which the provider's users log in, and its parameters.
    std::string const& PAMModule() const noexcept;
    std::list<std::string> const& PAMModuleParameters() const noexcept;

    /// Name of the name service that knows the provider's users, and its parameters.
    std::string const& NSSModule() const noexcept;
    std::list<std::string> const& NSSModuleParameters() const noexcept;

    /// The version that the provider's operations record states; its metadata may state another.
    int GetAPIVersion() const noexcept;

    /// Joins the host to `domain` in the name of the account `credentials`.
    /// @param organisationalUnit where the machine account is made; empty leaves it to the provider
    void JoinDomain(std::string const& domain, std::string const& organisationalUnit,
                    Credentials const& credentials) const;

    /// Joins the host with a machine account that a CAM server has made for it.
    /// @throws CallNotImplementedException also where `GetAPIVersion()` is less than 2
    void JoinDomainWithMachineAccount(CAM::ActiveDirectoryDomainInfo const& domainInfo,
                                      CAM::MachineAccountInfo const& account) const;

    /// Parts the host from its domain, without credentials or with those of `credentials`.
    void PartDomain() const;
    void PartDomain(Credentials const& credentials) const;

    /// The domain that the host is joined to.
    Domain GetActiveDomain() const;

    /// Sets the domain controllers to ask first, in this order.
    /// @param controllers must not change during the call: the provider reads these very strings
    void SetPreferredDomainControllers(std::deque<std::string> const& controllers) const;

    /// The domain controllers to ask first, in order.
    std::deque<std::string> GetPreferredDomainControllers() const;

    /// The name of a domain controller of `domain`.
    /// @param first narrows the choice in a way that is the provider's own; empty leaves it open
    std::string GetAnyDomainController(std::string const& first, std::string const& domain) const;

    /// The state of the host's trust in its domain, as the provider numbers it.
    int GetDomainTrustState() const;

    /// The domains that the host's domain trusts, in the provider's order.
    std::deque<Domain> GetTrustedDomains() const;

    /// The distinguished name of the host's machine account.
    std::string GetMachineAccountDN() const;

    /// The form of `name` under which the host knows that user.
    std::string ConvertCanonicalUsername(std::string const& name) const;

    /// The host's principal in `domain`.
    /// @throws CallNotImplementedException also where `GetAPIVersion()` is less than 2
    std::string GetHostPrincipalForDomain(std::string const& domain) const;

    /// The relationship between the host's domain and `domain`, as the provider numbers it.
    int GetDomainTrustRelationship(std::string const& domain) const;

    /// Why the last operation that failed on this thread did so, in the provider's own words, which
    /// say more than a code can; empty where the provider does not tell. To be asked for before
    /// anything else is asked of the provider on this thread. Does not block.
    std::string GetLastFailure() const;

    /// What a join would meet, one line each, "what: finding"; see `tslauth_provider.h`. Nothing is
    /// changed. Empty where the provider does not tell. Blocks as a join does.
    /// @param organisationalUnit empty: where the domain puts new computers
    /// @param credentials null: nobody's, and what takes an account is not told
    /// @throws what the provider's code stands for
    std::string PreviewJoin(std::string const& domain, std::string const& organisationalUnit,
                            Credentials const* credentials) const;

private:
    void CacheMetadata();

    LibraryHandle _library;
    ActiveDirectoryClientMetadataRecord const* _metadata;
    ActiveDirectoryClientOperationsRecord const* _operations;
    std::string _pamModule;
    std::list<std::string> _pamModuleParameters;
    std::string _nssModule;
    std::list<std::string> _nssModuleParameters;
};

} // namespace authentication
} // namespace tessel

#endif
