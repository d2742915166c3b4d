// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "Report.h"

#include <array>
#include <atomic>
#include <cstddef>
#include <cstdint>

namespace tessel::providercheck {

/// What a child writes down while it calls a provider, in memory that it shares with its parent: it
/// is there also when the child has crashed. Needs no heap and no lock; any thread may write, and
/// so may a signal handler.
class Recorder {
public:
    /// In shared memory; ends the process where there is none.
    static Recorder& Make();
    static void Destroy(Recorder& recorder);

    void Examined(Rule rule) {
        ++_examined[static_cast<std::size_t>(rule)];
    }
    /// As printf(3) has it; cut where it is too long.
    [[gnu::format(printf, 3, 4)]] void Found(Rule rule, char const* format, ...);

    /// A call begins on this process's behalf; what it is called with, in words.
    [[gnu::format(printf, 2, 3)]] void Begin(char const* format, ...);
    /// The call has ended.
    void End() {
        _began = 0;
    }

    /// The words of the call that was begun last.
    char const* Doing() const {
        return _doing.data();
    }
    /// Nanoseconds of the steady clock at which the running call began; 0 where none runs.
    std::int64_t Began() const {
        return _began;
    }

    /// How many calls have begun.
    unsigned Calls() const {
        return _calls;
    }

    /// How far a check has come that goes on in another child where this one ends.
    std::atomic<unsigned> step{0};
    /// Whether the child came to its end.
    std::atomic<bool> complete{false};
    /// Whether its end before that has a finding already.
    std::atomic<bool> explained{false};
    /// What a child tells about the library itself.
    std::atomic<int> kind{0};
    std::atomic<std::uint32_t> entries{0};

    /// Adds all of it.
    void AddTo(Report& report) const;

private:
    struct Finding {
        std::atomic<bool> whole{false};
        Rule rule{};
        std::array<char, 400> text{};
    };

    std::array<std::atomic<unsigned long>, RuleCount> _examined{};
    std::atomic<unsigned> _count{0};
    std::array<Finding, 64> _findings{};
    std::array<char, 400> _doing{};
    std::atomic<std::int64_t> _began{0};
    std::atomic<unsigned> _calls{0};
};

} // namespace tessel::providercheck
