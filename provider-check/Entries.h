// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "Profile.h"
#include "Provider.h"

#include <functional>
#include <optional>
#include <string>
#include <vector>

namespace tessel::providercheck {

/// What stands in for a password: no secret of anybody's, and nothing that a text holds by chance.
constexpr char CheckedSecret[] = "Checked-9f3b61-Secret";

/// What a call came back with; see `Entry::call`.
struct Answer {
    std::optional<int> code; ///< of an entry that returns one
    int value = 0;           ///< of one that does not
    /// Copies of the texts that it handed out, in order; an array's as well.
    std::vector<std::string> texts;
    /// What is wrong with what it handed out; empty where nothing is.
    std::string flaw;
    /// Whether something stands in the slots although the call failed.
    bool handedOutOnFailure = false;
    /// The texts themselves, to look at again while they must stay. Not of an array.
    std::vector<char const*> held;
    /// What releases it, as libtslauth does; empty where nothing is to be released.
    std::function<void()> release;

    /// Whether both say the same.
    bool operator==(Answer const& other) const {
        return code == other.code && value == other.value && texts == other.texts;
    }
};

/// An argument that an entry takes as text.
struct Parameter {
    char const* name;
    bool mayBeNull;
    std::string usual; ///< what an ordinary caller gives
    bool isSecret = false;
};

/// An entry of a record, called as libtslauth calls it.
struct Entry {
    char const* name;
    bool changesHost;
    std::vector<Parameter> parameters;
    /// Calls it with a text, or null, for each parameter. Empty where the record has none.
    std::function<Answer(std::vector<char const*> const&)> call;
};

/// The entries of a record, those that are null included; of a provider's, which must stay open.
/// @{
std::vector<Entry> EntriesOf(ActiveDirectoryClientOperationsRecord const& record,
                             Profile const& profile);
std::vector<Entry> EntriesOf(CAMProxyClientOperationsRecord const& record, Profile const& profile);
std::vector<Entry> EntriesOf(Provider const& provider, Kind kind, Profile const& profile);
/// @}

} // namespace tessel::providercheck
