// SPDX-License-Identifier: Apache-2.0
#include "access/AccessRules.h"
#include "analysis/KnownStores.h"
#include "history/HistoryPaths.h"
#include "setup/SetupArchive.h"
#include "setup/SetupHost.h"
#include "setup/SetupPaths.h"
#include "terminal/UnifiedDiff.h"
#include "trial/LogInTrial.h"
#include "verbs/HostChange.h"
#include "verbs/Verbs.h"

#include <tslauth/AuthenticationConfiguration.h>

#include <base/AsciiText.h>

#include <algorithm>
#include <iterator>

namespace tessel::tslauthctl {

namespace {

void Describe(SetupPlan const& plan, std::string const& provider, Console& console) {
    auto& document = console.Document();
    document["provider"] = provider;
    document["files"] = nlohmann::json::array();
    for (auto const& file : plan.files) {
        auto const diff = UnifiedDiff(file.path, file.before.value_or(std::string()), file.after);
        document["files"].push_back({{"path", file.path},
                                     {"existed", file.before.has_value()},
                                     {"changed", file.Changes()},
                                     {"diff", diff}});
    }
    document["links"] = nlohmann::json::array();
    for (auto const& link : plan.links) {
        document["links"].push_back({{"path", link}, {"target", plan.linkTarget}});
    }
    document["profiles_on"] = plan.profilesOn;
    document["profiles_off"] = plan.profilesOff;
    console.Warnings(plan.notes);
}

std::string Listed(std::vector<std::string> const& names) {
    std::string text;
    for (auto const& name : names) {
        text += (text.empty() ? "'" : ", '") + name + "'";
    }
    return text;
}

/// What a plan would do beside its files, for people.
void SayWhatElse(SetupPlan const& plan, Console& console) {
    for (auto const& link : plan.links) {
        console.Note(link + " would lead to " + plan.linkTarget);
    }
    if (!plan.profilesOn.empty()) {
        console.Note(
            "pam-auth-update would switch on " + Listed(plan.profilesOn) +
            (plan.profilesOff.empty() ? "" : ", and switch off " + Listed(plan.profilesOff)));
    }
}

/// Remembers everything that the plan is going to change.
SetupRecord RecordFor(SetupPlan const& plan, SetupFacts const& facts) {
    auto record = ReadSetupRecord().value_or(SetupRecord());
    bool const again = record.provider == facts.provider;
    record.provider = facts.provider;
    auto const addFolders = [&](std::string const& path) {
        for (auto& folder : MissingFolders(path)) {
            if (std::find(record.folders.begin(), record.folders.end(), folder) ==
                record.folders.end()) {
                record.folders.push_back(std::move(folder));
            }
        }
    };
    for (auto const& file : plan.files) {
        // What has come into the switch since it was set up is nothing that the host was before.
        bool const mended = again && file.path == Paths::NSSConfiguration;
        if (file.Changes() && !mended) {
            record.Add(file.path, file.before, file.after);
            addFolders(file.path);
        }
    }
    for (auto const& link : plan.links) {
        record.links.push_back(link);
        addFolders(link);
    }
    if (!plan.profilesOn.empty()) {
        for (auto const* const path : Paths::ServicePolicies) {
            if (auto const& text = facts.texts.at(path)) {
                record.Add(path, text, *text);
            }
        }
        record.profilesOn = plan.profilesOn;
        for (auto const& profile : plan.profilesOff) {
            if (std::find(record.profilesOff.begin(), record.profilesOff.end(), profile) ==
                record.profilesOff.end()) {
                record.profilesOff.push_back(profile);
            }
        }
    }
    return record;
}

/// Runs pam-auth-update and remembers what it wrote.
void LeadServicesToPolicy(SetupPlan const& plan, SetupRecord& record) {
    SwitchProfiles(plan.profilesOn, plan.profilesOff);
    PolicyTexts texts;
    for (auto const* const path : Paths::ServicePolicies) {
        texts[path] = TextOnHost(path);
        if (texts[path]) {
            record.Add(path, texts[path], *texts[path]);
        }
    }
    WriteSetupRecord(record);
    auto const others = FilesThatDoNotFollow(texts);
    if (!others.empty()) {
        throw Failure(
            ExitCode::refused,
            "pam-auth-update has left " + Listed(others) +
                " alone, which somebody has edited by hand: services that include them do "
                "not follow. 'pam-auth-update --force' takes such edits away");
    }
}

void CarryOut(SetupPlan const& plan, SetupFacts const& facts) {
    auto record = RecordFor(plan, facts);
    WriteSetupRecord(record);
    for (auto const& folder : record.folders) {
        MakeFolder(folder);
    }
    for (auto const& link : plan.links) {
        MakeLink(link, plan.linkTarget);
    }
    for (auto const& file : plan.files) {
        if (file.Changes()) {
            PutOnHost(file.path, file.after);
        }
    }
    if (!plan.profilesOn.empty()) {
        LeadServicesToPolicy(plan, record);
    }
}

PlannedTexts TextsAfter(SetupPlan const& plan) {
    PlannedTexts texts;
    for (auto const& file : plan.files) {
        texts[file.path] = file.after;
    }
    return texts;
}

/// Who may log in once a store is active, in one line.
void SayWhoMayLogIn(SetupPlan const& plan, Console& console) {
    auto const file = std::find_if(plan.files.begin(), plan.files.end(), [](auto const& change) {
        return change.path == Paths::AccessRules;
    });
    auto const rules = ReadAccessRules(file->after);
    bool const somebody =
        rules.PermitByDefault() || std::any_of(rules.rules.begin(), rules.rules.end(),
                                               [](AccessRule const& rule) { return rule.permits; });
    console.Line(somebody ? "'tslauthctl permit --list' says who of the domain may log in."
                          : "Nobody of the domain may log in until 'tslauthctl permit' lets them.");
}

/// What is to become of the host's files, and what they are.
struct Undoing {
    std::vector<FileUndo> files;
    std::vector<std::optional<std::string>> current;
};

Undoing PlanUndoing(SetupRecord const& record) {
    Undoing undoing;
    for (auto const& file : record.files) {
        undoing.current.push_back(TextOnHost(file.path));
        undoing.files.push_back(UndoOf(file, undoing.current.back()));
    }
    return undoing;
}

char const* Word(UndoKind kind) {
    switch (kind) {
    case UndoKind::asBefore:
        return "as-before";
    case UndoKind::restore:
        return "restored";
    case UndoKind::remove:
        return "removed";
    case UndoKind::inUse:
        return "in-use";
    case UndoKind::changedSince:
        break;
    }
    return "changed-since";
}

void Describe(std::vector<FileUndo> const& files, Console& console) {
    auto& described = console.Document()["files"];
    for (auto const& file : files) {
        described.push_back({{"path", file.path},
                             {"outcome", Word(file.kind)},
                             {"lines_added", file.added},
                             {"lines_removed", file.removed}});
        if (file.kind == UndoKind::changedSince) {
            console.Warning(file.path + ": stays as it is, for it was changed since: " +
                            base::AsciiText::Counted(file.added, "line") + " more, " +
                            std::to_string(file.removed) + " fewer");
        }
    }
}

bool IsServicePolicy(std::string const& path) {
    return std::find(std::begin(Paths::ServicePolicies), std::end(Paths::ServicePolicies), path) !=
           std::end(Paths::ServicePolicies);
}

/// Has the policy stay where it was to be removed and somebody goes by it: libpam refuses everybody
/// who reaches an include of a missing file.
/// @param followers the files that include the policy
void KeepPolicyFor(std::vector<std::string> const& followers, Undoing& undoing, Console& console) {
    for (auto& undo : undoing.files) {
        if (undo.path == Paths::PAMPolicy && undo.kind == UndoKind::remove && !followers.empty()) {
            undo.kind = UndoKind::inUse;
            console.Warning(undo.path + ": stays as the default one, which lets in the users of " +
                            "this host alone, for it is included by " + Listed(followers));
        }
    }
}

/// Those that pam-auth-update will not have led elsewhere before the policy would be removed.
std::vector<std::string> LastingFollowers(SetupRecord const& record) {
    auto files = FilesThatFollow(PoliciesOnHost());
    if (!record.profilesOn.empty()) {
        files.erase(std::remove_if(files.begin(), files.end(), IsServicePolicy), files.end());
    }
    return files;
}

/// Takes out of the policy what the provider has asked for. It can be removed later, still.
void PutDefaultPolicy() {
    if (auto const text = TextOnHost(Paths::DefaultPolicy)) {
        PutOnHost(Paths::PAMPolicy, *text);
        RecordChange(Paths::PAMPolicy, *text);
    }
}

void Undo(RecordedFile const& file, FileUndo const& undo) {
    switch (undo.kind) {
    case UndoKind::asBefore:
    case UndoKind::changedSince:
        break;
    case UndoKind::inUse:
        PutDefaultPolicy();
        break;
    case UndoKind::restore:
        PutOnHost(file.path, *file.before);
        break;
    case UndoKind::remove:
        RemoveFromHost(file.path);
        break;
    }
}

/// Gives the services back to what they included before.
/// @param undoing is brought up to date where pam-auth-update wrote a file that was changed since
void TakeServicesBack(SetupRecord const& record, Undoing& undoing) {
    if (record.profilesOn.empty()) {
        return;
    }
    SwitchProfiles(record.profilesOff, record.profilesOn);
    for (std::size_t i = 0; i < record.files.size(); ++i) {
        auto& undo = undoing.files[i];
        if (IsServicePolicy(undo.path) && undo.kind == UndoKind::changedSince) {
            // What it wrote now is to be compared with what was there before ours.
            auto const& file = record.files[i];
            undo = UndoOf({file.path, file.before, *file.before}, TextOnHost(file.path));
        }
    }
}

bool Any(UndoKind kind, std::vector<FileUndo> const& files) {
    return std::any_of(files.begin(), files.end(),
                       [&](FileUndo const& file) { return file.kind == kind; });
}

/// How far the host has become what it was.
ExitCode Conclude(std::vector<FileUndo> const& files, Console& console) {
    bool const changedSince = Any(UndoKind::changedSince, files);
    bool const inUse = Any(UndoKind::inUse, files);
    if (changedSince) {
        console.Line(std::string("What they were before is kept below ") + Paths::SetupRecord +
                     "/before.");
    }
    if (inUse) {
        console.Line("Once nothing includes the policy, another 'tslauthctl unsetup' removes it.");
    }
    if (changedSince || inUse) {
        return ExitCode::loss;
    }
    RemoveSetupRecord();
    console.Line("The host is as it was before it was set up.");
    return ExitCode::done;
}

/// Makes the host what it was.
ExitCode TakeBack(SetupRecord const& record, LogInTrial const& trial, Console& console) {
    auto undoing = PlanUndoing(record);
    // First of all, so that no service ever includes a policy that is gone.
    TakeServicesBack(record, undoing);
    KeepPolicyFor(FilesThatFollow(PoliciesOnHost()), undoing, console);
    for (std::size_t i = record.files.size(); i > 0; --i) {
        Undo(record.files[i - 1], undoing.files[i - 1]);
    }
    for (auto const& link : record.links) {
        RemoveFromHost(link);
    }
    for (auto folder = record.folders.rbegin(); folder != record.folders.rend(); ++folder) {
        RemoveEmptyFolder(*folder);
    }
    trial.RequireNow();
    Describe(undoing.files, console);
    return Conclude(undoing.files, console);
}

bool IsNoneActive() {
    try {
        return authentication::RecordedStore() == NoStore;
    } catch (std::exception const&) {
        return true; // no store is recorded: there is nothing to leave
    }
}

std::string const notSetUp = "The host is not set up, or not by this tool; nothing was changed.";

} // namespace

ExitCode RunPlanSetup(std::string const& provider, Console& console) {
    auto const plan = MakeSetupPlan(ReadSetupFacts(provider));
    Describe(plan, provider, console);
    for (auto const& file : console.Document()["files"]) {
        console.Diff(file["diff"].get<std::string>());
    }
    SayWhatElse(plan, console);
    if (!plan.Changes()) {
        console.Line("Setting up would change nothing.");
        return ExitCode::done;
    }
    return ExitCode::changes;
}

ExitCode RunSetup(std::string const& provider, int confirmWithin, Console& console) {
    RequireRoot("setup");
    HostChange change(console);
    change.ConfirmWithin(confirmWithin);
    auto const facts = ReadSetupFacts(provider);
    auto const plan = MakeSetupPlan(facts);
    Describe(plan, provider, console);
    if (plan.Changes()) {
        LogInTrial const trial;
        trial.Require(TextsAfter(plan), console);
        change.Write("setup", PathsOfSetup(), [&] {
            CarryOut(plan, facts);
            trial.RequireNow(); // what pam-auth-update writes is known by now
        });
    }
    for (auto const& file : plan.files) {
        if (file.Changes()) {
            console.Line((file.before ? "changed " : "made ") + file.path);
        }
    }
    console.Line(
        "The host is set up for the provider '" + provider + "'; " +
        (plan.Changes() ? "'tslauthctl unsetup' takes it back." : "nothing had to be changed."));
    SayWhoMayLogIn(plan, console);
    return ExitCode::done;
}

ExitCode RunPlanUnsetup(Console& console) {
    console.Document()["files"] = nlohmann::json::array();
    auto const record = ReadSetupRecord();
    if (!record) {
        console.Line(notSetUp);
        return ExitCode::done;
    }
    auto undoing = PlanUndoing(*record);
    KeepPolicyFor(LastingFollowers(*record), undoing, console);
    Describe(undoing.files, console);
    for (std::size_t i = 0; i < undoing.files.size(); ++i) {
        if (undoing.files[i].kind != UndoKind::changedSince &&
            undoing.files[i].kind != UndoKind::inUse) {
            console.Diff(UnifiedDiff(undoing.files[i].path,
                                     undoing.current[i].value_or(std::string()),
                                     record->files[i].before.value_or(std::string())));
        }
    }
    return ExitCode::changes;
}

ExitCode RunUnsetup(Console& console) {
    RequireRoot("unsetup");
    if (!IsNoneActive()) {
        auto const left = RunActivate(NoStore, false, 0, console);
        if (left != ExitCode::done) {
            // A loss of this command's own is that something has stayed.
            return left == ExitCode::loss ? ExitCode::refused : left;
        }
    }
    HostChange change(console);
    if (!IsNoneActive()) {
        throw Failure(ExitCode::refused, "Somebody has activated a store meanwhile");
    }
    console.Document()["files"] = nlohmann::json::array();
    auto const record = ReadSetupRecord();
    if (!record) {
        console.Line(notSetUp);
        return ExitCode::done;
    }
    auto code = ExitCode::done;
    LogInTrial const trial;
    change.Write("unsetup", PathsOfSetup(), [&] { code = TakeBack(*record, trial, console); });
    return code;
}

} // namespace tessel::tslauthctl
