/* SPDX-License-Identifier: Apache-2.0 */
/* Takes a signal for a failure of its directory. */
#define _POSIX_C_SOURCE 200809L
#include "Converting.h"

#include <time.h>

static int Convert(char const* name, char** canonicalName,
                   ActiveDirectoryClientFreeFunction* release) {
    struct timespec const time = {0, 5000000};
    (void)name;
    return nanosleep(&time, NULL) != 0 ? TSLAUTH_PROVIDER_NO_NETWORK
                                       : HandOut("checked", canonicalName, release);
}
