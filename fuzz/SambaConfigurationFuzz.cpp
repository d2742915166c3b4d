// SPDX-License-Identifier: Apache-2.0
/// Reads any bytes as an smb.conf, and includes a file there and takes it out again. The oracle of
/// the reader works on the text as Samba's own reader does, byte by byte, and shares nothing with
/// the provider's.
#include "Expect.h"

#include "text/SambaDomain.h"
#include "text/SambaInclude.h"

#include <cstddef>
#include <cstdint>
#include <map>
#include <string>

using namespace tessel::winbind;

namespace {

std::string const Path = "/etc/samba/tslauth.conf";

bool IsSpace(char c) {
    return c == ' ' || (c >= '\t' && c <= '\r');
}

std::string WithoutBlanks(std::string const& text) {
    std::string result;
    for (char const c : text) {
        if (!IsSpace(c)) {
            result += c >= 'A' && c <= 'Z' ? static_cast<char>(c + ('a' - 'A')) : c;
        }
    }
    return result;
}

/// The parameters of [global], by name without blanks, with values without blanks.
using Parameters = std::map<std::string, std::string>;

void ReadLineSlowly(std::string const& line, bool& global, Parameters& parameters) {
    if (line[0] == '[') {
        std::string name = line.substr(1);
        name = WithoutBlanks(name.substr(0, name.find(']')));
        global = name == "global" || name == "globals";
        return;
    }
    auto const delimiter = line.find('=');
    if (!global || delimiter == std::string::npos) {
        return;
    }
    auto const name = WithoutBlanks(line.substr(0, delimiter));
    if (!name.empty() && name != "include") {
        parameters[name] = WithoutBlanks(line.substr(delimiter + 1));
    }
}

Parameters ReadSlowly(std::string const& text) {
    Parameters parameters;
    bool global = true;
    std::size_t i = 0;
    while (i < text.size()) {
        if (IsSpace(text[i])) {
            ++i;
            continue;
        }
        std::string line;
        if (text[i] == '#' || text[i] == ';') {
            while (i < text.size() && text[i] != '\n') {
                ++i;
            }
            continue;
        }
        for (;; ++i) {
            if (i < text.size() && text[i] != '\n') {
                line += text[i];
                continue;
            }
            std::size_t end = line.size();
            while (end > 0 && IsSpace(line[end - 1])) {
                --end;
            }
            if (i >= text.size() || end == 0 || line[end - 1] != '\\') {
                break;
            }
            line.erase(end - 1);
        }
        while (!line.empty() && IsSpace(line[0])) {
            line.erase(0, 1);
        }
        if (!line.empty()) {
            ReadLineSlowly(line, global, parameters);
        }
    }
    return parameters;
}

std::string Describe(Parameters const& parameters, SambaSettings const& settings) {
    std::string text;
    for (auto const& [name, value] : parameters) {
        text += name;
        text += '=';
        text += WithoutBlanks(settings.Value(name).value_or("(not set)"));
        text += '\n';
    }
    return text;
}

std::string Describe(Parameters const& parameters) {
    std::string text;
    for (auto const& [name, value] : parameters) {
        text += name;
        text += '=';
        text += value;
        text += '\n';
    }
    return text;
}

} // namespace

extern "C" int LLVMFuzzerTestOneInput(std::uint8_t const* data, std::size_t size) {
    std::string const text(reinterpret_cast<char const*>(data), size);
    SambaSettings const settings(text);
    auto const parameters = ReadSlowly(text);
    Expect("the reader follows the format", Describe(parameters, settings), Describe(parameters));

    auto const with = WithSambaInclude(text, Path);
    auto const without = WithoutSambaInclude(with, Path);
    Expect("what was put in is there", HasSambaInclude(with, Path) ? "yes" : "no", "yes");
    Expect("putting in twice is putting in once", WithSambaInclude(with, Path), with);
    Expect("what was taken out is gone", HasSambaInclude(without, Path) ? "yes" : "no", "no");
    if (HasSambaInclude(text, Path)) {
        Expect("what was there stays as it is", with, text);
    } else {
        Expect("taking out gives back the same bytes", without, text);
        auto const last = text.find_last_not_of(" \t\n\v\f\r");
        // A backslash at the end of the text is a part of a value as long as it is there.
        if (last == std::string::npos || text[last] != '\\') {
            Expect("no other setting changes", Describe(parameters, SambaSettings(with)),
                   Describe(parameters));
        }
    }

    SambaDomain domain{"CORP.EXAMPLE", "CORP", "HOST1", {}};
    auto const file = SambaDomainText(domain, settings, {});
    auto const read = ReadSambaDomain(file);
    Expect("the own file is read back", read ? read->realm + read->workgroup : "nothing",
           "CORP.EXAMPLECORP");
    auto const changed = WithPreferredControllers(file, {"dc1"});
    domain.preferredControllers = {"dc1"};
    Expect("other controllers change nothing else", changed, SambaDomainText(domain, settings, {}));
    Expect("no controllers is as before", WithPreferredControllers(changed, {}), file);
    return 0;
}
