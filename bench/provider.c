/* SPDX-License-Identifier: Apache-2.0 */
/* A provider that answers at once: the cost of a call is then the library's own. */
#include <tslauth/tslauth_provider.h>

static int Succeed(ActiveDirectoryClientCredentials const* credentials) {
    (void)credentials;
    return TSLAUTH_PROVIDER_SUCCESS;
}

static int Fail(char const* domain, char const* organisationalUnit,
                ActiveDirectoryClientCredentials const* credentials) {
    (void)domain;
    (void)organisationalUnit;
    (void)credentials;
    return TSLAUTH_PROVIDER_LOGON_FAILURE;
}

ActiveDirectoryClientMetadataRecord const ActiveDirectoryClientMetadata = {
    TSLAUTH_PROVIDER_API_VERSION, "pam_bench.so", "use_first_pass debug", "bench", NULL};

ActiveDirectoryClientOperationsRecord const ActiveDirectoryClientOperations = {
    .apiVersion = TSLAUTH_PROVIDER_API_VERSION, .joinDomain = Fail, .partDomain = Succeed};
