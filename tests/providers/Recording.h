/* SPDX-License-Identifier: Apache-2.0 */
#ifndef TSLAUTH_TESTS_RECORDING_H
#define TSLAUTH_TESTS_RECORDING_H

#include <tslauth/tslauth_provider.h>

#ifdef __cplusplus
extern "C" {
#endif

enum { RECORDING_ENTRIES = 16, RECORDING_ARGUMENTS = 10, RECORDING_TEXT = 64 };

/* What a recording provider answers, and what was done to it. The library exports one, `recording`,
 * which a test finds with dlsym; loading it afresh empties it. For one thread at a time. */
typedef struct Recording {
    /* Set by the test. Results are handed out also where `code` says failure. */
    int code;   /* of every entry that returns one */
    int value;  /* of the two entries that return one */
    char* text; /* what every single-text entry hands out */
    ActiveDirectoryClientDomain domain;
    char** names; /* the preferred domain controllers */
    ActiveDirectoryClientDomain** domains;

    /* Recorded. An entry's number is its place in the operations record, the version being 1. */
    unsigned calls[RECORDING_ENTRIES];
    unsigned argumentCount; /* of the last call; texts, in order */
    int isNull[RECORDING_ARGUMENTS];
    char arguments[RECORDING_ARGUMENTS][RECORDING_TEXT];
    char const* firstArgument; /* the text itself, to tell a copy from the caller's own */
    void const* credentials;   /* likewise */
    int slotsWereNull;         /* when the last call that has slots began */
    unsigned releases;
    void* released[RECORDING_ARGUMENTS];
} Recording;

extern TSLAUTH_PROVIDER_EXPORT Recording recording;

#ifdef __cplusplus
}
#endif

#endif
