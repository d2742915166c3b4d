// SPDX-License-Identifier: Apache-2.0
#include "PAMPolicyText.h"

#include "PAMReader.h"
#include "Words.h"

#include <cstddef>
#include <string>
#include <string_view>

namespace SystemConfiguration {

namespace {

char* Put(char* at, std::string_view text) {
    return at + text.copy(at, text.size());
}

/// Appends an entry between `start` and `end`. The length is counted first, so that the text is
/// grown once an entry and not once a word.
void AppendEntry(std::string_view start, PAMEntry const& entry, std::string_view end,
                 std::string& out) {
    out += start;
    std::string_view const control = Words::TextOf(entry.control());
    std::size_t size = control.size() + entry.module().size() + 2 + end.size();
    for (auto const& parameter : entry.parameters()) {
        size += parameter.size() + 1;
    }
    std::size_t const before = out.size();
    out.resize(before + size);
    char* at = &out[before];
    at = Put(at, control);
    *at++ = '\t';
    at = Put(at, entry.module());
    *at++ = '\t';
    for (auto const& parameter : entry.parameters()) {
        at = Put(at, parameter);
        *at++ = ' ';
    }
    Put(at, end);
}

} // namespace

void ReadPolicy(std::string_view text, PAMPolicy& policy) {
    TextInput in(text);
    ReadLines(in, policy);
}

void PrintEntry(PAMEntry const& entry, std::string& out) {
    AppendEntry({}, entry, {}, out);
}

void PrintStack(PAMStack const& stack, std::string& out) {
    if (stack.empty()) {
        return; // a stack of no facility may be empty, but has no word
    }
    std::string start = stack.Facility();
    start += '\t';
    for (auto const& entry : stack) {
        AppendEntry(start, entry, "\n", out);
    }
}

void PrintPolicy(PAMPolicy const& policy, std::string& out) {
    out += "#%PAM-1.0\n\n";
    for (auto const& [facility, stack] : policy.Stacks()) {
        PrintStack(stack, out);
        out += '\n';
    }
}

} // namespace SystemConfiguration
