/* SPDX-License-Identifier: Apache-2.0 */
/* Starts a process in its first call, and forgets it. */
#define _POSIX_C_SOURCE 200809L
#include "Converting.h"

#include <unistd.h>

static int Convert(char const* name, char** canonicalName,
                   ActiveDirectoryClientFreeFunction* release) {
    static int calls;
    if (__atomic_fetch_add(&calls, 1, __ATOMIC_SEQ_CST) == 0 && fork() == 0) {
        for (;;) {
            (void)pause();
        }
    }
    (void)name;
    return HandOut("checked", canonicalName, release);
}
