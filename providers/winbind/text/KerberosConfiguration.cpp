// SPDX-License-Identifier: Apache-2.0
#include "text/KerberosConfiguration.h"

#include "Failure.h"
#include <base/AsciiText.h>

#include <cstddef>

using namespace tessel::base::AsciiText;

namespace tessel::winbind {

namespace {

constexpr std::string_view Comment =
    "# Written by tslauth: the domain that this host is joined to. It stays the first line.\n";

/// Kerberos passes over it at the very start of a file, and nowhere else.
constexpr std::string_view ByteOrderMark = "\xef\xbb\xbf";

/// A directive stands at the very start of a line; indented, it would be a relation.
bool Includes(std::string_view line, std::string_view path) {
    constexpr std::string_view directive = "include";
    return StartsWith(line, directive) && line.size() > directive.size() &&
           WhiteSpace.find(line[directive.size()]) != std::string_view::npos &&
           Trimmed(line.substr(directive.size())) == path;
}

std::size_t Start(std::string_view text) {
    return StartsWith(text, ByteOrderMark) ? ByteOrderMark.size() : 0;
}

void CheckWord(std::string const& word) {
    if (word.empty() || HasControlCharacters(word) ||
        word.find_first_of(" {}[]=#;\"") != std::string::npos) {
        throw Failure(TSLAUTH_PROVIDER_INVALID_PARAMETER, "a name that krb5.conf cannot hold");
    }
}

/// Whose ticket is whose. Without a rule Kerberos takes user@REALM for the host's user of that
/// name: root of the domain for root of the host. With it, for DOMAIN\user, and for nobody else.
std::string UserNameRule(KerberosDomain const& domain) {
    std::string realm;
    for (char const c : domain.realm) {
        realm += c == '.' ? "\\." : std::string(1, c);
    }
    return "\t\tauth_to_local = RULE:[1:" + domain.workgroup + "\\$1@$0](.*@" + realm + ")s/@" +
           realm + "$//\n";
}

} // namespace

bool HasKerberosInclude(std::string_view text, std::string_view path) {
    for (auto rest = text.substr(Start(text)); !rest.empty();) {
        if (Includes(TakeLine(rest), path)) {
            return true;
        }
    }
    return false;
}

std::string WithKerberosInclude(std::string_view text, std::string_view path) {
    std::string result(text);
    if (!HasKerberosInclude(text, path)) {
        result.insert(Start(text), std::string(Comment) + "include " + std::string(path) + '\n');
    }
    return result;
}

std::string WithoutKerberosInclude(std::string_view text, std::string_view path) {
    auto const start = Start(text);
    std::string result(text.substr(0, start));
    std::string_view comment; // kept back until the line below it is known
    for (auto rest = text.substr(start); !rest.empty();) {
        auto const line = TakeLine(rest);
        bool const included = Includes(line, path);
        if (!included) {
            result += comment;
        }
        comment = {};
        if (line == Comment) {
            comment = line;
        } else if (!included) {
            result += line;
        }
    }
    return result += comment;
}

std::string KerberosDomainText(KerberosDomain const& domain) {
    CheckWord(domain.realm);
    CheckWord(domain.dnsName);
    std::string text = "# Written by tslauth when the host joined its domain. Settings of your own "
                       "belong into krb5.conf.\n"
                       "[libdefaults]\n"
                       "\tdefault_realm = " +
                       domain.realm +
                       "\n"
                       "\tdns_lookup_realm = false\n"
                       "\tdns_lookup_kdc = true\n"
                       "\n"
                       "[realms]\n"
                       "\t" +
                       domain.realm +
                       " = {\n"
                       "\t\tdefault_domain = " +
                       domain.dnsName + "\n";
    for (auto const& controller : domain.controllers) {
        CheckWord(controller);
        text += "\t\tkdc = " + controller + '\n';
    }
    if (!domain.workgroup.empty()) {
        CheckWord(domain.workgroup);
        text += UserNameRule(domain);
    }
    return text + "\t}\n\n[domain_realm]\n\t" + domain.dnsName + " = " + domain.realm + "\n\t." +
           domain.dnsName + " = " + domain.realm + '\n';
}

} // namespace tessel::winbind
