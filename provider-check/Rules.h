// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>

/// What a provider has to keep to, a rule each: the words of docs/PROVIDERS.md, and why.
namespace tessel::providercheck {

enum class Rule : unsigned {
    Loads,
    Records,
    RecordSize,
    Version,
    Metadata,
    NameServiceParameters,
    Unused,
    Crash,
    Exit,
    Exception,
    Time,
    Code,
    Arguments,
    Injection,
    Slots,
    Results,
    ReleasedOnce,
    ReleasedOwn,
    ReleasedAll,
    Overrun,
    Threads,
    Cancelled,
    Forked,
    Signals,
    Locale,
    Descriptors,
    ThreadsLeft,
    Children,
    Process,
    Output,
    Secrets,
    Unloads,
    Changes,
    Joins,
};

constexpr std::size_t RuleCount = static_cast<std::size_t>(Rule::Joins) + 1;

struct RuleText {
    char const* name;
    char const* rule;
    char const* why;
};

RuleText const& TextOf(Rule rule);

} // namespace tessel::providercheck
