// SPDX-License-Identifier: Apache-2.0
#include "KeyValueText.h"

#include "Lines.h"

#include <cstddef>
#include <strandctl/HostCtlException.h>

namespace StrandCtl {

namespace {

using HostCtl::Lib::HostCtlException;

constexpr std::string_view blanks = " \t";

std::string CleanField(std::string_view field, std::size_t lineNumber) {
    std::string_view::size_type const first = field.find_first_not_of(blanks);
    if (first == std::string_view::npos) {
        return std::string(field);
    }
    std::string_view text = field.substr(first, field.find_last_not_of(blanks) + 1 - first);
    if (text.front() == '"' || text.front() == '\'') {
        if (text.size() == 1) {
            throw HostCtlException("Error parsing configuration at line " +
                                   std::to_string(lineNumber) + ": invalid quoting");
        }
        if (text.front() == text.back()) {
            text = text.substr(1, text.size() - 2);
        }
    }
    return std::string(text);
}

} // namespace

std::map<std::string, std::string> ParseKeyValueText(std::string_view text) {
    std::map<std::string, std::string> assignments;
    std::size_t lineNumber = 0;
    while (!text.empty()) {
        std::string_view line = TakeLine(text);
        ++lineNumber;
        if (line.back() == '\n') {
            line.remove_suffix(1);
        }
        if (line.find_first_not_of(blanks) == std::string_view::npos) {
            continue;
        }
        std::string_view::size_type const delimiter = line.find('=');
        if (delimiter == std::string_view::npos) {
            throw HostCtlException("Error parsing configuration on line " +
                                   std::to_string(lineNumber) + ": no delimiter found");
        }
        std::string const value = CleanField(line.substr(delimiter + 1), lineNumber);
        assignments.emplace(CleanField(line.substr(0, delimiter), lineNumber), value);
    }
    return assignments;
}

} // namespace StrandCtl
