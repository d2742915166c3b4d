// SPDX-License-Identifier: Apache-2.0
#ifndef STRANDCTL_LINES_H
#define STRANDCTL_LINES_H

#include <string_view>

namespace StrandCtl {

/// Takes the first line off a text that is not empty: up to its line feed, and with it. The last
/// line may have none.
inline std::string_view TakeLine(std::string_view& text) {
    std::string_view::size_type const end = text.find('\n');
    std::string_view const line =
        text.substr(0, end == std::string_view::npos ? text.size() : end + 1);
    text.remove_prefix(line.size());
    return line;
}

/// Takes the first word off a text: what is not one of `blanks`, after any that are. Empty if there
/// is none.
inline std::string_view TakeWord(std::string_view& text, std::string_view blanks) {
    std::string_view::size_type const first = text.find_first_not_of(blanks);
    if (first == std::string_view::npos) {
        text = {};
        return {};
    }
    text.remove_prefix(first);
    std::string_view const word = text.substr(0, text.find_first_of(blanks));
    text.remove_prefix(word.size());
    return word;
}

} // namespace StrandCtl

#endif
