/* SPDX-License-Identifier: Apache-2.0 */
/* Forgets a piece of memory in each call. */
#include "Converting.h"

static void* volatile lastOfTheLost;

static int Convert(char const* name, char** canonicalName,
                   ActiveDirectoryClientFreeFunction* release) {
    lastOfTheLost = malloc(strlen(name) + 100);
    return HandOut("checked", canonicalName, release);
}
