/* SPDX-License-Identifier: Apache-2.0 */
/* Loses its way when it is closed. */
#include "Converting.h"

__attribute__((destructor)) static void End(void) {
    abort();
}

static int Convert(char const* name, char** canonicalName,
                   ActiveDirectoryClientFreeFunction* release) {
    (void)name;
    return HandOut("checked", canonicalName, release);
}
