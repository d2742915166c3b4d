// SPDX-License-Identifier: Apache-2.0
#include "text/SambaDomain.h"

#include "Failure.h"
#include "text/SambaLines.h"

#include <algorithm>
#include <base/AsciiText.h>
#include <cstddef>
#include <cstdint>
#include <utility>

using namespace tessel::base::AsciiText;

namespace tessel::winbind {

namespace {

constexpr std::string_view Header = "[global]";

void CheckValue(std::string const& value) {
    if (HasControlCharacters(value)) {
        throw Failure(TSLAUTH_PROVIDER_INVALID_PARAMETER,
                      "a control character in a setting for smb.conf");
    }
}

/// A file of one section.
class GlobalSection {
public:
    explicit GlobalSection(std::string comment) : _text(std::move(comment)) {
        _text += Header;
        _text += '\n';
    }

    void Add(std::string const& name, std::string const& value) {
        CheckValue(name);
        CheckValue(value);
        _text += '\t' + name + " = " + value + '\n';
    }

    std::string& Text() {
        return _text;
    }

private:
    std::string _text;
};

std::string PasswordServers(std::vector<std::string> const& controllers) {
    std::string servers;
    for (auto const& controller : controllers) {
        servers += controller + ' ';
    }
    return servers + '*';
}

/// What holds for a joined host and for one that is being joined.
void AddMembership(GlobalSection& section, SambaDomain const& domain, bool keytab) {
    section.Add("workgroup", domain.workgroup);
    section.Add("realm", domain.realm);
    section.Add("netbios name", domain.netbiosName);
    section.Add("security", "ads");
    section.Add("server role", "member server");
    section.Add("kerberos method", keytab ? "secrets and keytab" : "secrets only");
    if (!domain.preferredControllers.empty()) {
        section.Add("password server", PasswordServers(domain.preferredControllers));
    }
}

/// A million numbers for each domain, as many as a domain has in practice.
constexpr std::uint64_t RangeSize = 1000000;

constexpr std::uint64_t LastNumber = 0xFFFFFFFE; // (uid_t)-1 means "no user"

/// The first free range, and takes it; nothing where none is free.
std::optional<SambaSettings::Range> TakeRange(std::vector<SambaSettings::Range>& taken) {
    SambaSettings::Range range{RangeSize, 2 * RangeSize - 1};
    auto const overlaps = [&](SambaSettings::Range const& other) {
        return range.first <= other.last && other.first <= range.last;
    };
    while (std::any_of(taken.begin(), taken.end(), overlaps)) {
        range.first += RangeSize;
        range.last += RangeSize;
        if (range.last > LastNumber) {
            return std::nullopt;
        }
    }
    taken.push_back(range);
    return range;
}

void AddIdmap(GlobalSection& section, std::string const& domain, std::string const& backend,
              std::vector<SambaSettings::Range>& taken) {
    auto const range = TakeRange(taken);
    if (!range) {
        return; // a range that overlaps another would stop winbindd from giving any number
    }
    std::string const family = "idmap config " + domain + " : ";
    section.Add(family + "backend", backend);
    section.Add(family + "range", std::to_string(range->first) + '-' + std::to_string(range->last));
}

void AddIdmaps(GlobalSection& section, std::string const& workgroup,
               SambaSettings const& administrator) {
    auto ranges = administrator.IdmapRanges();
    if (!administrator.SetsIdmapOf("*")) {
        AddIdmap(section, "*", "tdb", ranges);
    } else if (auto const backend = administrator.Value("idmap config * : backend");
               backend && EqualsIgnoringCase(*backend, "autorid")) {
        return; // it gives every domain a range of its own
    }
    if (!administrator.SetsIdmapOf(workgroup)) {
        AddIdmap(section, workgroup, "rid", ranges);
    }
}

std::vector<std::string> ReadControllers(std::string_view servers) {
    std::vector<std::string> controllers;
    for (auto word = TakeWord(servers); !word.empty(); word = TakeWord(servers)) {
        if (word != "*") {
            controllers.emplace_back(word);
        }
    }
    return controllers;
}

} // namespace

std::string SambaDomainText(SambaDomain const& domain, SambaSettings const& administrator,
                            ProviderOptions const& options) {
    GlobalSection section(
        "# Written by tslauth when the host joined its domain, and again at every change of it.\n"
        "# Settings of your own belong into smb.conf: those of the first block are overruled "
        "here,\n"
        "# one of the second block is left to smb.conf, from the next join on, once it is set "
        "there.\n");
    AddMembership(section, domain, options.keytab);
    // A controller that does not answer must not hold up questions for winbindd's whole minute.
    section.Add("winbind request timeout", "5");
    // One that is back must not go unnoticed for half a minute.
    section.Add("winbind reconnect delay", "5");
    // It works without: winbindd meets a trusted domain when it is asked for one of its users. With
    // it, all of winbindd waits while it looks for the controllers of those domains, which may be
    // silent, and everybody's log-in waits with it, root's too.
    section.Add("winbind scan trusted domains", "no");
    section.Add("winbind use default domain", options.shortNames ? "yes" : "no");
    section.Add("winbind offline logon", options.offlineLogIn ? "yes" : "no");
    section.Text() += '\n';

    auto const unlessSet = [&](char const* name, std::string const& value) {
        if (!administrator.Sets(name)) {
            section.Add(name, value);
        }
    };
    // Nobody answers broadcasts for a domain of this kind; waiting for them would only take time.
    unlessSet("disable netbios", "yes");
    unlessSet("name resolve order", "host");
    unlessSet("template shell", options.loginShell);
    unlessSet("template homedir", options.homeFolder);
    AddIdmaps(section, domain.workgroup, administrator);

    if (administrator.Sets("winbind separator")) {
        // A backslash stands for itself only where nothing at all follows it.
        section.Text() += "\n# As above; in the last line, without a line end, because a backslash "
                          "there would be lost.\n\twinbind separator = \\";
    }
    return std::move(section.Text());
}

std::string StagedSambaDomainText(SambaDomain const& domain, std::string const& directory) {
    GlobalSection section("");
    // An offline join crashes where it is to write a keytab.
    AddMembership(section, domain, false);
    section.Add("disable netbios", "yes"); // broadcasts would only take time
    section.Add("name resolve order", "host");
    section.Add("private dir", directory + "/private");
    section.Add("state directory", directory + "/state");
    section.Add("cache directory", directory + "/cache");
    section.Add("lock directory", directory + "/lock");
    section.Add("pid directory", directory + "/lock");
    section.Add("binddns dir", directory + "/binddns");
    section.Add("ncalrpc dir", directory + "/ncalrpc");
    section.Add("winbindd socket directory", directory + "/winbindd");
    section.Add("log file", directory + "/log");
    return std::move(section.Text());
}

std::vector<std::string> StagingDirectories(std::string const& directory) {
    std::vector<std::string> directories;
    for (char const* const name :
         {"/private", "/state", "/cache", "/lock", "/binddns", "/ncalrpc", "/winbindd"}) {
        directories.push_back(directory + name);
    }
    return directories;
}

std::optional<SambaDomain> ReadSambaDomain(std::string_view text) {
    SambaSettings const settings(text);
    auto const value = [&](char const* name) { return settings.Value(name).value_or(""); };
    SambaDomain domain{value("realm"), value("workgroup"), value("netbios name"),
                       ReadControllers(value("password server"))};
    if (domain.realm.empty() || domain.workgroup.empty()) {
        return std::nullopt;
    }
    return domain;
}

bool LetsInOffLine(std::string_view text) {
    return SambaSettings(text).Value("winbind offline logon") == "yes";
}

std::string WithPreferredControllers(std::string_view text,
                                     std::vector<std::string> const& controllers) {
    std::string setting;
    if (!controllers.empty()) {
        setting = PasswordServers(controllers);
        CheckValue(setting);
        setting = "\tpassword server = " + setting + '\n';
    }
    std::string result(text);
    auto const lines = SambaLines(text);
    std::size_t header = std::string::npos;
    std::size_t membership = std::string::npos;
    std::size_t replaced = std::string::npos;
    for (std::size_t i = lines.size(); i-- > 0;) {
        if (lines[i].kind == SambaLine::Kind::section) {
            header = lines[i].end;
        } else if (lines[i].name == "kerberosmethod") {
            membership = lines[i].end;
        } else if (lines[i].name == "passwordserver") {
            replaced = lines[i].begin;
            result.erase(replaced, lines[i].end - replaced);
        }
    }
    // Where the setting was; else where it would be; else anywhere in the section.
    for (std::size_t const place : {replaced, membership, header}) {
        if (place != std::string::npos) {
            return result.insert(place, setting);
        }
    }
    return result;
}

} // namespace tessel::winbind
