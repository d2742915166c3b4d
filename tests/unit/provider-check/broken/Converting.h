/* SPDX-License-Identifier: Apache-2.0 */
#ifndef TSLAUTH_TESTS_CONVERTING_H
#define TSLAUTH_TESTS_CONVERTING_H

/* A provider with one entry, `Convert`, which the source that includes this defines, and with
 * nothing wrong but what is wrong with that one. */

#include <tslauth/tslauth_provider.h>

#include <stdlib.h>
#include <string.h>

static int Convert(char const* name, char** canonicalName,
                   ActiveDirectoryClientFreeFunction* release);

/* Hands out a copy, as it is right. */
static inline int HandOut(char const* text, char** slot,
                          ActiveDirectoryClientFreeFunction* release) {
    size_t const size = strlen(text) + 1;
    char* const copy = malloc(size);
    if (copy == NULL) {
        return TSLAUTH_PROVIDER_NOT_ENOUGH_MEMORY;
    }
    memcpy(copy, text, size);
    *slot = copy;
    *release = free;
    return TSLAUTH_PROVIDER_SUCCESS;
}

#ifndef OTHER_METADATA
ActiveDirectoryClientMetadataRecord const ActiveDirectoryClientMetadata = {2, "pam_broken.so", NULL,
                                                                           "broken", NULL};
#endif

ActiveDirectoryClientOperationsRecord const ActiveDirectoryClientOperations = {
    .apiVersion = 2, .convertCanonicalUsername = Convert};

#endif
