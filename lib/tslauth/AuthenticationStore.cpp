// SPDX-License-Identifier: Apache-2.0
#include <tslauth/AuthenticationStore.h>
#include <tslauth/DirectoryStore.h>
#include <tslauth/StoreConfiguration.h>

namespace tessel::authentication {

StoreConfiguration::~StoreConfiguration() = default;

AuthenticationStore::~AuthenticationStore() = default;

DirectoryStore::~DirectoryStore() = default;

} // namespace tessel::authentication
