// SPDX-License-Identifier: Apache-2.0
#include "ConfigurationText.h"

#include <algorithm>
#include <tslauth/Exceptions.h>
#include <vector>

namespace tessel::authentication {

namespace {

using base::Assignment;

template <typename Call> auto Translated(Call call) {
    try {
        return call();
    } catch (base::KeyValueError const& error) {
        throw ConfigurationError(error.what());
    }
}

} // namespace

Assignment SplitLine(std::string_view line, int lineNumber) {
    return Translated([&] { return base::SplitAssignment(line, lineNumber); });
}

void ReadAssignments(std::string_view text, std::map<std::string, std::string>& map) {
    std::vector<Assignment> assignments;
    Translated([&] {
        base::ForEachAssignment(
            text, [&](Assignment const& assignment) { assignments.push_back(assignment); });
    });
    auto const byKey = [](Assignment const& left, Assignment const& right) {
        return left.key < right.key;
    };
    // A file of ours is in order already.
    if (!std::is_sorted(assignments.begin(), assignments.end(), byKey)) {
        std::stable_sort(assignments.begin(), assignments.end(), byKey); // the first of a key stays
    }
    for (Assignment const& assignment : assignments) {
        map.emplace_hint(map.end(), assignment.key, assignment.value);
    }
}

void ThrowMissingKey(std::string const& key) {
    throw InvalidKeyException("The specified key '" + key +
                              "' was not found in this configuration");
}

void AssignLine(std::string& line, Assignment const& assignment) {
    static constexpr std::string_view middle = " = \"";
    static constexpr std::string_view end = "\"\n";
    line.resize(assignment.key.size() + middle.size() + assignment.value.size() + end.size());
    char* at = line.data();
    for (std::string_view const piece : {assignment.key, middle, assignment.value, end}) {
        at += piece.copy(at, piece.size());
    }
}

} // namespace tessel::authentication
