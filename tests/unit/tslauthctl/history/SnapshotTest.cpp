// SPDX-License-Identifier: Apache-2.0
#include "history/Snapshot.h"

#include <gmock/gmock.h>
#include <stdexcept>
#include <string>

namespace tessel::tslauthctl {
namespace {

using Kind = PathState::Kind;
using testing::ElementsAre;

PathStates EveryKind() {
    return {
        {"/absent", {}},
        {"/file", {Kind::file, {0640, 1, 2, {{"security.label", std::string("a\0\xff", 3)}}}, "t"}},
        {"/folder", {Kind::folder, {0750, 3, 4, {}}, {}}},
        {"/link", {Kind::link, {0, 5, 6, {}}, "../elsewhere"}},
        {"/other", {Kind::other, {}, {}}}};
}

TEST(SnapshotTest, WhatIsWrittenIsReadAgainButForTheBytesOfFiles) {
    Snapshot snapshot;
    snapshot.number = 7;
    snapshot.when = "2026-11-22T01:30:00Z";
    snapshot.verb = "activate";
    snapshot.command = "activate None";
    snapshot.caller = {0, "1000", "alice"};
    snapshot.before = EveryKind();
    auto const read = SnapshotIn(nlohmann::json::parse(Described(snapshot).dump()));
    EXPECT_EQ(7U, read.number);
    EXPECT_EQ(snapshot.when, read.when);
    EXPECT_EQ("activate", read.verb);
    EXPECT_EQ("activate None", read.command);
    EXPECT_EQ("1000", read.caller.loginUid);
    EXPECT_EQ("alice", read.caller.sudoUser);
    EXPECT_FALSE(read.after);
    auto expected = EveryKind();
    expected["/file"].text.clear();
    EXPECT_EQ(expected, read.before);
}

TEST(SnapshotTest, ADocumentThatIsDamagedIsRefused) {
    EXPECT_THROW(StatesIn({{"/a", {{"kind", "socket"}}}}), std::invalid_argument);
    EXPECT_THROW(StatesIn({{"/a", {{"kind", "file"}}}}), nlohmann::json::exception);
    auto document = Described(EveryKind());
    document["/file"]["attributes"]["security.label"] = "6x";
    EXPECT_THROW(StatesIn(document), std::invalid_argument);
}

TEST(SnapshotTest, AChangeIsAnythingThatIsNotTheSame) {
    Snapshot snapshot;
    snapshot.before = EveryKind();
    EXPECT_TRUE(snapshot.Changed().empty()) << "nobody knows";
    snapshot.after = EveryKind();
    EXPECT_TRUE(snapshot.Changed().empty());
    (*snapshot.after)["/file"].attributes.extended.clear();
    (*snapshot.after)["/folder"].attributes.mode = 0755;
    (*snapshot.after)["/link"].text = "../else";
    (*snapshot.after)["/absent"].kind = Kind::file;
    EXPECT_THAT(snapshot.Changed(), ElementsAre("/absent", "/file", "/folder", "/link"));
}

} // namespace
} // namespace tessel::tslauthctl
