// SPDX-License-Identifier: Apache-2.0
#ifndef TSLAUTH_ACTIVEDIRECTORYSTORECONFIGURATION_H
#define TSLAUTH_ACTIVEDIRECTORYSTORECONFIGURATION_H

#include "Domain.h"
#include "StoreConfiguration.h"

#include <deque>
#include <string>

namespace tessel {
namespace authentication {

/// What the provider knows of the host's membership. A field is empty where the provider could not
/// tell it, or was too slow and had never told it before.
class TSLAUTH_EXPORT ActiveDirectoryStoreConfiguration : public StoreConfiguration {
public:
    ActiveDirectoryStoreConfiguration() = default;
    ActiveDirectoryStoreConfiguration(ActiveDirectoryStoreConfiguration const&) = default;
    ActiveDirectoryStoreConfiguration&
    operator=(ActiveDirectoryStoreConfiguration const&) = default;
    ~ActiveDirectoryStoreConfiguration() override;

    Domain activeDomain;
    std::deque<std::string> preferredDomainControllers;
    std::string machineAccountDN;
};

} // namespace authentication
} // namespace tessel

#endif
