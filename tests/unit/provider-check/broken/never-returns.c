/* SPDX-License-Identifier: Apache-2.0 */
/* Waits for what does not come. */
#define _POSIX_C_SOURCE 200809L
#include "Converting.h"

#include <unistd.h>

static int Convert(char const* name, char** canonicalName,
                   ActiveDirectoryClientFreeFunction* release) {
    while (name[0] != '\0') {
        (void)pause();
    }
    return HandOut("checked", canonicalName, release);
}
