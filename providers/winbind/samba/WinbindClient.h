// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "samba/BoundedCall.h"

#include <tslauth/Domain.h>
#include <tslauth/tslauth_provider.h>

#include <cstdint>
#include <grp.h>
#include <pwd.h>
#include <string>
#include <vector>

extern "C" { // it does not say so itself, and has no include that C++ would mind here
#include <wbclient.h>
}

namespace tessel::winbind {

/// The code that names best what libwbclient reports.
ActiveDirectoryClientErrorCode CodeOfWinbind(wbcErr error);

/// The code that names best what a controller, or winbindd for it, has answered.
ActiveDirectoryClientErrorCode CodeOfNTStatus(std::uint32_t status);

/// The questions that winbindd answers, through libwbclient. Each is asked on a connection of its
/// own, which is closed with the answer: no state is kept, and any thread may ask. All questions of
/// one object share its deadline.
///
/// Every question throws `Failure`: `TSLAUTH_PROVIDER_SERVICE_NOT_ACTIVE` where winbindd does not
/// run, `TSLAUTH_PROVIDER_TIMED_OUT` at the deadline, otherwise what winbindd has answered.
class WinbindClient {
public:
    struct Host {
        std::string netBIOSName;
        authentication::Domain domain;
    };

    struct Domain {
        authentication::Domain names; // the DNS name is empty for a domain that has none
        std::uint32_t trustType;      // WBC_DOMINFO_TRUSTTYPE_...
    };

    struct Account {
        std::string identifier; // S-1-5-21-...
        std::string domain;     // the NetBIOS name of the domain that it is of
    };

    explicit WinbindClient(BoundedCall::Clock::time_point deadline);

    /// Returns where winbindd runs and answers. Asks no controller.
    void Ping() const;

    /// The host as winbindd knows it. Asks no controller.
    Host GetHost() const;

    /// Returns where a controller of the host's domain has accepted the host's secret.
    void CheckTrustCredentials() const;

    /// Every domain that winbindd knows, the host's own and the built-in ones among them. Asks no
    /// controller.
    std::vector<Domain> ListDomains() const;

    /// The DNS name of a controller of `domain`.
    /// @param site the site that it is to be in; empty: any
    std::string FindDomainController(std::string const& domain, std::string const& site) const;

    /// The DNS name of the forest that `domain`, a DNS name, is in.
    std::string GetForest(std::string const& domain) const;

    /// The user `name` of `domain` as the name service of this host prints it.
    /// @throws Failure `TSLAUTH_PROVIDER_NO_SUCH_USER` also for what is no user
    std::string GetUserName(std::string const& domain, std::string const& name) const;

    /// The user whom the name service of this host knows by `name`, in whatever form.
    /// @throws Failure `TSLAUTH_PROVIDER_NO_SUCH_USER`
    Account GetAccount(std::string const& name) const;

private:
    BoundedCall::Clock::time_point _deadline;
};

} // namespace tessel::winbind
