// SPDX-License-Identifier: Apache-2.0
#include "analysis/Prepare.h"

#include <tslauth/Paths.h>

#include <base/AsciiText.h>
#include <gmock/gmock.h>
#include <meaning/NSSMeaning.h>

#include <random>

namespace tessel::tslauthctl {
namespace {

using namespace base::AsciiText;
using namespace meaning;
using testing::HasSubstr;
using testing::IsEmpty;
using testing::SizeIs;

constexpr char local[] = "passwd: files\ngroup: files\nshadow: files\n";

std::string const provided = local;

/// What becomes of one line among the local databases; "(impossible)" where it cannot be carried.
std::string PreparedLineOf(std::string const& line) {
    auto const prepared = PrepareNSS(provided + line + "\n", PlaceholderEntries(), false);
    if (!prepared.impossible.empty()) {
        return "(impossible)";
    }
    EXPECT_EQ(provided, prepared.text.substr(0, provided.size()));
    return prepared.text.substr(provided.size());
}

TEST(PrepareNSSTest, WhatTheLibraryCarriesStaysByteForByte) {
    for (auto const* line :
         {"hosts:  files\t dns", "# comment", "", "  \t", " rpc: files",
          "hosts: files [NOTFOUND=return]", "hosts: files  ", "ethers: db  files"}) {
        EXPECT_EQ(std::string(line) + "\n", PreparedLineOf(line));
    }
}

TEST(PrepareNSSTest, AStockFileBecomesCarriable) {
    auto const prepared = PrepareNSS("# /etc/nsswitch.conf\n\n"
                                     "passwd:         files systemd\n"
                                     "group:          files systemd\n"
                                     "shadow:         files\n"
                                     "gshadow:        files\n\n"
                                     "hosts:          files mdns4_minimal [NOTFOUND=return] dns\n",
                                     PlaceholderEntries(), false);
    EXPECT_EQ("# /etc/nsswitch.conf\n\n"
              "passwd:         files systemd\n"
              "group:          files systemd\n"
              "shadow:         files\n\n"
              "hosts: files[SUCCESS=return]mdns4_minimal[NOTFOUND=return] dns\n",
              prepared.text);
    EXPECT_THAT(prepared.impossible, IsEmpty());
    EXPECT_THAT(prepared.edits, SizeIs(2));
}

TEST(PrepareNSSTest, GoldenLines) {
    struct {
        char const* before;
        char const* after;
    } const cases[] = {
        {"hosts: files dns ", "hosts: files dns\n"},
        {"hosts: files dns\r", "hosts: files dns\n"},
        {"hosts : files", "hosts: files\n"},
        {"hosts files", "hosts: files\n"},
        {"hosts:files dns", "hosts: files dns\n"},
        {" # comment", "# comment\n"},
        {"stray", "#stray\n"},
        {"\v", ""},
        {"gshadow: files", ""},
        {"sudoers: files", ""},
        {"subid: files [NOTFOUND=return]", ""},
        {"hosts: files [NOTFOUND=return] dns", "hosts: files[NOTFOUND=return] dns\n"},
        {"hosts: files [SUCCESS=return] dns", "hosts: files dns\n"},
        {"hosts: files [!UNAVAIL=return] dns", "hosts: files[!UNAVAIL=return] dns\n"},
        {"hosts: files [UNAVAIL=return NOTFOUND=return] dns",
         "hosts: files[!TRYAGAIN=return] dns\n"},
        {"hosts: a b [NOTFOUND=return] c [UNAVAIL=return] d e",
         "hosts: a[SUCCESS=return]b[NOTFOUND=return]c[UNAVAIL=return] d e\n"},
        {"hosts: a b [NOTFOUND=return]", "hosts: a b\n"},
        {"hosts: files [SUCCESS=return] [NOTFOUND=return] dns", "hosts: files\n"},
        {"hosts: [NOTFOUND=return] dns", "hosts: [NOTFOUND=return] dns\n"},
        {"netgroup:", "(impossible)"},
        {"group: files [SUCCESS=merge]", "(impossible)"},
        {"hosts: files [SUCCESS=merge UNAVAIL=return] dns", "(impossible)"},
        {"hosts: files [FOO=return] dns", "(impossible)"},
        {"gshadow: files systemd", "(impossible)"},
        {"initgroups: files", "(impossible)"},
        {"whatever: x", "(impossible)"},
    };
    for (auto const& c : cases) {
        EXPECT_EQ(c.after, PreparedLineOf(c.before)) << c.before;
    }
}

TEST(PrepareNSSTest, ABracketInAnEditedDatabaseGoesOnlyWhereItMakesNoDifference) {
    auto const prepare = [](std::string const& passwd) {
        return PrepareNSS(passwd + "\ngroup: files\nshadow: files\n", PlaceholderEntries(), false);
    };
    EXPECT_EQ("passwd: files ldap\ngroup: files\nshadow: files\n",
              prepare("passwd: files ldap [NOTFOUND=return]").text);
    auto const impossible = prepare("passwd: files [NOTFOUND=return] ldap");
    ASSERT_THAT(impossible.impossible, SizeIs(1));
    EXPECT_EQ(1U, impossible.impossible[0].number);
}

TEST(PrepareNSSTest, AnEditedDatabaseWithoutServicesIsCarried) {
    EXPECT_EQ(
        "passwd: files\ngroup: files\nshadow:\n",
        PrepareNSS("passwd: files\ngroup: files\nshadow:\n", PlaceholderEntries(), false).text);
}

TEST(PrepareNSSTest, MissingLinesGetTheirDefault) {
    EXPECT_EQ("passwd: files\ngroup: files\nshadow: files\n",
              PrepareNSS("passwd: files", PlaceholderEntries(), false).text);
}

TEST(PrepareNSSTest, OfTwoLinesTheOneThatAppliesStays) {
    EXPECT_EQ("hosts: files\n", PreparedLineOf("hosts: dns\nhosts: files"));
    EXPECT_EQ("(impossible)", PreparedLineOf("automount: nis\nautomount: files"));
    EXPECT_EQ("automount: files\n", PreparedLineOf("automount: files\nautomount: files"));
}

TEST(PrepareNSSTest, AnAcceptedLossIsEditedAndStillNamed) {
    auto const prepared =
        PrepareNSS(provided + "gshadow: files systemd\nwhatever: x\n", PlaceholderEntries(), true);
    EXPECT_EQ(provided, prepared.text);
    ASSERT_THAT(prepared.impossible, SizeIs(2));
    EXPECT_THAT(prepared.impossible[0].reason, HasSubstr("'files' would be asked instead of"));
    auto const merged = PrepareNSS("passwd: files\ngroup: files [SUCCESS=merge] x\nshadow: files\n",
                                   PlaceholderEntries(), true);
    EXPECT_THAT(merged.text, HasSubstr("group: files x\n"));
}

TEST(PrepareNSSTest, AProviderWithParametersCannotBeCarriedBack) {
    auto const provider = authentication::MakeProviderEntries("p.so", {}, "p", {"NOTFOUND=return"});
    EXPECT_FALSE(PrepareNSS(provided, provider, false).impossible.empty());
}

/// A line of a file as it comes in the field, and worse.
std::string RandomLine(std::mt19937& random) {
    auto const pick = [&random](std::initializer_list<char const*> list) {
        return std::string(*(list.begin() + random() % list.size()));
    };
    auto line = pick({"", "", "", " ", "\t", "#"}) +
                pick({"passwd", "group", "shadow", "hosts", "hosts", "networks", "rpc", "automount",
                      "gshadow", "sudoers", "netgroup", "aliases", "odd"}) +
                pick({":", ":", ":", ": ", " :", " : ", " ", ""});
    for (auto words = random() % 5; words > 0; --words) {
        line += pick({" ", " ", "  ", "\t", ""});
        line +=
            pick({"files", "dns", "db", "systemd", "files", "mdns4_minimal", "[NOTFOUND=return]",
                  "[SUCCESS=return]", "[!UNAVAIL=return]", "[ NOTFOUND = continue ]",
                  "[UNAVAIL=return NOTFOUND=return]", "[SUCCESS=merge]", "#", "x"});
    }
    return line + pick({"", "", "", " ", "\t", "\r", "  "});
}

TEST(PrepareNSSTest, AnyBytesArePreparedOrGivenUp) {
    std::mt19937 random(5);
    constexpr char bytes[] = " \t\n\r\v:#[]!=\0\xff\x80passwdhostsfilesSUCCESS=return";
    for (int i = 0; i < 800; ++i) {
        std::string text;
        for (auto size = random() % 60; size > 0; --size) {
            text += bytes[random() % sizeof bytes];
        }
        auto const prepared = PrepareNSS(text, PlaceholderEntries(), i % 2 == 0);
        if (prepared.impossible.empty()) {
            ASSERT_THAT(PrepareNSS(prepared.text, PlaceholderEntries(), false).edits, IsEmpty());
        }
    }
}

/// What activating the provider's store, and leaving it again, costs a name-service switch.
std::vector<std::string> LossesOf(std::string const& text, ProviderEntries const& provider) {
    return authentication::ActivationPlan::Activating(provider, {})
        .PreviewOf(authentication::Paths::NSSConfiguration,
                   [&](std::string const& /*path*/) { return text; })
        .losses;
}

TEST(PrepareNSSTest, WhatIsPreparedLosesNothingAndMeansTheSame) {
    std::mt19937 random(7);
    auto const provider = PlaceholderEntries();
    int carried = 0;
    for (int i = 0; i < 800; ++i) {
        std::string text;
        for (auto lines = 1 + random() % 6; lines > 0; --lines) {
            text += RandomLine(random) + "\n";
        }
        if (random() % 4 == 0) {
            text.pop_back();
        }
        auto const prepared = PrepareNSS(text, provider, false);
        if (!prepared.impossible.empty()) {
            continue;
        }
        ++carried;
        auto const before = ReadNSSMeaning(text);
        auto const after = ReadNSSMeaning(prepared.text);
        for (auto const* meaning : {&before, &after}) {
            for (auto const& entry : meaning->databases) {
                auto const was = EffectiveNSSServices(before, entry.first);
                auto const is = EffectiveNSSServices(after, entry.first);
                ASSERT_TRUE(was && is && SameEffect(*was, *is)) << entry.first << "\n" << text;
            }
        }
        ASSERT_THAT(LossesOf(prepared.text, provider), IsEmpty()) << text << "\n=>\n"
                                                                  << prepared.text;
        ASSERT_EQ(prepared.text, PrepareNSS(prepared.text, provider, false).text);
        ASSERT_EQ(prepared.edits.empty(), prepared.text == text) << text;
    }
    EXPECT_GT(carried, 100);
}

} // namespace
} // namespace tessel::tslauthctl
