// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <tslauth/Exceptions.h>

#include <cstddef>
#include <string>
#include <string_view>

/// What edits of texts have in common: whole lines that come and go again, so that the one undoes
/// the other byte for byte.
namespace tessel::authentication {

/// Where the line that holds the byte at `position` begins.
inline std::size_t LineStart(std::string_view text, std::size_t position) {
    return text.substr(0, position).rfind('\n') + 1; // 0 where there is no line feed before it
}

/// @param position the start of a line, or the end of the text
/// @param lines each with its line feed. At the end of a text without a final line feed the last of
///     them goes without as well.
inline std::string WithLines(std::string_view text, std::size_t position, std::string_view lines) {
    std::string out(text.substr(0, position));
    bool const unfinished = position == text.size() && !text.empty() && text.back() != '\n';
    if (unfinished) {
        out += '\n';
        lines.remove_suffix(1);
    }
    out += lines;
    out += text.substr(position);
    return out;
}

/// @param begin the start of a line
/// @param end behind the line feed of that line or of a later one, or the end of the text
inline std::string WithoutLines(std::string_view text, std::size_t begin, std::size_t end) {
    std::string out(text.substr(0, begin));
    bool const unfinished = end == text.size() && begin < end && text.back() != '\n';
    if (unfinished && !out.empty()) {
        out.pop_back();
    }
    out += text.substr(end);
    return out;
}

/// What stands behind a NUL byte only some readers see.
/// @throws ConfigurationError for a text with such a byte
inline void RefuseNul(std::string_view text) {
    if (text.find('\0') != std::string_view::npos) {
        throw ConfigurationError("There is a NUL byte in the file");
    }
}

} // namespace tessel::authentication
