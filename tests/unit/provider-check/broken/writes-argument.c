/* SPDX-License-Identifier: Apache-2.0 */
/* Cuts a name where it stands, which is the caller's. */
#include "Converting.h"

static int Convert(char const* name, char** canonicalName,
                   ActiveDirectoryClientFreeFunction* release) {
    char* const at = strchr(name, '@');
    if (at != NULL) {
        *at = '\0';
    }
    return HandOut("checked", canonicalName, release);
}
