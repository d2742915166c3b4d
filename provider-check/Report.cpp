// SPDX-License-Identifier: Apache-2.0
#include "Report.h"

#include <algorithm>
#include <cstdio>
#include <sstream>

namespace tessel::providercheck {

namespace {

/// In double quotes, for YAML and for people: what a provider says may hold any byte.
std::string Quoted(std::string const& text) {
    std::string quoted = "\"";
    for (char const character : text) {
        auto const byte = static_cast<unsigned char>(character);
        if (byte < 0x20 || byte >= 0x7f) {
            char escape[8];
            (void)std::snprintf(escape, sizeof escape, "\\x%02x", byte); // it always fits
            quoted += escape;
        } else {
            if (character == '"' || character == '\\') {
                quoted += '\\';
            }
            quoted += character;
        }
    }
    return quoted + '"';
}

std::string Xml(std::string const& text) {
    std::string escaped;
    for (char const character : text) {
        auto const byte = static_cast<unsigned char>(character);
        switch (character) {
        case '&':
            escaped += "&amp;";
            break;
        case '<':
            escaped += "&lt;";
            break;
        case '>':
            escaped += "&gt;";
            break;
        case '"':
            escaped += "&quot;";
            break;
        default:
            // XML has no way to say a control character.
            escaped += byte < 0x20 || byte >= 0x7f ? '?' : character;
        }
    }
    return escaped;
}

constexpr Rule RuleAt(std::size_t index) {
    return static_cast<Rule>(index);
}

} // namespace

void Report::Examined(Rule rule, unsigned long times) {
    _entries[static_cast<std::size_t>(rule)].examined += times;
}

void Report::Found(Rule rule, std::string const& what) {
    constexpr std::size_t most = 6; // what breaks a rule breaks it with many arguments
    Entry& entry = _entries[static_cast<std::size_t>(rule)];
    if (entry.findings.size() < most &&
        std::find(entry.findings.begin(), entry.findings.end(), what) == entry.findings.end()) {
        entry.findings.push_back(what);
    }
}

void Report::NotExamined(Rule rule, std::string const& reason) {
    _entries[static_cast<std::size_t>(rule)].reason = reason;
}

Report::Entry const& Report::Of(Rule rule) const {
    return _entries[static_cast<std::size_t>(rule)];
}

bool Report::Passes() const {
    return std::all_of(_entries.begin(), _entries.end(),
                       [](Entry const& entry) { return entry.findings.empty(); });
}

std::string Report::Tap() const {
    std::ostringstream tap;
    tap << "TAP version 14\n1.." << RuleCount << '\n';
    for (std::size_t i = 0; i < RuleCount; ++i) {
        RuleText const& text = TextOf(RuleAt(i));
        Entry const& entry = Of(RuleAt(i));
        tap << (entry.findings.empty() ? "ok " : "not ok ") << i + 1 << " - " << text.name << ": "
            << text.rule;
        if (!entry.findings.empty()) {
            tap << "\n  ---\n  why: " << Quoted(text.why) << "\n  found:\n";
            for (std::string const& finding : entry.findings) {
                tap << "    - " << Quoted(finding) << '\n';
            }
            tap << "  ...\n";
        } else if (entry.examined == 0) {
            tap << " # SKIP " << entry.reason << '\n';
        } else {
            tap << '\n';
        }
    }
    return tap.str();
}

std::string Report::JUnit(std::string const& provider) const {
    auto const count = [this](auto condition) {
        return std::count_if(_entries.begin(), _entries.end(), condition);
    };
    std::ostringstream xml;
    xml << "<?xml version=\"1.0\" encoding=\"UTF-8\"?>\n<testsuite name=\"" << Xml(provider)
        << "\" tests=\"" << RuleCount << "\" failures=\""
        << count([](Entry const& entry) { return !entry.findings.empty(); }) << "\" skipped=\""
        << count([](Entry const& entry) { return entry.findings.empty() && entry.examined == 0; })
        << "\">\n";
    for (std::size_t i = 0; i < RuleCount; ++i) {
        RuleText const& text = TextOf(RuleAt(i));
        Entry const& entry = Of(RuleAt(i));
        xml << "  <testcase classname=\"tslauth-provider-check\" name=\"" << text.name << "\">";
        if (!entry.findings.empty()) {
            xml << "\n    <failure message=\"" << Xml(text.rule) << "\">" << Xml(text.why) << ".\n";
            for (std::string const& finding : entry.findings) {
                xml << Xml(finding) << '\n';
            }
            xml << "</failure>\n  ";
        } else if (entry.examined == 0) {
            xml << "<skipped message=\"" << Xml(entry.reason) << "\"/>";
        }
        xml << "</testcase>\n";
    }
    xml << "</testsuite>\n";
    return xml.str();
}

} // namespace tessel::providercheck
