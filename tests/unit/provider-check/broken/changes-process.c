/* SPDX-License-Identifier: Apache-2.0 */
/* Makes files in its own way, for everybody. */
#define _POSIX_C_SOURCE 200809L
#include "Converting.h"

#include <sys/stat.h>

static int Convert(char const* name, char** canonicalName,
                   ActiveDirectoryClientFreeFunction* release) {
    (void)umask(0123);
    (void)name;
    return HandOut("checked", canonicalName, release);
}
