/* SPDX-License-Identifier: Apache-2.0 */
/* An array without a null at its end. */
#include <tslauth/tslauth_provider.h>

#include <stdlib.h>

static int GetTrustedDomains(ActiveDirectoryClientDomain*** domains,
                             ActiveDirectoryClientFreeFunction* release) {
    static ActiveDirectoryClientDomain other = {"other.example", "OTHER"};
    ActiveDirectoryClientDomain** const array = malloc(sizeof *array);
    if (array == NULL) {
        return TSLAUTH_PROVIDER_NOT_ENOUGH_MEMORY;
    }
    array[0] = &other;
    *domains = array;
    *release = free;
    return TSLAUTH_PROVIDER_SUCCESS;
}

ActiveDirectoryClientMetadataRecord const ActiveDirectoryClientMetadata = {2, "pam_broken.so", NULL,
                                                                           "broken", NULL};
ActiveDirectoryClientOperationsRecord const ActiveDirectoryClientOperations = {
    .apiVersion = 2, .getTrustedDomains = GetTrustedDomains};
