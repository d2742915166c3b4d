/* SPDX-License-Identifier: Apache-2.0 */
/* Answers at once and always the same, and counts without a lock, so that a child of a process that
 * forked can call it whatever the other threads were doing. */
#include <tslauth/tslauth_provider.h>

#include <stddef.h>

/* Read it where no other thread runs. */
extern TSLAUTH_PROVIDER_EXPORT unsigned constantCalls;
unsigned constantCalls = 0;

static void Keep(void* memory) {
    (void)memory;
}

static int GetTrustedDomains(ActiveDirectoryClientDomain*** domains,
                             ActiveDirectoryClientFreeFunction* release) {
    static ActiveDirectoryClientDomain other = {"other.example", "OTHER"};
    static ActiveDirectoryClientDomain* list[] = {&other, NULL};
    (void)__atomic_add_fetch(&constantCalls, 1, __ATOMIC_RELAXED);
    *domains = list;
    *release = Keep;
    return TSLAUTH_PROVIDER_SUCCESS;
}

static int GetDomainTrustState(void) {
    (void)__atomic_add_fetch(&constantCalls, 1, __ATOMIC_RELAXED);
    return 42;
}

ActiveDirectoryClientMetadataRecord const ActiveDirectoryClientMetadata = {2, "pam_constant.so",
                                                                           NULL, "constant", NULL};

ActiveDirectoryClientOperationsRecord const ActiveDirectoryClientOperations = {
    .apiVersion = 2,
    .getDomainTrustState = GetDomainTrustState,
    .getTrustedDomains = GetTrustedDomains,
};
