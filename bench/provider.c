/* SPDX-License-Identifier: Apache-2.0 */
/* A provider that answers at once: the cost of a call is then the library's own. */
#define _POSIX_C_SOURCE 200809L /* nanosleep */
#include <tslauth/tslauth_provider.h>

#include <stddef.h>
#include <time.h>

/* The trusted domains are not answered while this is not 0. A case sets it, atomically. */
extern TSLAUTH_PROVIDER_EXPORT int benchHangs;
int benchHangs = 0;

static int Succeed(ActiveDirectoryClientCredentials const* credentials) {
    (void)credentials;
    return TSLAUTH_PROVIDER_SUCCESS;
}

static int Fail(char const* domain, char const* organisationalUnit,
                ActiveDirectoryClientCredentials const* credentials) {
    (void)domain;
    (void)organisationalUnit;
    (void)credentials;
    return TSLAUTH_PROVIDER_LOGON_FAILURE;
}

/* Everything handed out is constant. */
static int GetTrustedDomains(ActiveDirectoryClientDomain*** domains,
                             ActiveDirectoryClientFreeFunction* release) {
    static ActiveDirectoryClientDomain all[] = {{"a-trusted-domain.corp.example.com", "ONE"},
                                                {"a-trusted-domain.corp.example.com", "TWO"},
                                                {"a-trusted-domain.corp.example.com", "THREE"},
                                                {"a-trusted-domain.corp.example.com", "FOUR"}};
    static ActiveDirectoryClientDomain* list[] = {&all[0], &all[1], &all[2], &all[3], NULL};
    while (__atomic_load_n(&benchHangs, __ATOMIC_ACQUIRE)) {
        struct timespec const millisecond = {0, 1000000};
        (void)nanosleep(&millisecond, NULL); /* or less */
    }
    *domains = list;
    *release = NULL;
    return TSLAUTH_PROVIDER_SUCCESS;
}

ActiveDirectoryClientMetadataRecord const ActiveDirectoryClientMetadata = {
    TSLAUTH_PROVIDER_API_VERSION, "pam_bench.so", "use_first_pass debug", "bench", NULL};

ActiveDirectoryClientOperationsRecord const ActiveDirectoryClientOperations = {
    .apiVersion = TSLAUTH_PROVIDER_API_VERSION,
    .joinDomain = Fail,
    .partDomain = Succeed,
    .getTrustedDomains = GetTrustedDomains};
