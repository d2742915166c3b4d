// SPDX-License-Identifier: Apache-2.0
#include "access/AccessRules.h"

#include <base/AsciiText.h>

#include <algorithm>
#include <optional>
#include <utility>

namespace tessel::tslauthctl {

namespace {

using namespace base::AsciiText;

constexpr std::string_view everybody = "ALL";
constexpr std::string_view except = "EXCEPT";

/// A line of pam_access's buffer: what is longer is no rule.
constexpr std::size_t longestLine = 8191;

bool Same(std::string_view left, std::string_view right) {
    return EqualsIgnoringCase(left, right);
}

/// The names of a list; between two separators without anything stands none.
std::vector<std::string> Names(std::string_view list) {
    std::vector<std::string> names;
    while (!list.empty()) {
        auto const length = std::min(list.find(','), list.size());
        if (length > 0) {
            names.emplace_back(list.substr(0, length));
        }
        list.remove_prefix(std::min(length + 1, list.size()));
    }
    return names;
}

/// Takes a field off a line as strtok(3) does: separators before it do not count.
std::string_view TakeField(std::string_view& text) {
    text.remove_prefix(std::min(text.find_first_not_of(':'), text.size()));
    auto const field = text.substr(0, text.find(':'));
    text.remove_prefix(std::min(field.size() + 1, text.size()));
    return field;
}

enum class Kind { nothing, rule, faulty };

/// @param line with its line feed
Kind ReadLine(std::string_view line, AccessRule& rule) {
    if (line.back() != '\n' || line.size() > longestLine) {
        return Kind::faulty;
    }
    line = line.substr(0, line.find('\0'));
    if (!line.empty() && line.front() == '#') {
        return Kind::nothing;
    }
    line = TrimmedRight(line);
    if (line.empty()) {
        return Kind::nothing;
    }
    char const first = line.front();
    auto const sign = TakeField(line);
    auto const names = TakeField(line);
    if (names.empty() || line.empty() || (sign.front() != '+' && sign.front() != '-')) {
        return Kind::faulty;
    }
    // By the line's first character: one with a separator before its sign denies, whatever the
    // sign.
    rule.permits = first == '+';
    rule.origins = line;
    bool excepted = false;
    for (auto& name : Names(names)) {
        if (Same(name, except)) {
            excepted = true;
        } else {
            (excepted ? rule.exceptions : rule.names).push_back(std::move(name));
        }
    }
    return Kind::rule;
}

bool Lists(AccessRule const& rule, std::string_view name) {
    return std::any_of(rule.names.begin(), rule.names.end(),
                       [&](std::string const& listed) { return Same(listed, name); });
}

/// Whether the rule is for exactly those it lists, wherever they come from.
bool IsPlain(AccessRule const& rule) {
    return rule.exceptions.empty() && Same(rule.origins, everybody);
}

std::string RuleLine(bool permits, std::string const& name) {
    return (permits ? "+:" : "-:") + name + ":ALL\n";
}

/// A line of the file, and the rule it holds.
struct Line {
    std::string text;
    std::optional<AccessRule> rule;
};

std::vector<Line> LinesOf(std::string_view text) {
    std::vector<Line> lines;
    while (!text.empty()) {
        Line line{std::string(TakeLine(text)), AccessRule()};
        if (ReadLine(line.text, *line.rule) != Kind::rule) {
            line.rule.reset();
        }
        lines.push_back(std::move(line));
    }
    return lines;
}

std::string Joined(std::vector<Line> const& lines) {
    std::string text;
    for (auto const& line : lines) {
        text += line.text;
    }
    return text;
}

/// The line without one of its names; nothing is left of a line that lists no other.
std::string WithoutName(Line const& line, std::string_view name) {
    std::string names;
    for (auto const& listed : line.rule->names) {
        if (!Same(listed, name)) {
            names += (names.empty() ? "" : ",") + listed;
        }
    }
    if (names.empty()) {
        return {};
    }
    return (line.rule->permits ? "+:" : "-:") + names + ":" + line.rule->origins + "\n";
}

/// The lines of a text, with a name taken out of the plain rules that permit or deny it.
std::vector<Line> LinesWithout(bool permits, std::string_view name, std::string_view text) {
    auto lines = LinesOf(text);
    for (auto& line : lines) {
        bool const concerned = line.rule && line.rule->permits == permits && IsPlain(*line.rule);
        if (concerned && Lists(*line.rule, name) && (permits || !line.rule->IsLast())) {
            line.text = WithoutName(line, name);
        }
    }
    return LinesOf(Joined(lines));
}

/// Whether a plain rule permits or denies exactly this name, and none before it decides otherwise:
/// a permission counts before one for everybody, a denial before any permission.
bool Has(bool permits, std::string_view name, std::vector<Line> const& lines) {
    for (auto const& line : lines) {
        if (!line.rule) {
            continue;
        }
        if (line.rule->permits == permits && IsPlain(*line.rule) && Lists(*line.rule, name)) {
            return true;
        }
        if (line.rule->IsLast() || (!permits && line.rule->permits)) {
            return false;
        }
    }
    return false;
}

/// Puts a rule before the first line that `isBehind`, or at the end.
template <typename IsBehind>
void Put(std::string rule, IsBehind isBehind, std::vector<Line>& lines) {
    auto const place = std::find_if(lines.begin(), lines.end(), [&](Line const& line) {
        return line.rule && isBehind(*line.rule);
    });
    if (place == lines.end() && !lines.empty() && lines.back().text.back() != '\n') {
        lines.back().text += '\n';
    }
    lines.insert(place, Line{std::move(rule), std::nullopt});
}

} // namespace

std::string RuleName(Subject const& subject) {
    return subject.isGroup ? "(" + subject.name + ")" : subject.name;
}

Subject Everybody() {
    return {std::string(everybody), false};
}

bool CanStandInARule(Subject const& subject) {
    auto const& name = subject.name;
    bool const word = Same(name, everybody) || Same(name, except);
    bool const likeAnother =
        !subject.isGroup && (name.find('@') != std::string::npos ||
                             (!name.empty() && name.front() == '(' && name.back() == ')'));
    return !name.empty() && name.find_first_of(",:") == std::string::npos &&
           !HasControlCharacters(name) && (subject.isGroup || (!word && !likeAnother)) &&
           name == TrimmedRight(name);
}

bool AccessRule::IsLast() const {
    return IsPlain(*this) && Lists(*this, everybody);
}

bool AccessRules::PermitByDefault() const {
    for (auto const& rule : rules) {
        if (rule.IsLast()) {
            return rule.permits;
        }
    }
    return true;
}

AccessRules ReadAccessRules(std::string_view text) {
    AccessRules rules;
    for (std::size_t number = 1; !text.empty(); ++number) {
        AccessRule rule;
        switch (ReadLine(TakeLine(text), rule)) {
        case Kind::nothing:
            break;
        case Kind::rule:
            rule.line = number;
            rules.rules.push_back(std::move(rule));
            break;
        case Kind::faulty:
            rules.faultyLines.push_back(number);
            break;
        }
    }
    return rules;
}

std::string FirstAccessRules() {
    return "# Who of the domain may log in to this host, as pam_access(8) reads it: one rule a "
           "line, the\n"
           "# first that fits decides. 'tslauthctl permit' and 'tslauthctl deny' edit it. Between "
           "two\n"
           "# names stands a comma and no blank; a group stands in parentheses. Users of the host "
           "itself\n"
           "# are not asked for here.\n"
           "-:ALL:ALL\n";
}

std::string Permitted(std::string_view text, Subject const& subject) {
    auto const name = RuleName(subject);
    auto lines = LinesWithout(false, name, text);
    if (!Has(true, name, lines)) {
        Put(
            RuleLine(true, name), [](AccessRule const& rule) { return rule.IsLast(); }, lines);
    }
    return Joined(lines);
}

std::string Denied(std::string_view text, Subject const& subject) {
    auto const name = RuleName(subject);
    auto lines = LinesWithout(true, name, text);
    if (!Has(false, name, lines)) {
        Put(
            RuleLine(false, name), [](AccessRule const&) { return true; }, lines);
    }
    return Joined(lines);
}

std::string NobodyPermitted(std::string_view text) {
    auto lines = LinesOf(text);
    for (auto& line : lines) {
        if (line.rule && line.rule->permits) {
            line.text.clear();
        }
    }
    lines = LinesOf(Joined(lines));
    auto const name = RuleName(Everybody());
    if (!Has(false, name, lines)) {
        Put(
            RuleLine(false, name), [](AccessRule const&) { return false; }, lines);
    }
    return Joined(lines);
}

} // namespace tessel::tslauthctl
