// SPDX-License-Identifier: Apache-2.0
#include "Factory.h"
#include "Handles.h"

#include <tslauth/ActivationPlan.h>
#include <tslauth/ActiveDirectoryStore.h>
#include <tslauth/AuthenticationConfiguration.h>
#include <tslauth/HostLock.h>
#include <tslauth/NoRemoteAuthenticationStore.h>

struct tslauth_plan {
    std::vector<tessel::authentication::PlannedFile> files;
    tslauth_texts losses;
    bool isRefused = false;
    tslauth_error refusal;
};

namespace tessel::tslauth_c {

namespace {

using namespace authentication;

ActivationPlan StepsTo(std::string const& store) {
    Factory();
    if (store == ActiveDirectoryStoreName) {
        return ActiveDirectoryStore(0).GetActivationPlan(EditForm::Lossless);
    }
    if (store == NoRemoteAuthenticationStore().GetDisplayName()) {
        return NoRemoteAuthenticationStore().GetActivationPlan(EditForm::Lossless);
    }
    throw Failure(TSLAUTH_ERROR_USAGE, "'" + store + "' is no store that can be activated here");
}

std::string InWords(std::vector<std::string> const& sentences) {
    std::string words;
    for (std::string const& sentence : sentences) {
        words += (words.empty() ? "" : "; ") + sentence;
    }
    return words;
}

tslauth_plan Look(ActivationPlan const& steps) {
    ActivationPreview const preview = steps.Preview();
    tslauth_plan plan;
    for (PlannedFile const& file : preview.files) {
        for (std::string const& loss : file.losses) {
            plan.losses.texts.push_back(file.path + ": " + loss);
        }
    }
    plan.files = preview.files;
    plan.isRefused = preview.refusal != nullptr;
    if (plan.isRefused) {
        plan.refusal = ErrorOf(preview.refusal);
    }
    return plan;
}

void Activate(std::string const& store, bool acceptLoss) {
    ActivationPlan const steps = StepsTo(store);
    ActivationPreview const preview = steps.Preview();
    if (preview.refusal != nullptr) {
        std::rethrow_exception(preview.refusal); // before anything is written
    }
    if (preview.Loses() && !acceptLoss) {
        throw Failure(TSLAUTH_ERROR_LOSS, InWords(Look(steps).losses.texts));
    }
    steps.Execute();
}

PlannedFile const* FileOf(tslauth_plan const& plan, std::size_t file) {
    return file < plan.files.size() ? &plan.files[file] : nullptr;
}

} // namespace

void TakeLock(HostLock& lock, int seconds) {
    if (!lock.TryLock(seconds)) {
        throw Failure(TSLAUTH_ERROR_LOCKED, "another change of this host runs");
    }
}

} // namespace tessel::tslauth_c

using namespace tessel::tslauth_c;

int tslauth_stores(tslauth_texts** stores, tslauth_error** error) {
    return Guarded(error, [&] { *stores = new tslauth_texts{Factory().GetRegisteredStores()}; });
}

int tslauth_recorded_store(tslauth_texts** store, tslauth_error** error) {
    return Guarded(error,
                   [&] { *store = new tslauth_texts{{tessel::authentication::RecordedStore()}}; });
}

int tslauth_plan_make(char const* store, tslauth_plan** plan, tslauth_error** error) {
    return Guarded(
        error, [&] { *plan = new tslauth_plan(Look(StepsTo(RequiredText(store, "the store")))); });
}

size_t tslauth_plan_file_count(tslauth_plan const* plan) {
    return plan->files.size();
}

char const* tslauth_plan_file_path(tslauth_plan const* plan, size_t file) {
    auto const found = FileOf(*plan, file);
    return found == nullptr ? nullptr : found->path.c_str();
}

char const* tslauth_plan_file_before(tslauth_plan const* plan, size_t file) {
    auto const found = FileOf(*plan, file);
    return found == nullptr ? nullptr : found->before.c_str();
}

char const* tslauth_plan_file_after(tslauth_plan const* plan, size_t file) {
    auto const found = FileOf(*plan, file);
    return found == nullptr ? nullptr : found->after.c_str();
}

tslauth_texts const* tslauth_plan_losses(tslauth_plan const* plan) {
    return &plan->losses;
}

tslauth_error const* tslauth_plan_refusal(tslauth_plan const* plan) {
    return plan->isRefused ? &plan->refusal : nullptr;
}

void tslauth_plan_free(tslauth_plan* plan) {
    delete plan;
}

int tslauth_activate(char const* store, unsigned flags, int seconds, tslauth_error** error) {
    return Guarded(error, [&] {
        RequireFlags(flags, TSLAUTH_ACCEPT_LOSS);
        std::string const name = RequiredText(store, "the store");
        tessel::authentication::HostLock lock;
        TakeLock(lock, seconds);
        Activate(name, (flags & TSLAUTH_ACCEPT_LOSS) != 0);
    });
}
