// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "Recorder.h"

#include <functional>

namespace tessel::providercheck {

/// What a check's child is measured by.
struct Conditions {
    unsigned seconds; ///< for each call that `Recorder::Begin` tells of, and for all between them
    Rule crash = Rule::Crash;
    Rule time = Rule::Time;
};

/// Runs `body` in a child process whose outputs are looked at, and writes down how it ends: by a
/// signal, by exit(3) inside a call, or not in time. Ends the child in any case.
/// @param body must not return to the caller's objects: it has copies of them
void RunInChild(Conditions const& conditions, Recorder& recorder,
                std::function<void(Recorder&)> const& body);

} // namespace tessel::providercheck
