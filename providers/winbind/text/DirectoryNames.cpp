// SPDX-License-Identifier: Apache-2.0
#include "text/DirectoryNames.h"

#include "Failure.h"
#include <base/AsciiText.h>

#include <algorithm>
#include <cstddef>
#include <optional>
#include <utility>

using namespace tessel::base::AsciiText;

namespace tessel::winbind {

namespace {

/// As a domain controller limits the name of a unit or a container.
constexpr std::size_t LongestPart = 64;

constexpr char HexDigits[] = "0123456789abcdef";

/// A text from outside, fit for one line of a log.
std::string Quoted(std::string_view text) {
    constexpr std::size_t longest = 256;
    std::string result = "'";
    for (char const c : text.substr(0, longest)) {
        result += IsControl(c) ? '?' : c;
    }
    return result + (text.size() > longest ? "...'" : "'");
}

/// Letters, digits and inner hyphens. `underscores`: also those, which DNS names of domains that
/// grew out of NetBIOS names may have.
bool IsLabel(std::string_view label, bool underscores) {
    return !label.empty() && label.front() != '-' && label.back() != '-' &&
           std::all_of(label.begin(), label.end(), [underscores](char c) {
               return IsLetter(c) || IsDigit(c) || c == '-' || (underscores && c == '_');
           });
}

bool IsNumber(std::string_view text) {
    return std::all_of(text.begin(), text.end(), IsDigit);
}

std::vector<std::string_view> Split(std::string_view text, char separator) {
    std::vector<std::string_view> parts;
    for (std::size_t end = 0; end != std::string_view::npos;) {
        end = text.find(separator);
        parts.push_back(text.substr(0, end));
        text.remove_prefix(end == std::string_view::npos ? text.size() : end + 1);
    }
    return parts;
}

Failure BadUnit(std::string_view unit, std::string const& why) {
    return {TSLAUTH_PROVIDER_INVALID_PARAMETER, "the unit " + Quoted(unit) + ' ' + why};
}

Failure BadUser(std::string_view user) {
    return {TSLAUTH_PROVIDER_INVALID_ACCOUNT_NAME,
            Quoted(user) + " is not in the form domain/name, DOMAIN\\name or name@domain"};
}

/// One step of a distinguished name, without escapes.
struct Part {
    std::string type; ///< in capitals
    std::string value;
};

void CheckPart(std::string_view unit, std::string const& value) {
    if (value.empty()) {
        throw BadUnit(unit, "has an empty name in it");
    }
    if (value.size() > LongestPart) {
        throw BadUnit(unit, "has a name of more than 64 bytes in it");
    }
    if (HasControlCharacters(value)) {
        throw BadUnit(unit, "has a control character in it");
    }
}

/// The parts of a path, from top to bottom. A backslash takes the slash or backslash behind it as
/// it is; in front of anything else it is what `lone` says.
enum class LoneBackslash { refused, literal };
std::optional<std::vector<std::string>> SplitPath(std::string_view path, LoneBackslash lone) {
    std::vector<std::string> parts(1);
    for (std::size_t i = 0; i < path.size(); ++i) {
        if (path[i] == '/') {
            parts.emplace_back();
            continue;
        }
        if (path[i] == '\\') {
            if (i + 1 < path.size() && (path[i + 1] == '/' || path[i + 1] == '\\')) {
                ++i;
            } else if (lone == LoneBackslash::refused) {
                return std::nullopt;
            }
        }
        parts.back() += path[i];
    }
    return parts;
}

std::optional<int> HexValue(char c) {
    c = Lower(c);
    if (IsDigit(c)) {
        return c - '0';
    }
    return c >= 'a' && c <= 'f' ? std::optional(c - 'a' + 10) : std::nullopt;
}

/// Takes an escape, of which the backslash is gone already: two hexadecimal digits, or one of the
/// characters that may be written with one.
std::optional<char> TakeEscape(std::string_view& rest) {
    if (rest.size() >= 2) {
        auto const high = HexValue(rest[0]);
        auto const low = HexValue(rest[1]);
        if (high && low) {
            rest.remove_prefix(2);
            return static_cast<char>(*high * 16 + *low);
        }
    }
    if (rest.empty() || std::string_view(" #=\"+,;<>\\").find(rest[0]) == std::string_view::npos) {
        return std::nullopt;
    }
    char const c = rest[0];
    rest.remove_prefix(1);
    return c;
}

/// Takes a value, up to the comma behind it. Blanks around it are not part of it unless escaped.
std::optional<std::string> TakeValue(std::string_view& rest) {
    std::string value;
    std::size_t kept = 0; // up to where trailing blanks are part of it
    rest.remove_prefix(std::min(rest.find_first_not_of(' '), rest.size()));
    if (!rest.empty() && rest[0] == '#') {
        return std::nullopt; // the value in hexadecimal BER, which no unit needs
    }
    while (!rest.empty() && rest[0] != ',') {
        char const c = rest[0];
        rest.remove_prefix(1);
        if (c == '\\') {
            auto const escaped = TakeEscape(rest);
            if (!escaped) {
                return std::nullopt;
            }
            value += *escaped;
            kept = value.size();
        } else if (std::string_view("\"+;<>").find(c) != std::string_view::npos) {
            return std::nullopt; // "+" would make a part of two types
        } else {
            value += c;
            kept = c == ' ' ? kept : value.size();
        }
    }
    value.resize(kept);
    return value;
}

/// The parts of a distinguished name, from bottom to top.
std::vector<Part> SplitDistinguishedName(std::string_view unit) {
    std::vector<Part> parts;
    for (auto rest = unit;;) {
        auto const equals = rest.find('=');
        if (equals == std::string_view::npos) {
            throw BadUnit(unit, "has a part without '='");
        }
        std::string const type = Upper(Trimmed(rest.substr(0, equals)));
        rest.remove_prefix(equals + 1);
        auto const value = TakeValue(rest);
        if (!value) {
            throw BadUnit(unit, "is not a distinguished name that can be read");
        }
        if (type != "OU" && type != "CN" && type != "DC") {
            throw BadUnit(unit, "has a part that is neither OU nor CN nor DC");
        }
        CheckPart(unit, *value);
        parts.push_back({type, *value});
        if (rest.empty()) {
            return parts;
        }
        rest.remove_prefix(1);
    }
}

/// Whether the text means to be a distinguished name: nothing but what a type is made of stands in
/// front of its first "=".
bool IsDistinguishedName(std::string_view unit) {
    auto const equals = unit.find('=');
    auto const type = Trimmed(unit.substr(0, equals));
    return equals != std::string_view::npos && std::all_of(type.begin(), type.end(), [](char c) {
               return IsLetter(c) || IsDigit(c) || c == '.' || c == '-';
           });
}

std::string Joined(std::vector<Part> const& parts) {
    std::string name;
    for (auto const& part : parts) {
        name += name.empty() ? "" : ",";
        name += part.type + '=' + EscapedForDistinguishedName(part.value);
    }
    return name;
}

/// A name that an account can have at log-in.
bool IsAccountName(std::string_view name) {
    return !name.empty() && !HasControlCharacters(name) &&
           name.find_first_of("\"/\\[]:;|=,+*?<>") == std::string_view::npos;
}

bool IsDomainName(std::string_view name) {
    try {
        DomainName(name);
        return true;
    } catch (Failure const&) {
        return false;
    }
}

std::optional<UserName> ReadCanonical(std::string_view text) {
    auto const slash = text.find('/');
    if (slash == std::string_view::npos || !IsDomainName(text.substr(0, slash))) {
        return std::nullopt;
    }
    auto parts = SplitPath(text.substr(slash + 1), LoneBackslash::literal);
    if (!parts || std::any_of(parts->begin(), parts->end(), [](std::string const& part) {
            return part.empty() || HasControlCharacters(part);
        })) {
        return std::nullopt;
    }
    std::string name = std::move(parts->back());
    parts->pop_back();
    return UserName{UserName::Form::canonical, std::string(text.substr(0, slash)),
                    std::move(*parts), std::move(name)};
}

} // namespace

std::string DomainName(std::string_view name) {
    auto const bare = EndsWith(name, ".") ? name.substr(0, name.size() - 1) : name;
    auto const labels = Split(bare, '.');
    constexpr std::size_t longestLabel = 63;
    constexpr std::size_t longestName = 253;
    if (bare.size() > longestName || IsNumber(labels.back()) ||
        !std::all_of(labels.begin(), labels.end(), [](std::string_view label) {
            return label.size() <= longestLabel && IsLabel(label, true);
        })) {
        throw Failure(TSLAUTH_PROVIDER_INVALID_DOMAIN_NAME,
                      Quoted(name) + " is not the DNS name of a domain");
    }
    return Lower(bare);
}

std::string ComputerName(std::string_view hostName) {
    auto const label = hostName.substr(0, hostName.find('.'));
    constexpr std::size_t longest = 15;
    if (label.size() > longest || !IsLabel(label, false) || IsNumber(label)) {
        throw Failure(TSLAUTH_PROVIDER_INVALID_COMPUTER_NAME,
                      "the host's name " + Quoted(label) +
                          " cannot be that of a machine account: 1 to 15 letters, digits and inner "
                          "hyphens, not digits alone");
    }
    return Upper(label);
}

std::string DomainDistinguishedName(std::string_view domain) {
    std::string const name = DomainName(domain);
    std::string result;
    for (auto const label : Split(name, '.')) {
        result += (result.empty() ? "DC=" : ",DC=") + std::string(label);
    }
    return result;
}

OrganisationalUnit ReadOrganisationalUnit(std::string_view unit, std::string_view domain) {
    std::string const suffix = DomainDistinguishedName(domain);
    std::vector<Part> parts;
    if (IsDistinguishedName(unit)) {
        parts = SplitDistinguishedName(unit);
        auto const first = std::find_if(parts.begin(), parts.end(),
                                        [](Part const& part) { return part.type == "DC"; });
        if (first != parts.end() &&
            !EqualsIgnoringCase(Joined(std::vector<Part>(first, parts.end())), suffix)) {
            throw BadUnit(unit, "is not one of the domain " + Quoted(domain));
        }
        parts.erase(first, parts.end());
        if (parts.empty()) {
            throw BadUnit(unit, "is the domain itself");
        }
    } else {
        auto const names = SplitPath(unit, LoneBackslash::refused);
        if (!names) {
            throw BadUnit(unit, "has a backslash that is not in front of a slash or a backslash");
        }
        for (auto const& name : *names) {
            CheckPart(unit, name);
            parts.insert(parts.begin(), {"OU", name});
        }
        if (parts.size() == 1 && EqualsIgnoringCase(parts[0].value, "computers")) {
            parts[0].type = "CN";
        }
    }
    std::string const relative = Joined(parts);
    return {relative, relative + ',' + suffix};
}

UserName ReadUserName(std::string_view text) {
    if (auto const canonical = ReadCanonical(text)) {
        return *canonical;
    }
    auto const backslash = text.find('\\');
    if (backslash != std::string_view::npos) {
        auto const domain = text.substr(0, backslash);
        auto const name = text.substr(backslash + 1);
        if (!IsDomainName(domain) || !IsAccountName(name)) {
            throw BadUser(text);
        }
        return {UserName::Form::downLevel, std::string(domain), {}, std::string(name)};
    }
    auto const at = text.rfind('@');
    if (at == std::string_view::npos || !IsAccountName(text.substr(0, at)) ||
        !IsDomainName(text.substr(at + 1))) {
        throw BadUser(text);
    }
    return {UserName::Form::principal,
            std::string(text.substr(at + 1)),
            {},
            std::string(text.substr(0, at))};
}

std::string CanonicalDistinguishedName(UserName const& user) {
    std::vector<Part> parts{{"CN", user.name}};
    for (auto container = user.containers.rbegin(); container != user.containers.rend();
         ++container) {
        // The one container that every domain has for users; the others are units.
        bool const isUsers = user.containers.size() == 1 && EqualsIgnoringCase(*container, "users");
        parts.push_back({isUsers ? "CN" : "OU", *container});
    }
    return Joined(parts) + ',' + DomainDistinguishedName(user.domain);
}

std::string EscapedForDistinguishedName(std::string_view value) {
    std::string result;
    for (std::size_t i = 0; i < value.size(); ++i) {
        char const c = value[i];
        if (IsControl(c)) {
            auto const byte = static_cast<unsigned char>(c);
            result += {'\\', HexDigits[byte / 16], HexDigits[byte % 16]};
            continue;
        }
        bool const outer = (c == ' ' && (i == 0 || i + 1 == value.size())) || (c == '#' && i == 0);
        if (outer || std::string_view("\"+,;<=>\\").find(c) != std::string_view::npos) {
            result += '\\';
        }
        result += c;
    }
    return result;
}

std::string EscapedForFilter(std::string_view value) {
    std::string result;
    for (char const c : value) {
        if (IsControl(c) || std::string_view("*()\\").find(c) != std::string_view::npos) {
            auto const byte = static_cast<unsigned char>(c);
            result += {'\\', HexDigits[byte / 16], HexDigits[byte % 16]};
        } else {
            result += c;
        }
    }
    return result;
}

} // namespace tessel::winbind
