/* SPDX-License-Identifier: Apache-2.0 */
/* Takes the process for its own. */
#include "Converting.h"

static int Convert(char const* name, char** canonicalName,
                   ActiveDirectoryClientFreeFunction* release) {
    if (strlen(name) > 1000) {
        exit(1);
    }
    return HandOut("checked", canonicalName, release);
}
