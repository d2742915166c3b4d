// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <functional>
#include <map>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

/// What a PAM policy file means to the system, read as libpam reads it and not as the library's
/// model does, so that the two can be compared. Established with Linux-PAM 1.5:
/// - "#" begins a comment anywhere; only space, tab and line feed separate words;
/// - a backslash at the end of a line joins the next line that is not blank and no comment;
/// - facility and control are read without regard to case, "@include" too;
/// - a word that begins with "[" reaches to the next "]", blanks included, also as an argument;
/// - a leading minus only keeps libpam from logging that the module is missing;
/// - a facility that is not known makes every "auth" fail;
/// - a line is read in pieces of 1023 bytes, and ends at a NUL byte.
namespace tessel::meaning {

struct PAMLine {
    /// In lower case; "@include", or as written where it is no facility.
    std::string facility;
    bool known = false;
    bool silent = false;
    /// In lower case, or a bracketed list with single blanks, as text that libpam reads the same.
    std::string control;
    std::string module;
    std::vector<std::string> arguments;
    /// Which lines of the file it was read from, from 1 and inclusive.
    std::size_t first = 0;
    std::size_t last = 0;

    bool IsInclude() const {
        return facility == "@include" || control == "include";
    }
    /// Without regard to the place and to the minus.
    bool operator==(PAMLine const& other) const {
        return facility == other.facility && control == other.control && module == other.module &&
               arguments == other.arguments;
    }
};

/// The line in the form that libpam and the library read the same wherever there is one.
std::string PAMText(PAMLine const& line);

/// The entry of a text that follows a facility: control, module, arguments.
PAMLine ReadPAMEntry(std::string const& facility, std::string const& entry);

struct PAMMeaning {
    std::vector<PAMLine> lines;
    std::size_t comments = 0;
    /// libpam refuses the whole file: it ends in a continuation, or a continued line is too long.
    bool unreadable = false;
};

PAMMeaning ReadPAMMeaning(std::string_view text);

/// The lines of one facility, in order. "@include" belongs to each, and so does nothing else.
std::vector<PAMLine> PAMStackOf(PAMMeaning const& meaning, std::string const& facility);

/// The text of another policy by its name; nothing where it cannot be read.
using PAMPolicyReader = std::function<std::optional<std::string>(std::string const&)>;

/// Looks for policies by their names where libpam does.
/// @param file gives the text of a file by its path; nothing where it cannot be read
PAMPolicyReader PAMPoliciesIn(std::function<std::optional<std::string>(std::string const&)> file);

inline constexpr char const* PAMFacilities[] = {"auth", "account", "password", "session"};

/// Where each jump of a stack lands.
struct PAMJump {
    /// The index in the stack of the line that jumps, and what it says, such as "success=2".
    std::size_t from;
    std::string criterion;
    /// The index of the line where it goes on, and how many modules into what that line includes;
    /// the size of the stack where it jumps to the end. Nothing where an include that cannot be
    /// read lies between.
    std::optional<std::size_t> to;
    std::size_t within = 0;
};

/// Whether a stack runs anything at all. Where it does not, libpam goes by the policy "other". An
/// include that cannot be read counts as something.
bool RunsAnything(std::vector<PAMLine> const& stack, PAMPolicyReader const& reader);

/// The jumps of the lines themselves, and those out of what they include.
std::vector<PAMJump> PAMJumps(std::vector<PAMLine> const& stack, PAMPolicyReader const& reader);

} // namespace tessel::meaning
