// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <string>
#include <string_view>
#include <vector>

/// Names as a directory and its users write them: checked, taken apart, put together.
namespace tessel::winbind {

/// A domain's DNS name in lower case and without the dot of the root. A name of one label is taken.
/// @throws Failure TSLAUTH_PROVIDER_INVALID_DOMAIN_NAME
std::string DomainName(std::string_view name);

/// The host's NetBIOS name: the first label of `hostName`, in capitals.
/// @throws Failure TSLAUTH_PROVIDER_INVALID_COMPUTER_NAME where that is no name that a machine
///         account can have: empty, longer than 15 characters, digits alone, or other characters
///         than letters, digits and inner hyphens. It is never cut: two hosts would share an
///         account.
std::string ComputerName(std::string_view hostName);

/// "DC=corp,DC=example" for "corp.example".
/// @throws Failure TSLAUTH_PROVIDER_INVALID_DOMAIN_NAME
std::string DomainDistinguishedName(std::string_view domain);

/// Where a machine account is to be made.
struct OrganisationalUnit {
    std::string relative;          ///< "OU=Linux,OU=Servers"
    std::string distinguishedName; ///< with the domain's part; what `createcomputer=` takes
};

/// Reads a unit: a path from top to bottom ("Servers/Linux"), or a distinguished name with or
/// without the domain's part. In a path, "\/" and "\\" stand for a slash and a backslash in a name;
/// the one name "Computers" is the container that every domain has. A distinguished name is escaped
/// as RFC 4514 says and may name units and containers.
/// @throws Failure TSLAUTH_PROVIDER_INVALID_PARAMETER for a malformed unit or one of another
///         domain, TSLAUTH_PROVIDER_INVALID_DOMAIN_NAME
OrganisationalUnit ReadOrganisationalUnit(std::string_view unit, std::string_view domain);

/// A user's name, taken apart.
struct UserName {
    enum class Form {
        canonical, ///< corp.example/Unit/Name
        downLevel, ///< CORP\name
        principal, ///< name@corp.example
    };
    Form form;
    std::string domain;                  ///< as written
    std::vector<std::string> containers; ///< of the canonical form, from top to bottom
    std::string name;                    ///< without escapes
};

/// @throws Failure TSLAUTH_PROVIDER_INVALID_ACCOUNT_NAME for what is in none of the three forms
UserName ReadUserName(std::string_view text);

/// The distinguished name of what the canonical form names, as far as it can be known: "CN=Name,
/// OU=Unit,DC=..." where every container is a unit.
std::string CanonicalDistinguishedName(UserName const& user);

/// `value` as it stands in a distinguished name (RFC 4514).
std::string EscapedForDistinguishedName(std::string_view value);

/// `value` as it stands in a search filter (RFC 4515).
std::string EscapedForFilter(std::string_view value);

} // namespace tessel::winbind
