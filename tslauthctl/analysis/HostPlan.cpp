// SPDX-License-Identifier: Apache-2.0
#include "analysis/HostPlan.h"

#include "analysis/Failures.h"
#include "analysis/KnownStores.h"
#include "analysis/ProviderOnHost.h"

#include <tslauth/ActiveDirectoryStore.h>
#include <tslauth/AuthenticationConfiguration.h>
#include <tslauth/Exceptions.h>
#include <tslauth/NoRemoteAuthenticationStore.h>

namespace tessel::tslauthctl {

namespace {

using namespace authentication;

ActivationPlan PlanFor(HostPlan& plan) {
    if (plan.store == NoStore) {
        return NoRemoteAuthenticationStore().GetActivationPlan(EditForm::Lossless);
    }
    ActiveDirectoryStore const store(0);
    plan.warnings = MissingModules(store.GetProviderEntries());
    return store.GetActivationPlan(EditForm::Lossless);
}

} // namespace

HostPlan MakeHostPlan(std::string const& store) {
    HostPlan plan;
    plan.store = store;
    try {
        plan.steps = PlanFor(plan);
        plan.recorded = RecordedStore();
        plan.preview = plan.steps.Preview();
        if (plan.preview.refusal) {
            std::rethrow_exception(plan.preview.refusal);
        }
    } catch (UnknownRemoteAuthenticationStoreException const& e) {
        plan.refusal = Refused(e);
        plan.refusedAfterwards = true;
    } catch (std::exception const& e) {
        plan.refusal = Refused(e);
    }
    return plan;
}

} // namespace tessel::tslauthctl
