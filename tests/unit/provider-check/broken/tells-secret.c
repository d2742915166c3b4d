/* SPDX-License-Identifier: Apache-2.0 */
/* Says why a join failed, and too much. */
#include <tslauth/tslauth_provider.h>

#include <stddef.h>
#include <stdio.h>

static __thread char lastFailure[256];

static int JoinDomain(char const* domain, char const* organisationalUnit,
                      ActiveDirectoryClientCredentials const* credentials) {
    (void)snprintf(lastFailure, sizeof lastFailure, "no user with the password %s",
                   credentials->password == NULL ? "(none)" : credentials->password);
    (void)domain, (void)organisationalUnit;
    return TSLAUTH_PROVIDER_LOGON_FAILURE;
}

char const* ActiveDirectoryClientLastFailure(void) {
    return lastFailure;
}

ActiveDirectoryClientMetadataRecord const ActiveDirectoryClientMetadata = {2, "pam_broken.so", NULL,
                                                                           "broken", NULL};
ActiveDirectoryClientOperationsRecord const ActiveDirectoryClientOperations = {
    .apiVersion = 2, .joinDomain = JoinDomain};
