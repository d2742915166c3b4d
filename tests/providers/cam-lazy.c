/* SPDX-License-Identifier: Apache-2.0 */
/* Calls a function that is nowhere, in an entry that nobody calls: it loads only where functions
 * are bound when they are called first. */
#include <tslauth/tslauth_cam_provider.h>

int ThisFunctionIsNowhere(void);

static int GetDomainInformation(char const* server, int verifyCertificate, char const* thumbprint,
                                char** netBIOSDomainName, char** dnsDomainName, char** domainSID) {
    (void)server; /* it does not come that far */
    (void)verifyCertificate;
    (void)thumbprint;
    (void)netBIOSDomainName;
    (void)dnsDomainName;
    (void)domainSID;
    return ThisFunctionIsNowhere();
}

CAMProxyClientOperationsRecord const CAMProxyClientOperations = {.getDomainInformation =
                                                                     GetDomainInformation};
