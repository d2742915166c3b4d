// SPDX-License-Identifier: Apache-2.0
#ifndef TSLAUTH_ACTIVEDIRECTORYSTORE_H
#define TSLAUTH_ACTIVEDIRECTORYSTORE_H

#include "ActivationPlan.h"
#include "ActiveDirectoryProvider.h"
#include "ActiveDirectoryStoreConfiguration.h"
#include "Credentials.h"
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
///
/// A process may fork while workers run: the child has none of them, keeps the last answers, and
/// its stores ask anew, as far as the provider itself can be used in such a child.
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

    /// What the provider brings into the system files.
    ProviderEntries GetProviderEntries() const;

    /// What `MakeActive` and `MakeInactive` do, to be looked at before it is done. With a form
    /// other than theirs, it is to be executed by the caller.
    ActivationPlan GetActivationPlan(EditForm form = EditForm::Normalised) const;
    ActivationPlan GetWithdrawalPlan(EditForm form = EditForm::Normalised) const;

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
    ///     first, so that a host without it stays untouched
    /// @throws ConfigurationError where a line of `authentication.conf` is malformed; the host is
    ///     untouched then, too
    /// @throws InvalidKeyException where `authentication.conf` lacks its key. That shows last, and
    ///     both system files have been replaced by then
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

    /// The three questions above for whoever wants the truth now: the answer is the provider's own,
    /// never a remembered one, and a failure is never an empty answer. Each runs on a worker of its
    /// own, at most one a question in the process besides those above; whoever finds one running
    /// waits for it within the timeout.
    /// @param timeout seconds to wait at most
    /// @throws the provider's failure, `CallNotImplementedException` among it. Of the
    ///     configuration, the first failure of its three fields; a field that the provider does not
    ///     offer is empty
    /// @throws ProviderCallTimedOutException where there is no answer in time. The worker goes on
    ///     until the provider answers
    /// @throws ThreadErrorException where no worker can be started or waited for
    ActiveDirectoryStoreConfiguration AskStoreConfiguration(int timeout) const;
    std::deque<Domain> AskTrustedDomains(int timeout) const;
    int AskDomainTrustState(int timeout) const;

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

    /// Joins the host to a domain in the name of an account that may add computers. Joining does
    /// not activate the store.
    ///
    /// Unless told to skip it, the host's name is checked and repaired first, so that domain
    /// controllers will accept the host: its resolved name must begin with its short name, and
    /// becomes, with the short name as its alias, the hosts-file entry of the management address.
    /// Where the resolved name is not "SHORTNAME.DOMAIN", a warning goes to the system log, and the
    /// domain becomes a DNS search domain if it resolves. Nothing of this is undone when a later
    /// step fails.
    ///
    /// Blocks as long as the resolver and the provider do. One join at a time: it edits system
    /// files.
    ///
    /// @param domain the domain's DNS name; after a "/", the organisational unit for the machine
    ///     account
    /// @param credentials with a user name, which may be empty, and a password, which may not; the
    ///     texts are handed to the provider without a copy
    /// @throws InvalidCredentialsException where either is missing; nothing has been done then
    /// @throws InvalidHostNameException where the host's name is too long (more than 63 bytes),
    ///     does not resolve, resolves to another short name, or is one of "localhost", "linux" and
    ///     "hostname"
    /// @throws HostCtl::Lib::HostCtlException (<strandctl/HostCtlException.h>) where the hosts
    ///     file, the DNS configuration or the management interface cannot be read or changed
    /// @throws the provider's failure
    void JoinDomain(std::string const& domain, Credentials const& credentials,
                    bool skipHostnameCheck);

    /// Parts the host from its domain, without credentials or with those of an account that may
    /// remove it. Parting does not deactivate the store. Blocks as long as the provider does;
    /// throws its failure.
    void PartDomain();
    void PartDomain(Credentials const& credentials);

    /// Pins the certificate that the CAM server at `serverAddress` must present from now on: its
    /// thumbprint replaces the one in "/etc/tessel/tslauth/camservers.conf".
    /// @param certificateFile whose first PEM certificate counts
    /// @param serverAddress an IPv4 address in dotted decimal; other spellings of it are refused
    /// @throws InvalidIPAddressException before any file is opened
    /// @throws FileNotFoundException (code 2) if the certificate's file cannot be opened
    /// @throws InvalidCertificateException if it holds no certificate in PEM form
    /// @throws InvalidThumbprintStoreException if the store cannot be opened or replaced; it is not
    ///     created where it does not exist
    /// @throws FilePermissionError if it was replaced but may have the wrong permissions; the
    ///     thumbprint stands in it then
    /// @throws ConfigurationError where a line of the store is malformed
    ///
    /// A read error ends the reading of the store quietly, and what was not read is not written
    /// back: `PinCertificateForCAM` loses no other server's thumbprint.
    void ImportCertificateForCAM(std::string const& certificateFile,
                                 std::string const& serverAddress);

    /// `ImportCertificateForCAM` for callers that would rather fail than write back a store that
    /// could not be read whole.
    /// @throws as there, but IOError with its reason where the store cannot be opened, read to its
    ///     end or replaced; it is as it was then
    void PinCertificateForCAM(std::string const& certificateFile, std::string const& serverAddress);

    /// Joins the host without an administrator's credentials: the CAM server at `serverAddress`
    /// makes the machine account and tells about its domain, and the provider joins with both.
    /// Whether the server's certificate is verified is the host's option
    /// "UserVars.ActiveDirectoryVerifyCAMCertificate". Joining does not activate the store.
    ///
    /// Nothing is undone when a step fails: a machine account may be left on the server. Blocks as
    /// long as the resolver, the server and the provider do. One join at a time: it edits system
    /// files.
    ///
    /// @param serverAddress as for `ImportCertificateForCAM`. A server without a pinned thumbprint
    ///     is asked all the same; to accept it or not is the CAM provider's decision
    /// @param organisationalUnit for the machine account; empty leaves it to the server
    /// @param skipHostnameCheck leaves the host's name and name resolution alone; see `JoinDomain`
    /// @throws InvalidIPAddressException before anything else is done
    /// @throws HostCtl::Lib::HostCtlException where the option cannot be read, and as `JoinDomain`
    /// @throws InvalidVerifyCAMCertificateOptionException where its value is neither 0 nor 1
    /// @throws InvalidHostNameException as `JoinDomain`; "unable to get hostname" also where the
    ///     check is skipped
    /// @throws InvalidCAMProxyProviderException for the name "(unset)" where `camprovider.conf`
    ///     names no CAM provider, for "(none installed)" where the file or the provider cannot be
    ///     opened, and where the provider lacks its record
    /// @throws InvalidKeyException where `camprovider.conf` lacks its key
    /// @throws InvalidThumbprintStoreException where the thumbprints cannot be read
    /// @throws ConfigurationError where a line of either file is malformed
    /// @throws what `CAMProxy`'s operations throw, `InvalidCAMCertificateException` among it, and
    ///     the provider's failure
    void JoinDomainWithCAM(std::string const& serverAddress, std::string const& organisationalUnit,
                           bool skipHostnameCheck);

    /// The DNS name of the domain that the CAM server at `serverAddress` serves. Its certificate is
    /// not verified, so believe the answer no more than the network. Blocks as long as the server
    /// does.
    /// @throws InvalidIPAddressException, InvalidCAMProxyProviderException, InvalidKeyException,
    ///     ConfigurationError as `JoinDomainWithCAM`
    /// @throws what `CAMProxy`'s operations throw
    std::string GetDomainForCAMService(std::string const& serverAddress) const;

    /// Why the last of the provider's operations that failed on this thread did so, in the
    /// provider's own words; empty where it does not tell. Not for the questions that run on
    /// workers.
    std::string GetLastFailure() const;

    /// What a join would meet, one line each, "what: finding", such as "clock: 2 seconds behind".
    /// Nothing is changed, neither here nor in the directory. Empty where the provider does not
    /// tell. Blocks as a join does.
    /// @param organisationalUnit empty: where the domain puts new computers
    /// @param credentials null: nobody's, and what takes an account is not told
    /// @throws what `JoinDomain` throws for the provider's failures
    std::string PreviewJoin(std::string const& domain, std::string const& organisationalUnit,
                            Credentials const* credentials) const;

private:
    typedef boost::shared_ptr<ActiveDirectoryProvider> ProviderPointer;
    typedef boost::shared_ptr<RequestState> StatePointer;

    SystemConfiguration::PAMEntry GetPAMEntryForProvider() const;

    /// Checks and repairs the host's name before a join to `domain`; see `JoinDomain`.
    void SanitiseHostnameForDomain(std::string const& domain) const;

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
    friend struct ForkHandlers;
};

} // namespace authentication
} // namespace tessel

#endif
