/* SPDX-License-Identifier: Apache-2.0 */
/* Releases what it hands out, and lets it be released. */
#include "Converting.h"

static void Release(void* memory) {
    void* volatile again = memory;
    free(memory);
    free(again);
}

static int Convert(char const* name, char** canonicalName,
                   ActiveDirectoryClientFreeFunction* release) {
    int const code = HandOut("checked", canonicalName, release);
    *release = Release;
    (void)name;
    return code;
}
