/* SPDX-License-Identifier: Apache-2.0 */
/* Hands out the same buffer each time, with something else in it. */
#include "Converting.h"

#include <stdio.h>

static int Convert(char const* name, char** canonicalName,
                   ActiveDirectoryClientFreeFunction* release) {
    static __thread char text[32];
    static __thread unsigned calls;
    (void)snprintf(text, sizeof text, "checked %u", ++calls); /* it always fits */
    *canonicalName = text;
    (void)name, (void)release;
    return TSLAUTH_PROVIDER_SUCCESS;
}
