// SPDX-License-Identifier: Apache-2.0
#include "terminal/UnifiedDiff.h"

#include "terminal/EscapedText.h"

#include <base/AsciiText.h>

#if defined(__GNUC__)
#pragma GCC diagnostic push
#pragma GCC diagnostic ignored "-Wconversion"
#pragma GCC diagnostic ignored "-Wsign-conversion"
#pragma GCC diagnostic ignored "-Wshadow"
#endif
#include <dtl/dtl.hpp>
#if defined(__GNUC__)
#pragma GCC diagnostic pop
#endif

#include <algorithm>
#include <unordered_map>

// dtl finds the shortest edit. Its own printer is not used: it knows nothing of a last line without
// a line feed, and writes "@@ -1,0" where patch wants "@@ -0,0" for an empty file.

namespace tessel::tslauthctl {

namespace {

constexpr std::size_t context = 3;
constexpr std::size_t mostDiffering = 2000;

struct Step {
    char sign;
    std::string_view line;
};

using LineList = std::vector<std::string_view>;

void AppendShortest(LineList const& before, LineList const& after, std::vector<Step>& steps) {
    // Numbers instead of texts: dtl copies and compares each element many times.
    std::unordered_map<std::string_view, int> numbers;
    auto const numbered = [&numbers](LineList const& lines) {
        std::vector<int> result;
        for (auto const line : lines) {
            result.push_back(numbers.emplace(line, static_cast<int>(numbers.size())).first->second);
        }
        return result;
    };
    auto const left = numbered(before);
    auto const right = numbered(after);
    dtl::Diff<int, std::vector<int>> diff(left, right);
    diff.onHuge();
    diff.compose();
    std::size_t b = 0;
    std::size_t a = 0;
    for (auto const& element : diff.getSes().getSequence()) {
        if (element.second.type == dtl::SES_ADD) {
            steps.push_back({'+', after[a++]});
        } else if (element.second.type == dtl::SES_DELETE) {
            steps.push_back({'-', before[b++]});
        } else {
            steps.push_back({' ', before[b++]});
            ++a;
        }
    }
    // Within a run of changes what goes stands before what comes, as readers know it.
    for (auto step = steps.begin(); step != steps.end();) {
        auto const isSame = [](Step const& any) { return any.sign == ' '; };
        auto const start = std::find_if_not(step, steps.end(), isSame);
        step = std::find_if(start, steps.end(), isSame);
        std::stable_partition(start, step, [](Step const& any) { return any.sign == '-'; });
    }
}

std::vector<Step> EditSteps(LineList const& before, LineList const& after) {
    auto const most = std::min(before.size(), after.size());
    std::size_t head = 0;
    while (head < most && before[head] == after[head]) {
        ++head;
    }
    std::size_t tail = 0;
    while (tail < most - head &&
           before[before.size() - 1 - tail] == after[after.size() - 1 - tail]) {
        ++tail;
    }
    auto const middle = [&](LineList const& lines) {
        return LineList(lines.begin() + static_cast<std::ptrdiff_t>(head),
                        lines.end() - static_cast<std::ptrdiff_t>(tail));
    };
    auto const removed = middle(before);
    auto const added = middle(after);

    std::vector<Step> steps;
    for (std::size_t i = 0; i < head; ++i) {
        steps.push_back({' ', before[i]});
    }
    if (removed.size() + added.size() <= mostDiffering && !removed.empty() && !added.empty()) {
        AppendShortest(removed, added, steps);
    } else {
        for (auto const line : removed) {
            steps.push_back({'-', line});
        }
        for (auto const line : added) {
            steps.push_back({'+', line});
        }
    }
    for (std::size_t i = before.size() - tail; i < before.size(); ++i) {
        steps.push_back({' ', before[i]});
    }
    return steps;
}

std::string Range(std::size_t linesBefore, std::size_t count) {
    // An empty range names the line before it.
    return std::to_string(count > 0 ? linesBefore + 1 : linesBefore) + "," + std::to_string(count);
}

} // namespace

std::string UnifiedDiff(std::string const& path, std::string_view before, std::string_view after) {
    if (before == after) {
        return {};
    }
    auto const steps = EditSteps(base::AsciiText::Lines(before), base::AsciiText::Lines(after));
    std::string out = "--- " + path + "\n+++ " + path + "\n";
    std::size_t oldLine = 0;
    std::size_t newLine = 0;
    std::size_t done = 0;
    while (true) {
        auto const isChange = [](Step const& step) { return step.sign != ' '; };
        auto const at = [&](std::size_t i) {
            return steps.begin() + static_cast<std::ptrdiff_t>(i);
        };
        auto const change =
            static_cast<std::size_t>(std::find_if(at(done), steps.end(), isChange) - steps.begin());
        if (change == steps.size()) {
            return out;
        }
        auto const start = std::max(done, change - std::min(change, context));
        oldLine += start - done;
        newLine += start - done;
        auto end = change;
        for (std::size_t i = change; i < steps.size() && i <= end + 2 * context + 1; ++i) {
            end = isChange(steps[i]) ? i : end;
        }
        end = std::min(end + 1 + context, steps.size());
        std::size_t oldCount = 0;
        std::size_t newCount = 0;
        std::string body;
        for (std::size_t i = start; i < end; ++i) {
            oldCount += steps[i].sign != '+' ? 1U : 0U;
            newCount += steps[i].sign != '-' ? 1U : 0U;
            body += steps[i].sign;
            body += steps[i].line;
            if (steps[i].line.back() != '\n') {
                body += "\n\\ No newline at end of file\n";
            }
        }
        out += "@@ -" + Range(oldLine, oldCount) + " +" + Range(newLine, newCount) + " @@\n" + body;
        oldLine += oldCount;
        newLine += newCount;
        done = end;
    }
}

} // namespace tessel::tslauthctl
