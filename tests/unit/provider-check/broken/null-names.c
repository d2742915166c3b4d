/* SPDX-License-Identifier: Apache-2.0 */
/* A trusted domain with one name, where there have to be two. */
#include <tslauth/tslauth_provider.h>

#include <stddef.h>

static int GetTrustedDomains(ActiveDirectoryClientDomain*** domains,
                             ActiveDirectoryClientFreeFunction* release) {
    static ActiveDirectoryClientDomain other = {"other.example", NULL};
    static ActiveDirectoryClientDomain* array[] = {&other, NULL};
    *domains = array;
    (void)release; /* nothing is to be released */
    return TSLAUTH_PROVIDER_SUCCESS;
}

ActiveDirectoryClientMetadataRecord const ActiveDirectoryClientMetadata = {2, "pam_broken.so", NULL,
                                                                           "broken", NULL};
ActiveDirectoryClientOperationsRecord const ActiveDirectoryClientOperations = {
    .apiVersion = 2, .getTrustedDomains = GetTrustedDomains};
