/* SPDX-License-Identifier: Apache-2.0 */
/* Hands out what nobody looks at. */
#include "Converting.h"

static int Convert(char const* name, char** canonicalName,
                   ActiveDirectoryClientFreeFunction* release) {
    static char text[] = "checked";
    *canonicalName = text;
    (void)name, (void)release;
    return TSLAUTH_PROVIDER_NO_SUCH_USER;
}
