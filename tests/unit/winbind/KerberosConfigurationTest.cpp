// SPDX-License-Identifier: Apache-2.0
#include "text/KerberosConfiguration.h"

#include "Failure.h"
#include "GoldenText.h"

#include <gtest/gtest.h>

#include <string>
#include <vector>

using namespace tessel::winbind;

namespace {

using Texts = std::vector<std::string>;

std::string const Path = "/etc/krb5.conf.d/tslauth.conf";
std::string const Include = "include " + Path + "\n";

TEST(KerberosConfigurationTest, GoldenFilesGetTheIncludeAndLoseItByteForByte) {
    ExpectGoldenEdits(
        "krb5.conf", 8, [](std::string const& text) { return HasKerberosInclude(text, Path); },
        [](std::string const& text) { return WithKerberosInclude(text, Path); },
        [](std::string const& text) { return WithoutKerberosInclude(text, Path); });
}

TEST(KerberosConfigurationTest, AnIncludeThatIsThereIsNotAddedAgain) {
    for (std::string const& text :
         Texts{Include, "[realms]\n" + Include, "# c\r\ninclude \t" + Path + " \r\n"}) {
        EXPECT_TRUE(HasKerberosInclude(text, Path)) << text;
        EXPECT_EQ(WithKerberosInclude(text, Path), text);
    }
}

TEST(KerberosConfigurationTest, OtherLinesAreNotOurs) {
    for (std::string const& text :
         Texts{"include /etc/other\n", " " + Include, "includedir " + Path + "\n", "#" + Include}) {
        EXPECT_FALSE(HasKerberosInclude(text, Path)) << text;
        EXPECT_EQ(WithoutKerberosInclude(text, Path), text);
    }
}

TEST(KerberosConfigurationTest, TheIncludeIsTakenOutWhereverItIs) {
    EXPECT_EQ(WithoutKerberosInclude("[realms]\n" + Include + "[libdefaults]\n" + Include, Path),
              "[realms]\n[libdefaults]\n");
    EXPECT_EQ(WithoutKerberosInclude("# mine\n\n" + WithKerberosInclude("[realms]\n", Path), Path),
              "# mine\n\n[realms]\n");
}

TEST(KerberosConfigurationTest, ARealmIsFoundInDNS) {
    EXPECT_EQ(KerberosDomainText({"CORP.EXAMPLE", "corp.example"}),
              GoldenText("krb5-tslauth.conf/dns.conf"));
}

TEST(KerberosConfigurationTest, ARealmIsFoundAtItsControllers) {
    EXPECT_EQ(KerberosDomainText(
                  {"CORP.EXAMPLE", "corp.example", {"dc1.corp.example", "dc2.corp.example"}}),
              GoldenText("krb5-tslauth.conf/controllers.conf"));
}

TEST(KerberosConfigurationTest, ATicketIsForTheDomainsUserAndForNoLocalOne) {
    std::string const text = KerberosDomainText({"CORP.EXAMPLE", "corp.example", {}, "CORP"});
    EXPECT_NE(std::string::npos,
              text.find("\t\tauth_to_local = RULE:[1:CORP\\$1@$0](.*@CORP\\.EXAMPLE)"
                        "s/@CORP\\.EXAMPLE$//\n\t}\n"))
        << text;
    EXPECT_EQ(std::string::npos, text.find("DEFAULT"));
}

TEST(KerberosConfigurationTest, NamesThatTheFileCannotHoldAreRefused) {
    for (std::string const& name : Texts{"", "A B", "A\n", "A}", "A={", "A#", "[A]", "A\"", "A;"}) {
        for (auto const& domain :
             std::vector<KerberosDomain>{KerberosDomain{name, "a"}, KerberosDomain{"A", name},
                                         KerberosDomain{"A", "a", {name}}}) {
            try {
                (void)KerberosDomainText(domain);
                ADD_FAILURE() << "took " << name;
            } catch (Failure const& failure) {
                EXPECT_EQ(failure.Code(), 87U);
            }
        }
    }
}

} // namespace
