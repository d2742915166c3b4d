/* SPDX-License-Identifier: Apache-2.0 */
/* Says why a join failed, and too much, in the system log. */
#include <tslauth/tslauth_provider.h>

#include <stddef.h>
#include <syslog.h>

static int JoinDomain(char const* domain, char const* organisationalUnit,
                      ActiveDirectoryClientCredentials const* credentials) {
    syslog(LOG_WARNING, "no user with the password %s",
           credentials->password == NULL ? "(none)" : credentials->password);
    (void)domain, (void)organisationalUnit;
    return TSLAUTH_PROVIDER_LOGON_FAILURE;
}

ActiveDirectoryClientMetadataRecord const ActiveDirectoryClientMetadata = {2, "pam_broken.so", NULL,
                                                                           "broken", NULL};
ActiveDirectoryClientOperationsRecord const ActiveDirectoryClientOperations = {
    .apiVersion = 2, .joinDomain = JoinDomain};
