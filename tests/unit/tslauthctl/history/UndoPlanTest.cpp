// SPDX-License-Identifier: Apache-2.0
#include "history/UndoPlan.h"

#include <gmock/gmock.h>
#include <string>
#include <vector>

namespace tessel::tslauthctl {
namespace {

using Kind = PathState::Kind;
using testing::ElementsAre;
using testing::IsEmpty;

PathState File(std::string const& text) {
    return {Kind::file, {0644, 0, 0, {}}, text};
}
PathState Link(std::string const& target) {
    return {Kind::link, {}, target};
}
PathState Folder() {
    return {Kind::folder, {0755, 0, 0, {}}, {}};
}
PathState const absent;

Snapshot Change(unsigned number, std::string const& verb, PathStates before, PathStates after) {
    Snapshot snapshot;
    snapshot.number = number;
    snapshot.verb = verb;
    snapshot.before = std::move(before);
    snapshot.after = std::move(after);
    return snapshot;
}

std::vector<std::string> Paths(std::vector<UndoStep> const& steps) {
    std::vector<std::string> paths;
    for (auto const& step : steps) {
        paths.push_back((step.editedSince ? "!" : "") + step.path);
    }
    return paths;
}

std::vector<Snapshot> const history = {
    Change(3, "setup", {{"/policy", absent}, {"/rules", absent}},
           {{"/policy", File("1")}, {"/rules", File("a")}}),
    Change(4, "activate", {{"/policy", File("1")}}, {{"/policy", File("2")}}),
    Change(5, "join", {{"/hosts", File("h")}}, {{"/hosts", File("i")}}),
    Change(6, "permit", {{"/rules", File("a")}}, {{"/rules", File("b")}})};

TEST(UndoPlanTest, UndoingAChangeUndoesThoseBehindItAndPassesOverMemberships) {
    EXPECT_EQ((PathStates{{"/rules", File("a")}}), StatesBefore(6, history));
    EXPECT_EQ((PathStates{{"/policy", File("1")}, {"/rules", File("a")}}),
              StatesBefore(4, history));
    EXPECT_EQ((PathStates{{"/policy", absent}, {"/rules", absent}}), StatesBefore(3, history));
    EXPECT_EQ((PathStates{{"/hosts", File("h")}, {"/rules", File("a")}}), StatesBefore(5, history));
    EXPECT_THAT(StatesBefore(2, history), IsEmpty());
    ASSERT_EQ(1U, MembershipsBehind(4, history).size());
    EXPECT_EQ(5U, MembershipsBehind(4, history).front().number);
    EXPECT_THAT(MembershipsBehind(5, history), IsEmpty());
}

TEST(UndoPlanTest, WhatOthersHaveEditedSinceIsNamed) {
    auto const wanted = StatesBefore(3, history);
    EXPECT_THAT(Paths(PlanUndo(wanted, {{"/policy", File("2")}, {"/rules", File("b")}}, history)),
                ElementsAre("/policy", "/rules"));
    EXPECT_THAT(Paths(PlanUndo(wanted, {{"/policy", File("3")}, {"/rules", File("b")}}, history)),
                ElementsAre("!/policy", "/rules"));
    EXPECT_THAT(Paths(PlanUndo(wanted, {{"/policy", absent}, {"/rules", absent}}, history)),
                IsEmpty())
        << "it is what it was, whoever made it so";
}

TEST(UndoPlanTest, WhatAKilledCommandLeftIsNobodysEdit) {
    auto killed = history;
    killed.back().after.reset();
    EXPECT_THAT(Paths(PlanUndo({{"/rules", File("a")}}, {{"/rules", File("half")}}, killed)),
                ElementsAre("/rules"));
}

TEST(UndoPlanTest, WhatOthersIncludeComesFirstAndGoesLast) {
    PathStates const wanted = {{"/new", Folder()},     {"/new/file", File("f")},
                               {"/link", Link("new")}, {"/other", File("now")},
                               {"/old", absent},       {"/old/below", absent},
                               {"/old/file", absent},  {"/old/link", absent}};
    PathStates const current = {{"/new", absent},         {"/new/file", absent},
                                {"/link", absent},        {"/other", File("before")},
                                {"/old", Folder()},       {"/old/below", Folder()},
                                {"/old/file", File("f")}, {"/old/link", Link("file")}};
    EXPECT_THAT(Paths(PlanUndo(wanted, current, {})),
                ElementsAre("/new", "/link", "/new/file", "/other", "/old/file", "/old/link",
                            "/old/below", "/old"));
}

} // namespace
} // namespace tessel::tslauthctl
