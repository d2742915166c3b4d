// SPDX-License-Identifier: Apache-2.0
#include <tslauth/NoRemoteAuthenticationStore.h>

#include <tslauth/Paths.h>

#include <tslauth/AuthenticationConfiguration.h>

#include <stdexcept>

TSLAUTH_AUTO_PTR_BEGIN

namespace tessel::authentication {

namespace {

constexpr char DisplayName[] = "None";

} // namespace

NoRemoteAuthenticationStoreConfiguration::~NoRemoteAuthenticationStoreConfiguration() = default;

std::auto_ptr<StoreConfiguration> NoRemoteAuthenticationStore::GetStoreConfiguration() const {
    return std::auto_ptr<StoreConfiguration>(new NoRemoteAuthenticationStoreConfiguration);
}

std::string NoRemoteAuthenticationStore::GetDisplayName() const {
    return DisplayName;
}

ActivationPlan NoRemoteAuthenticationStore::PlanFor(AuthenticationConfiguration const& record,
                                                    EditForm form) const {
    std::string const previous = record[Paths::RemoteAuthenticationStoreKey];
    // Recorded first, not last: a store that cannot be withdrawn would otherwise keep the host from
    // ever becoming local again. And not as what a derived class calls itself: it is local.
    return previous == GetDisplayName() ? ActivationPlan()
                                        : ActivationPlan::Replacing(previous, DisplayName, form);
}

ActivationPlan NoRemoteAuthenticationStore::GetActivationPlan(EditForm form) const {
    return PlanFor(AuthenticationConfiguration(), form);
}

void NoRemoteAuthenticationStore::MakeActive() {
    AuthenticationConfiguration record;
    PlanFor(record, EditForm::Normalised).Execute(record);
}

NoRemoteAuthenticationStore::~NoRemoteAuthenticationStore() = default;

void NoRemoteAuthenticationStore::MakeInactive() {
    throw std::runtime_error("Attempted to disable None Store");
}

} // namespace tessel::authentication

TSLAUTH_AUTO_PTR_END
