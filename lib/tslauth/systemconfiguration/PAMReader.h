// SPDX-License-Identifier: Apache-2.0
#ifndef TSLAUTH_SYSTEMCONFIGURATION_PAMREADER_H
#define TSLAUTH_SYSTEMCONFIGURATION_PAMREADER_H

#include "Input.h"
#include "Words.h"

#include <tslauth/systemconfiguration/PAMPolicy.h>

#include <list>
#include <string>
#include <string_view>

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

/// Reads a whole policy and appends to its stacks.
template <typename Input> void ReadLines(Input& in, PAMPolicy& policy) {
    // A stack is made when its first line has been understood, and looked up once.
    PAMStack* stacks[PAMFacility::session + 1] = {};
    while (in.Good()) {
        in.SkipSpace();
        if (in.Sees('#')) {
            in.SkipLine();
            continue;
        }
        if (in.AtEnd()) {
            break;
        }
        auto const facility = Words::ValueOf<PAMFacility>(in.Word());
        PAMControl control;
        ReadControl(in, control);
        std::string_view const module = in.Word();
        std::string_view const line = in.Line();

        PAMStack*& stack = stacks[facility];
        if (stack == nullptr) {
            stack = &policy[facility];
        }
        stack->emplace_back(std::move(control), module.data(), module.size());
        ReadParameters(line, stack->back().parameters());
    }
}

} // namespace SystemConfiguration

#endif
