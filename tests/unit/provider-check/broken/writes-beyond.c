/* SPDX-License-Identifier: Apache-2.0 */
/* Forgets the zero at the end of a text. */
#include "Converting.h"

static int Convert(char const* name, char** canonicalName,
                   ActiveDirectoryClientFreeFunction* release) {
    size_t const length = strlen(name);
    char* volatile copy = malloc(length == 0 ? 1 : length);
    if (copy == NULL) {
        return TSLAUTH_PROVIDER_NOT_ENOUGH_MEMORY;
    }
    memcpy(copy, name, length + 1);
    *canonicalName = copy;
    *release = free;
    return TSLAUTH_PROVIDER_SUCCESS;
}
