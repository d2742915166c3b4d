// SPDX-License-Identifier: Apache-2.0
#include "ResolvConfText.h"

#include <algorithm>
#include <base/AsciiText.h>
#include <cstddef>
#include <resolv.h>
#include <strandctl/HostCtlException.h>
#include <vector>

namespace StrandCtl {

namespace {

using HostCtl::Lib::HostCtlException;
using namespace tessel::base::AsciiText;

/// What separates words for the resolver. A carriage return is none: it is part of the last name.
constexpr std::string_view blanks = " \t";

constexpr std::size_t maximumDomains = MAXDNSRCH;
/// The list's text, without the null byte that ends it.
constexpr std::size_t maximumCharacters = sizeof(__res_state::defdname) - 1;

constexpr std::size_t maximumLabel = 63; // RFC 1035, 2.3.4, as for the whole name
constexpr std::size_t maximumName = 253;

/// Two spellings of one domain give the same text.
std::string Normal(std::string_view domain) {
    if (domain.size() > 1 && domain.back() == '.') {
        domain.remove_suffix(1);
    }
    return Lower(domain);
}

bool IsDomainName(std::string_view name) {
    if (name.size() > maximumName) {
        return false;
    }
    std::size_t label = 0;
    for (char const character : name) {
        if (character == '.') {
            if (label == 0) {
                return false;
            }
            label = 0;
            continue;
        }
        bool const allowed =
            IsLetter(character) || IsDigit(character) || character == '-' || character == '_';
        if (!allowed || ++label > maximumLabel) {
            return false;
        }
    }
    return label != 0;
}

bool IsComment(std::string_view word) {
    return word.front() == '#' || word.front() == ';';
}

/// A line that makes a search list, as the resolver recognises it: the keyword in the first column,
/// a blank behind it, and at least one name.
struct SearchLine {
    bool isDomain = false; ///< a "domain" line: its first name is the whole list
    std::vector<std::string_view> names;
    std::string_view whole; ///< with its line end
};

std::optional<SearchLine> ParseSearchLine(std::string_view whole) {
    std::string_view rest = whole;
    if (rest.back() == '\n') {
        rest.remove_suffix(1);
    }
    SearchLine line;
    line.whole = whole;
    line.isDomain = rest.substr(0, 6) == "domain";
    if (!(line.isDomain || rest.substr(0, 6) == "search") || rest.size() < 7 ||
        blanks.find(rest[6]) == std::string_view::npos) {
        return std::nullopt;
    }
    rest.remove_prefix(7);
    for (std::string_view word = TakeWord(rest, blanks); !word.empty();
         word = TakeWord(rest, blanks)) {
        line.names.push_back(word);
    }
    if (line.names.empty()) {
        return std::nullopt;
    }
    if (line.isDomain) {
        line.names.resize(1);
    }
    return line;
}

/// The search line with one more name. A carriage return at its end, which the resolver takes for a
/// part of the last name, goes; it may be all that kept the new name from being found.
std::string Extended(SearchLine const& line, std::string const& domain) {
    std::string_view last = line.names.back();
    if (last.back() == '\r') {
        last.remove_suffix(1);
    }
    std::string const addition = Normal(last) == Normal(domain) ? "" : " " + domain;
    std::string result(line.whole);
    if (line.isDomain) {
        if (result.back() != '\n') {
            result += '\n';
        }
        return result + "search " + std::string(last) + addition + "\n";
    }
    // The resolver knows no comments behind the names and takes them for names; other readers of
    // the file do know them. In front of one the new name is seen by all.
    auto const comment = std::find_if(line.names.begin(), line.names.end(), IsComment);
    if (comment != line.names.end()) {
        auto const place = static_cast<std::size_t>(comment->data() - line.whole.data());
        return result.insert(place, domain + " ");
    }
    std::size_t const end = result.find_last_not_of(" \t\r\n") + 1;
    bool const ended = result.back() == '\n';
    return result.substr(0, end) + addition + (ended ? "\n" : "");
}

/// Throws if a resolver might cut or ignore the list that the names and one more make.
void CheckLimits(std::vector<std::string_view> const& names, std::string const& domain) {
    std::string const failure = "Cannot add the search domain '" + domain + "': ";
    std::size_t const count = names.size() + 1;
    if (count > maximumDomains) {
        throw HostCtlException(failure + "the search list would have " + std::to_string(count) +
                               " domains, and the limit is " + std::to_string(maximumDomains));
    }
    std::size_t characters = domain.size();
    for (std::string_view const name : names) {
        characters += name.size() + 1;
    }
    if (characters > maximumCharacters) {
        throw HostCtlException(failure + "the search list would have " +
                               std::to_string(characters) + " characters, and the limit is " +
                               std::to_string(maximumCharacters));
    }
}

/// The comments that a text begins with, without their signs and the blanks around them.
std::vector<std::string_view> HeaderOf(std::string_view text) {
    std::vector<std::string_view> header;
    while (!text.empty()) {
        std::string_view line = TakeLine(text);
        std::size_t const last = line.find_last_not_of(" \t\r\n");
        if (last == std::string_view::npos) {
            continue;
        }
        line = line.substr(0, last + 1);
        std::size_t const sign = line.find_first_not_of(blanks);
        if (line[sign] != '#' && line[sign] != ';') {
            break;
        }
        header.push_back(line.substr(std::min(line.find_first_not_of(" \t#;"), line.size())));
    }
    return header;
}

/// How a program that keeps the file can be told: the folder of its file, if it has one, and what
/// it writes into the first comments, in lower case.
struct KnownOwner {
    std::string_view name;
    std::string_view folder;
    std::string_view mark;
    std::string_view remedy;
};

constexpr KnownOwner knownOwners[] = {
    {"systemd-resolved", "/run/systemd/resolve/", "man:systemd-resolved",
     "set Domains= in /etc/systemd/resolved.conf and restart systemd-resolved"},
    {"NetworkManager", "/run/NetworkManager/", "generated by networkmanager",
     "set ipv4.dns-search of the connection with nmcli and bring it up again"},
    {"resolvconf", "/run/resolvconf/", "generated by resolvconf",
     "add the domain to a \"search\" line of /etc/resolvconf/resolv.conf.d/base (or search_domains "
     "of /etc/resolvconf.conf) and run resolvconf -u"},
    {"dhclient", "", "dhclient-script",
     "append it to domain-search in /etc/dhcp/dhclient.conf and renew the lease"},
    {"dhcpcd", "/run/dhcpcd/", "generated by dhcpcd",
     "set domain_search in /etc/dhcpcd.conf and restart dhcpcd"},
    {"ConnMan", "/run/connman/", "generated by connection manager",
     "set the domain of the service with connmanctl config"},
    {"netconfig", "/run/netconfig/", "generated by netconfig",
     "set NETCONFIG_DNS_STATIC_SEARCHLIST in /etc/sysconfig/network/config and run netconfig "
     "update"},
    {"Tailscale", "", "generated by tailscale",
     "set the search domain in the DNS settings of the network"},
    {"WSL", "/mnt/wsl/", "generated by wsl",
     "set generateResolvConf = false in /etc/wsl.conf and restart"},
};

/// How programs that are not in the table speak of a file that is theirs.
constexpr std::string_view ownersMarks[] = {"do not edit", "managed by", "generated by",
                                            "overwritten"};
/// And how one says that it writes the file once and then leaves it alone (container engines).
constexpr std::string_view freeMark = "can be edited";
constexpr std::string_view generalRemedy =
    "set the search domain in that program's own configuration";

} // namespace

std::string AddSearchDomainToText(std::string_view text, std::string const& domain) {
    // A dot at the end is how a full name is written.
    if (!IsDomainName(Normal(domain))) {
        throw HostCtlException("'" + domain + "' is not a domain name");
    }
    // The last list is the one that counts.
    std::optional<SearchLine> current;
    for (std::string_view rest = text; !rest.empty();) {
        if (auto line = ParseSearchLine(TakeLine(rest))) {
            current = std::move(line);
        }
    }
    std::string result(text);
    if (!current) {
        CheckLimits({}, domain);
        if (!result.empty() && result.back() != '\n') {
            result += '\n';
        }
        return result + "search " + domain + "\n";
    }
    auto const comment = std::find_if(current->names.begin(), current->names.end(), IsComment);
    bool const present = std::any_of(current->names.begin(), comment, [&](std::string_view name) {
        return Normal(name) == Normal(domain);
    });
    if (present) {
        return result;
    }
    CheckLimits(current->names, domain);
    auto const place = static_cast<std::size_t>(current->whole.data() - text.data());
    return result.replace(place, current->whole.size(), Extended(*current, domain));
}

std::optional<ResolvConfOwner> OwnerOfResolvConf(std::string_view destination,
                                                 std::string_view text) {
    std::vector<std::string_view> const header = HeaderOf(text);
    auto const mentioned = [&](std::string_view mark) {
        return std::find_if(header.begin(), header.end(), [mark](std::string_view line) {
            return Lower(line).find(mark) != std::string::npos;
        });
    };
    for (KnownOwner const& owner : knownOwners) {
        if ((!owner.folder.empty() && StartsWith(destination, owner.folder)) ||
            mentioned(owner.mark) != header.end()) {
            return ResolvConfOwner{std::string(owner.name), std::string(owner.remedy)};
        }
    }
    if (StartsWith(destination, "/run/")) {
        return ResolvConfOwner{"the program that writes '" + std::string(destination) + "'",
                               std::string(generalRemedy)};
    }
    if (mentioned(freeMark) != header.end()) {
        return std::nullopt;
    }
    for (std::string_view const mark : ownersMarks) {
        if (auto const line = mentioned(mark); line != header.end()) {
            return ResolvConfOwner{"the program that its first lines speak of ('" +
                                       std::string(*line) + "')",
                                   std::string(generalRemedy)};
        }
    }
    return std::nullopt;
}

} // namespace StrandCtl
