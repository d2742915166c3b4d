// SPDX-License-Identifier: Apache-2.0
#include "analysis/Prepare.h"

#include <tslauth/Paths.h>
#include <tslauth/systemconfiguration/NSSDatabase.h>

#include <base/AsciiText.h>
#include <meaning/NSSMeaning.h>

#include <algorithm>

namespace tessel::tslauthctl {

namespace {

using namespace authentication;
using namespace base::AsciiText;
using namespace meaning;

/// Whether the library puts its service into a database. A file without a line for such a one gets
/// a line that names the provider alone.
bool IsEdited(std::string const& database) {
    auto const edited = EditedDatabases();
    return std::find(edited.begin(), edited.end(), database) != edited.end();
}

/// Whether the last of several lines for a database is known to be the one that applies.
bool LastLineApplies(std::string const& database) {
    static constexpr std::string_view readByTheCLibrary[] = {
        "aliases",  "ethers",   "group",  "group_compat",  "gshadow",   "hosts",
        "netgroup", "networks", "passwd", "passwd_compat", "protocols", "publickey",
        "rpc",      "services", "shadow", "shadow_compat", "initgroups"};
    return std::find(std::begin(readByTheCLibrary), std::end(readByTheCLibrary), database) !=
           std::end(readByTheCLibrary);
}

bool LibraryKnows(std::string const& database) {
    try {
        SystemConfiguration::NSSDatabase const known(database);
        return true;
    } catch (SystemConfiguration::InvalidDatabaseException const&) {
        return false;
    }
}

/// Whether the library carries `text` through an activation and back, and what gets lost if not.
bool Carries(std::string const& text, ProviderEntries const& provider,
             std::vector<std::string>* losses = nullptr) {
    std::vector<std::string> found;
    try {
        found = ActivationPlan::Activating(provider, {})
                    .PreviewOf(Paths::NSSConfiguration, [&](std::string const&) { return text; })
                    .losses;
    } catch (std::exception const& e) {
        found.emplace_back(e.what());
    }
    if (losses != nullptr) {
        *losses = found;
    }
    return found.empty();
}

/// The same for one line, among lines that give no trouble.
bool CarriesLine(std::string const& line, std::string const& database,
                 ProviderEntries const& provider) {
    std::string text;
    for (auto const& edited : EditedDatabases()) {
        if (edited != database) {
            text += edited;
            text += ": files\n";
        }
    }
    return Carries(text + line + "\n", provider);
}

/// The forms that keep the services, the most usual first.
std::vector<std::string> Forms(NSSLine const& line) {
    auto services = line.services;
    std::vector<std::string> forms;
    auto const plain = line.database + ":" + (services.empty() ? "" : " ") + NSSText(services);
    forms.push_back(plain);
    if (services.empty()) {
        return forms;
    }
    // What the last service does on its status makes no difference.
    auto shorter = services;
    shorter.back().actions = DefaultNSSActions;
    forms.push_back(line.database + ": " + NSSText(shorter));

    // The C library needs no blank around a bracket; to the library the whole is then one word,
    // which it carries as it stands. A bracket with the default action keeps two services apart.
    if (SameEffect(shorter, services)) {
        services = shorter;
    }
    std::size_t glued = 0;
    for (std::size_t i = 0; i < services.size(); ++i) {
        glued = services[i].actions == DefaultNSSActions ? glued : i + 1;
    }
    std::string text = line.database + ":";
    for (std::size_t i = 0; i < services.size(); ++i) {
        auto const criterion = OneCriterion(services[i].actions);
        if (!criterion) {
            return forms;
        }
        text += i == 0 || i >= glued ? " " : "";
        text += services[i].name;
        if (i < glued) {
            text += criterion->empty() ? "[SUCCESS=return]" : *criterion;
        }
    }
    forms.push_back(text);
    return forms;
}

std::string WithoutLineEnd(std::string_view line) {
    return std::string(line.substr(0, line.find('\n')));
}

std::string WithoutTrailingSpace(std::string_view line) {
    while (!line.empty() && IsSpace(line.back())) {
        line.remove_suffix(1);
    }
    return std::string(line);
}

class NSSPreparation {
public:
    NSSPreparation(std::string_view text, ProviderEntries const& provider, bool acceptLoss)
        : _provider(provider), _acceptLoss(acceptLoss), _meaning(ReadNSSMeaning(text)) {
        for (auto const line : Lines(text)) {
            _parsed.push_back(ReadNSSLine(line));
            if (_parsed.back()) {
                _lastLine[_parsed.back()->database] = _parsed.size();
            }
        }
        std::size_t number = 0;
        for (auto const line : Lines(text)) {
            _number = ++number;
            _raw = line;
            _before = WithoutLineEnd(line);
            if (_parsed[number - 1]) {
                PrepareLine(*_parsed[number - 1]);
            } else {
                PrepareRest();
            }
        }
        AddMissing();
        std::vector<std::string> losses;
        if (_result.impossible.empty() && !Carries(_result.text, _provider, &losses)) {
            for (auto& loss : losses) {
                _result.impossible.push_back({0, {}, {}, std::move(loss)});
            }
        }
    }

    Prepared Take() {
        return std::move(_result);
    }

private:
    void Keep() {
        _result.text += _raw;
    }

    void Replace(std::string const& line, std::string reason) {
        _result.text += line;
        if (_raw.back() == '\n') {
            _result.text += '\n';
        }
        _result.edits.push_back({_number, _before, line, std::move(reason)});
    }

    void Drop(std::string reason) {
        _result.edits.push_back({_number, _before, {}, std::move(reason)});
    }

    void GiveUp(std::string reason) {
        _result.impossible.push_back({_number, _before, {}, std::move(reason)});
    }

    void KeepUnlessAccepted() {
        if (_acceptLoss) {
            Drop("the library cannot carry it, and its loss was accepted");
        } else {
            Keep();
        }
    }

    /// A line without a meaning to the C library.
    void PrepareRest() {
        if (_raw.front() == '#' || _raw.find_first_not_of(" \t\r\n") == std::string_view::npos) {
            Keep();
        } else if (IsBlank(_raw)) {
            Drop("the library takes this blank line for a database");
        } else if (auto const start = _before.find_first_not_of(" \t\r\v\f");
                   _before[start] == '#') {
            Replace(_before.substr(start), "the library takes an indented comment for a database");
        } else {
            Replace("#" + _before, "the system reads nothing from this line, and the library would "
                                   "refuse it");
        }
    }

    void PrepareLine(NSSLine const& line) {
        if (_number != _lastLine[line.database]) {
            PrepareSuperseded(line);
        } else if (line.faulty) {
            Keep();
            GiveUp("the C library does not understand the criterion, and with it no look-up works");
        } else if (!LibraryKnows(line.database)) {
            PrepareUnknown(line);
        } else if (CarriesLine(_before, line.database, _provider)) {
            Keep();
        } else {
            Rewrite(line);
        }
    }

    void PrepareSuperseded(NSSLine const& line) {
        auto const& last = _parsed[_lastLine[line.database] - 1];
        if (LastLineApplies(line.database) || SameEffect(line.services, last->services)) {
            Drop("line " + std::to_string(_lastLine[line.database]) + " for '" + line.database +
                 "' applies, and the library would merge the two");
            return;
        }
        GiveUp("the library would merge this line with line " +
               std::to_string(_lastLine[line.database]) + ", and who reads '" + line.database +
               "' decides which of them applies");
        KeepUnlessAccepted();
    }

    void PrepareUnknown(NSSLine const& line) {
        auto const usual = DefaultNSSServices(line.database);
        if (usual && SameEffect(*usual, line.services)) {
            Drop("the library refuses the database '" + line.database + "'; without the line '" +
                 NSSText(*usual) + "' is asked all the same");
            return;
        }
        GiveUp("the library refuses the database '" + line.database + "', and without the line " +
               (usual ? "'" + NSSText(*usual) + "' would be asked instead of '" +
                            NSSText(line.services) + "'"
                      : "'" + NSSText(line.services) + "' would no longer be asked"));
        KeepUnlessAccepted();
    }

    void Rewrite(NSSLine const& line) {
        auto forms = Forms(line);
        forms.insert(forms.begin(), WithoutTrailingSpace(_before));
        for (auto const& form : forms) {
            auto const read = ReadNSSLine(form);
            if (read && read->database == line.database &&
                SameEffect(read->services, line.services) &&
                CarriesLine(form, line.database, _provider)) {
                Replace(form, Reason(line));
                return;
            }
        }
        GiveUp(Obstacle(line));
        auto names = line;
        for (auto& service : names.services) {
            service.actions = DefaultNSSActions;
        }
        auto const form = Forms(names).front();
        if (_acceptLoss && CarriesLine(form, line.database, _provider)) {
            Replace(form, "without its actions, as accepted");
        } else {
            Keep();
        }
    }

    /// Why no form of the line is carried.
    static std::string Obstacle(NSSLine const& line) {
        if (line.services.empty()) {
            return "the library drops a line without services, and '" + line.database +
                   "' is then asked by default";
        }
        if (IsEdited(line.database)) {
            return "the library puts its service before '" + NSSText(line.services) +
                   "', and then drops the services that stand before a bracket";
        }
        return "'" + NSSText(line.services) +
               "' cannot be written without a blank in a bracket, and the library drops the "
               "services around one";
    }

    std::string Reason(NSSLine const& line) const {
        if (!line.colon) {
            return "the library wants the colon directly after '" + line.database + "'";
        }
        for (auto const& service : line.services) {
            if (!(service.actions == DefaultNSSActions)) {
                return "the library drops the services around a bracket";
            }
        }
        if (WithoutTrailingSpace(_before) != _before) {
            return "the library fails on a blank at the end of the line";
        }
        return "the library reads the line otherwise than the system does";
    }

    /// Where a database that the library edits has no line, the line that it is taken to have.
    void AddMissing() {
        for (auto const& name : EditedDatabases()) {
            auto const usual = DefaultNSSServices(name);
            if (_meaning.databases.count(name) != 0 || !usual) {
                continue;
            }
            auto const line = name + ": " + NSSText(*usual);
            if (!_result.text.empty() && _result.text.back() != '\n') {
                _result.text += '\n';
            }
            _result.text += line + "\n";
            _result.edits.push_back({_parsed.size() + 1,
                                     {},
                                     line,
                                     "the library would add a line that names the provider alone"});
        }
    }

    ProviderEntries const& _provider;
    bool _acceptLoss;
    NSSMeaning _meaning;
    std::vector<std::optional<NSSLine>> _parsed;
    std::map<std::string, std::size_t> _lastLine;
    std::size_t _number = 0;
    std::string_view _raw;
    std::string _before;
    Prepared _result;
};

} // namespace

Prepared PrepareNSS(std::string_view text, ProviderEntries const& provider, bool acceptLoss) {
    return NSSPreparation(text, provider, acceptLoss).Take();
}

ProviderEntries PlaceholderEntries() {
    return MakeProviderEntries("pam_provider.so", {}, "provider", {});
}

} // namespace tessel::tslauthctl
