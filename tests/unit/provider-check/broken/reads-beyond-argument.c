/* SPDX-License-Identifier: Apache-2.0 */
/* Looks at the end of a name, and misses that of an empty one. */
#include "Converting.h"

static int Convert(char const* name, char** canonicalName,
                   ActiveDirectoryClientFreeFunction* release) {
    char const volatile* character = name;
    do {
        ++character;
    } while (*character != '\0');
    return HandOut("checked", canonicalName, release);
}
