/* SPDX-License-Identifier: Apache-2.0 */
/* Says what it does. */
#include "Converting.h"

#include <stdio.h>

static int Convert(char const* name, char** canonicalName,
                   ActiveDirectoryClientFreeFunction* release) {
    (void)printf("converting a name\n");
    (void)name;
    return HandOut("checked", canonicalName, release);
}
