// SPDX-License-Identifier: Apache-2.0
#include "HostsText.h"

#include "HostCtlFailure.h"

#include <gtest/gtest.h>
#include <string>
#include <vector>

namespace StrandCtl {
namespace {

std::string Edit(std::string const& text, std::string const& address = "10.1.2.3") {
    return AddOrReplaceHostsEntry(text, address, "node01.corp.example", {"node01"});
}

struct Case {
    char const* name;
    char const* before;
    char const* after;
};

class HostsTextTest : public testing::TestWithParam<Case> {};

TEST_P(HostsTextTest, IsEdited) {
    EXPECT_EQ(GetParam().after, Edit(GetParam().before));
}

TEST_P(HostsTextTest, TheEditIsIdempotent) {
    std::string const once = Edit(GetParam().before);
    EXPECT_EQ(once, Edit(once));
}

#define ENTRY "10.1.2.3\tnode01.corp.example node01"

INSTANTIATE_TEST_SUITE_P(
    Golden, HostsTextTest,
    testing::Values(
        Case{"Empty", "", ENTRY "\n"},
        Case{"AppendedBehindOthers", "127.0.0.1 localhost\n# local\n",
             "127.0.0.1 localhost\n# local\n" ENTRY "\n"},
        Case{"AppendedBehindNoFinalNewline", "127.0.0.1 localhost",
             "127.0.0.1 localhost\n" ENTRY "\n"},
        Case{"AppendedToCrlf", "127.0.0.1 localhost\r\n", "127.0.0.1 localhost\r\n" ENTRY "\r\n"},
        Case{"AppendedToCrlfNoFinalNewline", "::1 a\r\n127.0.0.1 localhost",
             "::1 a\r\n127.0.0.1 localhost\r\n" ENTRY "\r\n"},
        Case{"AppendedBehindBlankLines", "\n \t\n\r\n", "\n \t\n\r\n" ENTRY "\r\n"},
        Case{"ReplacedInPlace", "1.1.1.1 a\n10.1.2.3 old.example old\n2.2.2.2 b\n",
             "1.1.1.1 a\n10.1.2.3 node01.corp.example node01\n2.2.2.2 b\n"},
        Case{"KeepsBlanksAround", " \t10.1.2.3 \t old   other\t \n",
             " \t10.1.2.3 \t node01.corp.example node01\t \n"},
        Case{"KeepsCommentAtTheEnd", "10.1.2.3\told\t# the node\n",
             "10.1.2.3\tnode01.corp.example node01\t# the node\n"},
        Case{"KeepsCommentWithoutBlank", "10.1.2.3 old#the node\n",
             "10.1.2.3 node01.corp.example node01 #the node\n"},
        Case{"AddressAlone", "10.1.2.3\n", ENTRY "\n"},
        Case{"AddressAndComment", "10.1.2.3 # free\n",
             "10.1.2.3\tnode01.corp.example node01 # free\n"},
        Case{"AddressAndCommentWithoutBlank", "10.1.2.3#free\n",
             "10.1.2.3\tnode01.corp.example node01 #free\n"},
        Case{"ReplacedNoFinalNewline", "10.1.2.3 old", "10.1.2.3 node01.corp.example node01"},
        Case{"ReplacedCrlf", "10.1.2.3 old\r\n1.1.1.1 a\r\n",
             "10.1.2.3 node01.corp.example node01\r\n1.1.1.1 a\r\n"},
        Case{"UnchangedWhateverItsBlanks", "10.1.2.3  node01.corp.example\t node01  \n",
             "10.1.2.3  node01.corp.example\t node01  \n"},
        Case{"FurtherLinesGo", "10.1.2.3 a\n1.1.1.1 x\n10.1.2.3 b\n10.1.2.3 c\n2.2.2.2 y\n",
             "10.1.2.3 node01.corp.example node01\n1.1.1.1 x\n2.2.2.2 y\n"},
        Case{"CommentsOfFurtherLinesStay", "10.1.2.3 a # one\n \t10.1.2.3 b # two\n2.2.2.2 y\n",
             "10.1.2.3 node01.corp.example node01 # one\n# two\n2.2.2.2 y\n"},
        Case{"LastFurtherLineNoFinalNewline", "10.1.2.3 a\n2.2.2.2 y\n10.1.2.3 b",
             "10.1.2.3 node01.corp.example node01\n2.2.2.2 y\n"},
        Case{"CommentedOutIsNoEntry", "#10.1.2.3 old\n # 10.1.2.3 old\n",
             "#10.1.2.3 old\n # 10.1.2.3 old\n" ENTRY "\n"},
        Case{"LongerAddressIsAnother", "10.1.2.33 a\n110.1.2.3 b\n10.1.2.3.4 c\n",
             "10.1.2.33 a\n110.1.2.3 b\n10.1.2.3.4 c\n" ENTRY "\n"},
        Case{"NameThatLooksLikeTheAddress", "1.1.1.1 10.1.2.3\n", "1.1.1.1 10.1.2.3\n" ENTRY "\n"},
        Case{"MappedSpellingIsTheAddress", "::ffff:10.1.2.3 old\n",
             "::ffff:10.1.2.3 node01.corp.example node01\n"},
        Case{"FurtherMappedLineGoes", "10.1.2.3 a\n::FFFF:a01:203 b\n",
             "10.1.2.3 node01.corp.example node01\n"},
        Case{"LeadingZerosAreNoAddress", "010.1.2.3 a\n", "010.1.2.3 a\n" ENTRY "\n"},
        Case{"FormFeedIsABlank", "10.1.2.3\fold\n", "10.1.2.3\fnode01.corp.example node01\n"},
        Case{"OtherLinesKeepEveryByte", "\xff\x01 x  \n\t# \xc3\xa4\r\n%junk\n10.1.2.3 old\n \n",
             "\xff\x01 x  \n\t# \xc3\xa4\r\n%junk\n10.1.2.3 node01.corp.example node01\n \n"}),
    [](testing::TestParamInfo<Case> const& param) { return param.param.name; });

TEST(HostsTextTest, AnIPv6AddressIsFoundInAnySpelling) {
    EXPECT_EQ("2001:DB8:0:0::1 node01.corp.example node01\n::1 localhost\n",
              Edit("2001:DB8:0:0::1 old\n::1 localhost\n2001:db8::1 older\n", "2001:db8::1"));
    EXPECT_EQ("fe80::1%eth0 old\nfe80::1\tnode01.corp.example node01\n",
              Edit("fe80::1%eth0 old\n", "fe80::1"));
}

TEST(HostsTextTest, TheLoopbackAddressesOfTheFamiliesAreTwo) {
    EXPECT_EQ("::1 localhost\n127.0.0.1\tnode01.corp.example node01\n",
              Edit("::1 localhost\n", "127.0.0.1"));
}

TEST(HostsTextTest, AliasesComeInTheirOrder) {
    EXPECT_EQ("10.1.2.3\ta b c\n", AddOrReplaceHostsEntry("", "10.1.2.3", "a", {"b", "c"}));
    EXPECT_EQ("10.1.2.3\ta\n", AddOrReplaceHostsEntry("", "10.1.2.3", "a", {}));
}

TEST(HostsTextTest, FewerNamesAreNotTheSameEntry) {
    EXPECT_EQ("10.1.2.3 a\n", AddOrReplaceHostsEntry("10.1.2.3 a b\n", "10.1.2.3", "a", {}));
    EXPECT_EQ("10.1.2.3 a b\n", AddOrReplaceHostsEntry("10.1.2.3 a\n", "10.1.2.3", "a", {"b"}));
    EXPECT_EQ("10.1.2.3 a b\n", AddOrReplaceHostsEntry("10.1.2.3 b a\n", "10.1.2.3", "a", {"b"}));
}

TEST(HostsTextTest, ANullByteStaysAndEndsNoWord) {
    using namespace std::string_literals;
    EXPECT_EQ("10.1.2.3\0 old\n" ENTRY "\n"s, Edit("10.1.2.3\0 old\n"s));
}

TEST(HostsTextTest, WhatIsNoAddressIsRefused) {
    for (char const* const address :
         {"", "node01", "10.1.2", "10.1.2.3 ", "010.1.2.3", "10.1.2.3\nx", "fe80::1%eth0", "#"}) {
        EXPECT_EQ("'" + std::string(address) + "' is not an IP address",
                  FailureOf([&] { Edit("1.1.1.1 a\n", address); }));
    }
}

TEST(HostsTextTest, ANameThatWouldBeReadAsSomethingElseIsRefused) {
    for (char const* const name :
         {"", " ", "a b", "a\tb", "a\n1.1.1.1 b", "a#b", "#", "a\r", "\x7f"}) {
        std::string const text =
            "'" + std::string(name) + "' cannot stand as a name in a hosts file";
        EXPECT_EQ(text, FailureOf([&] { AddOrReplaceHostsEntry("", "10.1.2.3", name, {}); }));
        EXPECT_EQ(text, FailureOf([&] {
                      AddOrReplaceHostsEntry("", "10.1.2.3", "a", {"b", name});
                  }));
    }
}

TEST(HostsTextTest, AHundredThousandLinesKeepTheirOrderAndBytes) {
    std::string before;
    std::string after;
    for (int i = 0; i < 100000; ++i) {
        std::string const line = "172." + std::to_string(16 + i / 65536) + "." +
                                 std::to_string(i / 256 % 256) + "." + std::to_string(i % 256) +
                                 "\thost" + std::to_string(i) + " # " + std::to_string(i) + "\n";
        before += line;
        after += line;
        if (i == 50000) {
            before += "10.1.2.3 old\n";
            after += "10.1.2.3 node01.corp.example node01\n";
        }
        if (i == 70000) {
            before += "10.1.2.3 older\n";
        }
    }
    EXPECT_TRUE(after == Edit(before));
}

TEST(HostsTextTest, ALongLineIsEdited) {
    std::string const comment = "#" + std::string(1 << 20, 'x');
    EXPECT_TRUE("10.1.2.3 node01.corp.example node01 " + comment ==
                Edit("10.1.2.3 " + std::string(1 << 20, 'a') + " " + comment));
}

} // namespace
} // namespace StrandCtl
