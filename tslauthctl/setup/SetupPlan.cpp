// SPDX-License-Identifier: Apache-2.0
#include "setup/SetupPlan.h"

#include "access/AccessRules.h"
#include "analysis/KnownStores.h"
#include "setup/SetupPaths.h"
#include "terminal/Console.h"

#include <base/KeyValueText.h>
#include <tslauth/ActivationPlan.h>

#include <algorithm>
#include <iterator>

namespace tessel::tslauthctl {

namespace {

using namespace meaning;

std::optional<std::string> ValueOf(std::string_view key, std::string_view text) {
    std::optional<std::string> value;
    base::ForEachAssignment(text, [&](base::Assignment const& assignment) {
        if (assignment.key == key && !value) {
            value = assignment.value;
        }
    });
    return value;
}

/// The text with a value for a key: the line that gives it is another one, or comes at the end.
std::string WithValue(std::string_view key, std::string_view value, std::string_view text) {
    std::string line(key);
    line.append(" = \"").append(value).append("\"\n");
    std::string out;
    bool given = false;
    while (!text.empty()) {
        auto const old = text.substr(0, text.find('\n'));
        text.remove_prefix(std::min(old.size() + 1, text.size()));
        if (!given && ValueOf(key, old)) {
            out += line;
            given = true;
        } else {
            out.append(old).append("\n");
        }
    }
    return given ? out : out + line;
}

std::optional<std::string> const& TextOf(std::string_view path, SetupFacts const& facts) {
    static std::optional<std::string> const none;
    auto const found = facts.texts.find(std::string(path));
    return found == facts.texts.end() ? none : found->second;
}

/// Sets one key of one file.
FileChange Assigned(std::string const& path, std::string_view key, std::string_view value,
                    SetupFacts const& facts) {
    auto const& text = TextOf(path, facts);
    FileChange change{path, text, text.value_or(std::string())};
    if (ValueOf(key, change.after) != value) {
        change.after = WithValue(key, value, change.after);
    }
    return change;
}

bool Has(std::vector<PAMLine> const& stack, PAMLine const& sought) {
    return std::find(stack.begin(), stack.end(), sought) != stack.end();
}

/// Whether the file of the access rules decides in this stack.
bool StackAsksAccessRules(std::vector<PAMLine> const& stack) {
    std::string const module = std::string(Paths::PAMModulePrefix) + Paths::PAMAccessModule;
    std::string const file = std::string("accessfile=") + Paths::AccessRules;
    return std::any_of(stack.begin(), stack.end(), [&](PAMLine const& line) {
        return line.module == module && std::find(line.arguments.begin(), line.arguments.end(),
                                                  file) != line.arguments.end();
    });
}

/// Whether a policy includes what includes it in turn, once the services follow.
bool IncludesServicePolicy(PAMMeaning const& meaning) {
    std::string_view const prefix = Paths::ServicePolicyPrefix;
    return std::any_of(meaning.lines.begin(), meaning.lines.end(), [&](PAMLine const& line) {
        bool const includes = line.IsInclude() || line.control == "substack";
        return includes && std::string_view(line.module).substr(0, prefix.size()) == prefix;
    });
}

/// Whether a policy does what the default one does for this provider, whatever else it does.
bool Serves(std::string const& policy, SetupFacts const& facts) {
    auto const meaning = ReadPAMMeaning(policy);
    for (auto const& text : facts.asked.policyLines) {
        auto const asked = ReadPAMMeaning(text + "\n");
        for (auto const& line : asked.lines) {
            if (!Has(PAMStackOf(meaning, line.facility), line)) {
                return false;
            }
        }
    }
    return AsksAccessRules(meaning) && !IncludesServicePolicy(meaning) && !meaning.unreadable;
}

bool IsActive(SetupFacts const& facts) {
    auto const record = TextOf(Paths::AuthenticationConfiguration, facts);
    auto const store = ValueOf(Paths::RemoteAuthenticationStoreKey, record.value_or(""));
    return store && *store != NoStore;
}

void RequireInactive(std::string const& path, SetupFacts const& facts) {
    if (IsActive(facts)) {
        throw Failure(ExitCode::refused,
                      "'" + path +
                          "' has to be replaced, which takes the entries of the active "
                          "store with it: activate 'None' first");
    }
}

FileChange PlanRecord(SetupFacts const& facts) {
    auto const& text = TextOf(Paths::AuthenticationConfiguration, facts);
    if (text && ValueOf(Paths::RemoteAuthenticationStoreKey, *text)) {
        return {Paths::AuthenticationConfiguration, text, *text};
    }
    return Assigned(Paths::AuthenticationConfiguration, Paths::RemoteAuthenticationStoreKey,
                    NoStore, facts);
}

FileChange PlanProvider(SetupFacts const& facts) {
    auto change = Assigned(Paths::ProviderConfiguration, Paths::ProviderKey, facts.provider, facts);
    if (change.Changes()) {
        RequireInactive(change.path, facts);
    }
    return change;
}

FileChange PlanAccessRules(SetupFacts const& facts) {
    auto const& text = TextOf(Paths::AccessRules, facts);
    return {Paths::AccessRules, text, text ? *text : FirstAccessRules()};
}

FileChange PlanPolicy(SetupFacts const& facts) {
    auto const& text = TextOf(Paths::PAMPolicy, facts);
    FileChange change{Paths::PAMPolicy, text, text.value_or(std::string())};
    if (!text || !Serves(*text, facts)) {
        RequireInactive(change.path, facts);
        change.after = PolicyWith(facts.asked.policyLines, facts.defaultPolicy);
    }
    return change;
}

/// The name-service switch without a service that is not the provider's.
FileChange PlanNSS(std::string const& text, std::string const& service) {
    using namespace authentication;
    auto const withdrawal =
        ActivationPlan::Withdrawing(MakeProviderEntries({}, {}, service, {}), EditForm::Lossless);
    auto const file =
        withdrawal.PreviewOf(Paths::NSSConfiguration, [&](std::string const&) { return text; });
    return {Paths::NSSConfiguration, text, file.after};
}

bool Reaches(std::string const& module, std::string const& text) {
    auto const meaning = ReadPAMMeaning(text);
    return std::any_of(meaning.lines.begin(), meaning.lines.end(), [&](PAMLine const& line) {
        auto const slash = line.module.rfind('/') + 1; // 0 for a module without a folder
        return line.module.substr(slash) == module;
    });
}

bool Follows(std::string const& text) {
    auto const meaning = ReadPAMMeaning(text);
    return std::any_of(meaning.lines.begin(), meaning.lines.end(), [](PAMLine const& line) {
        return (line.IsInclude() || line.control == "substack") &&
               line.module == Paths::PAMPolicyName;
    });
}

void PlanServices(SetupFacts const& facts, SetupPlan& plan) {
    bool const replaced =
        !facts.asked.replacedModule.empty() &&
        std::any_of(std::begin(Paths::ServicePolicies), std::end(Paths::ServicePolicies),
                    [&](char const* path) {
                        return Reaches(facts.asked.replacedModule,
                                       TextOf(path, facts).value_or(std::string()));
                    });
    auto const others = FilesThatDoNotFollow(facts.texts);
    if (others.empty() && !replaced) {
        return;
    }
    if (facts.profiles.empty()) {
        plan.notes.push_back("pam-auth-update has no profile that leads services to the policy: "
                             "include '" +
                             std::string(Paths::PAMPolicyName) + "' where users log in");
        return;
    }
    plan.profilesOn = facts.profiles;
    if (replaced && !facts.asked.replacedProfile.empty()) {
        plan.profilesOff.push_back(facts.asked.replacedProfile);
    }
}

} // namespace

ProviderSetup ReadProviderSetup(std::string_view text) {
    ProviderSetup setup;
    for (auto const* const facility : PAMFacilities) {
        if (auto const line = ValueOf(std::string("policy-") + facility, text)) {
            setup.policyLines.push_back(std::string(facility) + "\t" + *line);
        }
    }
    setup.replacedProfile = ValueOf("replaced-profile", text).value_or("");
    setup.replacedModule = ValueOf("replaced-module", text).value_or("");
    setup.replacedService = ValueOf("replaced-service", text).value_or("");
    base::ForEachAssignment(text, [&](base::Assignment const& assignment) {
        if (assignment.key == "join-writes") {
            setup.joinPaths.emplace_back(assignment.value);
        }
    });
    return setup;
}

std::vector<std::string> SetupPaths() {
    std::vector<std::string> paths = {Paths::AuthenticationConfiguration,
                                      Paths::ProviderConfiguration, Paths::AccessRules,
                                      Paths::PAMPolicy, Paths::NSSConfiguration};
    paths.insert(paths.end(), std::begin(Paths::ServicePolicies), std::end(Paths::ServicePolicies));
    return paths;
}

bool SetupPlan::Changes() const {
    return !links.empty() || !profilesOn.empty() ||
           std::any_of(files.begin(), files.end(),
                       [](FileChange const& change) { return change.Changes(); });
}

SetupPlan MakeSetupPlan(SetupFacts const& facts) {
    SetupPlan plan;
    plan.files = {PlanRecord(facts), PlanProvider(facts), PlanAccessRules(facts),
                  PlanPolicy(facts)};
    auto const& services = TextOf(Paths::NSSConfiguration, facts);
    if (services && !facts.asked.replacedService.empty()) {
        plan.files.push_back(PlanNSS(*services, facts.asked.replacedService));
    }
    plan.links = facts.missingLinks;
    plan.linkTarget = facts.moduleFolder;
    PlanServices(facts, plan);
    return plan;
}

bool AsksAccessRules(PAMMeaning const& policy) {
    return StackAsksAccessRules(PAMStackOf(policy, "auth")) &&
           StackAsksAccessRules(PAMStackOf(policy, "account"));
}

std::string PolicyWith(std::vector<std::string> const& lines, std::string_view policy) {
    std::string out(policy);
    for (auto line = lines.rbegin(); line != lines.rend(); ++line) {
        auto const facility = line->substr(0, line->find('\t') + 1);
        auto const first = out.find("\n" + facility);
        out.insert(first == std::string::npos ? out.size() : first + 1, *line + "\n");
    }
    return out;
}

std::vector<std::string> FilesThatFollow(PolicyTexts const& policies) {
    std::vector<std::string> files;
    for (auto const& [path, text] : policies) {
        if (text && Follows(*text)) {
            files.push_back(path);
        }
    }
    return files;
}

std::vector<std::string>
FilesThatDoNotFollow(std::map<std::string, std::optional<std::string>> const& texts) {
    std::vector<std::string> others;
    for (auto const* const path : Paths::ServicePolicies) {
        auto const found = texts.find(path);
        if (found != texts.end() && found->second && !Follows(*found->second)) {
            others.push_back(path);
        }
    }
    return others;
}

} // namespace tessel::tslauthctl
