/* SPDX-License-Identifier: Apache-2.0 */
#ifndef TSLAUTH_TESTS_ERRATIC_H
#define TSLAUTH_TESTS_ERRATIC_H

#include <tslauth/tslauth_provider.h>

#include <pthread.h>

#ifdef __cplusplus
extern "C" {
#endif

/* The questions that erratic.c answers. */
typedef enum ErraticQuestion {
    ErraticStoreConfiguration,
    ErraticTrustedDomains,
    ErraticTrustState,
    ErraticQuestions
} ErraticQuestion;

/* Counts of erratic.c, whose calls answer at once, late or very late, or fail, in an order that is
 * the same each time. The library exports one, `erratic`, which a test finds with dlsym. All fields
 * are guarded by `lock`. */
typedef struct Erratic {
    pthread_mutex_t lock;
    unsigned calls[ErraticQuestions];
    unsigned failures;
    unsigned inside[ErraticQuestions];     /* now */
    unsigned mostInside[ErraticQuestions]; /* ever at the same time */

    /* Called from inside every eighth call or so, on its thread; may be null. */
    void (*callBack)(ErraticQuestion question);
    unsigned callBacks;
} Erratic;

extern TSLAUTH_PROVIDER_EXPORT Erratic erratic;

#ifdef __cplusplus
}
#endif

#endif
