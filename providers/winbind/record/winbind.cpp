// SPDX-License-Identifier: Apache-2.0
#include "Failure.h"
#include "join/ControllerPreference.h"
#include "join/DomainJoin.h"
#include "join/DomainPart.h"
#include "questions/LastAnswer.h"
#include "questions/Questions.h"
#include "record/Boundary.h"
#include "samba/ThisHost.h"
#include "tslauth_winbind_provider.h"

#include <memory>
#include <string>
#include <vector>

using namespace tessel::winbind;

namespace {

std::string TextOrEmpty(char const* text) {
    return text == nullptr ? std::string() : std::string(text);
}

/// As long as any thread. Made when the library is loaded, since a fork may meet the first call.
LastAnswer<std::string>& lastMachineAccountDN =
    *std::make_unique<LastAnswer<std::string>>().release();

void RequireBoth(ActiveDirectoryClientCredentials const& credentials) {
    if (credentials.userName == nullptr || credentials.password == nullptr) {
        throw Failure(TSLAUTH_PROVIDER_INVALID_PARAMETER, "no user name or no password");
    }
}

} // namespace

// The record's entries. What they promise stands in tslauth_provider.h, what their numbers mean in
// tslauth_winbind_provider.h.
extern "C" {

static int JoinDomainEntry(char const* domain, char const* organisationalUnit,
                           ActiveDirectoryClientCredentials const* credentials) {
    return CodeOf("join domain", [&] {
        RequireBoth(*credentials);
        DomainJoin::WithCredentials(ThisHost(), domain, TextOrEmpty(organisationalUnit),
                                    *credentials);
    });
}

static int PartDomainEntry(ActiveDirectoryClientCredentials const* credentials) {
    return CodeOf("part domain", [&] {
        if (credentials != nullptr) {
            RequireBoth(*credentials);
        }
        PartFromDomain(ThisHost(), credentials);
    });
}

static int GetActiveDomainEntry(ActiveDirectoryClientDomain* domain,
                                ActiveDirectoryClientFreeFunction* release) {
    return CodeOf("get active domain",
                  [&] { HandOut(GetActiveDomain(ThisHost()), domain, release); });
}

static int SetPreferredDomainControllersEntry(char const** controllers) {
    return CodeOf("set preferred domain controllers", [&] {
        std::vector<std::string> names;
        for (char const* const* name = controllers; *name != nullptr; ++name) {
            names.emplace_back(*name);
        }
        SetPreferredDomainControllers(ThisHost(), names);
    });
}

static int GetPreferredDomainControllersEntry(char*** controllers,
                                              ActiveDirectoryClientFreeFunction* release) {
    return CodeOf("get preferred domain controllers", [&] {
        HandOut(GetPreferredDomainControllers(ThisHost()), controllers, release);
    });
}

static int GetDomainTrustStateEntry() {
    return ValueOf("get domain trust state", TSLAUTH_WINBIND_TRUST_UNKNOWN,
                   [] { return GetDomainTrustState(ThisHost()); });
}

static int GetTrustedDomainsEntry(ActiveDirectoryClientDomain*** domains,
                                  ActiveDirectoryClientFreeFunction* release) {
    return CodeOf("get trusted domains",
                  [&] { HandOut(GetTrustedDomains(ThisHost()), domains, release); });
}

static int GetMachineAccountDNEntry(char** name, ActiveDirectoryClientFreeFunction* release) {
    return CodeOf("get machine account DN", [&] {
        HandOut(lastMachineAccountDN.Get(GetActiveDomain(ThisHost()),
                                         [] { return GetMachineAccountDN(ThisHost()); }),
                name, release);
    });
}

static int GetAnyDomainControllerEntry(char const* first, char const* domain, char** controller,
                                       ActiveDirectoryClientFreeFunction* release) {
    return CodeOf("get any domain controller", [&] {
        HandOut(GetAnyDomainController(ThisHost(), TextOrEmpty(first), domain), controller,
                release);
    });
}

static int ConvertCanonicalUsernameEntry(char const* name, char** canonicalName,
                                         ActiveDirectoryClientFreeFunction* release) {
    return CodeOf("convert canonical user name", [&] {
        HandOut(ConvertCanonicalUsername(ThisHost(), name), canonicalName, release);
    });
}

static int
JoinDomainWithMachineAccountEntry(ActiveDirectoryClientDomainInformation const* domainInformation,
                                  ActiveDirectoryClientMachineAccount const* account) {
    return CodeOf("join domain with machine account", [&] {
        DomainJoin::WithMachineAccount(ThisHost(), *domainInformation, *account);
    });
}

static int GetHostPrincipalForDomainEntry(char const* domain, char** principal,
                                          ActiveDirectoryClientFreeFunction* release) {
    return CodeOf("get host principal for domain", [&] {
        HandOut(GetHostPrincipalForDomain(ThisHost(), domain), principal, release);
    });
}

static int GetDomainTrustRelationshipEntry(char const* domain) {
    return ValueOf("get domain trust relationship", 0,
                   [&] { return GetDomainTrustRelationship(ThisHost(), domain); });
}

ActiveDirectoryClientMetadataRecord const ActiveDirectoryClientMetadata = {
    TSLAUTH_PROVIDER_API_VERSION,
    "pam_tslauth_winbind.so",
    // README.md says why each of them.
    "try_first_pass cached_login",
    "tslauth_winbind",
    nullptr,
};

ActiveDirectoryClientOperationsRecord const ActiveDirectoryClientOperations = {
    TSLAUTH_PROVIDER_API_VERSION,
    &JoinDomainEntry,
    &PartDomainEntry,
    &GetActiveDomainEntry,
    &SetPreferredDomainControllersEntry,
    &GetPreferredDomainControllersEntry,
    nullptr,
    &GetDomainTrustStateEntry,
    &GetTrustedDomainsEntry,
    &GetMachineAccountDNEntry,
    &GetAnyDomainControllerEntry,
    &ConvertCanonicalUsernameEntry,
    &JoinDomainWithMachineAccountEntry,
    &GetHostPrincipalForDomainEntry,
    &GetDomainTrustRelationshipEntry,
};

int ActiveDirectoryClientPreviewJoin(char const* domain, char const* organisationalUnit,
                                     ActiveDirectoryClientCredentials const* credentials,
                                     char** text, ActiveDirectoryClientFreeFunction* release) {
    return CodeOf("preview join", [&] {
        if (credentials != nullptr) {
            RequireBoth(*credentials);
        }
        HandOut(
            DomainJoin::Preview(ThisHost(), domain, TextOrEmpty(organisationalUnit), credentials),
            text, release);
    });
}

char const* ActiveDirectoryClientLastFailure() {
    return LastFailure();
}

} // extern "C"
