// SPDX-License-Identifier: Apache-2.0
#include "Table.h"

#include "PeakMemory.h"

#include <algorithm>
#include <cstdarg>
#include <cstdio>
#include <cstdlib>
#include <ctime>
#include <fstream>
#include <iostream>
#include <map>
#include <memory>
#include <random>
#include <regex>
#include <sys/wait.h>
#include <unistd.h>
#include <utility>

namespace bench {

Observation observation;

void Observation::Begin() {
    (void)::access(("tslauth_bench:" + running).c_str(), F_OK);
    if (PeakMemoryStart != nullptr) {
        _before = PeakMemoryNow();
        PeakMemoryStart();
    }
}

void Observation::End() {
    if (PeakMemoryMost != nullptr) {
        peak = std::max(peak, PeakMemoryMost() - _before);
    }
    (void)::access("tslauth_bench:", F_OK);
}

double Observation::Seconds() const {
    timespec now = {};
    (void)::clock_gettime(clock == Clock::Wall ? CLOCK_MONOTONIC : CLOCK_THREAD_CPUTIME_ID, &now);
    return static_cast<double>(now.tv_sec) + static_cast<double>(now.tv_nsec) / 1e9;
}

namespace {

[[gnu::format(printf, 1, 2)]] std::string Format(char const* format, ...) {
    char text[256];
    va_list arguments;
    va_start(arguments, format);
    (void)std::vsnprintf(text, sizeof text, format, arguments);
    va_end(arguments);
    return text;
}

/// Three digits, which is more than a run repeats.
std::string Digits(double value, char const* unit) {
    return Format(value < 10 ? "%.2f %s" : value < 100 ? "%.1f %s" : "%.0f %s", value, unit);
}

std::string Scaled(double value, double step, std::initializer_list<char const*> units) {
    auto unit = units.begin();
    while (value >= step && unit + 1 != units.end()) {
        value /= step;
        ++unit;
    }
    return Digits(value, *unit);
}

std::string Time(double nanoseconds) {
    return Scaled(nanoseconds, 1000, {"ns", "us", "ms", "s"});
}

std::string Size(double bytes) {
    return bytes < 1024 ? Format("%.0f B", bytes) : Scaled(bytes / 1024, 1024, {"KiB", "MiB"});
}

double Median(std::vector<double> values) {
    auto const middle = values.begin() + static_cast<std::ptrdiff_t>(values.size() / 2);
    std::nth_element(values.begin(), middle, values.end());
    return *middle;
}

/// Keeps what was measured; prints nothing but where it stands.
class Collector : public benchmark::BenchmarkReporter {
public:
    bool ReportContext(Context const&) override {
        return true;
    }

    void ReportRuns(std::vector<Run> const& runs) override {
        for (Run const& run : runs) {
            std::string const& name = run.run_name.function_name;
            if (run.error_occurred) {
                failures[name] = run.error_message;
            } else if (run.run_type == Run::RT_Iteration) {
                double const time = run.run_name.time_type.empty() ? run.cpu_accumulated_time
                                                                   : run.real_accumulated_time;
                times[name].push_back(time / static_cast<double>(run.iterations) * 1e9);
            }
        }
    }

    std::map<std::string, std::vector<double>> times;
    std::map<std::string, std::string> failures;
};

/// Bytes for each "case/contender", from a process of its own: counting costs time.
std::map<std::string, double> PeakMemory(char const* self) {
    std::string const command = "LD_PRELOAD='" PEAK_MEMORY_LIBRARY "' exec '" + std::string(self) +
                                "' --observe --benchmark_filter='" +
                                benchmark::GetBenchmarkFilter() + "'";
    std::unique_ptr<std::FILE, int (*)(std::FILE*)> const pipe(::popen(command.c_str(), "r"),
                                                               ::pclose);
    std::map<std::string, double> peaks;
    char line[512];
    while (pipe != nullptr && std::fgets(line, sizeof line, pipe.get()) != nullptr) {
        std::string const text = line;
        auto const tab = text.find('\t');
        if (tab != std::string::npos) {
            peaks[text.substr(0, tab)] = std::strtod(text.c_str() + tab, nullptr);
        }
    }
    return peaks;
}

std::string BarText(Bar const& bar) {
    switch (bar.of) {
    case Bar::Of::Ratio:
        return Format("<= %g x", bar.limit);
    case Bar::Of::Overhead:
        return "<= +" + Time(bar.limit);
    case Bar::Of::Time:
        return "<= " + Time(bar.limit);
    }
    return {};
}

bool Met(Bar const& bar, double ours, double comparison) {
    switch (bar.of) {
    case Bar::Of::Ratio:
        return ours <= bar.limit * comparison;
    case Bar::Of::Overhead:
        return ours <= comparison + bar.limit;
    case Bar::Of::Time:
        return ours <= bar.limit;
    }
    return false;
}

using Row = std::vector<std::string>;

void Print(std::vector<Row> const& rows) {
    std::vector<std::size_t> widths(rows.front().size());
    for (Row const& row : rows) {
        for (std::size_t i = 0; i < row.size(); ++i) {
            widths[i] = std::max(widths[i], row[i].size());
        }
    }
    for (Row const& row : rows) {
        std::string line;
        for (std::size_t i = 0; i < row.size(); ++i) {
            bool const left = i == 0 || i + 1 == row.size();
            std::string const space(widths[i] - row[i].size(), ' ');
            line += (i == 0 ? "| " : " | ") + (left ? row[i] + space : space + row[i]);
        }
        std::puts((line + " |").c_str());
        if (&row == &rows.front()) {
            std::string rule;
            for (std::size_t const width : widths) {
                rule += "|" + std::string(width + 2, '-');
            }
            std::puts((rule + "|").c_str());
        }
    }
}

} // namespace

void Table::Add(std::string name, Bar bar, Clock clock, int repetitions,
                std::vector<Contender> contenders) {
    Case added{std::move(name), bar, clock, repetitions, std::move(contenders), {}, {}, 0, 0};
    _cases.push_back(std::move(added));
}

void Table::AddGrowth(std::string name, Bar bar, std::string few, double fewLines, std::string many,
                      double manyLines) {
    _cases.push_back({std::move(name),
                      bar,
                      Clock::Wall,
                      0,
                      {},
                      std::move(few),
                      std::move(many),
                      fewLines,
                      manyLines});
}

namespace {

void Register(Case const& row, Contender const& contender) {
    std::string const name = row.name + "/" + contender.name;
    auto* const registered =
        benchmark::RegisterBenchmark(name.c_str(), [=](benchmark::State& state) {
            observation.running = name;
            observation.clock = row.clock;
            observation.peak = 0;
            try {
                contender.body(state);
            } catch (std::exception const& failure) {
                state.SkipWithError(failure.what());
            }
            if (observation.active && PeakMemoryMost != nullptr) {
                std::printf("%s\t%zu\n", name.c_str(), observation.peak);
                (void)std::fflush(stdout);
            }
        });
    if (contender.timedByHand) {
        registered->UseManualTime();
    } else if (row.clock == Clock::Wall) {
        registered->UseRealTime();
    }
    if (observation.active) {
        registered->Iterations(1);
    } else {
        registered->MinTime(0.03);
    }
}

/// Runs a contender once, in a process of its own: what others leave of the heap, and in which
/// order they ran, would change the time of everything that allocates.
void RunAlone(Case const& row, Contender const& contender, Collector& collector) {
    std::string const name = row.name + "/" + contender.name;
    int ends[2];
    if (::pipe(ends) != 0) {
        collector.failures[name] = "no pipe";
        return;
    }
    pid_t const child = ::fork();
    if (child == 0) {
        Register(row, contender);
        Collector own;
        benchmark::RunSpecifiedBenchmarks(&own);
        std::string const answer = own.failures.empty() ? Format("%.17g", own.times[name].at(0))
                                                        : "!" + own.failures[name];
        ssize_t const written = ::write(ends[1], answer.data(), answer.size());
        ::_exit(written == static_cast<ssize_t>(answer.size()) ? 0 : 1);
    }
    ::close(ends[1]);
    char answer[1024] = {};
    ssize_t const count = ::read(ends[0], answer, sizeof answer - 1);
    ::close(ends[0]);
    int status = 0;
    if (child < 0 || ::waitpid(child, &status, 0) != child || status != 0 || count <= 0) {
        collector.failures[name] = "the process ended early";
    } else if (answer[0] == '!') {
        collector.failures[name] = answer + 1;
    } else {
        collector.times[name].push_back(std::strtod(answer, nullptr));
    }
}

/// Runs the contenders of a case in turn, each time in another order.
void RunInTurn(Case const& row, std::regex const& filter, Collector& collector) {
    std::vector<Contender const*> chosen;
    for (Contender const& contender : row.contenders) {
        if (std::regex_search(row.name + "/" + contender.name, filter)) {
            chosen.push_back(&contender);
        }
    }
    std::mt19937 random(1);
    for (int i = 0; i < row.repetitions; ++i) {
        std::shuffle(chosen.begin(), chosen.end(), random);
        for (Contender const* const contender : chosen) {
            RunAlone(row, *contender, collector);
        }
    }
}

} // namespace

void Table::Observe() const {
    observation.active = true;
    for (Case const& row : _cases) {
        for (Contender const& contender : row.contenders) {
            Register(row, contender);
        }
    }
    Collector collector;
    benchmark::RunSpecifiedBenchmarks(&collector);
}

bool Table::Run(char const* self) const {
    auto const peaks = PeakMemory(self);
    Collector collector;
    std::regex const filter(benchmark::GetBenchmarkFilter());
    for (Case const& row : _cases) {
        RunInTurn(row, filter, collector);
    }

    auto const median = [&](std::string const& name) {
        auto const found = collector.times.find(name);
        return found == collector.times.end() ? -1 : Median(found->second);
    };
    std::vector<Row> rows = {
        {"case", "ours", "compared", "ratio", "bar", "met?", "peak memory", "with", "peers"}};
    for (Case const& row : _cases) {
        double ours = 0;
        double comparison = 0;
        std::string peak = "-";
        std::string with = "a line";
        std::string peers;
        if (row.contenders.empty()) {
            ours = median(row.many + "/ours") / row.manyLines;
            comparison = median(row.few + "/ours") / row.fewLines;
        } else {
            std::string const first = row.name + "/" + row.contenders.front().name;
            ours = median(first);
            if (auto const found = peaks.find(first); found != peaks.end()) {
                peak = Size(found->second);
            }
            with = row.contenders[1].name;
            comparison = median(row.name + "/" + with);
            for (std::size_t i = 2; i < row.contenders.size(); ++i) {
                std::string const peer = row.name + "/" + row.contenders[i].name;
                double const time = median(peer);
                peers +=
                    (peers.empty() ? "" : ", ") + row.contenders[i].name + " " +
                    (time < 0 ? "-"
                              : Time(time) +
                                    (comparison > 0 ? Format(" (%.3g x)", time / comparison) : ""));
                if (auto const found = peaks.find(peer); found != peaks.end()) {
                    peers += " " + Size(found->second);
                }
            }
        }
        if (ours <= 0 || comparison <= 0) {
            // Left out by a filter, or it could not run: that is said below.
            continue;
        }
        rows.push_back({row.name, Time(ours), Time(comparison), Format("%.2f", ours / comparison),
                        BarText(row.bar), Met(row.bar, ours, comparison) ? "yes" : "NOT MET", peak,
                        with, peers});
    }
    Print(rows);
    for (auto const& [name, failure] : collector.failures) {
        std::printf("could not run: %s: %s\n", name.c_str(), failure.c_str());
    }
    return collector.failures.empty();
}

} // namespace bench
