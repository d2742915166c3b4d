/* SPDX-License-Identifier: Apache-2.0 */
/* Answers when its gate is open, and hangs while it is closed. */
#include "Gate.h"

#include <stddef.h>

Gate gate = {PTHREAD_MUTEX_INITIALIZER, PTHREAD_COND_INITIALIZER, 0, 0, 0, 0, 0, 0, 0};

/* For the calls that only the gate itself lets through. */
static int const never = 0;

/* Passes the gate, also where it is closed and `open` says otherwise, and tells what it says. The
 * calls on a plain mutex cannot fail. */
static int Pass(int const* open, int* value) {
    int code;
    (void)pthread_mutex_lock(&gate.lock);
    ++gate.calls;
    ++gate.inside;
    if (gate.inside > gate.mostInside) {
        gate.mostInside = gate.inside;
    }
    (void)pthread_cond_broadcast(&gate.change);
    while (gate.closed && !*open) {
        (void)pthread_cond_wait(&gate.change, &gate.lock);
    }
    code = gate.code;
    if (value != NULL) {
        *value = gate.value;
    }
    --gate.inside;
    (void)pthread_cond_broadcast(&gate.change);
    (void)pthread_mutex_unlock(&gate.lock);
    return code;
}

/* Everything below is constant: there is nothing to give back. */
static void Keep(void* memory) {
    (void)memory;
}

static int GetActiveDomain(ActiveDirectoryClientDomain* domain,
                           ActiveDirectoryClientFreeFunction* release) {
    domain->dnsName = "corp.example";
    domain->netBIOSName = "CORP";
    *release = Keep;
    return Pass(&never, NULL);
}

static int GetPreferredDomainControllers(char*** controllers,
                                         ActiveDirectoryClientFreeFunction* release) {
    static char first[] = "dc1.corp.example";
    static char second[] = "dc2.corp.example";
    static char* names[] = {first, second, NULL};
    *controllers = names;
    *release = Keep;
    return Pass(&never, NULL);
}

static int GetDomainTrustState(void) {
    int value;
    (void)Pass(&never, &value); /* the entry has no code */
    return value;
}

static int GetTrustedDomains(ActiveDirectoryClientDomain*** domains,
                             ActiveDirectoryClientFreeFunction* release) {
    static ActiveDirectoryClientDomain other = {"other.example", "OTHER"};
    static ActiveDirectoryClientDomain* list[] = {&other, NULL};
    *domains = list;
    *release = Keep;
    return Pass(&gate.domainsOpen, NULL);
}

ActiveDirectoryClientMetadataRecord const ActiveDirectoryClientMetadata = {2, "pam_gate.so", NULL,
                                                                           "gate", NULL};

ActiveDirectoryClientOperationsRecord const ActiveDirectoryClientOperations = {
    .apiVersion = 2,
    .getActiveDomain = GetActiveDomain,
    .getPreferredDomainControllers = GetPreferredDomainControllers,
    .getDomainTrustState = GetDomainTrustState,
    .getTrustedDomains = GetTrustedDomains,
};
