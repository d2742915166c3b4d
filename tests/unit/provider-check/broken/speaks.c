/* SPDX-License-Identifier: Apache-2.0 */
/* Answers in the language of the process. */
#define _POSIX_C_SOURCE 200809L
#include "Converting.h"

#include <langinfo.h>

static int Convert(char const* name, char** canonicalName,
                   ActiveDirectoryClientFreeFunction* release) {
    (void)name;
    return HandOut(nl_langinfo(CODESET), canonicalName, release);
}
