// SPDX-License-Identifier: Apache-2.0
#include "trial/LogIns.h"

#include <base/AsciiText.h>

#include <algorithm>
#include <iterator>

namespace tessel::tslauthctl {

namespace {

/// Whose members become root on Debian and its peers.
constexpr std::string_view rootGroups[] = {"sudo", "wheel", "admin"};

std::vector<std::string> Fields(std::string_view line, char separator) {
    std::vector<std::string> fields(1);
    for (char const c : line) {
        if (c == separator) {
            fields.emplace_back();
        } else if (c != '\n') {
            fields.back() += c;
        }
    }
    return fields;
}

std::vector<std::string> Names(std::string_view passwd) {
    std::vector<std::string> names;
    for (auto const line : base::AsciiText::Lines(passwd)) {
        names.push_back(Fields(line, ':').front());
    }
    return names;
}

std::vector<std::string> MembersWithTheRight(std::string_view group) {
    std::vector<std::string> members;
    for (auto const line : base::AsciiText::Lines(group)) {
        auto const fields = Fields(line, ':');
        if (fields.size() == 4 && std::find(std::begin(rootGroups), std::end(rootGroups),
                                            fields[0]) != std::end(rootGroups)) {
            auto const listed = Fields(fields[3], ',');
            members.insert(members.end(), listed.begin(), listed.end());
        }
    }
    return members;
}

} // namespace

std::vector<std::string> UsersToTry(std::string_view passwd, std::string_view group,
                                    std::string const& caller) {
    auto candidates = MembersWithTheRight(group);
    candidates.insert(candidates.begin(), caller);
    auto const locals = Names(passwd);
    std::vector<std::string> users = {"root"};
    auto const found =
        std::find_if(candidates.begin(), candidates.end(), [&](std::string const& name) {
            return !name.empty() && name != users.front() &&
                   std::find(locals.begin(), locals.end(), name) != locals.end();
        });
    if (found != candidates.end()) {
        users.push_back(*found);
    }
    return users;
}

std::vector<std::string> LogInsLost(LogInAnswers const& before, LogInAnswers const& after) {
    std::vector<std::string> lost;
    for (auto const& [logIn, was] : before) {
        bool const isName = logIn.first == NameServiceTrial;
        if (!isName && was != LetIn) {
            continue; // who did not get in before loses nothing
        }
        auto const found = after.find(logIn);
        auto const is = found == after.end() ? "no answer" : found->second;
        if (is != was && is != NoSuchService) {
            lost.push_back("'" + logIn.second + "' would no longer " +
                           (isName ? "be found by " : "get in through ") + logIn.first + ": " + is);
        }
    }
    return lost;
}

} // namespace tessel::tslauthctl
