/* SPDX-License-Identifier: Apache-2.0 */
#ifndef TSLAUTH_TESTS_SCRIPTED_H
#define TSLAUTH_TESTS_SCRIPTED_H

#include <tslauth/tslauth_provider.h>

#include <pthread.h>

#ifdef __cplusplus
extern "C" {
#endif

/* The entries of scripted.cpp. */
typedef enum ScriptedEntry {
    ScriptedActiveDomain,
    ScriptedPreferredDomainControllers,
    ScriptedMachineAccountDN,
    ScriptedTrustState,
    ScriptedTrustedDomains,
    ScriptedTrustRelationship,
    ScriptedHostPrincipal,
    ScriptedAnyDomainController,
    ScriptedCanonicalUsername,
    ScriptedSetPreferredDomainControllers,
    ScriptedEntries
} ScriptedEntry;

/* What an entry does. No provider may throw; this one does. */
typedef enum ScriptedAct {
    ScriptedAnswers,
    ScriptedFails, /* with `code`; the two entries that have none answer */
    ScriptedThrowsStandard,
    ScriptedThrowsBadAlloc,
    ScriptedThrowsNumber
} ScriptedAct;

/* The library exports one, `scripted`, which a test finds with dlsym; loading it afresh empties it.
 * All fields are guarded by `lock`. */
typedef struct Scripted {
    pthread_mutex_t lock;
    ScriptedAct acts[ScriptedEntries];
    int code;
    int value; /* of the two entries that return one */

    unsigned count;          /* of the calls so far */
    ScriptedEntry calls[64]; /* the first of them, in order */
    pthread_t thread;        /* that made the last one */
    char arguments[256];     /* of the last one that has any: "first, second", "(null)" for none */
} Scripted;

extern TSLAUTH_PROVIDER_EXPORT Scripted scripted;

#ifdef __cplusplus
}
#endif

#endif
