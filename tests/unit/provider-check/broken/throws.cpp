// SPDX-License-Identifier: Apache-2.0
// Lets an exception out of an entry.
#include <tslauth/tslauth_provider.h>

#include <string>

namespace {

extern "C" int Convert(char const* name, char** /*canonicalName*/,
                       ActiveDirectoryClientFreeFunction* /*release*/) {
    return std::string(name).at(3) == 'o' ? TSLAUTH_PROVIDER_NO_SUCH_USER
                                          : TSLAUTH_PROVIDER_NO_SUCH_DOMAIN;
}

ActiveDirectoryClientOperationsRecord Operations() {
    ActiveDirectoryClientOperationsRecord operations = {};
    operations.apiVersion = 2;
    operations.convertCanonicalUsername = &Convert;
    return operations;
}

} // namespace

ActiveDirectoryClientMetadataRecord const ActiveDirectoryClientMetadata = {
    2, "pam_broken.so", nullptr, "broken", nullptr};
ActiveDirectoryClientOperationsRecord const ActiveDirectoryClientOperations = Operations();
