/* SPDX-License-Identifier: Apache-2.0 */
/* Names both modules, with parameters for the first alone, and has no entries. */
#include <tslauth/tslauth_provider.h>

#include <stddef.h>

ActiveDirectoryClientMetadataRecord const ActiveDirectoryClientMetadata = {
    2, "pam_plain.so", "first=1 second", "plain", NULL};

ActiveDirectoryClientOperationsRecord const ActiveDirectoryClientOperations = {.apiVersion = 2};
