// SPDX-License-Identifier: Apache-2.0
#ifndef TSLAUTH_AUTHENTICATIONSTOREFACTORY_H
#define TSLAUTH_AUTHENTICATIONSTOREFACTORY_H

#include "AuthenticationStore.h"
#include "Singleton.h"

#include <map>
#include <memory>
#include <string>
#include <vector>

namespace tessel {
namespace authentication {

class ActiveDirectoryStore;
class AuthenticationStoreFactory;

TSLAUTH_AUTO_PTR_BEGIN
/// What `RegisterType` takes: `&Constructor<Store>` makes a `Store` with its default constructor.
template <typename Store> std::auto_ptr<AuthenticationStore> Constructor() {
    return std::auto_ptr<AuthenticationStore>(new Store);
}

/// A store that waits 60 seconds for its provider's answers.
template <> TSLAUTH_EXPORT std::auto_ptr<AuthenticationStore> Constructor<ActiveDirectoryStore>();
TSLAUTH_AUTO_PTR_END

/// The pointer's one home is the library, so that a program and its plug-ins see the same factory.
template <>
TSLAUTH_EXPORT AuthenticationStoreFactory* Singleton<AuthenticationStoreFactory>::_instance;

/// Makes a store from its display name. One per process, made before the first store and destroyed
/// by whoever made it; stores live on without it. `Instance()` finds it.
///
/// Registering and creating take no lock: register before threads start.
class TSLAUTH_EXPORT AuthenticationStoreFactory : public Singleton<AuthenticationStoreFactory> {
public:
    TSLAUTH_AUTO_PTR_BEGIN
    /// Makes a new store.
    typedef std::auto_ptr<AuthenticationStore> (*StoreConstructor)();

    /// Registers "Active Directory", whose stores wait 60 seconds for an answer, and "None".
    /// A second factory while one lives ends the process through an assertion.
    AuthenticationStoreFactory();
    ~AuthenticationStoreFactory();

    /// Adds a store. A name that is registered already keeps its first constructor.
    void RegisterType(std::string const& name, std::auto_ptr<AuthenticationStore> (*create)());

    /// A new store of exactly this name, owned by the caller; an empty pointer where none is
    /// registered.
    /// @throws what the store's constructor throws, for instance where its provider is missing
    std::auto_ptr<AuthenticationStore> CreateInstance(std::string const& name);
    TSLAUTH_AUTO_PTR_END

    /// The registered names in ascending byte order.
    std::vector<std::string> GetRegisteredStores() const;

private:
    std::map<std::string, StoreConstructor> _constructors;
};

} // namespace authentication
} // namespace tessel

#endif
