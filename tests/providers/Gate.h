/* SPDX-License-Identifier: Apache-2.0 */
#ifndef TSLAUTH_TESTS_GATE_H
#define TSLAUTH_TESTS_GATE_H

#include <tslauth/tslauth_provider.h>

#include <pthread.h>

#ifdef __cplusplus
extern "C" {
#endif

/* What gate.c answers, and how long it keeps its callers. The library exports one, `gate`, which a
 * test finds with dlsym. All fields are guarded by `lock`; `change` tells that one has changed. */
typedef struct Gate {
    pthread_mutex_t lock;
    pthread_cond_t change;
    int closed;      /* a call stays inside until this is 0 */
    int domainsOpen; /* but one for the trusted domains only until this is not 0 */
    int code;        /* the answer of every entry that returns a code */
    int value;       /* of the trust state */

    unsigned calls;      /* begun so far */
    unsigned inside;     /* now */
    unsigned mostInside; /* ever at the same time */
} Gate;

extern TSLAUTH_PROVIDER_EXPORT Gate gate;

#ifdef __cplusplus
}
#endif

#endif
