// SPDX-License-Identifier: Apache-2.0
#ifndef TSLAUTH_SYSTEMCONFIGURATION_PAMREADER_H
#define TSLAUTH_SYSTEMCONFIGURATION_PAMREADER_H

#include "Input.h"
#include "Words.h"

#include <tslauth/systemconfiguration/PAMPolicy.h>

#include <list>
#include <string>
#include <string_view>
#include <utility>

/// The one reader of PAM lines, for a stream and for a text in memory alike.
namespace SystemConfiguration {

/// Reads a control into `control`, which stays as it was where the input ends first.
template <typename Input> void ReadControl(Input& in, PAMControl& control) {
    std::string_view word = in.Word();
    if (word.empty()) {
        return;
    }
    if (word.front() != '[' || word.back() == ']') {
        control = Words::ControlOf(word);
        return;
    }
    std::string text(word);
    while (text.back() != ']') {
        word = in.Word();
        if (word.empty()) {
            break;
        }
        text += ' ';
        text += word;
    }
    control = Words::ControlOf(text);
}

/// Appends the words of `line` to `parameters`.
inline void ReadParameters(std::string_view line, std::list<std::string>& parameters) {
    TextInput in(line);
    for (auto word = in.Word(); !word.empty(); word = in.Word()) {
        parameters.emplace_back(word.data(), word.size());
    }
}

/// Moves to the next line that holds an entry: past blank lines and comments.
/// @return whether there is one
template <typename Input> bool MoveToEntry(Input& in) {
    while (in.Good()) {
        in.SkipSpace();
        if (!in.Sees('#')) {
            return !in.AtEnd();
        }
        in.SkipLine();
    }
    return false;
}

/// One entry as it stands in a policy. The words live as long as those of the input.
struct PAMEntryLine {
    PAMFacility::Facility facility{};
    PAMControl control;
    std::string_view module;
    std::string_view parameters;
};

/// Reads the entry that `MoveToEntry` has found, up to its line feed.
template <typename Input> PAMEntryLine ReadEntryLine(Input& in) {
    PAMEntryLine line;
    line.facility = Words::ValueOf<PAMFacility>(in.Word());
    ReadControl(in, line.control);
    line.module = in.Word();
    line.parameters = in.Line();
    return line;
}

/// Reads a whole policy and appends to its stacks.
template <typename Input> void ReadLines(Input& in, PAMPolicy& policy) {
    // A stack is made when its first line has been understood, and looked up once.
    PAMStack* stacks[PAMFacility::session + 1] = {};
    while (MoveToEntry(in)) {
        auto line = ReadEntryLine(in);
        PAMStack*& stack = stacks[line.facility];
        if (stack == nullptr) {
            stack = &policy[line.facility];
        }
        stack->emplace_back(std::move(line.control), line.module.data(), line.module.size());
        ReadParameters(line.parameters, stack->back().parameters());
    }
}

} // namespace SystemConfiguration

#endif
