// SPDX-License-Identifier: Apache-2.0
#include "host/PreferredControllers.h"

#include "../../TemporaryFolder.h"
#include "Failure.h"

#include <gmock/gmock.h>
#include <string>
#include <vector>

namespace tessel::winbind {
namespace {

using Names = std::vector<std::string>;

TEST(PreferredControllersTest, AreNoneWithoutAFile) {
    TemporaryFolder const folder;
    EXPECT_EQ(Names(), PreferredControllers(folder / "winbind.conf").Read());
}

TEST(PreferredControllersTest, ComeBackInTheirOrder) {
    TemporaryFolder const folder;
    PreferredControllers const file(folder / "winbind.conf");
    Names const names = {"dc2.corp.example", "10.99.0.1", "fd00::1", "DC-1"};
    file.Write(names);
    EXPECT_EQ(names, file.Read());
    EXPECT_EQ("preferred-domain-controllers = \"dc2.corp.example 10.99.0.1 fd00::1 DC-1\"\n",
              Contents(folder / "winbind.conf"));
}

TEST(PreferredControllersTest, ANewFileCanBeReadByEverybody) {
    TemporaryFolder const folder;
    PreferredControllers(folder / "winbind.conf").Write({"dc1"});
    EXPECT_EQ(0644U, ModeOf(folder / "winbind.conf"));
}

TEST(PreferredControllersTest, AnOldFileKeepsItsModeAndItsOtherKeys) {
    TemporaryFolder const folder;
    SetContents(folder / "winbind.conf", "other = \"value\"\n");
    ASSERT_EQ(0, ::chmod((folder / "winbind.conf").c_str(), 0640));
    PreferredControllers(folder / "winbind.conf").Write({"dc1"});
    EXPECT_EQ("other = \"value\"\npreferred-domain-controllers = \"dc1\"\n",
              Contents(folder / "winbind.conf"));
    EXPECT_EQ(0640U, ModeOf(folder / "winbind.conf"));
}

TEST(PreferredControllersTest, NoneMakeNoFile) {
    TemporaryFolder const folder;
    PreferredControllers(folder / "winbind.conf").Write({});
    EXPECT_TRUE(folder.Names().empty());
}

TEST(PreferredControllersTest, NoneTakeThePlaceOfSome) {
    TemporaryFolder const folder;
    PreferredControllers const file(folder / "winbind.conf");
    file.Write({"dc1"});
    file.Write({});
    EXPECT_EQ(Names(), file.Read());
}

TEST(PreferredControllersTest, AMalformedNameChangesNothing) {
    TemporaryFolder const folder;
    PreferredControllers const file(folder / "winbind.conf");
    file.Write({"dc1"});
    for (std::string const bad : {"", "-S", "dc1 dc2", "dc1\n", "dc\"1", "dc=1", "d\xC3\xA9"}) {
        try {
            file.Write({"dc2", bad});
            ADD_FAILURE() << bad;
        } catch (Failure const& e) {
            EXPECT_EQ(1210U, e.Code());
        }
    }
    EXPECT_EQ(Names({"dc1"}), file.Read());
}

TEST(PreferredControllersTest, WhatAnAdministratorSpoiltIsPassedOver) {
    TemporaryFolder const folder;
    SetContents(folder / "winbind.conf", "preferred-domain-controllers = \"  dc1\t-x   dc2 \"\n");
    EXPECT_EQ(Names({"dc1", "dc2"}), PreferredControllers(folder / "winbind.conf").Read());
}

TEST(PreferredControllersTest, AFileThatIsNoneOfThisFormatIsAFailure) {
    TemporaryFolder const folder;
    SetContents(folder / "winbind.conf", "no delimiter\n");
    EXPECT_THROW(PreferredControllers(folder / "winbind.conf").Read(), Failure);
}

} // namespace
} // namespace tessel::winbind
