// SPDX-License-Identifier: Apache-2.0
#ifndef TSLAUTH_STORECONFIGURATION_H
#define TSLAUTH_STORECONFIGURATION_H

#include "Export.h"

namespace tessel {
namespace authentication {

/// A snapshot of a store's configuration. Each store has a class of its own below this one; cast to
/// it to read the fields. Owned by whoever asked for it, and independent of the store.
class TSLAUTH_EXPORT StoreConfiguration {
public:
    StoreConfiguration() = default;
    StoreConfiguration(StoreConfiguration const&) = default;
    StoreConfiguration& operator=(StoreConfiguration const&) = default;
    virtual ~StoreConfiguration();
};

} // namespace authentication
} // namespace tessel

#endif
