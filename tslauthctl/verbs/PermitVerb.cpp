// SPDX-License-Identifier: Apache-2.0
#include "access/AccessRules.h"
#include "access/NameLookup.h"
#include "analysis/ChangeLog.h"
#include "analysis/JoinedDomain.h"
#include "history/HistoryPaths.h"
#include "setup/SetupArchive.h"
#include "setup/SetupHost.h"
#include "setup/SetupPaths.h"
#include "terminal/UnifiedDiff.h"
#include "trial/LogInTrial.h"
#include "verbs/HostChange.h"
#include "verbs/Verbs.h"

#include <meaning/PAMMeaning.h>

#include <algorithm>

namespace tessel::tslauthctl {

namespace {

/// The local part of the group that every user of a domain is in.
constexpr char allUsers[] = "domain users";

constexpr char localUsers[] = "/etc/passwd";

bool PolicyAsksRules() {
    auto const policy = TextOnHost(Paths::PAMPolicy);
    return policy && AsksAccessRules(meaning::ReadPAMMeaning(*policy));
}

std::string ReadRules() {
    auto text = TextOnHost(Paths::AccessRules);
    if (!text || !PolicyAsksRules()) {
        throw Failure(ExitCode::refused, "The policy does not ask who may log in; see 'tslauthctl "
                                         "setup'");
    }
    return std::move(*text);
}

/// "(NAME)" is a group.
Subject Typed(std::string const& name) {
    bool const group = name.size() > 2 && name.front() == '(' && name.back() == ')';
    return group ? Subject{name.substr(1, name.size() - 2), true} : Subject{name, false};
}

Subject Resolved(std::string const& typed, AccessArguments const& arguments, Limit limit,
                 Console& console) {
    auto subject = Typed(typed);
    auto const known = Ask(console, "the name service to know '" + subject.name + "'", limit,
                           [name = subject.name] { return LookUpName(name); });
    if (!subject.isGroup && known.user) {
        if (HasUser(TextOnHost(localUsers).value_or(std::string()), *known.user)) {
            throw Failure(ExitCode::refused, "'" + *known.user +
                                                 "' is a user of this host itself, whom the rules "
                                                 "do not concern");
        }
        if (!known.userIsGroup) {
            return {*known.user, false};
        }
    }
    if (known.group) {
        return {*known.group, true};
    }
    if (!arguments.force) {
        throw Failure(ExitCode::refused,
                      "No user and no group is known as '" + subject.name +
                          "' (names of a domain are known while its store is active; --force takes "
                          "the name as it is)");
    }
    return subject;
}

/// The group of all users of the host's own domain.
Subject AllOfTheDomain(Limit limit, Console& console) {
    auto const provider = OpenProvider();
    auto const domain = Ask(console, "the provider to name its domain", limit,
                            [provider] { return provider->GetActiveDomain(); });
    auto const name = domain.NetBIOSName() + "\\" + allUsers;
    auto const known = Ask(console, "the name service to know '" + name + "'", limit,
                           [name] { return LookUpName(name); });
    if (!known.group) {
        throw Failure(ExitCode::refused, "The group '" + name +
                                             "' is not known: name the group that all users of the "
                                             "domain are in");
    }
    return {*known.group, true};
}

void RequireWholeArguments(AccessArguments const& arguments) {
    bool const isComplete = arguments.all ? arguments.names.empty() : !arguments.names.empty();
    if (!isComplete || (arguments.trusted && !arguments.all)) {
        throw Failure(ExitCode::usage, "Names are wanted, or --all; --trusted goes with --all");
    }
}

/// Who the rules are to be about, for which others are asked: that may take a while. Nobody where
/// nobody is to be permitted.
std::vector<Subject> SubjectsOf(AccessArguments const& arguments, Limit limit, Console& console) {
    RequireWholeArguments(arguments);
    (void)ReadRules(); // no question where there is nothing to change
    if (arguments.denies && arguments.all) {
        return {};
    }
    if (arguments.all && arguments.trusted) {
        return {Everybody()};
    }
    if (arguments.all) {
        return {AllOfTheDomain(limit, console)};
    }
    std::vector<Subject> subjects;
    for (auto const& name : arguments.names) {
        auto subject = Resolved(name, arguments, limit, console);
        if (!CanStandInARule(subject)) {
            throw Failure(ExitCode::refused, "'" + subject.name +
                                                 "' cannot stand in a rule: it would be read as "
                                                 "something else");
        }
        subjects.push_back(std::move(subject));
    }
    return subjects;
}

std::string Edited(std::string text, AccessArguments const& arguments,
                   std::vector<Subject> const& subjects) {
    if (arguments.denies && arguments.all) {
        return NobodyPermitted(text);
    }
    for (auto const& subject : subjects) {
        text = arguments.denies ? Denied(text, subject) : Permitted(text, subject);
    }
    return text;
}

/// Shows the difference and gives the text to write.
std::string Preview(std::string const& before, AccessArguments const& arguments,
                    std::vector<Subject> const& subjects, Console& console) {
    auto after = Edited(before, arguments, subjects);
    auto const diff = UnifiedDiff(Paths::AccessRules, before, after);
    console.Document()["changed"] = before != after;
    console.Document()["diff"] = diff;
    console.Diff(diff);
    return after;
}

/// A name as it is known outside of rules.
nlohmann::json Described(std::string const& ruleName) {
    auto const subject = Typed(ruleName);
    return {{"name", subject.name}, {"group", subject.isGroup}};
}

} // namespace

ExitCode RunPlanAccess(AccessArguments const& arguments, Limit limit, Console& console) {
    auto const subjects = SubjectsOf(arguments, limit, console);
    auto const before = ReadRules();
    auto const after = Preview(before, arguments, subjects, console);
    if (before == after) {
        console.Line("Nothing would have to be changed.");
    }
    return before == after ? ExitCode::done : ExitCode::changes;
}

ExitCode RunAccess(AccessArguments const& arguments, Limit limit, Console& console) {
    char const* const verb = arguments.denies ? "deny" : "permit";
    RequireRoot(verb);
    ChangeLog::Begin();
    // Not while everybody else has to wait for the answers.
    auto const subjects = SubjectsOf(arguments, limit, console);
    HostChange change(console);
    change.ConfirmWithin(arguments.confirmWithin);
    auto const before = ReadRules();
    auto const after = Preview(before, arguments, subjects, console);
    if (before == after) {
        console.Line("Nothing had to be changed.");
        return ExitCode::done;
    }
    LogInTrial().Require({{Paths::AccessRules, after}}, console);
    change.Write(verb, PathsOfAccess(), [&] {
        PutOnHost(Paths::AccessRules, after);
        RecordChange(Paths::AccessRules, after);
    });
    return ExitCode::done;
}

ExitCode RunListAccess(Console& console) {
    auto const rules = ReadAccessRules(ReadRules());
    auto& document = console.Document();
    document["rules"] = nlohmann::json::array();
    for (auto const& rule : rules.rules) {
        auto names = nlohmann::json::array();
        auto exceptions = nlohmann::json::array();
        std::string text;
        for (auto const& name : rule.names) {
            names.push_back(Described(name));
            text += (text.empty() ? "" : ", ") + name;
        }
        for (auto const& name : rule.exceptions) {
            exceptions.push_back(Described(name));
            text += (&name == &rule.exceptions.front() ? " except " : ", ") + name;
        }
        document["rules"].push_back({{"line", rule.line},
                                     {"permits", rule.permits},
                                     {"names", names},
                                     {"exceptions", exceptions},
                                     {"origins", rule.origins}});
        auto const from = rule.origins == "ALL" ? std::string() : " from " + rule.origins;
        std::string line = rule.permits ? "permitted  " : "denied     ";
        line += text;
        line += from;
        console.Line(line);
    }
    document["by_default"] = rules.PermitByDefault();
    document["faulty_lines"] = rules.faultyLines;
    for (auto const line : rules.faultyLines) {
        console.Warning(std::string(Paths::AccessRules) + ":" + std::to_string(line) +
                        ": pam_access passes over this line");
    }
    console.Note("the first rule that fits counts; whom none fits is " +
                 std::string(rules.PermitByDefault() ? "permitted" : "denied"));
    return ExitCode::done;
}

} // namespace tessel::tslauthctl
