// SPDX-License-Identifier: Apache-2.0
#ifndef TSLAUTH_DIRECTORYSTORE_H
#define TSLAUTH_DIRECTORYSTORE_H

#include "RemoteAuthenticationStore.h"

namespace tessel {
namespace authentication {

/// A remote store that a directory service stands behind.
class TSLAUTH_EXPORT DirectoryStore : public RemoteAuthenticationStore {
public:
    ~DirectoryStore() override;
};

} // namespace authentication
} // namespace tessel

#endif
