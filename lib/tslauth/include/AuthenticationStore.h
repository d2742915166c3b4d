// SPDX-License-Identifier: Apache-2.0
#ifndef TSLAUTH_AUTHENTICATIONSTORE_H
#define TSLAUTH_AUTHENTICATIONSTORE_H

#include "Export.h"
#include "StoreConfiguration.h"

#include <memory>
#include <string>

namespace tessel {
namespace authentication {

/// What the host authenticates users against beyond its local accounts. Exactly one store is active
/// on a host at a time; which one is recorded in `authentication.conf`, not in the object, so that
/// a store can be made, used and destroyed at any time.
///
/// Stores come from `AuthenticationStoreFactory`. One object is used by one thread at a time; what
/// a store says beyond that stands at its class.
class TSLAUTH_EXPORT AuthenticationStore {
public:
    AuthenticationStore() = default;
    AuthenticationStore(AuthenticationStore const&) = delete;
    AuthenticationStore& operator=(AuthenticationStore const&) = delete;

    TSLAUTH_AUTO_PTR_BEGIN
    /// A snapshot of the store's configuration, never null; the caller owns it.
    /// May block as long as the store says.
    virtual std::auto_ptr<StoreConfiguration> GetStoreConfiguration() const = 0;
    TSLAUTH_AUTO_PTR_END

    /// The name under which the factory knows the store and which `authentication.conf` records.
    virtual std::string GetDisplayName() const = 0;

    /// Whether this store is the host's. Throws what the store says.
    virtual bool IsActive() const = 0;

    /// Makes this store the host's. Callers make sure that no two activations run at once, in this
    /// process or another.
    virtual void MakeActive() = 0;

    virtual ~AuthenticationStore();
};

} // namespace authentication
} // namespace tessel

#endif
