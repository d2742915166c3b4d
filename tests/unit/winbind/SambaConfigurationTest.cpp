// SPDX-License-Identifier: Apache-2.0
#include "SambaConfiguration.h"

#include "Failure.h"
#include "GoldenText.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <string>
#include <string_view>
#include <vector>

using namespace tessel::winbind;
using testing::ElementsAre;
using testing::HasSubstr;
using testing::IsEmpty;
using testing::Not;

namespace {

using Texts = std::vector<std::string>;

std::string const Path = "/etc/samba/tslauth.conf";
std::string const Comment = "# Written by tslauth: the domain that this host is joined to. It "
                            "stays the last of [global].\n";
std::string const Include = "\tinclude = /etc/samba/tslauth.conf\n";

SambaDomain const Corp{"CORP.EXAMPLE", "CORP", "HOST1", {}};

std::string TextFor(std::string_view administrator, SambaDomain const& domain = Corp) {
    return SambaDomainText(domain, SambaSettings(administrator));
}

TEST(SambaConfigurationTest, GoldenFilesGetTheIncludeAndLoseItByteForByte) {
    ExpectGoldenEdits(
        "smb.conf", 25, [](std::string const& text) { return HasSambaInclude(text, Path); },
        [](std::string const& text) { return WithSambaInclude(text, Path); },
        [](std::string const& text) { return WithoutSambaInclude(text, Path); });
}

TEST(SambaConfigurationTest, AnIncludeThatIsThereIsNotAddedAgain) {
    for (std::string const& text :
         Texts{"[global]\ninclude=" + Path, "INCLUDE = " + Path + "\n[x]\n",
               "[x]\n[globals]\n in clude = \\\n " + Path + " \n", "[global]\r\n" + Include}) {
        EXPECT_TRUE(HasSambaInclude(text, Path)) << text;
        EXPECT_EQ(WithSambaInclude(text, Path), text);
    }
}

TEST(SambaConfigurationTest, AnIncludeOfAnotherFileOrElsewhereIsNotOurs) {
    for (std::string const& text : Texts{"[global]\ninclude = /etc/samba/other.conf\n",
                                         "[x]\ninclude = /etc/samba/tslauth.conf\n",
                                         "[global]\n#include = /etc/samba/tslauth.conf\n",
                                         "[global]\n/etc/samba/tslauth.conf\n"}) {
        EXPECT_FALSE(HasSambaInclude(text, Path)) << text;
        EXPECT_EQ(WithoutSambaInclude(text, Path), text);
    }
}

TEST(SambaConfigurationTest, TheIncludeIsTakenOutWhereTheAdministratorHasGoneOnBehindIt) {
    EXPECT_EQ(WithoutSambaInclude("[global]\n" + Comment + Include + "\tsecurity = user\n", Path),
              "[global]\n\tsecurity = user\n");
}

TEST(SambaConfigurationTest, TheIncludeIsTakenOutWithoutItsComment) {
    EXPECT_EQ(WithoutSambaInclude("[global]\n" + Include + "\n[x]\n", Path), "[global]\n\n[x]\n");
    EXPECT_EQ(WithoutSambaInclude(Comment + "\n[global]\n" + Include, Path),
              Comment + "\n[global]\n");
}

TEST(SambaConfigurationTest, EveryIncludeOfOursIsTakenOut) {
    EXPECT_EQ(WithoutSambaInclude(
                  "[global]\n" + Include + Include + "[x]\n[global]\n" + Comment + Include, Path),
              "[global]\n[x]\n[global]\n");
}

TEST(SambaConfigurationTest, AHeaderThatWasAddedGoesAlsoWhenParametersHaveFollowedIt) {
    std::string const added = WithSambaInclude("[x]\npath = /\n", Path);
    EXPECT_EQ(WithoutSambaInclude("security = user\n" + added, Path),
              "security = user\n[x]\npath = /\n");
}

TEST(SambaConfigurationTest, NamesAreReadWithoutRegardToCaseAndBlanks) {
    SambaSettings const settings("[global]\n Work Group=WG\n\trealm\t= A.EXAMPLE \r\n");
    EXPECT_EQ(settings.Value("workgroup"), "WG");
    EXPECT_EQ(settings.Value("RE ALM"), "A.EXAMPLE");
    EXPECT_TRUE(settings.Sets("work group"));
    EXPECT_FALSE(settings.Sets("security"));
    EXPECT_EQ(settings.Value("security"), std::nullopt);
}

TEST(SambaConfigurationTest, OnlyGlobalSectionsAreRead) {
    SambaSettings const settings("realm = A\n[share]\nrealm = B\nsecurity = user\n"
                                 "[GLOBAL] x\nworkgroup = WG\n[globals\\\n]\nserver role = x\n");
    EXPECT_EQ(settings.Value("realm"), "A");
    EXPECT_FALSE(settings.Sets("security"));
    EXPECT_TRUE(settings.Sets("workgroup"));
    EXPECT_TRUE(settings.Sets("server role"));
}

TEST(SambaConfigurationTest, TheLastValueWins) {
    EXPECT_EQ(SambaSettings("realm = A\n[x]\n[global]\nrealm = B\n").Value("realm"), "B");
}

TEST(SambaConfigurationTest, CommentsAreNotContinuedButParametersAre) {
    SambaSettings const settings("[global]\n; security = user \\\n# realm = A \\\nrealm = B\\\n"
                                 ";C\nworkgroup = W # part of the value\nnetbios name = X \\ \n Y");
    EXPECT_FALSE(settings.Sets("security"));
    EXPECT_EQ(settings.Value("realm"), "B;C");
    EXPECT_EQ(settings.Value("workgroup"), "W # part of the value");
    EXPECT_EQ(settings.Value("netbios name"), "X Y");
}

TEST(SambaConfigurationTest, ABackslashInFrontOfAnEmptyLineContinuesOnceMore) {
    SambaSettings const settings("realm = A\\\\\n\nB\nworkgroup = W\\ \\\n\n\nsecurity = user\n");
    EXPECT_EQ(settings.Value("realm"), "AB");
    EXPECT_EQ(settings.Value("workgroup"), "W");
    EXPECT_EQ(settings.Value("security"), "user");
}

TEST(SambaConfigurationTest, ABackslashAtTheEndOfTheTextStandsForItself) {
    EXPECT_EQ(SambaSettings("winbind separator = \\").Value("winbind separator"), "\\");
    EXPECT_EQ(SambaSettings("winbind separator = \\\n").Value("winbind separator"), "");
}

TEST(SambaConfigurationTest, IncludedFilesAreToldAndCanBeAdded) {
    SambaSettings settings(
        "[global]\ninclude = /a\n[x]\ninclude = /b\n[global]\ninclude = /c.%h\n");
    EXPECT_THAT(settings.Includes(), ElementsAre("/a", "/c.%h"));
    settings.Read("realm = A\n[x]\npath = /\n");
    settings.Read("workgroup = W\n");
    EXPECT_TRUE(settings.Sets("realm"));
    EXPECT_TRUE(settings.Sets("workgroup"));
    EXPECT_FALSE(settings.Sets("path"));
}

TEST(SambaConfigurationTest, FamiliesOfIdmapParametersAreTold) {
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

TEST(SambaConfigurationTest, OlderIdmapParametersStandForAllDomains) {
    for (std::string const& name :
         Texts{"idmap uid", "idmap gid", "winbind uid", "winbind gid", "idmap backend"}) {
        EXPECT_TRUE(SambaSettings(name + " = 5-6\n").SetsIdmapOf("*")) << name;
        EXPECT_FALSE(SambaSettings(name + " = 5-6\n").SetsIdmapOf("CORP")) << name;
    }
}

TEST(SambaConfigurationTest, TheFileOfTheProviderHoldsAllSettings) {
    EXPECT_EQ(TextFor(""), GoldenText("tslauth.conf/plain.conf"));
}

TEST(SambaConfigurationTest, RequiredSettingsStandWhateverTheAdministratorSets) {
    std::string const text = TextFor("[global]\nworkgroup = OLD\nrealm = OLD\nsecurity = user\n"
                                     "server role = standalone server\nnetbios name = OLD\n"
                                     "winbind use default domain = yes\n");
    for (char const* const line :
         {"\tworkgroup = CORP\n", "\trealm = CORP.EXAMPLE\n", "\tnetbios name = HOST1\n",
          "\tsecurity = ads\n", "\tserver role = member server\n",
          "\twinbind use default domain = no\n", "\tkerberos method = secrets only\n"}) {
        EXPECT_THAT(text, HasSubstr(line));
    }
}

TEST(SambaConfigurationTest, MattersOfTasteAreLeftToTheAdministrator) {
    std::string const text =
        TextFor("[global]\nTemplate Shell = /bin/zsh\nidmap config * : backend = autorid\n");
    EXPECT_THAT(text, Not(HasSubstr("template shell")));
    EXPECT_THAT(text, HasSubstr("\ttemplate homedir = /home/%D/%U\n"));
    EXPECT_THAT(text, Not(HasSubstr("idmap")));
}

TEST(SambaConfigurationTest, NumbersComeFromRangesThatTheAdministratorDoesNotUse) {
    EXPECT_THAT(TextFor("idmap config * : range = 1000-2500000\n"),
                HasSubstr("\tidmap config CORP : range = 3000000-3999999\n"));
    EXPECT_THAT(TextFor("idmap config * : range = 1000-2500000\n"), Not(HasSubstr("config *")));
    std::string const text = TextFor("idmap config CORP : range = 1000000-1000000\n");
    EXPECT_THAT(text, HasSubstr("\tidmap config * : range = 2000000-2999999\n"));
    EXPECT_THAT(text, Not(HasSubstr("config CORP")));
    EXPECT_THAT(TextFor("idmap config X : range = 0-4294967295\n"), Not(HasSubstr("idmap")));
    EXPECT_THAT(TextFor("winbind uid = 1500000-1600000\n"),
                HasSubstr("\tidmap config CORP : range = 2000000-2999999\n"));
}

TEST(SambaConfigurationTest, AnotherSeparatorThanABackslashIsOverruled) {
    std::string const text = TextFor("[global]\nwinbind separator = +\n");
    EXPECT_EQ(text.substr(text.size() - 22), "\twinbind separator = \\");
    EXPECT_EQ(SambaSettings(text).Value("winbind separator"), "\\");
    EXPECT_THAT(TextFor(""), Not(HasSubstr("separator")));
}

TEST(SambaConfigurationTest, PreferredControllersAreAskedFirst) {
    EXPECT_THAT(TextFor("password server = old\n",
                        {"CORP.EXAMPLE", "CORP", "HOST1", {"dc2.corp.example", "dc1"}}),
                HasSubstr("\tpassword server = dc2.corp.example dc1 *\n"));
    EXPECT_THAT(TextFor(""), Not(HasSubstr("password server")));
}

TEST(SambaConfigurationTest, WhatIsWrittenIsReadBack) {
    SambaDomain const domain{"CORP.EXAMPLE", "CORP", "HOST1", {"dc2.corp.example", "dc1"}};
    auto const read = ReadSambaDomain(TextFor("", domain));
    ASSERT_TRUE(read);
    EXPECT_EQ(read->realm, domain.realm);
    EXPECT_EQ(read->workgroup, domain.workgroup);
    EXPECT_EQ(read->netbiosName, domain.netbiosName);
    EXPECT_EQ(read->preferredControllers, domain.preferredControllers);
}

TEST(SambaConfigurationTest, AFileWithoutItsDomainIsNoDomain) {
    EXPECT_FALSE(ReadSambaDomain(""));
    EXPECT_FALSE(ReadSambaDomain("[global]\nrealm = A\n"));
    EXPECT_FALSE(ReadSambaDomain("[global]\nworkgroup = A\nrealm =\n"));
    EXPECT_FALSE(ReadSambaDomain("[x]\nworkgroup = A\nrealm = A\n"));
}

TEST(SambaConfigurationTest, PreferredControllersChangeAndNothingElse) {
    SambaDomain with = Corp;
    with.preferredControllers = {"dc2", "dc1"};
    std::string const administrator = "winbind separator = +\n";
    std::string const none = TextFor(administrator);
    std::string const two = TextFor(administrator, with);
    EXPECT_EQ(WithPreferredControllers(none, {"dc2", "dc1"}), two);
    EXPECT_EQ(WithPreferredControllers(two, {}), none);
    EXPECT_EQ(WithPreferredControllers(two, {"dc2", "dc1"}), two);
    EXPECT_EQ(WithPreferredControllers(none, {}), none);
}

TEST(SambaConfigurationTest, PreferredControllersAreKeptAlsoInAFileThatWasEdited) {
    EXPECT_EQ(WithPreferredControllers("# c\n[global]\n\trealm = A\n", {"dc1"}),
              "# c\n[global]\n\tpassword server = dc1 *\n\trealm = A\n");
    EXPECT_EQ(WithPreferredControllers("[global]\npassword server = a\n\tkerberos method = x\n"
                                       "Password Server = b\n",
                                       {"dc1"}),
              "[global]\n\tpassword server = dc1 *\n\tkerberos method = x\n");
    EXPECT_EQ(WithPreferredControllers("", {"dc1"}), "");
}

TEST(SambaConfigurationTest, AStagedConfigurationKeepsEverythingBelowItsDirectory) {
    SambaDomain domain = Corp;
    domain.preferredControllers = {"dc1"};
    std::string const text = StagedSambaDomainText(domain, "/run/tslauth-winbind.AbCdEf");
    EXPECT_EQ(text, GoldenText("tslauth.conf/staged.conf"));
    for (auto const& directory : StagingDirectories("/run/tslauth-winbind.AbCdEf")) {
        EXPECT_THAT(text, HasSubstr(" = " + directory + '\n'));
    }
    EXPECT_EQ(StagingDirectories("/s").front(), "/s/private");
    EXPECT_THAT(SambaSettings(text).Includes(), IsEmpty());
}

TEST(SambaConfigurationTest, AValueOfSeveralLinesIsRefused) {
    for (auto const& domain : std::vector<SambaDomain>{
             SambaDomain{"A\nB", "C", "D", {}}, SambaDomain{"A", "C\r", "D", {}},
             SambaDomain{"A", "C", std::string("D\0", 2), {}},
             SambaDomain{"A", "C", "D", {"e\nf"}}}) {
        for (bool const staged : {false, true}) {
            try {
                (void)(staged ? StagedSambaDomainText(domain, "/s") : TextFor("", domain));
                ADD_FAILURE() << "taken";
            } catch (Failure const& failure) {
                EXPECT_EQ(failure.Code(), 87U);
            }
        }
    }
    EXPECT_THROW((void)WithPreferredControllers("[global]\n", {"a\nb"}), Failure);
}

} // namespace
