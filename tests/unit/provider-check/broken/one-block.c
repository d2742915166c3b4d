/* SPDX-License-Identifier: Apache-2.0 */
/* Has the two names of a domain in one block, which are released one by one. */
#include <tslauth/tslauth_provider.h>

#include <stdlib.h>
#include <string.h>

static int GetActiveDomain(ActiveDirectoryClientDomain* domain,
                           ActiveDirectoryClientFreeFunction* release) {
    static char const names[] = "broken.example\0BROKEN";
    char* const block = malloc(sizeof names);
    if (block == NULL) {
        return TSLAUTH_PROVIDER_NOT_ENOUGH_MEMORY;
    }
    memcpy(block, names, sizeof names);
    domain->dnsName = block;
    domain->netBIOSName = block + strlen(block) + 1;
    *release = free;
    return TSLAUTH_PROVIDER_SUCCESS;
}

ActiveDirectoryClientMetadataRecord const ActiveDirectoryClientMetadata = {2, "pam_broken.so", NULL,
                                                                           "broken", NULL};
ActiveDirectoryClientOperationsRecord const ActiveDirectoryClientOperations = {
    .apiVersion = 2, .getActiveDomain = GetActiveDomain};
