// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <array>
#include <map>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

/// What a name-service switch file means to the system, read as the C library reads it and not as
/// the library's model does, so that the two can be compared. Established with glibc 2.36:
/// - "#" begins a comment only at the start of a line; elsewhere it is part of a service's name;
/// - the database ends at a blank or a colon, case counts, and of two lines the last one applies;
/// - a bracket needs no blanks around it, and belongs to the service before it; a second one after
///   it, or one before the first service, ends the list;
/// - a criterion that is not understood makes every look-up of the process fail;
/// - a line ends at a NUL byte.
namespace tessel::meaning {

enum class NSSAction { proceed, leave, merge };

/// In the order success, notfound, unavail, tryagain.
using NSSActions = std::array<NSSAction, 4>;

inline constexpr NSSActions DefaultNSSActions = {NSSAction::leave, NSSAction::proceed,
                                                 NSSAction::proceed, NSSAction::proceed};

struct NSSServiceMeaning {
    std::string name;
    NSSActions actions = DefaultNSSActions;
    /// Where it stands in its line, its bracket included.
    std::size_t begin = 0;
    std::size_t end = 0;

    /// Without regard to the place.
    bool operator==(NSSServiceMeaning const& other) const {
        return name == other.name && actions == other.actions;
    }
};

using NSSServices = std::vector<NSSServiceMeaning>;

/// The bracket that gives `actions` with one criterion, and so without a blank in it; nothing where
/// one does not do. Empty text for the default.
std::optional<std::string> OneCriterion(NSSActions const& actions);

/// "files [NOTFOUND=return] dns", for people.
std::string NSSText(NSSServices const& services);
std::string NSSText(NSSServiceMeaning const& service);

/// One line that names a database.
struct NSSLine {
    std::string database;
    NSSServices services;
    /// The C library does not understand a criterion of this line.
    bool faulty = false;
    /// There was a colon directly after the database.
    bool colon = false;
    /// Something follows the point where the C library stops reading the line.
    bool unreadRest = false;
};

/// The services of a list as it stands behind the colon of a line.
NSSServices ReadNSSServices(std::string_view list);

/// Nothing for a line without a meaning: blank, comment, or without anything after the first word.
std::optional<NSSLine> ReadNSSLine(std::string_view line);

struct NSSMeaning {
    /// The services of each database that has a line, by the last line for it.
    std::map<std::string, NSSServices> databases;
    /// The numbers of lines that make every look-up fail, from 1.
    std::vector<std::size_t> faultyLines;
    std::size_t comments = 0;
};

NSSMeaning ReadNSSMeaning(std::string_view text);

/// The services that are asked where the file has no line for `database`; nothing where that is not
/// known.
std::optional<NSSServices> DefaultNSSServices(std::string const& database);

/// The services of a database, by its line or by default.
std::optional<NSSServices> EffectiveNSSServices(NSSMeaning const& meaning,
                                                std::string const& database);

/// Whether two lists ask the same services with the same outcome. What a last service does on its
/// status makes no difference, unless it merges.
bool SameEffect(NSSServices left, NSSServices right);

} // namespace tessel::meaning
