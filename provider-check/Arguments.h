// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "Entries.h"

#include <optional>
#include <string>
#include <vector>

namespace tessel::providercheck {

/// What an entry is called with: a text, or null, for each of its parameters.
struct Arguments {
    std::string words; ///< for people: "domain: empty"
    std::vector<std::optional<std::string>> texts;
};

/// What an ordinary caller gives.
Arguments UsualArguments(Entry const& entry);

/// Every combination that a check tries, the usual one first: null, empty, long, huge, bytes that
/// are no UTF-8, and texts that mean something to whoever takes them for more than texts; in each
/// parameter alone, and in all of them.
/// @param trap a path that only a shell could make
std::vector<Arguments> AllArguments(Entry const& entry, std::string const& trap);

} // namespace tessel::providercheck
