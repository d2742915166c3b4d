// SPDX-License-Identifier: Apache-2.0
#include "text/SambaSettings.h"

#include "text/SambaLines.h"

#include <algorithm>
#include <base/AsciiText.h>
#include <iterator>

using namespace tessel::base::AsciiText;

namespace tessel::winbind {

namespace {

std::optional<SambaSettings::Range> ReadRange(std::string_view text) {
    auto const hyphen = text.find('-');
    if (hyphen == std::string_view::npos) {
        return std::nullopt;
    }
    auto const first = SambaNumber(Trimmed(text.substr(0, hyphen)));
    auto const last = SambaNumber(Trimmed(text.substr(hyphen + 1)));
    if (!first || !last) {
        return std::nullopt;
    }
    return SambaSettings::Range{*first, *last};
}

constexpr std::string_view OldRangesOfAll[] = {"idmapuid", "idmapgid", "winbinduid", "winbindgid"};

} // namespace

SambaSettings::SambaSettings(std::string_view text) {
    Read(text);
}

void SambaSettings::Read(std::string_view text) {
    for (auto const& line : SambaLines(text)) {
        if (!line.global || line.name.empty()) {
            continue;
        }
        if (line.name == "include") {
            _includes.push_back(line.value);
        } else {
            _values[line.name] = line.value;
        }
    }
}

bool SambaSettings::Sets(std::string_view name) const {
    return _values.count(NormalisedSambaName(name)) != 0;
}

std::optional<std::string> SambaSettings::Value(std::string_view name) const {
    auto const found = _values.find(NormalisedSambaName(name));
    return found == _values.end() ? std::nullopt : std::optional(found->second);
}

bool SambaSettings::SetsIdmapOf(std::string_view domain) const {
    auto const family = NormalisedSambaName("idmapconfig" + std::string(domain) + ':');
    auto const first = _values.lower_bound(family);
    if (first != _values.end() && StartsWith(first->first, family)) {
        return true;
    }
    return domain == "*" && (Sets("idmap backend") ||
                             std::any_of(std::begin(OldRangesOfAll), std::end(OldRangesOfAll),
                                         [this](std::string_view name) { return Sets(name); }));
}

std::vector<SambaSettings::Range> SambaSettings::IdmapRanges() const {
    std::vector<Range> ranges;
    for (auto const& [name, value] : _values) {
        bool const isRange = (StartsWith(name, "idmapconfig") && EndsWith(name, ":range")) ||
                             std::find(std::begin(OldRangesOfAll), std::end(OldRangesOfAll),
                                       name) != std::end(OldRangesOfAll);
        if (auto const range = ReadRange(value); isRange && range) {
            ranges.push_back(*range);
        }
    }
    return ranges;
}

} // namespace tessel::winbind
