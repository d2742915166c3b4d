/* SPDX-License-Identifier: Apache-2.0 */
/* Both modules' names are longer than a string holds without memory of its own. */
#include <tslauth/tslauth_provider.h>

#include <stddef.h>

ActiveDirectoryClientMetadataRecord const ActiveDirectoryClientMetadata = {
    2, "pam_of_a_provider_with_a_long_name.so", NULL, "service_of_a_provider_with_a_long_name",
    NULL};

ActiveDirectoryClientOperationsRecord const ActiveDirectoryClientOperations = {.apiVersion = 2};
