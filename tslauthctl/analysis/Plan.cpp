// SPDX-License-Identifier: Apache-2.0
#include "analysis/Plan.h"

#include "analysis/Host.h"
#include "terminal/Text.h"

#include <tslauth/Configuration.h>
#include <tslauth/Exceptions.h>

#include <ConfigurationText.h>
#include <Paths.h>
#include <SystemFile.h>

#include <algorithm>

namespace tessel::tslauthctl {

namespace {

using namespace authentication;

/// The losses that show only when the store is left again.
void AddLossesOnReturn(std::vector<std::string> const& losses, PlannedFile& file) {
    // Those of the way there hide them, and are enough to refuse.
    if (file.losses.empty()) {
        for (auto const& loss : losses) {
            file.losses.push_back(loss + " (when the store is left again)");
        }
    }
}

void AddCommentNote(std::size_t before, std::size_t after, PlannedFile& file) {
    if (after < before) {
        file.notes.push_back(Counted(before - after, "comment") +
                             " without effect on the system would be dropped");
    }
}

std::map<std::string, std::string> Assignments(std::string_view text) {
    std::map<std::string, std::string> assignments;
    ReadAssignments(text, assignments);
    return assignments;
}

void PlanSystemFiles(Edit edit, ProviderEntries const& entries, Plan& plan) {
    plan.files.push_back(
        PlanPAM(Paths::PAMPolicy, ReadFile(Paths::PAMPolicy), edit, entries.pam, ReadPolicy));
    plan.files.push_back(
        PlanNSS(Paths::NSSConfiguration, ReadFile(Paths::NSSConfiguration), edit, entries.nss));
}

void PlanActiveDirectory(Plan& plan) {
    auto const entries = LoadProvider();
    plan.warnings = MissingModules(entries);
    plan.recorded = RecordedStore();
    PlanSystemFiles(Edit::insert, entries, plan);
    plan.files.push_back(PlanRecord(Paths::AuthenticationConfiguration,
                                    ReadFile(Paths::AuthenticationConfiguration), plan.store));
}

void PlanNone(Plan& plan) {
    plan.recorded = RecordedStore();
    if (plan.recorded == plan.store) {
        return;
    }
    plan.files.push_back(PlanRecord(Paths::AuthenticationConfiguration,
                                    ReadFile(Paths::AuthenticationConfiguration), plan.store));
    auto const known = Stores().GetRegisteredStores();
    if (std::find(known.begin(), known.end(), plan.recorded) == known.end()) {
        plan.refusedAfterwards = true;
        throw UnknownRemoteAuthenticationStoreException("The specified store '" + plan.recorded +
                                                        "' is unknown");
    }
    PlanSystemFiles(Edit::remove, LoadProvider(), plan);
}

} // namespace

PlannedFile PlanPAM(std::string const& path, std::string const& text, Edit edit,
                    SystemConfiguration::PAMEntry const& entry, PAMPolicyReader const& reader) {
    PlannedFile file{path, text, ProviderModules::EditedPAMPolicy(text, edit, entry), {}, {}};
    file.losses = PAMLosses(text, file.after, edit, entry, reader);
    if (edit == Edit::insert) {
        AddLossesOnReturn(PAMLossesOnReturn(file.after, entry, reader), file);
    }
    auto const meaning = ReadPAMMeaning(text);
    AddCommentNote(meaning.comments, ReadPAMMeaning(file.after).comments, file);
    if (meaning.unreadable) {
        file.notes.emplace_back("libpam refuses the file as it is: its last line is continued, or "
                                "too long");
    }
    return file;
}

PlannedFile PlanNSS(std::string const& path, std::string const& text, Edit edit,
                    SystemConfiguration::NSSService const& service) {
    PlannedFile file{
        path, text, ProviderModules::EditedNSSConfiguration(text, edit, service), {}, {}};
    file.losses = NSSLosses(text, file.after, edit, service);
    if (edit == Edit::insert) {
        AddLossesOnReturn(NSSLossesOnReturn(file.after, service), file);
    }
    auto const meaning = ReadNSSMeaning(text);
    AddCommentNote(meaning.comments, ReadNSSMeaning(file.after).comments, file);
    for (auto const line : meaning.faultyLines) {
        file.notes.push_back("line " + std::to_string(line) +
                             ": the C library does not understand the criterion, and with it no "
                             "look-up works");
    }
    return file;
}

PlannedFile PlanRecord(std::string const& path, std::string const& text, std::string const& store) {
    PlannedFile file{path, text, {}, {}, {}};
    auto wanted = Assignments(text);
    wanted[Paths::RemoteAuthenticationStoreKey] = store;
    std::string line;
    for (auto const& [key, value] : wanted) {
        AssignLine(line, {key, value});
        file.after += line;
    }
    auto const made = Assignments(file.after);
    for (auto const& assignment : wanted) {
        auto const found = made.find(assignment.first);
        if (found == made.end() || found->second != assignment.second) {
            file.losses.push_back("the value of the key '" + assignment.first + "' would be lost");
        }
    }
    return file;
}

bool Plan::Loses() const {
    return std::any_of(files.begin(), files.end(),
                       [](PlannedFile const& file) { return !file.losses.empty(); });
}

bool Plan::Changes() const {
    return std::any_of(files.begin(), files.end(),
                       [](PlannedFile const& file) { return file.before != file.after; });
}

Plan MakePlan(std::string const& store) {
    Plan plan;
    plan.store = store;
    try {
        if (store == NoStore) {
            PlanNone(plan);
        } else {
            PlanActiveDirectory(plan);
        }
    } catch (std::exception const& e) {
        plan.refusal = Refusal{e.what(), ClassName(e)};
    }
    return plan;
}

} // namespace tessel::tslauthctl
