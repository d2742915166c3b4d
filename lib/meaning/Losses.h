// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "NSSMeaning.h"
#include "PAMMeaning.h"

#include <string>
#include <vector>

/// What an edit takes away beyond what it is meant to do: the meaning before is compared with the
/// meaning after, the intended edit set aside. Each function gives one sentence for each
/// difference, and none where the two mean the same.
namespace tessel::meaning {

/// `insert` puts a provider's entries into a file, `remove` takes them out again.
enum class Edit { insert, remove };

/// @param entry what is inserted or removed, in each of `editedDatabases`
std::vector<std::string> NSSLosses(NSSMeaning const& before, NSSMeaning const& after, Edit edit,
                                   NSSServices const& entry,
                                   std::vector<std::string> const& editedDatabases);

/// @param entry what is inserted or removed; its facility does not matter
/// @param reader gives the policies that the file includes, for the jumps across them
std::vector<std::string> PAMLosses(PAMMeaning const& before, PAMMeaning const& after, Edit edit,
                                   PAMLine const& entry, PAMPolicyReader const& reader);

} // namespace tessel::meaning
