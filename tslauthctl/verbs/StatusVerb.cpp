// SPDX-License-Identifier: Apache-2.0
#include "analysis/Agreement.h"
#include "analysis/Failures.h"
#include "analysis/HostFile.h"
#include "analysis/KnownStores.h"
#include "analysis/ProviderOnHost.h"
#include "verbs/Verbs.h"

#include <tslauth/ActiveDirectoryStore.h>
#include <tslauth/AuthenticationConfiguration.h>
#include <tslauth/Exceptions.h>

#include <tslauth/Paths.h>

#include <optional>

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

} // namespace

ExitCode RunStatus(Console& console) {
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

    if (wanted) {
        console.Warnings(warnings);
    }
    auto const drifts = [](Agreement agreement) {
        return agreement == Agreement::partly || agreement == Agreement::notAtAll;
    };
    if (!isKnown || drifts(pam) || drifts(nss)) {
        return ExitCode::drift;
    }
    // A host that wants no provider is well without one. Where one is named, its entries may have
    // been left in the files, and that nobody can tell is no good news.
    if (!entries) {
        return wanted || !name.empty() ? ExitCode::refused : ExitCode::done;
    }
    bool const unread = pam == Agreement::unknown || nss == Agreement::unknown;
    return unread ? ExitCode::failure : ExitCode::done;
}

} // namespace tessel::tslauthctl
