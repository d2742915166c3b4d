// SPDX-License-Identifier: Apache-2.0
#include "SambaConfiguration.h"

#include "Failure.h"
#include "TextPieces.h"

#include <algorithm>
#include <cstddef>
#include <initializer_list>
#include <utility>

using namespace tessel::winbind::TextPieces;

namespace tessel::winbind {

namespace {

constexpr std::string_view Comment =
    "# Written by tslauth: the domain that this host is joined to. It stays the last of [global].";

/// In place of `Comment` where empty lines had to end a continued one first; with their number in
/// between.
constexpr std::string_view CommentBelowEmptyLines =
    "# Written by tslauth, with empty lines above (";
constexpr std::string_view CommentBelowEmptyLinesEnd = "): the domain that this host is joined to.";

constexpr std::string_view Header = "[global]";

/// A line as Samba sees it: with all the lines that it is continued on.
struct Line {
    enum class Kind { blank, comment, section, parameter };
    Kind kind;
    std::size_t begin;
    std::size_t end;          ///< behind the line feed, if there is one
    bool global;              ///< whether it belongs to a [global] section; its header does
    std::size_t openAtEnd;    ///< how many empty lines it takes to end it, at the end of the text
    std::string name;         ///< of a parameter: in lower case, without blanks
    std::string_view content; ///< of a blank line or a comment, without its line end
    std::string value;        ///< of a parameter
};

std::string NormalisedName(std::string_view name) {
    std::string result;
    for (char const c : name) {
        if (WhiteSpace.find(c) == std::string_view::npos) {
            result += Lower(c);
        }
    }
    return result;
}

/// How many empty lines it takes to end a line that a backslash continues: each of the backslashes
/// that stand at its end then, with blanks or without, continues it once more.
std::size_t EmptyLinesToEnd(std::string_view text) {
    std::size_t lines = 1;
    for (text = TrimmedRight(text); EndsWith(text, "\\"); text = TrimmedRight(text)) {
        text.remove_suffix(1);
        ++lines;
    }
    return lines;
}

/// The text of a line and of those it is continued on. What decides is the end of the whole text so
/// far, so that a backslash that an empty line follows may come to stand there. A run of blanks is
/// one blank.
/// @param openAtEnd as in `Line`
std::string TakeContinuedLine(std::string_view& rest, std::size_t& openAtEnd) {
    std::string text;
    while (!rest.empty()) {
        auto const line = TakeLine(rest);
        for (char const c : line) {
            bool const isBlank = WhiteSpace.find(c) != std::string_view::npos;
            if (!isBlank || (!text.empty() && text.back() != ' ')) {
                text += isBlank ? ' ' : c;
            }
        }
        auto const content = TrimmedRight(text);
        if (!EndsWith(content, "\\")) {
            openAtEnd = 0;
            return text;
        }
        if (rest.empty() && line.back() != '\n') {
            openAtEnd = EmptyLinesToEnd(content) - 1; // the line end itself will count for one
            return text; // a backslash that ends the text stands for itself
        }
        text.resize(content.size() - 1);
        openAtEnd = EmptyLinesToEnd(text);
    }
    return text;
}

std::vector<Line> Lines(std::string_view text) {
    std::vector<Line> lines;
    bool global = true;
    for (auto rest = text; !rest.empty();) {
        Line line{Line::Kind::blank, text.size() - rest.size(), 0, global, 0, {}, {}, {}};
        auto ahead = rest;
        auto const physical = TakeLine(ahead);
        auto const content = Trimmed(physical);
        if (content.empty() || content[0] == '#' || content[0] == ';') {
            line.kind = content.empty() ? Line::Kind::blank : Line::Kind::comment;
            line.content = physical.substr(0, physical.find_last_not_of("\r\n") + 1);
            rest = ahead;
        } else {
            auto const whole = TakeContinuedLine(rest, line.openAtEnd);
            auto const joined = Trimmed(whole);
            if (!joined.empty() && joined[0] == '[') {
                line.kind = Line::Kind::section;
                auto const name = NormalisedName(joined.substr(1, joined.find(']') - 1));
                global = name == "global" || name == "globals";
                line.global = global;
            } else {
                line.kind = Line::Kind::parameter;
                auto const delimiter = joined.find('=');
                if (delimiter != std::string_view::npos) {
                    line.name = NormalisedName(joined.substr(0, delimiter));
                    line.value = Trimmed(joined.substr(delimiter + 1));
                }
            }
        }
        line.end = text.size() - rest.size();
        lines.push_back(std::move(line));
    }
    return lines;
}

bool Includes(Line const& line, std::string_view path) {
    return line.global && line.kind == Line::Kind::parameter && line.name == "include" &&
           line.value == path;
}

/// Behind the last line that says anything in the last [global] section; nothing where no line is
/// in any.
Line const* LastGlobal(std::vector<Line> const& lines) {
    auto const last = std::find_if(lines.rbegin(), lines.rend(), [](Line const& line) {
        return line.global &&
               (line.kind == Line::Kind::section || line.kind == Line::Kind::parameter);
    });
    return last == lines.rend() ? nullptr : &*last;
}

std::optional<std::uint64_t> Number(std::string_view text) {
    if (text.empty() || text.size() > 10 || !std::all_of(text.begin(), text.end(), IsDigit)) {
        return std::nullopt;
    }
    std::uint64_t number = 0;
    for (char const c : text) {
        number = number * 10 + static_cast<std::uint64_t>(c - '0');
    }
    return number;
}

/// How many empty lines a comment of ours says to stand above it; nothing where it is not ours.
std::optional<std::size_t> AddedEmptyLines(std::string_view comment) {
    if (comment == Comment) {
        return 0;
    }
    if (!StartsWith(comment, CommentBelowEmptyLines) ||
        !EndsWith(comment, CommentBelowEmptyLinesEnd)) {
        return std::nullopt;
    }
    comment.remove_prefix(CommentBelowEmptyLines.size());
    auto const lines = Number(comment.substr(0, comment.find(')')));
    return lines ? std::optional(static_cast<std::size_t>(*lines)) : std::nullopt;
}

/// Where what WithSambaInclude() added with the line `include` begins.
std::size_t BeginOfAdded(std::string_view text, std::vector<Line> const& lines,
                         std::size_t include) {
    auto const content = [&](std::size_t back) {
        return include < back ? std::string_view() : lines[include - back].content;
    };
    if (auto const emptyLines = AddedEmptyLines(content(1))) {
        Line const& comment = lines[include - 1];
        std::string_view const lineEnd = LineEnd(text.substr(0, comment.end).substr(comment.begin));
        // Those of the empty lines, and the one that a text without its last one was given.
        std::size_t added = *emptyLines + (text[lines[include].end - 1] == '\n' ? 0 : 1);
        std::size_t begin = comment.begin;
        for (; added > 0 && EndsWith(text.substr(0, begin), lineEnd); --added) {
            begin -= lineEnd.size();
        }
        return begin;
    }
    if (content(2) == Comment && lines[include - 1].kind == Line::Kind::section) {
        Line const& header = lines[include - 1];
        if (TrimmedRight(text.substr(0, header.end).substr(header.begin)) == Header) {
            return lines[include - 2].begin;
        }
    }
    return lines[include].begin;
}

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
void AddMembership(GlobalSection& section, SambaDomain const& domain) {
    section.Add("workgroup", domain.workgroup);
    section.Add("realm", domain.realm);
    section.Add("netbios name", domain.netbiosName);
    section.Add("security", "ads");
    section.Add("server role", "member server");
    // The keytab would be the host's, and Samba's tools may crash on the way to it.
    section.Add("kerberos method", "secrets only");
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

std::optional<SambaSettings::Range> ReadRange(std::string_view text) {
    auto const hyphen = text.find('-');
    if (hyphen == std::string_view::npos) {
        return std::nullopt;
    }
    auto const first = Number(Trimmed(text.substr(0, hyphen)));
    auto const last = Number(Trimmed(text.substr(hyphen + 1)));
    if (!first || !last) {
        return std::nullopt;
    }
    return SambaSettings::Range{*first, *last};
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

constexpr std::string_view OldRangesOfAll[] = {"idmapuid", "idmapgid", "winbinduid", "winbindgid"};

} // namespace

SambaSettings::SambaSettings(std::string_view text) {
    Read(text);
}

void SambaSettings::Read(std::string_view text) {
    for (auto const& line : Lines(text)) {
        if (!line.global || line.name.empty()) {
            continue;
        }
        if (line.name == "include") {
            _includes.push_back(line.value);
        } else {
            _values[line.name] = line.value;
        }
    }
}

bool SambaSettings::Sets(std::string_view name) const {
    return _values.count(NormalisedName(name)) != 0;
}

std::optional<std::string> SambaSettings::Value(std::string_view name) const {
    auto const found = _values.find(NormalisedName(name));
    return found == _values.end() ? std::nullopt : std::optional(found->second);
}

bool SambaSettings::SetsIdmapOf(std::string_view domain) const {
    auto const family = NormalisedName("idmapconfig" + std::string(domain) + ':');
    auto const first = _values.lower_bound(family);
    if (first != _values.end() && StartsWith(first->first, family)) {
        return true;
    }
    return domain == "*" && (Sets("idmap backend") ||
                             std::any_of(std::begin(OldRangesOfAll), std::end(OldRangesOfAll),
                                         [this](std::string_view name) { return Sets(name); }));
}

std::vector<SambaSettings::Range> SambaSettings::IdmapRanges() const {
    std::vector<Range> ranges;
    for (auto const& [name, value] : _values) {
        bool const isRange = (StartsWith(name, "idmapconfig") && EndsWith(name, ":range")) ||
                             std::find(std::begin(OldRangesOfAll), std::end(OldRangesOfAll),
                                       name) != std::end(OldRangesOfAll);
        if (auto const range = ReadRange(value); isRange && range) {
            ranges.push_back(*range);
        }
    }
    return ranges;
}

bool HasSambaInclude(std::string_view text, std::string_view path) {
    auto const lines = Lines(text);
    return std::any_of(lines.begin(), lines.end(),
                       [path](Line const& line) { return Includes(line, path); });
}

std::string WithSambaInclude(std::string_view text, std::string_view path) {
    auto const lines = Lines(text);
    std::string result(text);
    if (std::any_of(lines.begin(), lines.end(),
                    [path](Line const& line) { return Includes(line, path); })) {
        return result;
    }
    std::string const lineEnd(LineEnd(text));
    std::string const include = "\tinclude = " + std::string(path);
    Line const* const last = LastGlobal(lines);
    if (last == nullptr) {
        // At the top: what follows [global] in the same file may be a share's.
        result.insert(0, std::string(Comment) + lineEnd + std::string(Header) + lineEnd + include +
                             lineEnd);
        return result;
    }
    bool const complete = text[last->end - 1] == '\n';
    std::string addition = complete ? "" : lineEnd;
    for (std::size_t i = 0; i < last->openAtEnd; ++i) {
        addition += lineEnd;
    }
    if (last->openAtEnd == 0) {
        addition += Comment;
    } else {
        addition += CommentBelowEmptyLines;
        addition += std::to_string(last->openAtEnd);
        addition += CommentBelowEmptyLinesEnd;
    }
    // Without a last line end where there was none, which is how WithoutSambaInclude() knows.
    addition += lineEnd + include + (complete ? lineEnd : "");
    result.insert(last->end, addition);
    return result;
}

std::string WithoutSambaInclude(std::string_view text, std::string_view path) {
    auto const lines = Lines(text);
    std::string result;
    std::size_t kept = 0;
    for (std::size_t i = 0; i < lines.size(); ++i) {
        if (Includes(lines[i], path)) {
            auto const begin = std::max(kept, BeginOfAdded(text, lines, i));
            result += text.substr(kept, begin - kept);
            kept = lines[i].end;
        }
    }
    return result += text.substr(kept);
}

std::string SambaDomainText(SambaDomain const& domain, SambaSettings const& administrator) {
    GlobalSection section(
        "# Written by tslauth when the host joined its domain, and again at every change of it.\n"
        "# Settings of your own belong into smb.conf: those of the first block are overruled "
        "here,\n"
        "# one of the second block is left to smb.conf, from the next join on, once it is set "
        "there.\n");
    AddMembership(section, domain);
    // A controller that does not answer must not hold up questions for winbindd's whole minute.
    section.Add("winbind request timeout", "5");
    // One that is back must not go unnoticed for half a minute.
    section.Add("winbind reconnect delay", "5");
    // It works without: winbindd meets a trusted domain when it is asked for one of its users. With
    // it, all of winbindd waits while it looks for the controllers of those domains, which may be
    // silent, and everybody's log-in waits with it, root's too.
    section.Add("winbind scan trusted domains", "no");
    // Names are DOMAIN\name everywhere, so that no user of the domain is taken for a local one.
    section.Add("winbind use default domain", "no");
    section.Text() += '\n';

    auto const unlessSet = [&](char const* name, char const* value) {
        if (!administrator.Sets(name)) {
            section.Add(name, value);
        }
    };
    // Nobody answers broadcasts for a domain of this kind; waiting for them would only take time.
    unlessSet("disable netbios", "yes");
    unlessSet("name resolve order", "host");
    unlessSet("template shell", "/bin/sh");
    unlessSet("template homedir", "/home/%D/%U");
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
    AddMembership(section, domain);
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

std::string WithPreferredControllers(std::string_view text,
                                     std::vector<std::string> const& controllers) {
    std::string setting;
    if (!controllers.empty()) {
        setting = PasswordServers(controllers);
        CheckValue(setting);
        setting = "\tpassword server = " + setting + '\n';
    }
    std::string result(text);
    auto const lines = Lines(text);
    std::size_t header = std::string::npos;
    std::size_t membership = std::string::npos;
    std::size_t replaced = std::string::npos;
    for (std::size_t i = lines.size(); i-- > 0;) {
        if (lines[i].kind == Line::Kind::section) {
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
