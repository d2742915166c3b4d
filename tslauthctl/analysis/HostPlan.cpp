// SPDX-License-Identifier: Apache-2.0
#include "analysis/HostPlan.h"

#include "analysis/Failures.h"
#include "analysis/KnownStores.h"
#include "analysis/ProviderCheck.h"
#include "analysis/ProviderOnHost.h"

#include <tslauth/ActiveDirectoryStore.h>
#include <tslauth/AuthenticationConfiguration.h>
#include <tslauth/Exceptions.h>
#include <tslauth/NoRemoteAuthenticationStore.h>

namespace tessel::tslauthctl {

namespace {

using namespace authentication;

/// Takes out what earlier activations left, whatever has become of their providers.
ActivationPlan WithdrawalOf(EntriesList const& entries) {
    ActivationPlan plan;
    for (auto const& each : entries) {
        auto const withdrawal = ActivationPlan::Withdrawing(each, EditForm::Lossless);
        if (withdrawal.Preview().Changes()) {
            plan.Append(withdrawal);
        }
    }
    return plan;
}

/// The way back from a provider that is gone, ends whoever loads it, or is not to be loaded:
/// nothing but what is recorded is known of its entries.
ActivationPlan PlanForNoneWithoutProvider(HostPlan& plan) {
    ActivationPlan steps;
    if (RecordedStore() == NoStore) {
        plan.refusal.reset();
    } else {
        steps = ActivationPlan::Recording(NoStore);
    }
    plan.insertedMeanwhile = InsertedOnHost();
    steps.Append(WithdrawalOf(plan.insertedMeanwhile));
    return steps;
}

ActivationPlan PlanForNone(HostPlan& plan) {
    auto steps = NoRemoteAuthenticationStore().GetActivationPlan(EditForm::Lossless);
    bool const withdrawsConfigured = RecordedStore() == ActiveDirectory;
    EntriesList configured;
    try {
        configured = {ActiveDirectoryStore(0).GetProviderEntries()};
    } catch (std::exception const& e) {
        if (withdrawsConfigured) {
            plan.refusal = Refused(e);
            return PlanForNoneWithoutProvider(plan);
        }
    }
    auto left = plan.insertedMeanwhile = InsertedOnHost();
    for (auto const& each : configured) {
        left = Without(left, each);
        if (!withdrawsConfigured) {
            // "None" was recorded by somebody who failed, or did, no more.
            left.push_back(each);
        }
    }
    steps.Append(WithdrawalOf(left));
    return steps;
}

ActivationPlan PlanForActiveDirectory(HostPlan& plan) {
    ActiveDirectoryStore const store(0);
    auto const entries = store.GetProviderEntries();
    plan.warnings = MissingModules(entries);
    auto const left = Without(InsertedOnHost(), entries);
    plan.insertedMeanwhile = left;
    plan.insertedMeanwhile.push_back(entries);
    plan.insertedAfterwards = {entries};
    auto steps = WithdrawalOf(left);
    steps.Append(store.GetActivationPlan(EditForm::Lossless));
    return steps;
}

ActivationPlan PlanFor(HostPlan& plan) {
    return plan.store == NoStore ? PlanForNone(plan) : PlanForActiveDirectory(plan);
}

} // namespace

HostPlan MakeHostPlan(std::string const& store) {
    HostPlan plan;
    plan.store = store;
    try {
        CheckProvider();
    } catch (Failure const& e) {
        if (store != NoStore) {
            throw;
        }
        plan.refusal = e;
    }
    try {
        plan.steps = plan.refusal ? PlanForNoneWithoutProvider(plan) : PlanFor(plan);
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
