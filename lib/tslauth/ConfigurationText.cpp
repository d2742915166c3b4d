// SPDX-License-Identifier: Apache-2.0
#include "ConfigurationText.h"

#include <algorithm>
#include <array>
#include <cstdint>
#include <cstring>
#include <endian.h>
#include <tslauth/Exceptions.h>
#include <utility>
#include <vector>

namespace tessel::authentication {

namespace {

/// A carriage return is none: a file with CRLF line ends keeps it in its values.
bool IsBlank(char character) {
    return character == ' ' || character == '\t';
}

bool IsQuote(char character) {
    return character == '"' || character == '\'';
}

/// A key or a value without the blanks and the one pair of quotes around it.
std::string_view CleanField(std::string_view field, int lineNumber) {
    std::string_view text = field;
    while (!text.empty() && IsBlank(text.front())) {
        text.remove_prefix(1);
    }
    if (text.empty()) {
        // Deliberate: files in the field hold values of nothing but blanks, and mean them.
        return field;
    }
    while (IsBlank(text.back())) {
        text.remove_suffix(1);
    }
    if (!IsQuote(text.front())) {
        return text;
    }
    if (text.size() == 1) {
        throw ConfigurationError("Error parsing configuration at line " +
                                 std::to_string(lineNumber) + ": invalid quoting");
    }
    return text.front() == text.back() ? text.substr(1, text.size() - 2) : text;
}

} // namespace

Assignment SplitLine(std::string_view line, int lineNumber) {
    std::string_view::size_type const delimiter = line.find('=');
    if (delimiter == std::string_view::npos) {
        throw ConfigurationError("Error parsing configuration on line " +
                                 std::to_string(lineNumber) + ": no delimiter found");
    }
    // The value first: where both are bad, it is the one that the message is about.
    std::string_view const value = CleanField(line.substr(delimiter + 1), lineNumber);
    return {CleanField(line.substr(0, delimiter), lineNumber), value};
}

namespace {

/// Calls `take` with each assignment of `text`, in order.
template <typename Take> void ForEachAssignment(std::string_view text, Take take) {
    int lineNumber = 0;
    while (!text.empty()) {
        std::string_view const line = text.substr(0, text.find('\n'));
        text.remove_prefix(std::min(line.size() + 1, text.size()));
        ++lineNumber;
        if (!std::all_of(line.begin(), line.end(), IsBlank)) {
            take(SplitLine(line, lineNumber));
        }
    }
}

std::string_view::size_type CommonPrefix(std::string_view left, std::string_view right) {
    return static_cast<std::string_view::size_type>(
        std::mismatch(left.begin(), left.end(), right.begin(), right.end()).first - left.begin());
}

/// The first eight bytes of `key` as a number that is ordered like them.
std::uint64_t Rank(std::string_view key) {
    std::uint64_t bytes = 0;
    std::memcpy(&bytes, key.data(), std::min(key.size(), sizeof bytes));
    return be64toh(bytes);
}

struct Place {
    std::uint64_t rank;
    std::size_t index;
};

/// Sorts by rank and keeps the order of equal ranks: byte for byte from the last on, leaving out
/// those that are the same everywhere.
void SortByRank(std::vector<Place>& places) {
    std::array<std::array<std::size_t, 256>, sizeof(Place::rank)> counts = {};
    for (Place const& place : places) {
        for (std::size_t byte = 0; byte < counts.size(); ++byte) {
            ++counts[byte][place.rank >> 8 * byte & 0xff];
        }
    }
    std::vector<Place> sorted(places.size());
    for (std::size_t byte = 0; byte < counts.size(); ++byte) {
        std::array<std::size_t, 256>& count = counts[byte];
        if (count[places.front().rank >> 8 * byte & 0xff] == places.size()) {
            continue;
        }
        std::size_t start = 0;
        for (std::size_t& slot : count) {
            start += std::exchange(slot, start);
        }
        for (Place const& place : places) {
            sorted[count[place.rank >> 8 * byte & 0xff]++] = place;
        }
        places.swap(sorted);
    }
}

/// The order in which `assignments` enter the map: by key, and the first of a key before its
/// others. By numbers as far as they tell keys apart, because a large file's keys lie all over the
/// memory: comparing them in place takes longer than everything else together.
std::vector<Place> SortedOrder(std::vector<Assignment> const& assignments) {
    std::string_view shared = assignments.front().key;
    for (Assignment const& assignment : assignments) {
        if (assignment.key.compare(0, shared.size(), shared) != 0) {
            shared = shared.substr(0, CommonPrefix(shared, assignment.key));
        }
    }
    std::vector<Place> places;
    places.reserve(assignments.size());
    for (Assignment const& assignment : assignments) {
        places.push_back({Rank(assignment.key.substr(shared.size())), places.size()});
    }
    SortByRank(places);
    for (auto first = places.begin(); first != places.end();) {
        auto const last = std::find_if(
            first, places.end(), [&](Place const& place) { return place.rank != first->rank; });
        if (last - first > 1) {
            std::stable_sort(first, last, [&](Place const& left, Place const& right) {
                return assignments[left.index].key < assignments[right.index].key;
            });
        }
        first = last;
    }
    return places;
}

/// Adds the assignments whose keys are not there yet, at the cost of one walk through the map.
void Merge(std::map<std::string, std::string>& map, std::vector<Assignment> const& assignments) {
    std::vector<Place> const order = SortedOrder(assignments);
    // The next ones are asked for while one is added: they lie all over a large file's memory, and
    // waiting for each would take longer than everything else together.
    static constexpr std::size_t ahead = 16;
    auto next = map.begin();
    for (std::size_t i = 0; i < order.size(); ++i) {
        if (i + 2 * ahead < order.size()) {
            __builtin_prefetch(&assignments[order[i + 2 * ahead].index]);
            __builtin_prefetch(assignments[order[i + ahead].index].key.data());
        }
        Assignment const& assignment = assignments[order[i].index];
        while (next != map.end() && next->first < assignment.key) {
            ++next;
        }
        if (next == map.end() || next->first != assignment.key) {
            // Goes in front of `next`, unless it is there already.
            map.emplace_hint(next, assignment.key, assignment.value);
        }
    }
}

} // namespace

void ReadAssignments(std::string_view text, std::map<std::string, std::string>& map) {
    // A file of ours is in order, and then each key goes to the end of the map. From the first
    // key that does not, the rest is collected and sorted: a map that grows at random places is
    // several times slower for a large file.
    std::vector<Assignment> rest;
    std::string_view last;
    ForEachAssignment(text, [&](Assignment const& assignment) {
        if (rest.empty() && (last < assignment.key || map.empty())) {
            map.emplace_hint(map.end(), assignment.key, assignment.value);
            last = assignment.key;
        } else {
            rest.push_back(assignment);
        }
    });
    if (!rest.empty()) {
        Merge(map, rest);
    }
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
