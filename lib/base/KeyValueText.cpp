// SPDX-License-Identifier: Apache-2.0
#include "KeyValueText.h"

#include <utility>

namespace tessel::base {

namespace {

bool IsQuote(char character) {
    return character == '"' || character == '\'';
}

/// A key or a value without the blanks and the one pair of quotes around it.
std::string_view CleanField(std::string_view field, int lineNumber) {
    std::string_view text = field;
    while (!text.empty() && IsBlank(text.front())) {
        text.remove_prefix(1);
    }
    if (text.empty()) {
        // Deliberate: files in the field hold values of nothing but blanks, and mean them.
        return field;
    }
    while (IsBlank(text.back())) {
        text.remove_suffix(1);
    }
    if (!IsQuote(text.front())) {
        return text;
    }
    if (text.size() == 1) {
        throw KeyValueError("Error parsing configuration at line " + std::to_string(lineNumber) +
                            ": invalid quoting");
    }
    return text.front() == text.back() ? text.substr(1, text.size() - 2) : text;
}

} // namespace

KeyValueError::KeyValueError(std::string text) : _text(std::move(text)) {}

KeyValueError::~KeyValueError() = default;

char const* KeyValueError::what() const noexcept {
    return _text.c_str();
}

Assignment SplitAssignment(std::string_view line, int lineNumber) {
    std::string_view::size_type const delimiter = line.find('=');
    if (delimiter == std::string_view::npos) {
        throw KeyValueError("Error parsing configuration on line " + std::to_string(lineNumber) +
                            ": no delimiter found");
    }
    // The value first: where both are bad, it is the one that the message is about.
    std::string_view const value = CleanField(line.substr(delimiter + 1), lineNumber);
    return {CleanField(line.substr(0, delimiter), lineNumber), value};
}

} // namespace tessel::base
