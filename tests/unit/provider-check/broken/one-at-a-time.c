/* SPDX-License-Identifier: Apache-2.0 */
/* Stands no company. */
#define _POSIX_C_SOURCE 200809L
#include "Converting.h"

#include <time.h>

static int Convert(char const* name, char** canonicalName,
                   ActiveDirectoryClientFreeFunction* release) {
    static int inside;
    struct timespec const time = {0, 100000};
    if (__atomic_add_fetch(&inside, 1, __ATOMIC_SEQ_CST) > 4) {
        abort();
    }
    (void)nanosleep(&time, NULL); /* how long does not matter */
    (void)__atomic_sub_fetch(&inside, 1, __ATOMIC_SEQ_CST);
    (void)name;
    return HandOut("checked", canonicalName, release);
}
