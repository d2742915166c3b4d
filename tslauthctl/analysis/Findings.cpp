// SPDX-License-Identifier: Apache-2.0
#include "analysis/Findings.h"

#include "analysis/TrustWord.h"
#include "setup/SetupPlan.h"

#include <tslauth/Paths.h>

#include <base/AsciiText.h>
#include <meaning/NSSMeaning.h>
#include <meaning/PAMMeaning.h>

#include <algorithm>
#include <sstream>

namespace tessel::tslauthctl {

namespace {

using namespace authentication;
using namespace meaning;

constexpr char SambaModule[] = "pam_winbind.so";
constexpr char SambaService[] = "winbind";

std::string BaseName(std::string const& path) {
    return path.substr(path.rfind('/') + 1);
}

template <typename Value> std::string Printed(Value const& value) {
    std::ostringstream text;
    text << value;
    return text.str();
}

bool NamesModule(std::string const& policy, std::string const& module) {
    auto const lines = ReadPAMMeaning(policy).lines;
    return std::any_of(lines.begin(), lines.end(),
                       [&](PAMLine const& line) { return BaseName(line.module) == module; });
}

/// Whether an activation's entry stands in any facility. The policy may ask the same module
/// otherwise, whichever store is active: that is for the provider to say.
bool HasEntry(std::string const& policy, SystemConfiguration::PAMEntry const& entry) {
    auto const lines = ReadPAMMeaning(policy).lines;
    auto const text = Printed(entry);
    return std::any_of(lines.begin(), lines.end(), [&](PAMLine const& line) {
        return line == ReadPAMEntry(line.facility, text);
    });
}

bool AsksService(std::string const& text, NSSServices const& sought) {
    auto const meaning = ReadNSSMeaning(text);
    auto const databases = EditedDatabases();
    return !sought.empty() &&
           std::any_of(databases.begin(), databases.end(), [&](auto const& name) {
               auto const services = EffectiveNSSServices(meaning, name).value_or(NSSServices());
               return std::search(services.begin(), services.end(), sought.begin(), sought.end()) !=
                      services.end();
           });
}

/// Providers whose entries have no business in the files.
EntriesList Unwanted(HostFacts const& facts) {
    auto entries = facts.inserted;
    if (!facts.configured) {
        return facts.wanted ? EntriesList() : entries;
    }
    entries = Without(entries, *facts.configured);
    if (!facts.wanted) {
        entries.push_back(*facts.configured);
    }
    return entries;
}

void AddEntriesLeft(HostFacts const& facts, std::vector<Finding>& findings) {
    std::string const advice =
        facts.wanted ? "tslauthctl activate 'Active Directory'" : "tslauthctl activate None";
    for (auto const& each : Unwanted(facts)) {
        auto const module = BaseName(each.pam.module());
        for (auto const& [path, text] : facts.policies) {
            bool const own = path == Paths::PAMPolicy;
            if (text && (own ? HasEntry(*text, each.pam) : NamesModule(*text, module))) {
                auto found = path;
                found += " still has entries of '" + module;
                found += "', which the recorded store does not want";
                findings.push_back({"entries-left", found, own ? advice : ""});
            }
        }
        auto const service = ReadNSSServices(Printed(each.nss));
        if (facts.nameServices && AsksService(*facts.nameServices, service)) {
            findings.push_back({"entries-left",
                                std::string(Paths::NSSConfiguration) + " still has the service '" +
                                    each.nss.module() + "', which the recorded store does not want",
                                advice});
        }
    }
}

void AddServices(HostFacts const& facts, std::vector<Finding>& findings) {
    for (auto const& path : FilesThatDoNotFollow(facts.policies)) {
        findings.push_back({"services-not-following",
                            "services that include " + path +
                                " do not follow the policy, so that "
                                "no user of the domain logs in by them",
                            "tslauthctl setup"});
    }
}

/// Debian's own profile lets a domain's users in beside the policy, and asks them about local
/// names.
void AddSambaProfile(HostFacts const& facts, std::vector<Finding>& findings) {
    for (auto const& [path, text] : facts.policies) {
        if (text && path != Paths::PAMPolicy && NamesModule(*text, SambaModule)) {
            findings.push_back({"samba-profile",
                                path + " asks " + SambaModule + " itself, beside the policy",
                                "pam-auth-update --remove winbind"});
        }
    }
}

/// Debian's package of it puts it in whenever it is installed. It knows nothing of local names.
void AddSambaService(HostFacts const& facts, std::vector<Finding>& findings) {
    bool const own = facts.configured && facts.configured->nss.module() == SambaService;
    if (!own && facts.nameServices &&
        AsksService(*facts.nameServices, ReadNSSServices(SambaService))) {
        findings.push_back({"samba-service",
                            std::string(Paths::NSSConfiguration) + " asks Samba's service '" +
                                SambaService + "' itself, beside the provider's",
                            "tslauthctl setup"});
    }
}

void AddMembership(HostFacts const& facts, std::vector<Finding>& findings) {
    if (facts.wanted && facts.joined == false) {
        findings.push_back({"not-joined",
                            "'Active Directory' is active, and the host is joined to no domain",
                            "tslauthctl join"});
    }
    if (facts.trustState && *facts.trustState != 0) {
        findings.push_back({"trust",
                            "the trust in the domain is not in order: " +
                                std::string(TrustWord(*facts.trustState)) + " (" +
                                std::to_string(*facts.trustState) + ")",
                            "tslauthctl info"});
    }
    if (!facts.notTold.empty()) {
        findings.push_back({"not-told", facts.notTold, ""});
    }
}

} // namespace

std::vector<Finding> FindingsOf(HostFacts const& facts) {
    std::vector<Finding> findings;
    AddEntriesLeft(facts, findings);
    if (facts.wanted) {
        AddServices(facts, findings);
        AddSambaProfile(facts, findings);
        AddSambaService(facts, findings);
        for (auto const& module : facts.missingModules) {
            findings.push_back({"module-missing", module, ""});
        }
    }
    AddMembership(facts, findings);
    if (!facts.root) {
        findings.push_back(
            {"not-looked-at", "not looked at, since that needs root: what only root may read", ""});
    }
    return findings;
}

} // namespace tessel::tslauthctl
