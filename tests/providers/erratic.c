/* SPDX-License-Identifier: Apache-2.0 */
/* Answers at once, late or very late, or fails, and counts who is inside. */
#define _POSIX_C_SOURCE 200809L /* nanosleep */
#include "Erratic.h"

#include <stddef.h>
#include <stdint.h>
#include <time.h>

Erratic erratic = {PTHREAD_MUTEX_INITIALIZER, {0}, 0, {0}, {0}, NULL, 0};

/* A number for each call that looks random and is the same in each run (SplitMix64). */
static uint64_t Scatter(uint64_t number) {
    number += UINT64_C(0x9e3779b97f4a7c15);
    number = (number ^ (number >> 30)) * UINT64_C(0xbf58476d1ce4e5b9);
    number = (number ^ (number >> 27)) * UINT64_C(0x94d049bb133111eb);
    return number ^ (number >> 31);
}

static void Sleep(long microseconds) {
    struct timespec const time = {0, microseconds * 1000};
    (void)nanosleep(&time, NULL); /* how long does not matter */
}

/* Returns the code. */
static int Act(ErraticQuestion question) {
    void (*callBack)(ErraticQuestion) = NULL;
    uint64_t scattered;
    int code = TSLAUTH_PROVIDER_SUCCESS;

    (void)pthread_mutex_lock(&erratic.lock);
    ++erratic.calls[question];
    ++erratic.inside[question];
    if (erratic.inside[question] > erratic.mostInside[question]) {
        erratic.mostInside[question] = erratic.inside[question];
    }
    scattered = Scatter(((uint64_t)(erratic.calls[question]) << 8) + (unsigned)question);
    if ((scattered & 7) == 0 && erratic.callBack != NULL) {
        callBack = erratic.callBack;
        ++erratic.callBacks;
    }
    (void)pthread_mutex_unlock(&erratic.lock);

    if (callBack != NULL) {
        callBack(question);
    }
    scattered >>= 8;
    switch (scattered % 64) {
    case 0: /* hangs for a while */
        Sleep(4000);
        break;
    case 1:
    case 2:
    case 3:
    case 4:
        Sleep((long)((scattered >> 8) % 200));
        break;
    case 5:
        code = TSLAUTH_PROVIDER_FILE_NOT_FOUND;
        break;
    case 6:
    case 7:
        code = TSLAUTH_PROVIDER_NO_SUCH_DOMAIN;
        break;
    default:
        break;
    }

    (void)pthread_mutex_lock(&erratic.lock);
    --erratic.inside[question];
    if (code != TSLAUTH_PROVIDER_SUCCESS) {
        ++erratic.failures;
    }
    (void)pthread_mutex_unlock(&erratic.lock);
    return code;
}

/* Everything below is constant: there is nothing to give back. */
static void Keep(void* memory) {
    (void)memory;
}

static int GetActiveDomain(ActiveDirectoryClientDomain* domain,
                           ActiveDirectoryClientFreeFunction* release) {
    domain->dnsName = "a-domain-name-that-needs-memory.corp.example";
    domain->netBIOSName = "CORP";
    *release = Keep;
    return Act(ErraticStoreConfiguration);
}

static int GetPreferredDomainControllers(char*** controllers,
                                         ActiveDirectoryClientFreeFunction* release) {
    static char first[] = "the-first-domain-controller.corp.example";
    static char second[] = "the-second-domain-controller.corp.example";
    static char* names[] = {first, second, NULL};
    *controllers = names;
    *release = Keep;
    return Act(ErraticStoreConfiguration);
}

static int GetMachineAccountDN(char** name, ActiveDirectoryClientFreeFunction* release) {
    static char constant[] = "CN=NODE,OU=Hosts,DC=corp,DC=example";
    *name = constant;
    *release = Keep;
    return Act(ErraticStoreConfiguration);
}

static int GetDomainTrustState(void) {
    (void)Act(ErraticTrustState); /* the entry has no code */
    return 42;
}

static int GetTrustedDomains(ActiveDirectoryClientDomain*** domains,
                             ActiveDirectoryClientFreeFunction* release) {
    static ActiveDirectoryClientDomain other = {"another-domain-that-needs-memory.example",
                                                "OTHER"};
    static ActiveDirectoryClientDomain* list[] = {&other, &other, NULL};
    *domains = list;
    *release = Keep;
    return Act(ErraticTrustedDomains);
}

ActiveDirectoryClientMetadataRecord const ActiveDirectoryClientMetadata = {2, "pam_erratic.so",
                                                                           NULL, "erratic", NULL};

ActiveDirectoryClientOperationsRecord const ActiveDirectoryClientOperations = {
    .apiVersion = 2,
    .getActiveDomain = GetActiveDomain,
    .getPreferredDomainControllers = GetPreferredDomainControllers,
    .getDomainTrustState = GetDomainTrustState,
    .getTrustedDomains = GetTrustedDomains,
    .getMachineAccountDN = GetMachineAccountDN,
};
