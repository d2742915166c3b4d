// SPDX-License-Identifier: Apache-2.0
#ifndef BENCH_TABLE_H
#define BENCH_TABLE_H

#include <benchmark/benchmark.h>
#include <cstddef>
#include <functional>
#include <string>
#include <vector>

/// The cases, and the one table that comes of them.
namespace bench {

/// What a case promises against its comparison, which runs in the same process, in turn.
struct Bar {
    enum class Of {
        /// Ours is at most `limit` times the comparison.
        Ratio,
        /// Ours is at most `limit` nanoseconds over the comparison.
        Overhead,
        /// Ours is at most `limit` nanoseconds; the comparison is shown and counts for nothing.
        Time,
    };
    Of of;
    double limit;
};

/// What a case's time is. Of a case that waits for nothing, the processor's time is all there is to
/// it, and other programs on the machine disturb that least.
enum class Clock { Processor, Wall };

using Body = std::function<void(benchmark::State&)>;

struct Contender {
    std::string name; ///< "ours", "floor", or who it is
    Body body;        ///< calls `Measure`, or `MeasureEach` where `timedByHand`
    bool timedByHand = false;
};

/// One row of the table.
struct Case {
    std::string name;
    Bar bar;
    Clock clock;
    int repetitions;
    /// Ours, the comparison, then peers that are shown beside.
    std::vector<Contender> contenders;
    /// For a row that compares two others: their names, and the lines that each has.
    std::string few, many;
    double fewLines = 0, manyLines = 0;
};

class Table {
public:
    /// @param repetitions of each contender, in turn with the others; the medians are compared
    void Add(std::string name, Bar bar, Clock clock, int repetitions,
             std::vector<Contender> contenders);

    /// A row that says how much more a line of the case `many` takes than one of the case `few`.
    void AddGrowth(std::string name, Bar bar, std::string few, double fewLines, std::string many,
                   double manyLines);

    /// Runs everything and prints the table.
    /// @param self this program's file, which is started once more to look at its memory
    /// @return whether everything could run
    bool Run(char const* self) const;

    /// Runs everything briefly, for a look from outside: at the system calls, and at the memory,
    /// which is printed where the library that counts it is loaded.
    void Observe() const;

private:
    std::vector<Case> _cases;
};

/// Whether and how this process is looked at from outside. Its times mean nothing then.
struct Observation {
    bool active = false;
    std::string running; ///< "case/contender"
    Clock clock = Clock::Wall;
    std::size_t peak = 0;

    /// What a tracer sees before each run: an `access` that fails.
    void Begin();
    void End();

    /// The time by the clock of what is running.
    double Seconds() const;

private:
    std::size_t _before = 0;
};
extern Observation observation;

/// Measures `run()`. What is made ready once belongs before this call, in the body.
template <typename Run> void Measure(benchmark::State& state, Run run) {
    if (!observation.active) {
        for (auto _ : state) {
            run();
        }
        return;
    }
    for (auto _ : state) {
        observation.Begin();
        run();
        observation.End();
    }
}

/// Measures `run()`, with `prepare()` before each, which does not count.
template <typename Prepare, typename Run>
void MeasureEach(benchmark::State& state, Prepare prepare, Run run) {
    for (auto _ : state) {
        prepare();
        if (observation.active) {
            observation.Begin();
        }
        double const start = observation.Seconds();
        run();
        state.SetIterationTime(observation.Seconds() - start);
        if (observation.active) {
            observation.End();
        }
    }
}

} // namespace bench

#endif
