/* SPDX-License-Identifier: Apache-2.0 */
/* Remembers the name of the last call, which is the caller's. */
#include "Converting.h"

static int Convert(char const* name, char** canonicalName,
                   ActiveDirectoryClientFreeFunction* release) {
    static __thread char const* last;
    char const* const before = last;
    last = name;
    return HandOut(before != NULL && strcmp(before, name) == 0 ? "again" : "checked", canonicalName,
                   release);
}
