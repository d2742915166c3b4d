// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "Rules.h"

#include <array>
#include <string>
#include <vector>

namespace tessel::providercheck {

/// What was found about each rule. A value.
class Report {
public:
    /// Something was looked at for `rule`.
    void Examined(Rule rule, unsigned long times = 1);
    /// @param what is told once, however often it was found, and among the first of its rule alone
    void Found(Rule rule, std::string const& what);
    /// Why nothing can be looked at for `rule`. Counts only where nothing was.
    void NotExamined(Rule rule, std::string const& reason);

    bool Passes() const;

    /// The Test Anything Protocol, version 14: a test point a rule.
    std::string Tap() const;
    /// JUnit's XML: a test case a rule.
    std::string JUnit(std::string const& provider) const;

private:
    struct Entry {
        unsigned long examined = 0;
        std::string reason = "there was nothing to look at";
        std::vector<std::string> findings;
    };
    Entry const& Of(Rule rule) const;

    std::array<Entry, RuleCount> _entries;
};

} // namespace tessel::providercheck
