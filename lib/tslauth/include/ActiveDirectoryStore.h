// SPDX-License-Identifier: Apache-2.0
#ifndef TSLAUTH_ACTIVEDIRECTORYSTORE_H
#define TSLAUTH_ACTIVEDIRECTORYSTORE_H

#include "ActiveDirectoryProvider.h"
#include "ActiveDirectoryStoreConfiguration.h"
#include "DirectoryStore.h"
#include "Domain.h"
#include "RequestState.h"
#include "TrustState.h"
#include "systemconfiguration/PAMEntry.h"

#include <boost/shared_ptr.hpp>

#include <cstdint>
#include <deque>
#include <pthread.h>
#include <string>

namespace tessel {
namespace authentication {

/// "Active Directory": users of a domain may log in. The directory work is done by the provider
/// that `provider.conf` names; this class puts the provider's modules into the host's log-in
/// configuration, and asks the provider's questions.
///
/// The questions may be asked from any thread, on any number of stores. Three of them can hang when
/// no domain controller answers: those run on a worker thread, at most one a question in the whole
/// process, and are answered from the last answer when the provider is slower than the store's
/// timeout. A store may be destroyed while its workers run. Activating is for one thread at a time.
class TSLAUTH_EXPORT ActiveDirectoryStore : public DirectoryStore {
public:
    /// Loads the provider that `provider.conf` names.
    /// @param timeout seconds that a timed question waits for the provider; taken as it is
    /// @throws InvalidActiveDirectoryProviderException for the name "(unset)" where `provider.conf`
    ///     names no provider, for "(none installed)" where the file cannot be opened
    /// @throws ConfigurationError where a line of the file is malformed
    /// @throws what `ActiveDirectoryProvider` throws where the library cannot be used
    explicit ActiveDirectoryStore(int timeout);

    TSLAUTH_AUTO_PTR_BEGIN
    /// An `ActiveDirectoryStoreConfiguration`. Blocks for the store's timeout at most.
    /// @throws ThreadErrorException where no worker can be started or waited for
    std::auto_ptr<StoreConfiguration> GetStoreConfiguration() const override;
    TSLAUTH_AUTO_PTR_END

    /// "Active Directory"
    std::string GetDisplayName() const override;

    /// Makes this store the host's: puts the provider's module into "auth" and "account" of
    /// "/etc/pam.d/system-auth-generic", directly after pam_access.so or else first; puts its
    /// service first for "passwd", "group" and "shadow" in "/etc/nsswitch.conf"; records the name
    /// in `authentication.conf`. What stands there already is not added twice.
    ///
    /// Each file is replaced whole or left as it was, in this order, and an earlier one stays
    /// replaced when a later one fails. Both system files are written in the form of their models:
    /// comments and blank lines do not survive. Blocks for the disk; asks the provider nothing.
    ///
    /// @throws IOError where a file cannot be read or replaced; `authentication.conf` is read
    /// first,
    ///     so that a host without it stays untouched
    /// @throws ConfigurationError, InvalidKeyException where `authentication.conf` is malformed
    /// @throws FilePermissionError where a file was replaced but its permissions may be wrong
    /// @throws SystemConfiguration::InvalidFacilityException,
    ///     SystemConfiguration::InvalidControlException,
    ///     SystemConfiguration::InvalidDatabaseException, std::out_of_range where a system file
    ///     holds what its model cannot carry; that file stays as it was
    void MakeActive() override;

    ~ActiveDirectoryStore() override;

    /// Takes the provider's entries out of the PAM policy and the name-service switch: the first
    /// equal one of each list, no more. `authentication.conf` is left to the store that follows.
    /// @throws as `MakeActive` does for the two system files
    void MakeInactive() override;

    /// The domains that the joined domain trusts; empty where the provider cannot tell. Blocks for
    /// the store's timeout at most.
    /// @throws the provider's failure, where it came in time
    /// @throws ThreadErrorException where no worker can be started or waited for. After a worker
    ///     could not be started, this question is answered from the last answer for good.
    std::deque<Domain> GetTrustedDomains() const;

    /// How the host stands with its domain; see `TrustState`. Asks for the trusted domains first.
    /// Blocks for twice the store's timeout at most.
    /// @throws the provider's failure, where it came in time
    /// @throws ThreadErrorException where no worker can be started or waited for
    int GetDomainTrustState() const;

    /// How the host's domain stands with `domain`, in the provider's numbers; 0 where the provider
    /// does not answer the question. Blocks as long as the provider does.
    int GetDomainTrustRelationship(std::string const& domain) const;

    /// The principal that the host is known by in `domain`; empty where the provider does not
    /// answer the question. Blocks as long as the provider does; throws its failure.
    std::string GetHostPrincipalForDomain(std::string const& domain) const;

    /// A domain controller of `domain`; empty where the provider does not answer the question.
    /// Blocks as long as the provider does; throws its failure.
    std::string GetDomainControllerForDomain(std::string const& domain) const;

    /// The form in which the host knows the user `name`; `name` itself where the provider does not
    /// convert. Blocks as long as the provider does; throws its failure.
    std::string ConvertCanonicalUsername(std::string const& name) const;

    /// Makes the provider prefer `controllers`, in this order. Where the provider cannot, a warning
    /// goes to the system log and the call returns. Blocks as long as the provider does; throws its
    /// failure.
    void SetPreferredDomainControllers(std::deque<std::string> const& controllers);

private:
    typedef boost::shared_ptr<ActiveDirectoryProvider> ProviderPointer;
    typedef boost::shared_ptr<RequestState> StatePointer;

    SystemConfiguration::PAMEntry GetPAMEntryForProvider() const;

    // The workers. Each stores its answer in the store's own cache object, so that an answer that
    // came too late for its caller serves the next one.
    static void
    GetStoreConfigurationInt(ProviderPointer provider, StatePointer state,
                             boost::shared_ptr<ActiveDirectoryStoreConfiguration> cache);
    static void GetTrustedDomainsInt(ProviderPointer provider, StatePointer state,
                                     boost::shared_ptr<std::deque<Domain>> cache);
    static void GetDomainTrustStateInt(ProviderPointer provider, StatePointer state,
                                       boost::shared_ptr<TrustState> cache);

    std::int32_t _timeout;
    ProviderPointer _provider;
    boost::shared_ptr<ActiveDirectoryStoreConfiguration> _storeConfiguration;
    boost::shared_ptr<TrustState> _trustState;
    boost::shared_ptr<std::deque<Domain>> _trustedDomains;

    /// Guards the three flags and every store's caches. Never held across a provider call or a
    /// wait.
    static pthread_mutex_t _lock;
    static bool _isGetStoreConfigThreadActive;
    static bool _isGetTrustedDomainsThreadActive;
    static bool _isGetTrustStateThreadActive;
};

} // namespace authentication
} // namespace tessel

#endif
