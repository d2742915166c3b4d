/* SPDX-License-Identifier: Apache-2.0 */
/* Ends the process at an empty name. */
#include "Converting.h"

static int Convert(char const* name, char** canonicalName,
                   ActiveDirectoryClientFreeFunction* release) {
    if (*name == '\0') {
        abort();
    }
    return HandOut("checked", canonicalName, release);
}
