// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <algorithm>
#include <exception>
#include <string>
#include <string_view>

/// The form of files of `key = "value"` lines: text in, pieces of it out.
///
/// A line is split at its first "=". Blanks (space and tab) around a key or a value and one pair of
/// equal quotes around it, of either kind, are not part of it; what holds nothing but blanks is
/// left as it is. There are no comments and no escapes. A carriage return is no blank: a file with
/// CRLF line ends keeps it in its values.
namespace tessel::base {

/// One assignment of a file, as pieces of its text.
struct Assignment {
    std::string_view key;
    std::string_view value;
};

/// A line that is no assignment. Each library turns it into a failure of its own.
class KeyValueError : public std::exception {
public:
    explicit KeyValueError(std::string text);
    ~KeyValueError() override;
    char const* what() const noexcept override;

private:
    std::string _text;
};

/// @param line one that is not blank, without its line feed
/// @param lineNumber for the message
/// @throws KeyValueError "Error parsing configuration on line " + number + ": no delimiter found",
///     or "Error parsing configuration at line " + number + ": invalid quoting" for a key or value
///     that is one lone quote
Assignment SplitAssignment(std::string_view line, int lineNumber);

constexpr bool IsBlank(char character) {
    return character == ' ' || character == '\t';
}

/// Calls `take` with each assignment of `text`, in order. Lines are counted from 1, and the blank
/// ones, which are skipped, too.
/// @throws KeyValueError at the first bad line
template <typename Take> void ForEachAssignment(std::string_view text, Take take) {
    int lineNumber = 0;
    while (!text.empty()) {
        std::string_view const line = text.substr(0, text.find('\n'));
        text.remove_prefix(std::min(line.size() + 1, text.size()));
        ++lineNumber;
        if (!std::all_of(line.begin(), line.end(), IsBlank)) {
            take(SplitAssignment(line, lineNumber));
        }
    }
}

} // namespace tessel::base
