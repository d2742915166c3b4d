// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "Recorder.h"

#include <array>
#include <csignal>
#include <set>
#include <string>

namespace tessel::providercheck {

/// What a process has that a provider leaves alone. A value.
class ProcessState {
public:
    static ProcessState Now();

    /// Writes down what is different now; threads and children have a moment to come to their end.
    void LookForChanges(Recorder& recorder) const;

    /// How many threads the process has.
    static std::size_t Threads();

private:
    std::set<std::string> _descriptors;
    std::size_t _threads = 0;
    std::array<struct sigaction, 65> _handlers{};
    sigset_t _mask{};
    std::string _locale;
    std::string _folder;
    std::string _umask;
    std::string _environment;
};

} // namespace tessel::providercheck
