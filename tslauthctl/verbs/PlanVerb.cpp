// SPDX-License-Identifier: Apache-2.0
#include "analysis/HostPlan.h"
#include "analysis/KnownStores.h"
#include "terminal/UnifiedDiff.h"
#include "verbs/Verbs.h"

namespace tessel::tslauthctl {

void AddPrepareHint(HostPlan const& plan, Console& console) {
    // Once the store is known, no file is read but the two that an activation edits.
    bool const reader = plan.recorded && plan.refusal->ExceptionClass() ==
                                             "tessel::authentication::ConfigurationError";
    if (reader) {
        console.ErrorDetail("'tslauthctl prepare' shows what can be done about the file");
    }
}

void DescribePlan(HostPlan const& plan, Console& console) {
    auto& document = console.Document();
    document["store"] = plan.store;
    document["recorded"] = nullptr;
    if (plan.recorded) {
        document["recorded"] = *plan.recorded;
    }
    auto& files = document["files"] = nlohmann::json::array();
    for (auto const& file : plan.preview.files) {
        auto const diff = UnifiedDiff(file.path, file.before, file.after);
        files.push_back({{"path", file.path},
                         {"changed", file.Changes()},
                         {"diff", diff},
                         {"losses", file.losses},
                         {"notes", file.notes}});
        console.Diff(diff);
    }
    for (auto const& file : plan.preview.files) {
        for (auto const& loss : file.losses) {
            console.Warning(file.path + ": " + loss);
        }
        for (auto const& note : file.notes) {
            console.Note(file.path + ": " + note);
        }
    }
    console.Warnings(plan.warnings);
    document["refusal"] = nullptr;
    if (plan.refusal) {
        document["refusal"] = {{"message", plan.refusal->what()},
                               {"exception", plan.refusal->ExceptionClass()},
                               {"afterwards", plan.refusedAfterwards}};
    }
}

ExitCode RunPlan(std::string const& store, Console& console) {
    if (store.empty()) {
        throw Failure(ExitCode::usage, "store is required (see tslauthctl plan --help)");
    }
    RequireStore(store);
    auto const plan = MakeHostPlan(store);
    DescribePlan(plan, console);
    if (plan.refusal) {
        console.Error(*plan.refusal);
        console.ErrorDetail(plan.refusedAfterwards
                                ? "the library would write the above first, and then refuse"
                                : "the library would refuse; nothing would be changed");
        AddPrepareHint(plan, console);
        return ExitCode::refused;
    }
    if (plan.preview.Loses()) {
        console.Warning("Activating '" + store +
                        "' would lose the above; it is refused without "
                        "--accept-loss. See 'tslauthctl prepare'.");
        return ExitCode::loss;
    }
    if (!plan.preview.Changes()) {
        console.Line("Activating '" + store + "' would change nothing.");
        return ExitCode::done;
    }
    return ExitCode::changes;
}

} // namespace tessel::tslauthctl
