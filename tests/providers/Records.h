/* SPDX-License-Identifier: Apache-2.0 */
#ifndef TSLAUTH_TESTS_RECORDS_H
#define TSLAUTH_TESTS_RECORDS_H

/* The two records in as few words as a provider that is broken in one place needs. */

#include <tslauth/tslauth_provider.h>

#define METADATA(version, parameters)                                                              \
    ActiveDirectoryClientMetadataRecord const ActiveDirectoryClientMetadata = {                    \
        (version), "pam_test.so", (parameters), "test", (parameters)}

#define OPERATIONS_WITHOUT_ENTRIES(version)                                                        \
    ActiveDirectoryClientOperationsRecord const ActiveDirectoryClientOperations = {.apiVersion =   \
                                                                                       (version)}

#endif
