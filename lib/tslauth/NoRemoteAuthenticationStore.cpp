// SPDX-License-Identifier: Apache-2.0
#include <tslauth/NoRemoteAuthenticationStore.h>

#include "Paths.h"

#include <tslauth/AuthenticationConfiguration.h>
#include <tslauth/AuthenticationStoreFactory.h>
#include <tslauth/Exceptions.h>

#include <stdexcept>

TSLAUTH_AUTO_PTR_BEGIN

namespace tessel::authentication {

namespace {

constexpr char DisplayName[] = "None";

/// A store by name, from the process's factory; a program that made none gets one for the call.
std::auto_ptr<AuthenticationStore> CreateStore(std::string const& name) {
    if (AuthenticationStoreFactory* const factory = AuthenticationStoreFactory::Instance()) {
        return factory->CreateInstance(name);
    }
    AuthenticationStoreFactory factory;
    return factory.CreateInstance(name);
}

} // namespace

NoRemoteAuthenticationStoreConfiguration::~NoRemoteAuthenticationStoreConfiguration() = default;

std::auto_ptr<StoreConfiguration> NoRemoteAuthenticationStore::GetStoreConfiguration() const {
    return std::auto_ptr<StoreConfiguration>(new NoRemoteAuthenticationStoreConfiguration);
}

std::string NoRemoteAuthenticationStore::GetDisplayName() const {
    return DisplayName;
}

void NoRemoteAuthenticationStore::MakeActive() {
    AuthenticationConfiguration configuration;
    std::string& recorded = configuration[Paths::RemoteAuthenticationStoreKey];
    if (recorded == GetDisplayName()) {
        return;
    }
    std::string const previous = recorded;
    // Not what a class derived from this one calls itself: the host is local from here on.
    recorded = DisplayName;
    // Before the withdrawal, not after it: a store that cannot be withdrawn would otherwise keep
    // the host from ever becoming local again.
    configuration.Write();

    std::auto_ptr<AuthenticationStore> const store = CreateStore(previous);
    if (!store.get()) {
        throw UnknownRemoteAuthenticationStoreException("The specified store '" + previous +
                                                        "' is unknown");
    }
    auto* const remote = dynamic_cast<RemoteAuthenticationStore*>(store.get());
    if (!remote) {
        throw InvalidRemoteAuthenticationStoreException("The specified store '" + previous +
                                                        "' is invalid");
    }
    remote->MakeInactive();
}

NoRemoteAuthenticationStore::~NoRemoteAuthenticationStore() = default;

void NoRemoteAuthenticationStore::MakeInactive() {
    throw std::runtime_error("Attempted to disable None Store");
}

} // namespace tessel::authentication

TSLAUTH_AUTO_PTR_END
