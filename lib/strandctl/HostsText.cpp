// SPDX-License-Identifier: Apache-2.0
#include "HostsText.h"

#include <algorithm>
#include <arpa/inet.h>
#include <array>
#include <base/AsciiText.h>
#include <cstddef>
#include <netinet/in.h>
#include <optional>
#include <strandctl/HostCtlException.h>

namespace StrandCtl {

namespace {

using HostCtl::Lib::HostCtlException;
using tessel::base::AsciiText::TakeLine;
using tessel::base::AsciiText::TakeWord;

/// What separates words for the resolver. The carriage return of a CRLF line end is one of them.
constexpr std::string_view blanks = " \t\r\v\f";

using Address = std::array<unsigned char, 16>;

/// An address of either family, IPv4 as its mapped IPv6 address: the resolver takes the two for
/// one.
std::optional<Address> ParseAddress(std::string_view word) {
    static constexpr std::size_t mappedPrefix = 12;
    Address address = {0, 0, 0, 0, 0, 0, 0, 0, 0, 0, 0xff, 0xff};
    // The C library's own parser reads up to a null byte.
    std::string const text(word);
    if (text.find('\0') == std::string::npos &&
        (::inet_pton(AF_INET, text.c_str(), address.data() + mappedPrefix) == 1 ||
         ::inet_pton(AF_INET6, text.c_str(), address.data()) == 1)) {
        return address;
    }
    return std::nullopt;
}

void CheckName(std::string const& name) {
    bool const readable = std::all_of(name.begin(), name.end(), [](char character) {
        auto const byte = static_cast<unsigned char>(character);
        return byte > ' ' && byte != 0x7f && byte != '#';
    });
    if (name.empty() || !readable) {
        throw HostCtlException("'" + name + "' cannot stand as a name in a hosts file");
    }
}

/// A line, cut where an edit needs it. The parts follow one another without a gap.
struct Line {
    std::string_view head;    ///< up to the address, and with it
    std::string_view gap;     ///< the blanks between the address and the first name
    std::string_view names;   ///< from the first name to the end of the last one
    std::string_view tail;    ///< blanks
    std::string_view comment; ///< from its number sign on
    std::string_view end;     ///< the line end; empty at the end of a text without one
    std::string_view address; ///< the last part of `head`; empty in a line without words
};

Line Cut(std::string_view text) {
    Line line;
    std::string_view rest = text;
    if (rest.back() == '\n') {
        std::size_t const size = rest.size() > 1 && rest[rest.size() - 2] == '\r' ? 2 : 1;
        line.end = rest.substr(rest.size() - size);
        rest.remove_suffix(size);
    }
    line.comment = rest.substr(std::min(rest.find('#'), rest.size()));
    rest.remove_suffix(line.comment.size());
    std::size_t const wordsEnd = rest.find_last_not_of(blanks) + 1; // 0 if there are none
    line.tail = rest.substr(wordsEnd);
    rest = rest.substr(0, wordsEnd);

    std::string_view names = rest;
    line.address = TakeWord(names, blanks);
    line.head = rest.substr(0, rest.size() - names.size());
    line.names = names.substr(std::min(names.find_first_not_of(blanks), names.size()));
    line.gap = names.substr(0, names.size() - line.names.size());
    return line;
}

bool SameWords(std::string_view left, std::string_view right) {
    for (;;) {
        std::string_view const word = TakeWord(left, blanks);
        if (word != TakeWord(right, blanks)) {
            return false;
        }
        if (word.empty()) {
            return true;
        }
    }
}

void AppendReplaced(std::string& result, Line const& line, std::string const& names) {
    result.append(line.head);
    result.append(line.gap.empty() ? std::string_view("\t") : line.gap);
    if (SameWords(line.names, names)) {
        result.append(line.names);
    } else {
        result.append(names);
    }
    if (line.tail.empty() && !line.comment.empty()) {
        result.append(" ");
    }
    result.append(line.tail).append(line.comment).append(line.end);
}

} // namespace

std::string AddOrReplaceHostsEntry(std::string_view text, std::string const& address,
                                   std::string const& name,
                                   std::vector<std::string> const& aliases) {
    std::optional<Address> const wanted = ParseAddress(address);
    if (!wanted) {
        throw HostCtlException("'" + address + "' is not an IP address");
    }
    CheckName(name);
    std::string names = name;
    for (std::string const& alias : aliases) {
        CheckName(alias);
        names.append(" ").append(alias);
    }

    std::string result;
    result.reserve(text.size() + address.size() + names.size() + 4);
    bool placed = false;
    std::string_view end = "\n";
    while (!text.empty()) {
        std::string_view const whole = TakeLine(text);
        Line const line = Cut(whole);
        if (!line.end.empty()) {
            end = line.end;
        }
        if (ParseAddress(line.address) != wanted) {
            result.append(whole);
        } else if (!placed) {
            AppendReplaced(result, line, names);
            placed = true;
        } else if (!line.comment.empty()) {
            result.append(line.comment).append(line.end);
        }
    }
    if (!placed) {
        if (!result.empty() && result.back() != '\n') {
            result.append(end);
        }
        result.append(address).append("\t").append(names).append(end);
    }
    return result;
}

} // namespace StrandCtl
