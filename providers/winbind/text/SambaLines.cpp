// SPDX-License-Identifier: Apache-2.0
#include "text/SambaLines.h"

#include <algorithm>
#include <base/AsciiText.h>
#include <utility>

using namespace tessel::base::AsciiText;

namespace tessel::winbind {

namespace {

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

} // namespace

std::string NormalisedSambaName(std::string_view name) {
    std::string result;
    for (char const c : name) {
        if (WhiteSpace.find(c) == std::string_view::npos) {
            result += Lower(c);
        }
    }
    return result;
}

std::vector<SambaLine> SambaLines(std::string_view text) {
    std::vector<SambaLine> lines;
    bool global = true;
    for (auto rest = text; !rest.empty();) {
        SambaLine line{SambaLine::Kind::blank, text.size() - rest.size(), 0, global, 0, {}, {}, {}};
        auto ahead = rest;
        auto const physical = TakeLine(ahead);
        auto const content = Trimmed(physical);
        if (content.empty() || content[0] == '#' || content[0] == ';') {
            line.kind = content.empty() ? SambaLine::Kind::blank : SambaLine::Kind::comment;
            line.content = physical.substr(0, physical.find_last_not_of("\r\n") + 1);
            rest = ahead;
        } else {
            auto const whole = TakeContinuedLine(rest, line.openAtEnd);
            auto const joined = Trimmed(whole);
            if (!joined.empty() && joined[0] == '[') {
                line.kind = SambaLine::Kind::section;
                auto const name = NormalisedSambaName(joined.substr(1, joined.find(']') - 1));
                global = name == "global" || name == "globals";
                line.global = global;
            } else {
                line.kind = SambaLine::Kind::parameter;
                auto const delimiter = joined.find('=');
                if (delimiter != std::string_view::npos) {
                    line.name = NormalisedSambaName(joined.substr(0, delimiter));
                    line.value = Trimmed(joined.substr(delimiter + 1));
                }
            }
        }
        line.end = text.size() - rest.size();
        lines.push_back(std::move(line));
    }
    return lines;
}

std::optional<std::uint64_t> SambaNumber(std::string_view text) {
    if (text.empty() || text.size() > 10 || !std::all_of(text.begin(), text.end(), IsDigit)) {
        return std::nullopt;
    }
    std::uint64_t number = 0;
    for (char const c : text) {
        number = number * 10 + static_cast<std::uint64_t>(c - '0');
    }
    return number;
}

} // namespace tessel::winbind
