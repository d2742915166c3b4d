// SPDX-License-Identifier: Apache-2.0
#include <tslauth/AuthenticationStoreFactory.h>

#include <tslauth/ActiveDirectoryStore.h>
#include <tslauth/NoRemoteAuthenticationStore.h>

TSLAUTH_AUTO_PTR_BEGIN

namespace tessel::authentication {

namespace {

/// Seconds that a store of the factory waits for its provider.
constexpr int StoreTimeout = 60;

} // namespace

template <> std::auto_ptr<AuthenticationStore> Constructor<ActiveDirectoryStore>() {
    return std::auto_ptr<AuthenticationStore>(new ActiveDirectoryStore(StoreTimeout));
}

template <> AuthenticationStoreFactory* Singleton<AuthenticationStoreFactory>::_instance = nullptr;

AuthenticationStoreFactory::AuthenticationStoreFactory() {
    RegisterType("Active Directory", &Constructor<ActiveDirectoryStore>);
    RegisterType("None", &Constructor<NoRemoteAuthenticationStore>);
}

AuthenticationStoreFactory::~AuthenticationStoreFactory() = default;

void AuthenticationStoreFactory::RegisterType(std::string const& name,
                                              std::auto_ptr<AuthenticationStore> (*create)()) {
    _constructors.emplace(name, create);
}

std::auto_ptr<AuthenticationStore>
AuthenticationStoreFactory::CreateInstance(std::string const& name) {
    auto const found = _constructors.find(name);
    if (found == _constructors.end()) {
        return std::auto_ptr<AuthenticationStore>();
    }
    return found->second();
}

std::vector<std::string> AuthenticationStoreFactory::GetRegisteredStores() const {
    std::vector<std::string> names;
    names.reserve(_constructors.size());
    for (auto const& constructor : _constructors) {
        names.push_back(constructor.first);
    }
    return names;
}

} // namespace tessel::authentication

TSLAUTH_AUTO_PTR_END
