/* SPDX-License-Identifier: Apache-2.0 */
/* Names a path where a file name is wanted, and no name service. */
#define OTHER_METADATA
#include "Converting.h"

ActiveDirectoryClientMetadataRecord const ActiveDirectoryClientMetadata = {
    2, "/lib/security/pam_broken.so", NULL, "", NULL};

static int Convert(char const* name, char** canonicalName,
                   ActiveDirectoryClientFreeFunction* release) {
    (void)name;
    return HandOut("checked", canonicalName, release);
}
