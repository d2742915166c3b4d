// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <algorithm>
#include <string>
#include <string_view>
#include <vector>

/// Bytes of files and answers. ASCII alone, and never the locale of the process: in a Turkish one
/// "CORP.INTERNAL" would not be "corp.internal".
namespace tessel::base::AsciiText {

/// What C's isspace() takes for white space in the "C" locale.
constexpr std::string_view WhiteSpace = " \t\n\v\f\r";

constexpr bool IsDigit(char c) {
    return c >= '0' && c <= '9';
}

constexpr bool IsLetter(char c) {
    return (c >= 'a' && c <= 'z') || (c >= 'A' && c <= 'Z');
}

constexpr bool IsSpace(char c) {
    return c == ' ' || (c >= '\t' && c <= '\r');
}

constexpr bool IsControl(char c) {
    // Whether a char can be below 0 is the machine's affair.
    return static_cast<unsigned char>(c) < ' ' || c == '\x7f';
}

constexpr char Lower(char c) {
    return c >= 'A' && c <= 'Z' ? static_cast<char>(c - 'A' + 'a') : c;
}

constexpr char Upper(char c) {
    return c >= 'a' && c <= 'z' ? static_cast<char>(c - 'a' + 'A') : c;
}

inline std::string Lower(std::string_view text) {
    std::string result(text);
    std::transform(result.begin(), result.end(), result.begin(), [](char c) { return Lower(c); });
    return result;
}

inline std::string Upper(std::string_view text) {
    std::string result(text);
    std::transform(result.begin(), result.end(), result.begin(), [](char c) { return Upper(c); });
    return result;
}

inline bool EqualsIgnoringCase(std::string_view left, std::string_view right) {
    return std::equal(left.begin(), left.end(), right.begin(), right.end(),
                      [](char a, char b) { return Lower(a) == Lower(b); });
}

inline bool StartsWith(std::string_view text, std::string_view start) {
    return text.substr(0, start.size()) == start;
}

inline bool EndsWith(std::string_view text, std::string_view end) {
    return text.size() >= end.size() && text.substr(text.size() - end.size()) == end;
}

inline bool HasControlCharacters(std::string_view text) {
    return std::any_of(text.begin(), text.end(), [](char c) { return IsControl(c); });
}

/// Whether nothing but white space is there.
inline bool IsBlank(std::string_view text) {
    return text.find_first_not_of(WhiteSpace) == std::string_view::npos;
}

inline std::string_view TrimmedRight(std::string_view text) {
    return text.substr(0, text.find_last_not_of(WhiteSpace) + 1);
}

inline std::string_view Trimmed(std::string_view text) {
    text = TrimmedRight(text);
    text.remove_prefix(std::min(text.find_first_not_of(WhiteSpace), text.size()));
    return text;
}

/// Takes the first line off a text that is not empty: up to its line feed, and with it. The last
/// line may have none.
inline std::string_view TakeLine(std::string_view& text) {
    auto const end = text.find('\n');
    auto const line = text.substr(0, end == std::string_view::npos ? text.size() : end + 1);
    text.remove_prefix(line.size());
    return line;
}

/// The lines of a text, each with its line feed; the last one may lack it.
inline std::vector<std::string_view> Lines(std::string_view text) {
    std::vector<std::string_view> lines;
    while (!text.empty()) {
        lines.push_back(TakeLine(text));
    }
    return lines;
}

/// Takes the first word off a text, with the `blanks` in front of it. Empty where there is none.
inline std::string_view TakeWord(std::string_view& text, std::string_view blanks = WhiteSpace) {
    text.remove_prefix(std::min(text.find_first_not_of(blanks), text.size()));
    auto const word = text.substr(0, text.find_first_of(blanks));
    text.remove_prefix(word.size());
    return word;
}

/// How the lines of a text that something adds lines to end.
inline std::string_view LineEnd(std::string_view text) {
    return text.find("\r\n") == std::string_view::npos ? "\n" : "\r\n";
}

/// "1 line", "2 lines"
inline std::string Counted(std::size_t count, std::string_view noun) {
    std::string text = std::to_string(count) + " ";
    text += noun;
    if (count != 1) {
        text += 's';
    }
    return text;
}

} // namespace tessel::base::AsciiText
