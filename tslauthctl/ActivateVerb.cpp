// SPDX-License-Identifier: Apache-2.0
#include "ControlLock.h"
#include "Host.h"
#include "Plan.h"
#include "Text.h"
#include "Verbs.h"

#include <tslauth/AuthenticationStore.h>
#include <tslauth/Exceptions.h>

#include <SystemFile.h>

namespace tessel::tslauthctl {

namespace {

/// The files that are no longer what they were when the plan was made.
std::vector<std::string> ChangedFiles(Plan const& plan) {
    std::vector<std::string> changed;
    for (auto const& file : plan.files) {
        try {
            if (authentication::ReadFile(file.path) != file.before) {
                changed.push_back(file.path);
            }
        } catch (authentication::IOError const&) {
            changed.push_back(file.path);
        }
    }
    return changed;
}

void MakeActive(std::string const& store) {
    auto const instance = Stores().CreateInstance(store);
    if (!instance.get()) {
        throw Failure(ExitCode::usage, "Unknown store '" + store + "'");
    }
    instance->MakeActive();
}

} // namespace

ExitCode RunActivate(std::string const& store, bool acceptLoss, Output& output) {
    RequireStore(store);
    RequireRoot("activate");
    ControlLock const lock(output);
    auto const plan = MakePlan(store);
    auto& document = output.Document();
    document["changed"] = nlohmann::json::array();
    document["store"] = store;
    document["recorded"] = nullptr;
    if (!plan.recorded.empty() || !plan.refusal) {
        document["recorded"] = plan.recorded;
    }
    document["losses"] = nlohmann::json::array();
    for (auto const& file : plan.files) {
        for (auto const& loss : file.losses) {
            document["losses"].push_back({{"path", file.path}, {"loss", loss}});
        }
    }
    // Where the library would record "None" and then fail, its entries would stay for good: it does
    // nothing the next time. So that is a loss to be accepted; an unknown store has left nothing
    // that could be taken out, and there is no other way away from it.
    bool const leavesEntries =
        store == NoStore && plan.refusal && !plan.refusedAfterwards && !plan.files.empty();
    if (plan.refusal && !plan.refusedAfterwards && !(leavesEntries && acceptLoss)) {
        output.Error(
            Failure(ExitCode::refused, plan.refusal->message, plan.refusal->exceptionClass));
        output.ErrorDetail("nothing was changed");
        if (leavesEntries) {
            output.ErrorDetail("with --accept-loss 'None' is recorded all the same, and the "
                               "provider's entries stay in the files");
        }
        AddPrepareHint(*plan.refusal, output);
        return ExitCode::refused;
    }
    if (plan.Loses() && !acceptLoss) {
        output.Error(Failure(ExitCode::loss, "Activating '" + store +
                                                 "' would lose what follows; nothing was changed"));
        for (auto const& file : plan.files) {
            for (auto const& loss : file.losses) {
                output.ErrorDetail(file.path + ": " + loss);
            }
        }
        output.ErrorDetail("see 'tslauthctl prepare', or give --accept-loss");
        return ExitCode::loss;
    }
    try {
        MakeActive(store);
    } catch (std::exception const& e) {
        output.Error(Refused(e));
        auto const changed = ChangedFiles(plan);
        document["changed"] = changed;
        for (auto const& path : changed) {
            output.ErrorDetail("changed before that: " + path);
        }
        if (changed.empty()) {
            output.ErrorDetail("nothing was changed");
        }
        return ExitCode::refused;
    }
    auto const changed = ChangedFiles(plan);
    document["changed"] = changed;
    for (auto const& path : changed) {
        output.Line("changed " + path);
    }
    for (auto const& file : plan.files) {
        for (auto const& loss : file.losses) {
            output.Warning(file.path + ": " + loss + ", as accepted");
        }
    }
    output.Warnings(plan.warnings);
    output.Line("'" + store + "' is active; " +
                (changed.empty() ? "nothing had to be changed"
                                 : Counted(changed.size(), "file") + " changed") +
                ".");
    return ExitCode::done;
}

} // namespace tessel::tslauthctl
