// SPDX-License-Identifier: Apache-2.0
#include "text/SambaInclude.h"

#include "GoldenText.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <string>
#include <string_view>
#include <vector>

using namespace tessel::winbind;

namespace {

using Texts = std::vector<std::string>;

std::string const Path = "/etc/samba/tslauth.conf";
std::string const Comment = "# Written by tslauth: the domain that this host is joined to. It "
                            "stays the last of [global].\n";
std::string const Include = "\tinclude = /etc/samba/tslauth.conf\n";

TEST(SambaIncludeTest, GoldenFilesGetTheIncludeAndLoseItByteForByte) {
    ExpectGoldenEdits(
        "smb.conf", 25, [](std::string const& text) { return HasSambaInclude(text, Path); },
        [](std::string const& text) { return WithSambaInclude(text, Path); },
        [](std::string const& text) { return WithoutSambaInclude(text, Path); });
}

TEST(SambaIncludeTest, AnIncludeThatIsThereIsNotAddedAgain) {
    for (std::string const& text :
         Texts{"[global]\ninclude=" + Path, "INCLUDE = " + Path + "\n[x]\n",
               "[x]\n[globals]\n in clude = \\\n " + Path + " \n", "[global]\r\n" + Include}) {
        EXPECT_TRUE(HasSambaInclude(text, Path)) << text;
        EXPECT_EQ(WithSambaInclude(text, Path), text);
    }
}

TEST(SambaIncludeTest, AnIncludeOfAnotherFileOrElsewhereIsNotOurs) {
    for (std::string const& text : Texts{"[global]\ninclude = /etc/samba/other.conf\n",
                                         "[x]\ninclude = /etc/samba/tslauth.conf\n",
                                         "[global]\n#include = /etc/samba/tslauth.conf\n",
                                         "[global]\n/etc/samba/tslauth.conf\n"}) {
        EXPECT_FALSE(HasSambaInclude(text, Path)) << text;
        EXPECT_EQ(WithoutSambaInclude(text, Path), text);
    }
}

TEST(SambaIncludeTest, TheIncludeIsTakenOutWhereTheAdministratorHasGoneOnBehindIt) {
    EXPECT_EQ(WithoutSambaInclude("[global]\n" + Comment + Include + "\tsecurity = user\n", Path),
              "[global]\n\tsecurity = user\n");
}

TEST(SambaIncludeTest, TheIncludeIsTakenOutWithoutItsComment) {
    EXPECT_EQ(WithoutSambaInclude("[global]\n" + Include + "\n[x]\n", Path), "[global]\n\n[x]\n");
    EXPECT_EQ(WithoutSambaInclude(Comment + "\n[global]\n" + Include, Path),
              Comment + "\n[global]\n");
}

TEST(SambaIncludeTest, EveryIncludeOfOursIsTakenOut) {
    EXPECT_EQ(WithoutSambaInclude(
                  "[global]\n" + Include + Include + "[x]\n[global]\n" + Comment + Include, Path),
              "[global]\n[x]\n[global]\n");
}

TEST(SambaIncludeTest, AHeaderThatWasAddedGoesAlsoWhenParametersHaveFollowedIt) {
    std::string const added = WithSambaInclude("[x]\npath = /\n", Path);
    EXPECT_EQ(WithoutSambaInclude("security = user\n" + added, Path),
              "security = user\n[x]\npath = /\n");
}

} // namespace
