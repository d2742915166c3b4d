/* SPDX-License-Identifier: Apache-2.0 */
/* The body of the recording providers: each source that includes it is one of them, and may state
 * other versions and another free function first. Has every entry, the unused one included. */
#include "Recording.h"

#include <stdio.h>

#ifndef METADATA_VERSION
#define METADATA_VERSION 2
#endif
#ifndef OPERATIONS_VERSION
#define OPERATIONS_VERSION 2
#endif

Recording recording;

#ifndef FREE_FUNCTION
#define FREE_FUNCTION Release
/* Counts what is given back; nothing is freed, since nothing was allocated. */
static void Release(void* memory) {
    if (recording.releases < RECORDING_ARGUMENTS) {
        recording.released[recording.releases] = memory;
    }
    ++recording.releases;
}
#endif

static void Called(unsigned entry) {
    ++recording.calls[entry];
    recording.argumentCount = 0;
    recording.firstArgument = NULL;
}

static void Argument(char const* text) {
    unsigned const i = recording.argumentCount++;
    if (i == 0) {
        recording.firstArgument = text;
    }
    if (i < RECORDING_ARGUMENTS) {
        recording.isNull[i] = text == NULL;
        (void)snprintf(recording.arguments[i], RECORDING_TEXT, "%s", text == NULL ? "" : text);
    }
}

static void CredentialsArgument(ActiveDirectoryClientCredentials const* credentials) {
    recording.credentials = credentials;
    if (credentials != NULL) {
        Argument(credentials->userName);
        Argument(credentials->password);
    }
}

static int Text(char** text, ActiveDirectoryClientFreeFunction* release) {
    recording.slotsWereNull = *text == NULL && *release == NULL;
    *text = recording.text;
    *release = FREE_FUNCTION;
    return recording.code;
}

static int JoinDomain(char const* domain, char const* organisationalUnit,
                      ActiveDirectoryClientCredentials const* credentials) {
    Called(2);
    Argument(domain);
    Argument(organisationalUnit);
    CredentialsArgument(credentials);
    return recording.code;
}

static int PartDomain(ActiveDirectoryClientCredentials const* credentials) {
    Called(3);
    CredentialsArgument(credentials);
    return recording.code;
}

static int GetActiveDomain(ActiveDirectoryClientDomain* domain,
                           ActiveDirectoryClientFreeFunction* release) {
    Called(4);
    recording.slotsWereNull =
        domain->dnsName == NULL && domain->netBIOSName == NULL && *release == NULL;
    *domain = recording.domain;
    *release = FREE_FUNCTION;
    return recording.code;
}

static int SetPreferredDomainControllers(char const** controllers) {
    Called(5);
    for (; *controllers != NULL; ++controllers) {
        Argument(*controllers);
    }
    return recording.code;
}

static int GetPreferredDomainControllers(char*** controllers,
                                         ActiveDirectoryClientFreeFunction* release) {
    Called(6);
    recording.slotsWereNull = *controllers == NULL && *release == NULL;
    *controllers = recording.names;
    *release = FREE_FUNCTION;
    return recording.code;
}

static void Unused(void) {
    Called(7);
}

static int GetDomainTrustState(void) {
    Called(8);
    return recording.value;
}

static int GetTrustedDomains(ActiveDirectoryClientDomain*** domains,
                             ActiveDirectoryClientFreeFunction* release) {
    Called(9);
    recording.slotsWereNull = *domains == NULL && *release == NULL;
    *domains = recording.domains;
    *release = FREE_FUNCTION;
    return recording.code;
}

static int GetMachineAccountDN(char** name, ActiveDirectoryClientFreeFunction* release) {
    Called(10);
    return Text(name, release);
}

static int GetAnyDomainController(char const* first, char const* domain, char** controller,
                                  ActiveDirectoryClientFreeFunction* release) {
    Called(11);
    Argument(first);
    Argument(domain);
    return Text(controller, release);
}

static int ConvertCanonicalUsername(char const* name, char** canonicalName,
                                    ActiveDirectoryClientFreeFunction* release) {
    Called(12);
    Argument(name);
    return Text(canonicalName, release);
}

static int JoinDomainWithMachineAccount(ActiveDirectoryClientDomainInformation const* domain,
                                        ActiveDirectoryClientMachineAccount const* account) {
    /* By position, not by name: the order is what the interface promises. */
    char const* const* const domainTexts = (char const* const*)domain;
    char const* const* const accountTexts = (char const* const*)account;
    Called(13);
    for (int i = 0; i < 4; ++i) {
        Argument(domainTexts[i]);
    }
    for (int i = 0; i < 5; ++i) {
        Argument(accountTexts[i]);
    }
    return recording.code;
}

static int GetHostPrincipalForDomain(char const* domain, char** principal,
                                     ActiveDirectoryClientFreeFunction* release) {
    Called(14);
    Argument(domain);
    return Text(principal, release);
}

static int GetDomainTrustRelationship(char const* domain) {
    Called(15);
    Argument(domain);
    return recording.value;
}

ActiveDirectoryClientMetadataRecord const ActiveDirectoryClientMetadata = {
    METADATA_VERSION, "pam_recording.so", "first=1 second", "recording", "third"};

/* By position as well, so that an entry that moves is an entry that fails. */
ActiveDirectoryClientOperationsRecord const ActiveDirectoryClientOperations = {
    OPERATIONS_VERSION,
    JoinDomain,
    PartDomain,
    GetActiveDomain,
    SetPreferredDomainControllers,
    GetPreferredDomainControllers,
    Unused,
    GetDomainTrustState,
    GetTrustedDomains,
    GetMachineAccountDN,
    GetAnyDomainController,
    ConvertCanonicalUsername,
    JoinDomainWithMachineAccount,
    GetHostPrincipalForDomain,
    GetDomainTrustRelationship,
};
