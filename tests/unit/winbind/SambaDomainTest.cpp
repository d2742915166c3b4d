// SPDX-License-Identifier: Apache-2.0
#include "text/SambaDomain.h"

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

SambaDomain const Corp{"CORP.EXAMPLE", "CORP", "HOST1", {}};

std::string TextFor(std::string_view administrator, SambaDomain const& domain = Corp,
                    ProviderOptions const& options = {}) {
    return SambaDomainText(domain, SambaSettings(administrator), options);
}

TEST(SambaDomainTest, TheFileOfTheProviderHoldsAllSettings) {
    EXPECT_EQ(TextFor(""), GoldenText("tslauth.conf/plain.conf"));
}

TEST(SambaDomainTest, RequiredSettingsStandWhateverTheAdministratorSets) {
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

TEST(SambaDomainTest, MattersOfTasteAreLeftToTheAdministrator) {
    std::string const text =
        TextFor("[global]\nTemplate Shell = /bin/zsh\nidmap config * : backend = autorid\n");
    EXPECT_THAT(text, Not(HasSubstr("template shell")));
    EXPECT_THAT(text, HasSubstr("\ttemplate homedir = /home/%D/%U\n"));
    EXPECT_THAT(text, Not(HasSubstr("idmap")));
}

TEST(SambaDomainTest, OptionsAreSettings) {
    ProviderOptions options;
    options.shortNames = true;
    options.offlineLogIn = true;
    options.keytab = true;
    options.loginShell = "/bin/zsh";
    options.homeFolder = "/srv/%U";
    std::string const text = TextFor("", Corp, options);
    for (char const* const line :
         {"\twinbind use default domain = yes\n", "\twinbind offline logon = yes\n",
          "\tkerberos method = secrets and keytab\n", "\ttemplate shell = /bin/zsh\n",
          "\ttemplate homedir = /srv/%U\n"}) {
        EXPECT_THAT(text, HasSubstr(line));
    }
}

TEST(SambaDomainTest, NumbersComeFromRangesThatTheAdministratorDoesNotUse) {
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

TEST(SambaDomainTest, AnotherSeparatorThanABackslashIsOverruled) {
    std::string const text = TextFor("[global]\nwinbind separator = +\n");
    EXPECT_EQ(text.substr(text.size() - 22), "\twinbind separator = \\");
    EXPECT_EQ(SambaSettings(text).Value("winbind separator"), "\\");
    EXPECT_THAT(TextFor(""), Not(HasSubstr("separator")));
}

TEST(SambaDomainTest, PreferredControllersAreAskedFirst) {
    EXPECT_THAT(TextFor("password server = old\n",
                        {"CORP.EXAMPLE", "CORP", "HOST1", {"dc2.corp.example", "dc1"}}),
                HasSubstr("\tpassword server = dc2.corp.example dc1 *\n"));
    EXPECT_THAT(TextFor(""), Not(HasSubstr("password server")));
}

TEST(SambaDomainTest, WhatIsWrittenIsReadBack) {
    SambaDomain const domain{"CORP.EXAMPLE", "CORP", "HOST1", {"dc2.corp.example", "dc1"}};
    auto const read = ReadSambaDomain(TextFor("", domain));
    ASSERT_TRUE(read);
    EXPECT_EQ(read->realm, domain.realm);
    EXPECT_EQ(read->workgroup, domain.workgroup);
    EXPECT_EQ(read->netbiosName, domain.netbiosName);
    EXPECT_EQ(read->preferredControllers, domain.preferredControllers);
}

TEST(SambaDomainTest, AFileWithoutItsDomainIsNoDomain) {
    EXPECT_FALSE(ReadSambaDomain(""));
    EXPECT_FALSE(ReadSambaDomain("[global]\nrealm = A\n"));
    EXPECT_FALSE(ReadSambaDomain("[global]\nworkgroup = A\nrealm =\n"));
    EXPECT_FALSE(ReadSambaDomain("[x]\nworkgroup = A\nrealm = A\n"));
}

TEST(SambaDomainTest, PreferredControllersChangeAndNothingElse) {
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

TEST(SambaDomainTest, PreferredControllersAreKeptAlsoInAFileThatWasEdited) {
    EXPECT_EQ(WithPreferredControllers("# c\n[global]\n\trealm = A\n", {"dc1"}),
              "# c\n[global]\n\tpassword server = dc1 *\n\trealm = A\n");
    EXPECT_EQ(WithPreferredControllers("[global]\npassword server = a\n\tkerberos method = x\n"
                                       "Password Server = b\n",
                                       {"dc1"}),
              "[global]\n\tpassword server = dc1 *\n\tkerberos method = x\n");
    EXPECT_EQ(WithPreferredControllers("", {"dc1"}), "");
}

TEST(SambaDomainTest, AStagedConfigurationKeepsEverythingBelowItsDirectory) {
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

TEST(SambaDomainTest, AValueOfSeveralLinesIsRefused) {
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
