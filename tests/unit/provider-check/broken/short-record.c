/* SPDX-License-Identifier: Apache-2.0 */
/* Was written by somebody who left out what did not seem to matter. */
#define OTHER_METADATA
#define ActiveDirectoryClientMetadata ActiveDirectoryClientMetadataOfTheHeader
#include "Converting.h"
#undef ActiveDirectoryClientMetadata

extern TSLAUTH_PROVIDER_EXPORT struct Short {
    int32_t apiVersion;
    char const* pamModule;
} const ActiveDirectoryClientMetadata;
struct Short const ActiveDirectoryClientMetadata = {2, "pam_broken.so"};

static int Convert(char const* name, char** canonicalName,
                   ActiveDirectoryClientFreeFunction* release) {
    (void)name;
    return HandOut("checked", canonicalName, release);
}
