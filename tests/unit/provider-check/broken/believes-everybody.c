/* SPDX-License-Identifier: Apache-2.0 */
/* Joins with any password, and in this process alone. */
#include <tslauth/tslauth_provider.h>

#include <stddef.h>

static int isJoined;

static int JoinDomain(char const* domain, char const* organisationalUnit,
                      ActiveDirectoryClientCredentials const* credentials) {
    (void)domain, (void)organisationalUnit, (void)credentials;
    __atomic_store_n(&isJoined, 1, __ATOMIC_SEQ_CST);
    return TSLAUTH_PROVIDER_SUCCESS;
}

static int PartDomain(ActiveDirectoryClientCredentials const* credentials) {
    (void)credentials;
    __atomic_store_n(&isJoined, 0, __ATOMIC_SEQ_CST);
    return TSLAUTH_PROVIDER_SUCCESS;
}

static int GetActiveDomain(ActiveDirectoryClientDomain* domain,
                           ActiveDirectoryClientFreeFunction* release) {
    if (__atomic_load_n(&isJoined, __ATOMIC_SEQ_CST) != 0) {
        domain->dnsName = "broken.example";
    }
    (void)release; /* nothing is to be released */
    return TSLAUTH_PROVIDER_SUCCESS;
}

ActiveDirectoryClientMetadataRecord const ActiveDirectoryClientMetadata = {2, "pam_broken.so", NULL,
                                                                           "broken", NULL};
ActiveDirectoryClientOperationsRecord const ActiveDirectoryClientOperations = {
    .apiVersion = 2,
    .joinDomain = JoinDomain,
    .partDomain = PartDomain,
    .getActiveDomain = GetActiveDomain,
};
