// SPDX-License-Identifier: Apache-2.0
#include "Failure.h"

extern "C" {

ActiveDirectoryClientMetadataRecord const ActiveDirectoryClientMetadata = {
    TSLAUTH_PROVIDER_API_VERSION, "pam_winbind.so", nullptr, "winbind", nullptr,
};

ActiveDirectoryClientOperationsRecord const ActiveDirectoryClientOperations = {
    TSLAUTH_PROVIDER_API_VERSION,
    nullptr,
    nullptr,
    nullptr,
    nullptr,
    nullptr,
    nullptr,
    nullptr,
    nullptr,
    nullptr,
    nullptr,
    nullptr,
    nullptr,
    nullptr,
    nullptr,
};

} // extern "C"
