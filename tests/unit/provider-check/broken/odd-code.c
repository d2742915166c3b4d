/* SPDX-License-Identifier: Apache-2.0 */
/* Fails with a number that nobody knows. */
#include "Converting.h"

static int Convert(char const* name, char** canonicalName,
                   ActiveDirectoryClientFreeFunction* release) {
    return strlen(name) > 1000 ? 4242 : HandOut("checked", canonicalName, release);
}
