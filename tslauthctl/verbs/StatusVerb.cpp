// SPDX-License-Identifier: Apache-2.0
#include "analysis/Agreement.h"
#include "analysis/Failures.h"
#include "analysis/Findings.h"
#include "analysis/HostFile.h"
#include "analysis/JoinedDomain.h"
#include "analysis/KnownStores.h"
#include "analysis/Policies.h"
#include "analysis/ProviderCheck.h"
#include "analysis/ProviderOnHost.h"
#include "history/Confirmation.h"
#include "verbs/Verbs.h"

#include <tslauth/ActiveDirectoryStore.h>
#include <tslauth/AuthenticationConfiguration.h>
#include <tslauth/Exceptions.h>

#include <tslauth/Paths.h>

#include <optional>
#include <unistd.h>

namespace tessel::tslauthctl {

namespace {

using namespace authentication;

/// For people, where the JSON word is terse.
std::string Text(Agreement agreement) {
    switch (agreement) {
    case Agreement::inStep:
        return "in step";
    case Agreement::partly:
        return "partly in step";
    case Agreement::notAtAll:
        return "not in step at all";
    case Agreement::unknown:
        break;
    }
    return "cannot be told";
}

/// Describes one of the system files.
/// @param parts from its text, or what stands for them where there is none
template <typename Parts>
Agreement DescribeFile(char const* path, bool providerKnown, Parts const& parts,
                       std::vector<Part> const& unknown, Console& console) {
    auto found = unknown;
    nlohmann::json error = nullptr;
    if (providerKnown) {
        try {
            found = parts(ReadHostFile(path));
        } catch (IOError const& e) {
            error = e.what();
        }
    }
    auto const agreement = Together(found);
    console.Line(std::string(path) + ": " + Text(agreement));
    auto described = nlohmann::json::array();
    for (auto const& part : found) {
        described.push_back({{"name", part.name}, {"state", Word(part.agreement)}});
        if (agreement == Agreement::partly) {
            console.Line("  " + part.name + ": " + Text(part.agreement));
        }
    }
    if (!error.is_null()) {
        console.Warning("  " + error.get<std::string>());
    }
    console.Document()["files"].push_back(
        {{"path", path}, {"state", Word(agreement)}, {"parts", described}, {"error", error}});
    return agreement;
}

/// Asks the provider what it takes a while to tell.
void AskProvider(StatusArguments const& arguments, HostFacts& facts, Console& console) {
    try {
        auto const provider = OpenProvider();
        auto const domain = Explaining(Account::none, [&] {
            return Ask(console, "the provider to name the host's domain", arguments.limit,
                       [provider] { return provider->GetActiveDomain(); });
        });
        facts.joined = !domain.DNSName().empty() || !domain.NetBIOSName().empty();
        if (arguments.deep && *facts.joined) {
            facts.trustState = Explaining(Account::none, [&] {
                return Ask(console, "the provider's answer about the state of the trust",
                           arguments.limit, [provider] { return provider->GetDomainTrustState(); });
            });
        }
    } catch (Failure const& e) {
        if (e.ExceptionClass() != ClassName(CallNotImplementedException())) {
            facts.notTold = std::string("the provider does not tell about the domain: ") + e.what();
        }
    }
}

void Describe(std::vector<Finding> const& findings, Console& console) {
    auto& list = console.Document()["findings"] = nlohmann::json::array();
    for (auto const& finding : findings) {
        list.push_back(
            {{"word", finding.word}, {"text", finding.text}, {"advice", finding.advice}});
        if (finding.word == "not-looked-at") {
            console.Note(finding.text);
            continue;
        }
        console.Warning(finding.word + ": " + finding.text);
        if (!finding.advice.empty()) {
            console.Line("  see: " + finding.advice);
        }
    }
}

/// The change that waits to be confirmed.
void DescribeConfirmation(Console& console) {
    if (geteuid() != 0) {
        return;
    }
    auto const open = OpenConfirmation();
    if (!open) {
        return;
    }
    auto const left = SecondsLeft(*open);
    console.Document()["confirm"] = {{"number", open->number}, {"seconds", left}};
    console.Warning("Change " + std::to_string(open->number) + " is undone in " +
                    std::to_string(left) + " seconds, unless 'tslauthctl confirm' keeps it");
}

/// How the command ends by what was found beside the two files.
ExitCode ExitCodeOf(std::vector<Finding> const& findings) {
    auto code = ExitCode::done;
    for (auto const& finding : findings) {
        if (finding.word == "not-joined") {
            code = code == ExitCode::done ? ExitCode::notJoined : code;
        } else if (finding.word == "trust" || finding.word == "not-told") {
            code = code == ExitCode::done ? ExitCode::untrusted : code;
        } else if (finding.word != "not-looked-at") {
            return ExitCode::drift;
        }
    }
    return code;
}

} // namespace

ExitCode RunStatus(StatusArguments const& arguments, Console& console) {
    auto const recorded = RecordedStore();
    bool const isKnown = IsKnownStore(recorded);
    bool const wanted = recorded == ActiveDirectory;
    auto& document = console.Document();
    document["recorded"] = recorded;
    document["known"] = isKnown;
    console.Line("store: " + recorded + (isKnown ? "" : " (unknown to the library)"));

    auto const name = ProviderName();
    auto& provider = document["provider"] = {{"name", nullptr},
                                             {"loaded", false},
                                             {"pam_module", nullptr},
                                             {"nss_module", nullptr},
                                             {"error", nullptr}};
    if (!name.empty()) {
        provider["name"] = name;
    }
    std::optional<ProviderEntries> entries;
    std::vector<std::string> warnings;
    std::string const shown = name.empty() ? "none" : name;
    try {
        CheckProvider();
        entries = ActiveDirectoryStore(0).GetProviderEntries();
        provider["loaded"] = true;
        provider["pam_module"] = entries->pam.module();
        provider["nss_module"] = entries->nss.module();
        console.Line("provider: " + shown);
        warnings = MissingModules(*entries);
    } catch (std::exception const& e) {
        provider["error"] = {{"message", e.what()}, {"exception", ClassName(e)}};
        console.Line("provider: " + shown +
                     (name.empty() ? " (provider.conf names none, or is missing)"
                                   : std::string(" (cannot be loaded: ") + e.what() + ")"));
        console.Line("Without the provider it cannot be told whether the files agree with the "
                     "store.");
    }

    document["files"] = nlohmann::json::array();
    auto const pam = DescribeFile(
        Paths::PAMPolicy, entries.has_value(),
        [&](std::string const& text) { return PAMParts(text, entries->pam, wanted); },
        UnknownPAMParts(), console);
    auto const nss = DescribeFile(
        Paths::NSSConfiguration, entries.has_value(),
        [&](std::string const& text) { return NSSParts(text, entries->nss, wanted); },
        UnknownNSSParts(), console);

    HostFacts facts;
    facts.wanted = wanted;
    facts.root = geteuid() == 0;
    facts.configured = entries;
    facts.inserted = InsertedOnHost();
    facts.policies = PoliciesOnHost();
    facts.nameServices = HostFileOrNothing(Paths::NSSConfiguration);
    facts.missingModules = warnings;
    if (wanted && entries) {
        AskProvider(arguments, facts, console);
    }
    if (wanted && !warnings.empty()) {
        console.Document()["warnings"] = warnings;
    }
    auto const findings = FindingsOf(facts);
    Describe(findings, console);
    DescribeConfirmation(console);
    auto const drifts = [](Agreement agreement) {
        return agreement == Agreement::partly || agreement == Agreement::notAtAll;
    };
    if (!isKnown || drifts(pam) || drifts(nss)) {
        return ExitCode::drift;
    }
    // A host that wants no provider is well without one. Where one is named, its entries may have
    // been left in the files, and that nobody can tell is no good news.
    auto const found = ExitCodeOf(findings);
    if (!entries && found == ExitCode::done) {
        return wanted || !name.empty() ? ExitCode::refused : ExitCode::done;
    }
    bool const unread = pam == Agreement::unknown || nss == Agreement::unknown;
    return unread && entries ? ExitCode::failure : found;
}

} // namespace tessel::tslauthctl
