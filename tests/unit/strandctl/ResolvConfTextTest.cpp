// SPDX-License-Identifier: Apache-2.0
#include "ResolvConfText.h"

#include "HostCtlFailure.h"

#include <gtest/gtest.h>
#include <string>

namespace StrandCtl {
namespace {

struct Case {
    char const* name;
    char const* before;
    char const* after;
};

class ResolvConfTextTest : public testing::TestWithParam<Case> {};

TEST_P(ResolvConfTextTest, IsEdited) {
    EXPECT_EQ(GetParam().after, AddSearchDomainToText(GetParam().before, "corp.example"));
}

TEST_P(ResolvConfTextTest, TheEditIsIdempotent) {
    EXPECT_EQ(GetParam().after, AddSearchDomainToText(GetParam().after, "corp.example"));
}

INSTANTIATE_TEST_SUITE_P(
    Golden, ResolvConfTextTest,
    testing::Values(
        Case{"Empty", "", "search corp.example\n"},
        Case{"Appended", "nameserver 192.0.2.1\noptions ndots:1\n",
             "nameserver 192.0.2.1\noptions ndots:1\nsearch corp.example\n"},
        Case{"AppendedBehindNoFinalNewline", "nameserver 192.0.2.1",
             "nameserver 192.0.2.1\nsearch corp.example\n"},
        Case{"AddedToTheList", "search a.example\nnameserver 192.0.2.1\n",
             "search a.example corp.example\nnameserver 192.0.2.1\n"},
        Case{"AddedNoFinalNewline", "search a.example", "search a.example corp.example"},
        Case{"AddedBehindBlanks", "search\ta.example \t b.example \t\nnameserver 192.0.2.1\n",
             "search\ta.example \t b.example corp.example\nnameserver 192.0.2.1\n"},
        Case{"PresentIsUnchanged", "search\ta.example corp.example  b.example \n",
             "search\ta.example corp.example  b.example \n"},
        Case{"PresentInUpperCase", "search CORP.Example\n", "search CORP.Example\n"},
        Case{"PresentWithDot", "search corp.example.\n", "search corp.example.\n"},
        Case{"PartOfANameIsAnother", "search corp.example.org x.corp.example\n",
             "search corp.example.org x.corp.example corp.example\n"},
        Case{"TheLastListCounts", "search corp.example\n# x\nsearch b.example\n; y\n",
             "search corp.example\n# x\nsearch b.example corp.example\n; y\n"},
        Case{"DomainLineIsFollowedByTheList", "domain a.example\nnameserver 192.0.2.1\n",
             "domain a.example\nsearch a.example corp.example\nnameserver 192.0.2.1\n"},
        Case{"DomainLineNoFinalNewline", "domain a.example",
             "domain a.example\nsearch a.example corp.example\n"},
        Case{"DomainLineWithIgnoredRest", "domain\ta.example b.example # home\n",
             "domain\ta.example b.example # home\nsearch a.example corp.example\n"},
        Case{"DomainLineThatSaysIt", "domain corp.example\n", "domain corp.example\n"},
        Case{"DomainBehindSearchCounts", "search corp.example\ndomain a.example\n",
             "search corp.example\ndomain a.example\nsearch a.example corp.example\n"},
        Case{"SearchBehindDomainCounts", "domain corp.example\nsearch a.example\n",
             "domain corp.example\nsearch a.example corp.example\n"},
        Case{"CommentedOutIsNoList", "#search corp.example\n;search corp.example\n",
             "#search corp.example\n;search corp.example\nsearch corp.example\n"},
        Case{"IndentedIsNoList", " search corp.example\n",
             " search corp.example\nsearch corp.example\n"},
        Case{"KeywordInUpperCaseIsNoList", "SEARCH corp.example\n",
             "SEARCH corp.example\nsearch corp.example\n"},
        Case{"LongerKeywordIsNoList", "searching corp.example\ndomainname corp.example\nsearch\n",
             "searching corp.example\ndomainname corp.example\nsearch\nsearch corp.example\n"},
        Case{"ListWithoutNamesIsNone", "search a.example\nsearch \t\ndomain \n",
             "search a.example corp.example\nsearch \t\ndomain \n"},
        Case{"BeforeACommentBehindTheNames", "search a.example # main\n",
             "search a.example corp.example # main\n"},
        Case{"NotFoundInAComment", "search a.example ;corp.example corp.example\n",
             "search a.example corp.example ;corp.example corp.example\n"},
        Case{"CarriageReturnOfTheListGoes", "nameserver 192.0.2.1\r\nsearch a.example\r\n# x\r\n",
             "nameserver 192.0.2.1\r\nsearch a.example corp.example\n# x\r\n"},
        Case{"CarriageReturnThatHidesTheName", "search corp.example\r\n", "search corp.example\n"},
        Case{"CarriageReturnOfADomainLine", "domain a.example\r\n",
             "domain a.example\r\nsearch a.example corp.example\n"},
        Case{"CarriageReturnOfADomainLineThatSaysIt", "domain corp.example\r\n",
             "domain corp.example\r\nsearch corp.example\n"},
        Case{"OtherLinesKeepEveryByte", "\xff\t\n\noptions  rotate \r\nsortlist x\nsearch a\n\t\n",
             "\xff\t\n\noptions  rotate \r\nsortlist x\nsearch a corp.example\n\t\n"}),
    [](testing::TestParamInfo<Case> const& param) { return param.param.name; });

TEST(ResolvConfTextTest, TheDomainIsWrittenAsItWasGiven) {
    EXPECT_EQ("search Corp.Example.\n", AddSearchDomainToText("", "Corp.Example."));
    EXPECT_EQ("search corp.example\n",
              AddSearchDomainToText("search corp.example\n", "CORP.EXAMPLE."));
}

TEST(ResolvConfTextTest, SixDomainsFitAndTheSeventhIsAnError) {
    EXPECT_EQ("search a b c d e f\n", AddSearchDomainToText("search a b c d e\n", "f"));
    EXPECT_EQ("Cannot add the search domain 'g': the search list would have 7 domains, and the "
              "limit is 6",
              FailureOf([] { AddSearchDomainToText("search a b c d e f\n", "g"); }));
}

TEST(ResolvConfTextTest, WordsOfACommentCountAsTheResolverCountsThem) {
    EXPECT_EQ("Cannot add the search domain 'g': the search list would have 7 domains, and the "
              "limit is 6",
              FailureOf([] { AddSearchDomainToText("search a # b c d e\n", "g"); }));
}

TEST(ResolvConfTextTest, AListThatIsTooLongAlreadyIsLeftAlone) {
    std::string const text = "search a b c d e f g h\n";
    EXPECT_EQ(text, AddSearchDomainToText(text, "h"));
    EXPECT_EQ("Cannot add the search domain 'i': the search list would have 9 domains, and the "
              "limit is 6",
              FailureOf([&] { AddSearchDomainToText(text, "i"); }));
}

TEST(ResolvConfTextTest, CharactersUpTo255Fit) {
    // 63 + 1 + 63 + 1 + 63 = 191; with a blank, 63 more fit.
    std::string const label(63, 'a');
    std::string const text = "search " + label + "." + label + " " + label + "\n";
    std::string const domain(63, 'b');
    EXPECT_EQ("search " + label + "." + label + " " + label + " " + domain + "\n",
              AddSearchDomainToText(text, domain));
    EXPECT_EQ("Cannot add the search domain '" + domain +
                  ".c': the search list would have 257 "
                  "characters, and the limit is 255",
              FailureOf([&] { AddSearchDomainToText(text, domain + ".c"); }));
    EXPECT_EQ("Cannot add the search domain '" + domain +
                  ".': the search list would have 256 "
                  "characters, and the limit is 255",
              FailureOf([&] { AddSearchDomainToText(text, domain + "."); }));
}

TEST(ResolvConfTextTest, WhatIsNoDomainNameIsRefused) {
    std::string const label(63, 'a');
    for (std::string const& domain :
         {std::string(), std::string("."), std::string(".."), std::string("a..b"),
          std::string(".a"), std::string("a.."), std::string("a b"), std::string("a\tb"),
          std::string("a\nsearch b"), std::string("#a"), std::string(";a"), std::string("a/b"),
          std::string("a\r"), std::string("\xc3\xa4.example"), label + "a",
          label + "." + label + "." + label + "." + std::string(62, 'a')}) {
        EXPECT_EQ("'" + domain + "' is not a domain name",
                  FailureOf([&] { AddSearchDomainToText("", domain); }));
    }
    // The text of the failure ends at the null byte.
    EXPECT_EQ("'a", FailureOf([] { AddSearchDomainToText("", std::string("a\0b", 3)); }));
    EXPECT_EQ("search a_b-c.1\n", AddSearchDomainToText("", "a_b-c.1"));
    std::string const longest = label + "." + label + "." + label + "." + std::string(61, 'a');
    EXPECT_EQ("search " + longest + "\n", AddSearchDomainToText("", longest));
}

TEST(ResolvConfTextTest, AHundredThousandLinesStay) {
    std::string lines;
    for (int i = 0; i < 100000; ++i) {
        lines += "# " + std::to_string(i) + "\n";
    }
    EXPECT_TRUE(lines + "search a corp.example\n" + lines ==
                AddSearchDomainToText(lines + "search a\n" + lines, "corp.example"));
}

struct OwnedCase {
    char const* name;
    char const* destination;
    char const* text;
    char const* owner; ///< empty if nobody keeps it
};

class ResolvConfOwnerTest : public testing::TestWithParam<OwnedCase> {};

TEST_P(ResolvConfOwnerTest, IsFound) {
    auto const owner = OwnerOfResolvConf(GetParam().destination, GetParam().text);
    EXPECT_EQ(GetParam().owner, owner ? owner->name : "");
    if (owner) {
        EXPECT_NE("", owner->remedy);
    }
}

constexpr char plain[] = "/etc/resolv.conf";

INSTANTIATE_TEST_SUITE_P(
    Owners, ResolvConfOwnerTest,
    testing::Values(
        OwnedCase{"Nobody", plain, "nameserver 192.0.2.1\n", ""},
        OwnedCase{"NobodyEmpty", plain, "", ""},
        OwnedCase{"NobodyPlainComment", plain, "# the main name servers\n\nnameserver ::1\n", ""},
        OwnedCase{"NobodyLinkElsewhere", "/srv/resolv.conf", "nameserver 192.0.2.1\n", ""},
        OwnedCase{"NobodyFolderWithSimilarName", "/runtime/resolv.conf", "", ""},
        OwnedCase{
            "NobodyContainerEngine", plain,
            "# Generated by Docker Engine.\n# This file can be edited; Docker Engine will not "
            "make further changes once it\n# has been modified.\n\nnameserver 192.0.2.1\n",
            ""},
        OwnedCase{"NobodyCommentBehindTheHeader", plain,
                  "nameserver 192.0.2.1\n# Generated by NetworkManager\n", ""},
        OwnedCase{"ResolvedLink", "/run/systemd/resolve/stub-resolv.conf", "", "systemd-resolved"},
        OwnedCase{"ResolvedHeader", "/usr/lib/systemd/resolv.conf",
                  "# This file belongs to man:systemd-resolved(8). Do not edit.\n#\n",
                  "systemd-resolved"},
        OwnedCase{"NetworkManagerLink", "/run/NetworkManager/resolv.conf", "", "NetworkManager"},
        OwnedCase{"NetworkManagerHeader", plain, "\n# Generated by NetworkManager\r\nsearch a\n",
                  "NetworkManager"},
        OwnedCase{"ResolvconfLink", "/run/resolvconf/resolv.conf", "", "resolvconf"},
        OwnedCase{"ResolvconfHeader", plain,
                  "# Dynamic resolv.conf(5) file for glibc resolver(3) generated by resolvconf(8)\n"
                  "#     DO NOT EDIT THIS FILE BY HAND -- YOUR CHANGES WILL BE OVERWRITTEN\n",
                  "resolvconf"},
        OwnedCase{"Dhclient", plain, "; generated by /usr/sbin/dhclient-script\n", "dhclient"},
        OwnedCase{"Dhcpcd", plain, "# Generated by dhcpcd from eth0.dhcp\n", "dhcpcd"},
        OwnedCase{"ConnMan", plain, "# Generated by Connection Manager\n", "ConnMan"},
        OwnedCase{"Netconfig", "/run/netconfig/resolv.conf", "", "netconfig"},
        OwnedCase{"Tailscale", plain, "# resolv.conf(5) file generated by tailscale\n",
                  "Tailscale"},
        OwnedCase{"WSL", plain, "# This file was automatically generated by WSL. To stop\n", "WSL"},
        OwnedCase{"UnknownLink", "/run/other/resolv.conf", "",
                  "the program that writes '/run/other/resolv.conf'"},
        OwnedCase{"UnknownHeader", plain, "#\n#  Managed by Puppet \nnameserver ::1\n",
                  "the program that its first lines speak of ('Managed by Puppet')"},
        OwnedCase{"UnknownDoNotEdit", plain, "# please DO NOT EDIT\n",
                  "the program that its first lines speak of ('please DO NOT EDIT')"}),
    [](testing::TestParamInfo<OwnedCase> const& param) { return param.param.name; });

} // namespace
} // namespace StrandCtl
