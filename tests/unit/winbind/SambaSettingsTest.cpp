// SPDX-License-Identifier: Apache-2.0
#include "text/SambaSettings.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <string>
#include <string_view>
#include <vector>

using namespace tessel::winbind;
using testing::ElementsAre;
using testing::IsEmpty;

namespace {

using Texts = std::vector<std::string>;

TEST(SambaSettingsTest, NamesAreReadWithoutRegardToCaseAndBlanks) {
    SambaSettings const settings("[global]\n Work Group=WG\n\trealm\t= A.EXAMPLE \r\n");
    EXPECT_EQ(settings.Value("workgroup"), "WG");
    EXPECT_EQ(settings.Value("RE ALM"), "A.EXAMPLE");
    EXPECT_TRUE(settings.Sets("work group"));
    EXPECT_FALSE(settings.Sets("security"));
    EXPECT_EQ(settings.Value("security"), std::nullopt);
}

TEST(SambaSettingsTest, OnlyGlobalSectionsAreRead) {
    SambaSettings const settings("realm = A\n[share]\nrealm = B\nsecurity = user\n"
                                 "[GLOBAL] x\nworkgroup = WG\n[globals\\\n]\nserver role = x\n");
    EXPECT_EQ(settings.Value("realm"), "A");
    EXPECT_FALSE(settings.Sets("security"));
    EXPECT_TRUE(settings.Sets("workgroup"));
    EXPECT_TRUE(settings.Sets("server role"));
}

TEST(SambaSettingsTest, TheLastValueWins) {
    EXPECT_EQ(SambaSettings("realm = A\n[x]\n[global]\nrealm = B\n").Value("realm"), "B");
}

TEST(SambaSettingsTest, CommentsAreNotContinuedButParametersAre) {
    SambaSettings const settings("[global]\n; security = user \\\n# realm = A \\\nrealm = B\\\n"
                                 ";C\nworkgroup = W # part of the value\nnetbios name = X \\ \n Y");
    EXPECT_FALSE(settings.Sets("security"));
    EXPECT_EQ(settings.Value("realm"), "B;C");
    EXPECT_EQ(settings.Value("workgroup"), "W # part of the value");
    EXPECT_EQ(settings.Value("netbios name"), "X Y");
}

TEST(SambaSettingsTest, ABackslashInFrontOfAnEmptyLineContinuesOnceMore) {
    SambaSettings const settings("realm = A\\\\\n\nB\nworkgroup = W\\ \\\n\n\nsecurity = user\n");
    EXPECT_EQ(settings.Value("realm"), "AB");
    EXPECT_EQ(settings.Value("workgroup"), "W");
    EXPECT_EQ(settings.Value("security"), "user");
}

TEST(SambaSettingsTest, ABackslashAtTheEndOfTheTextStandsForItself) {
    EXPECT_EQ(SambaSettings("winbind separator = \\").Value("winbind separator"), "\\");
    EXPECT_EQ(SambaSettings("winbind separator = \\\n").Value("winbind separator"), "");
}

TEST(SambaSettingsTest, IncludedFilesAreToldAndCanBeAdded) {
    SambaSettings settings(
        "[global]\ninclude = /a\n[x]\ninclude = /b\n[global]\ninclude = /c.%h\n");
    EXPECT_THAT(settings.Includes(), ElementsAre("/a", "/c.%h"));
    settings.Read("realm = A\n[x]\npath = /\n");
    settings.Read("workgroup = W\n");
    EXPECT_TRUE(settings.Sets("realm"));
    EXPECT_TRUE(settings.Sets("workgroup"));
    EXPECT_FALSE(settings.Sets("path"));
}

TEST(SambaSettingsTest, FamiliesOfIdmapParametersAreTold) {
    SambaSettings const settings(
        "idmap config corp:backend = ad\nIDMAP Config Other : range = 5 - 6\n"
        "idmap config X : range = 7\n");
    EXPECT_TRUE(settings.SetsIdmapOf("CORP"));
    EXPECT_TRUE(settings.SetsIdmapOf("other"));
    EXPECT_FALSE(settings.SetsIdmapOf("*"));
    EXPECT_FALSE(settings.SetsIdmapOf("COR"));
    ASSERT_EQ(settings.IdmapRanges().size(), 1U);
    EXPECT_EQ(settings.IdmapRanges()[0].first, 5U);
    EXPECT_EQ(settings.IdmapRanges()[0].last, 6U);
}

TEST(SambaSettingsTest, OlderIdmapParametersStandForAllDomains) {
    for (std::string const& name :
         Texts{"idmap uid", "idmap gid", "winbind uid", "winbind gid", "idmap backend"}) {
        EXPECT_TRUE(SambaSettings(name + " = 5-6\n").SetsIdmapOf("*")) << name;
        EXPECT_FALSE(SambaSettings(name + " = 5-6\n").SetsIdmapOf("CORP")) << name;
    }
}

} // namespace
