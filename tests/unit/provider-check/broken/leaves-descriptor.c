/* SPDX-License-Identifier: Apache-2.0 */
/* Opens and does not close. */
#define _POSIX_C_SOURCE 200809L
#include "Converting.h"

#include <fcntl.h>

static int Convert(char const* name, char** canonicalName,
                   ActiveDirectoryClientFreeFunction* release) {
    (void)name;
    return open("/dev/null", O_RDONLY | O_CLOEXEC) < 0 ? TSLAUTH_PROVIDER_INTERNAL_ERROR
                                                       : HandOut("checked", canonicalName, release);
}
