// SPDX-License-Identifier: Apache-2.0
#include "analysis/Agreement.h"
#include "analysis/Failures.h"
#include "analysis/HostFile.h"
#include "analysis/HostPlan.h"
#include "analysis/KnownStores.h"
#include "history/HistoryPaths.h"
#include "trial/LogInTrial.h"
#include "verbs/HostChange.h"
#include "verbs/Verbs.h"

#include <tslauth/Exceptions.h>
#include <tslauth/Paths.h>

#include <base/AsciiText.h>

namespace tessel::tslauthctl {

namespace {

using authentication::UnknownRemoteAuthenticationStoreException;

/// The files that are no longer what they were when the plan was made.
std::vector<std::string> ChangedFiles(HostPlan const& plan) {
    std::vector<std::string> changed;
    for (auto const& file : plan.preview.files) {
        if (HostFileOrNothing(file.path) != file.before) {
            changed.push_back(file.path);
        }
    }
    return changed;
}

PlannedTexts TextsAfter(authentication::ActivationPreview const& preview) {
    PlannedTexts texts;
    for (auto const& file : preview.files) {
        texts[file.path] = file.after;
    }
    return texts;
}

/// The files in which the entries that the plan is about are not as the store wants them, by the
/// same measure as `status`.
std::vector<std::string> FilesNotInStep(HostPlan const& plan) {
    bool const wanted = plan.store == ActiveDirectory;
    auto const& known = wanted ? plan.insertedAfterwards : plan.insertedMeanwhile;
    bool policy = true;
    bool services = true;
    auto const agrees = [](std::vector<Part> const& parts) {
        return Together(parts) == Agreement::inStep || Together(parts) == Agreement::unknown;
    };
    for (auto const& entries : known) {
        policy = policy && agrees(PAMParts(ReadHostFile(authentication::Paths::PAMPolicy),
                                           entries.pam, wanted));
        services =
            services && agrees(NSSParts(ReadHostFile(authentication::Paths::NSSConfiguration),
                                        entries.nss, wanted));
    }
    std::vector<std::string> files;
    if (!policy) {
        files.emplace_back(authentication::Paths::PAMPolicy);
    }
    if (!services) {
        files.emplace_back(authentication::Paths::NSSConfiguration);
    }
    return files;
}

/// No change ends well that has left the host out of step.
ExitCode Verified(HostPlan const& plan, ExitCode code, Console& console) {
    auto const files = FilesNotInStep(plan);
    if (files.empty()) {
        return code;
    }
    console.Error(Failure(ExitCode::drift, "'" + plan.store +
                                               "' is recorded, and the host does not do as it "
                                               "says; see 'tslauthctl status'"));
    for (auto const& path : files) {
        console.ErrorDetail("not in step: " + path);
    }
    return ExitCode::drift;
}

/// Forgets what has been taken out. That the record names too much harms nothing.
ExitCode FinishRecord(HostPlan const& plan, Console& console) {
    try {
        RecordInserted(plan.insertedAfterwards);
        return ExitCode::done;
    } catch (Failure const& e) {
        console.Error(Failure(e.Code(), "'" + plan.store + "' is active, but: " + e.what()));
        return e.Code();
    }
}

} // namespace

ExitCode RunActivate(std::string const& store, bool acceptLoss, int confirmWithin,
                     Console& console) {
    RequireStore(store);
    RequireRoot("activate");
    HostChange change(console);
    change.ConfirmWithin(confirmWithin);
    auto const plan = MakeHostPlan(store);
    auto& document = console.Document();
    document["changed"] = nlohmann::json::array();
    document["store"] = store;
    document["recorded"] = nullptr;
    if (plan.recorded) {
        document["recorded"] = *plan.recorded;
    }
    document["losses"] = nlohmann::json::array();
    for (auto const& file : plan.preview.files) {
        for (auto const& loss : file.losses) {
            document["losses"].push_back({{"path", file.path}, {"loss", loss}});
        }
    }
    // Where the library would record "None" and then fail, its entries would stay for good: it does
    // nothing the next time. So that is a loss to be accepted; an unknown store has left nothing
    // that could be taken out, and there is no other way away from it.
    bool const leavesEntries =
        store == NoStore && plan.refusal && !plan.refusedAfterwards && !plan.preview.files.empty();
    if (plan.refusal && !plan.refusedAfterwards && !(leavesEntries && acceptLoss)) {
        console.Error(*plan.refusal);
        console.ErrorDetail("nothing was changed");
        if (leavesEntries) {
            console.ErrorDetail(
                "with --accept-loss 'None' is recorded all the same, and entries of "
                "the provider may stay in the files");
        }
        AddPrepareHint(plan, console);
        return ExitCode::refused;
    }
    if (plan.preview.Loses() && !acceptLoss) {
        console.Error(
            Failure(ExitCode::loss,
                    "Activating '" + store + "' would lose what follows; nothing was changed"));
        for (auto const& file : plan.preview.files) {
            for (auto const& loss : file.losses) {
                console.ErrorDetail(file.path + ": " + loss);
            }
        }
        console.ErrorDetail("see 'tslauthctl prepare', or give --accept-loss");
        return ExitCode::loss;
    }
    if (plan.preview.Changes()) {
        LogInTrial().Require(TextsAfter(plan.preview), console);
    }
    auto code = ExitCode::done;
    try {
        std::exception_ptr refusal;
        change.Write("activate", PathsOfActivation(), [&] {
            RecordInserted(plan.insertedMeanwhile);
            try {
                plan.steps.Execute();
            } catch (UnknownRemoteAuthenticationStoreException const&) {
                if (!plan.refusedAfterwards) {
                    throw;
                }
                refusal = std::current_exception(); // what was written is the way away
                return;
            }
            code = FinishRecord(plan, console);
        });
        if (refusal) {
            std::rethrow_exception(refusal);
        }
    } catch (Failure const&) {
        throw;
    } catch (std::exception const& e) {
        console.Error(Refused(e));
        auto const changed = ChangedFiles(plan);
        document["changed"] = changed;
        for (auto const& path : changed) {
            console.ErrorDetail("changed all the same: " + path);
        }
        if (changed.empty()) {
            console.ErrorDetail("nothing was changed");
        }
        return ExitCode::refused;
    }
    auto const changed = ChangedFiles(plan);
    document["changed"] = changed;
    for (auto const& path : changed) {
        console.Line("changed " + path);
    }
    for (auto const& file : plan.preview.files) {
        for (auto const& loss : file.losses) {
            console.Warning(file.path + ": " + loss + ", as accepted");
        }
    }
    console.Warnings(plan.warnings);
    console.Line("'" + store + "' is active; " +
                 (changed.empty() ? "nothing had to be changed"
                                  : base::AsciiText::Counted(changed.size(), "file") + " changed") +
                 ".");
    return Verified(plan, code, console);
}

} // namespace tessel::tslauthctl
