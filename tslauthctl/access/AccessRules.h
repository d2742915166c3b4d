// SPDX-License-Identifier: Apache-2.0
#ifndef TSLAUTHCTL_ACCESSRULES_H
#define TSLAUTHCTL_ACCESSRULES_H

#include <cstddef>
#include <string>
#include <string_view>
#include <vector>

/// Who may log in: the rules of pam_access, read and edited as text. They are understood as that
/// module understands them with `listsep=,` and `nodefgroup`, which the policy gives it (Linux-PAM
/// 1.5):
/// - the first rule that fits a user and where he comes from decides; who fits none may log in;
/// - a rule is one line of three fields, with ":" between them; the third may hold more of them;
/// - names are separated by commas alone, and blanks belong to them;
/// - "#" makes a comment in the first column only; a last line without a line feed does not count;
/// - capital letters make no difference, and a group stands in parentheses.
/// No file is opened here.
namespace tessel::tslauthctl {

/// Whom a rule is for.
struct Subject {
    /// As the name service has it.
    std::string name;
    bool isGroup = false;
};

/// As it stands in a rule: "CORP\user1", "(CORP\domain users)", "ALL".
std::string RuleName(Subject const& subject);
/// Everybody, of trusted domains too.
Subject Everybody();

/// Whether a name can stand in a rule at all: one with a comma, a colon or a control character
/// would be read as something else, and so would a user's with "@" or in parentheses.
bool CanStandInARule(Subject const& subject);

struct AccessRule {
    /// From 1.
    std::size_t line = 0;
    bool permits = false;
    /// Each name that the rule lists, up to an "EXCEPT", and what is listed behind one.
    std::vector<std::string> names;
    std::vector<std::string> exceptions;
    /// Where from, as it is written; "ALL" for everywhere.
    std::string origins;

    /// Whether it decides for everybody, wherever he comes from.
    bool IsLast() const;
};

struct AccessRules {
    std::vector<AccessRule> rules;
    /// The numbers of lines that pam_access passes over with a complaint in the system log.
    std::vector<std::size_t> faultyLines;

    /// Whether somebody of whom no rule says anything may log in.
    bool PermitByDefault() const;
};

AccessRules ReadAccessRules(std::string_view text);

/// The file with which a host begins: nobody of the domain may log in.
std::string FirstAccessRules();

/// Each returns the text with as few lines changed as do it, and the same text where nothing has to
/// be changed.
///
/// `Permitted`: takes back a denial of `subject`, and puts a rule for it before the last one.
/// `Denied`: takes back a permission of `subject`, and puts a rule before all others, so that a
/// group which may log in does not let its member in.
std::string Permitted(std::string_view text, Subject const& subject);
std::string Denied(std::string_view text, Subject const& subject);
/// Takes back every permission; denials and comments stay.
std::string NobodyPermitted(std::string_view text);

} // namespace tessel::tslauthctl

#endif
