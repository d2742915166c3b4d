// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "host/ChildProcess.h"

#include <map>
#include <string>
#include <string_view>
#include <vector>

/// What the directory itself says, asked with the host's own account through `net ads search`. For
/// what winbindd does not know; it takes a quarter of a second and a controller that answers.
namespace tessel::winbind {

class Host;

/// One object: its attributes, several of a name in the order of the directory. The names are in
/// the case of the question.
typedef std::multimap<std::string, std::string> DirectoryEntry;

/// The value of an attribute, the first of several; empty where there is none.
std::string ValueIn(DirectoryEntry const& entry, std::string const& attribute);

/// The objects that `net ads search` has printed.
std::vector<DirectoryEntry> ReadDirectoryEntries(std::string_view text);

/// Searches the domain of `controller`, or the host's own where that is empty.
/// @param filter as RFC 4515 has it; names in it are escaped by the caller
/// @param attributes those to return
/// @throws Failure
std::vector<DirectoryEntry> SearchDirectory(Host const& host, std::string const& controller,
                                            std::string const& filter,
                                            std::vector<std::string> const& attributes,
                                            Clock::time_point deadline);

} // namespace tessel::winbind
