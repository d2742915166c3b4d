// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>
#include <cstdint>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

/// The lines of an smb.conf(5), which everything else about such files is made of. Text in, values
/// out.
namespace tessel::winbind {

/// A line as Samba sees it: with all the lines that it is continued on.
struct SambaLine {
    enum class Kind { blank, comment, section, parameter };
    Kind kind;
    std::size_t begin;
    std::size_t end;          ///< behind the line feed, if there is one
    bool global;              ///< whether it belongs to a [global] section; its header does
    std::size_t openAtEnd;    ///< how many empty lines it takes to end it, at the end of the text
    std::string name;         ///< of a parameter: in lower case, without blanks
    std::string_view content; ///< of a blank line or a comment, without its line end
    std::string value;        ///< of a parameter
};

/// The lines of `text`, in order and without a gap. A text that Samba refuses is read as far as it
/// makes sense.
std::vector<SambaLine> SambaLines(std::string_view text);

/// The name of a parameter or a section as Samba compares it: in lower case, without blanks.
std::string NormalisedSambaName(std::string_view name);

/// The value of up to ten decimal digits; nothing for anything else.
std::optional<std::uint64_t> SambaNumber(std::string_view text);

} // namespace tessel::winbind
