// SPDX-License-Identifier: Apache-2.0
#include "analysis/Prepare.h"

#include <tslauth/Exceptions.h>
#include <tslauth/Paths.h>

#include <gmock/gmock.h>
#include <meaning/PAMMeaning.h>

#include <random>

namespace tessel::tslauthctl {
namespace {

using namespace meaning;
using testing::HasSubstr;
using testing::IsEmpty;
using testing::SizeIs;

std::optional<std::string> ReadTestPolicy(std::string const& path) {
    if (path == "/etc/pam.d/login") {
        return "auth required u.so\n@include more\n";
    }
    if (path == "/usr/lib/pam.d/more") {
        return "session required s.so\n";
    }
    if (path == "/etc/pam.d/bad") {
        return "auth required u.so\nbogus required u.so\n";
    }
    return std::nullopt;
}

/// Both facilities that the library edits have an entry.
std::string const usual = "auth required a.so\naccount required a.so\n";

std::string PreparedText(std::string const& text) {
    auto const prepared = PreparePAM(usual + text, PlaceholderEntries(), ReadTestPolicy, false);
    EXPECT_EQ(usual, prepared.text.substr(0, usual.size()));
    return prepared.impossible.empty() ? prepared.text.substr(usual.size()) : "(impossible)";
}

TEST(PreparePAMTest, WhatTheLibraryCarriesStaysByteForByte) {
    constexpr char text[] = "#%PAM-1.0\n# comment\n\n  auth  required\tu.so  a b\n"
                            "auth [success=1 \t default=ignore] v.so # why\n"
                            "account include other\nsession optional s.so";
    auto const prepared = PreparePAM(text, PlaceholderEntries(), ReadTestPolicy, false);
    EXPECT_EQ(text, prepared.text);
    EXPECT_THAT(prepared.edits, IsEmpty());
    EXPECT_THAT(prepared.impossible, IsEmpty());
}

TEST(PreparePAMTest, GoldenLines) {
    struct {
        char const* before;
        char const* after;
    } const cases[] = {
        {"AUTH Required u.so\n", "auth\trequired\tu.so\n"},
        {"-session optional s.so x\n", "session\toptional\ts.so\tx\n"},
        {"-auth include other\n", "auth\tinclude\tother\n"},
        {"auth required \\\n# c\n  u.so a\\\n b\n", "auth\trequired\tu.so\ta b\n"},
        {"@include login\n", "auth\tinclude\tlogin\nsession\tinclude\tlogin\n"},
        {"@Include more", "session\tinclude\tmore"},
        {"auth [success=1 default=bad]u.so\n", "auth\t[success=1 default=bad]\tu.so\n"},
        {"auth required u.so [a b]\n", "auth required u.so [a b]\n"},
        {"auth required u.so [a  b]\n", "(impossible)"},
        {"@include missing\n", "(impossible)"},
        {"@include bad\n", "(impossible)"},
        {"bogus required u.so\n", "(impossible)"},
        {"auth bogus u.so\n", "(impossible)"},
        {"auth required\nauth required u.so\n", "(impossible)"},
        {"auth required u.so \\\n", "(impossible)"},
        {"auth required u.so\r\n", "(impossible)"},
    };
    for (auto const& c : cases) {
        EXPECT_EQ(c.after, PreparedText(c.before)) << c.before;
    }
}

TEST(PreparePAMTest, TheHiddenEndOfALongCommentIsALineToLibpam) {
    auto const comment = "#" + std::string(1022, 'x');
    EXPECT_EQ("auth\trequired\tu.so\n", PreparedText(comment + "auth required u.so\n"));
}

TEST(PreparePAMTest, AFacilityWithoutEntriesCannotBePrepared) {
    auto const prepared =
        PreparePAM("auth required u.so\n", PlaceholderEntries(), ReadTestPolicy, false);
    ASSERT_THAT(prepared.impossible, SizeIs(1));
    EXPECT_THAT(prepared.impossible[0].reason, HasSubstr("account: the policy 'other'"));
}

TEST(PreparePAMTest, AJumpOverThePlaceOfTheEntryCannotBePrepared) {
    auto const prepared = PreparePAM("account required a.so\nauth [success=2 default=ignore] u.so\n"
                                     "auth required /lib/security/$ISA/pam_access.so\n"
                                     "auth required b.so\nauth required c.so\n",
                                     PlaceholderEntries(), ReadTestPolicy, false);
    ASSERT_THAT(prepared.impossible, SizeIs(1));
    EXPECT_THAT(prepared.impossible[0].reason, HasSubstr("the jump 'success=2'"));
}

TEST(PreparePAMTest, AnAcceptedLossIsEditedAndStillNamed) {
    auto const prepared = PreparePAM(usual + "-auth required u.so [a  b]\n", PlaceholderEntries(),
                                     ReadTestPolicy, true);
    EXPECT_EQ(usual + "auth\trequired\tu.so\t[a b]\n", prepared.text);
    EXPECT_THAT(prepared.impossible, SizeIs(1));
}

std::string RandomEntry(std::mt19937& random) {
    auto const pick = [&random](std::initializer_list<char const*> list) {
        return std::string(*(list.begin() + random() % list.size()));
    };
    if (random() % 8 == 0) {
        return pick({"@include login", "@include more", "@INCLUDE login # c", "# comment \\", "",
                     "  ", "@include bad"});
    }
    return pick({"", "", " ", "\t", "-"}) +
           pick({"auth", "Auth", "account", "session", "password", "auth"}) +
           pick({" ", "\t", "  ", " \\\n "}) +
           pick({"required", "requisite", "SUFFICIENT", "optional", "[success=1 default=ignore]",
                 "[success=ok  default=bad]", "[ default = die ]", "include", "substack"}) +
           pick({" ", "\t", "\t\t", "\\\n  "}) +
           pick({"login", "u.so", "/lib/security/$ISA/pam_access.so", "v.so"}) +
           pick({"", "", " a", " a b", " [a b]", " [a  b]", " a#b", " # c", " a \\\n# c\n b", "\r",
                 " "});
}

/// The entries of a policy by facility, without minus, and each "@include" as one include for every
/// facility that `ReadTestPolicy` gives it.
std::vector<std::string> Expanded(std::string const& text) {
    std::vector<std::string> entries;
    for (auto const* facility : PAMFacilities) {
        for (auto line : ReadPAMMeaning(text).lines) {
            if (line.facility == "@include") {
                bool const holds = std::string(facility) == "session" ||
                                   (std::string(facility) == "auth" && line.module == "login");
                line.facility = holds ? facility : "";
                line.control = "include";
            }
            line.silent = false;
            if (line.facility == facility) {
                entries.push_back(PAMText(line));
            }
        }
    }
    return entries;
}

TEST(PreparePAMTest, AnyBytesArePreparedOrGivenUp) {
    std::mt19937 random(5);
    std::string const words[] = {" ",
                                 "\t",
                                 "\n",
                                 "\n",
                                 "\\\n",
                                 "[",
                                 "]",
                                 "\\]",
                                 "#",
                                 "-",
                                 "auth",
                                 "account",
                                 "required",
                                 "include",
                                 "@include",
                                 "login",
                                 "\r",
                                 "\v",
                                 "\xff",
                                 std::string(1, '\0'),
                                 "success=1",
                                 "=",
                                 std::string(1000, 'x')};
    for (int i = 0; i < 800; ++i) {
        std::string text = usual;
        for (auto size = random() % 40; size > 0; --size) {
            text += words[random() % std::size(words)];
        }
        auto const prepared = PreparePAM(text, PlaceholderEntries(), ReadTestPolicy, i % 2 == 0);
        if (prepared.impossible.empty()) {
            ASSERT_THAT(
                PreparePAM(prepared.text, PlaceholderEntries(), ReadTestPolicy, false).edits,
                IsEmpty())
                << text;
        }
    }
}

/// What activating the provider's store, and leaving it again, costs a policy.
std::vector<std::string> LossesOf(std::string const& policy, ProviderEntries const& provider) {
    auto const read = [&](std::string const& path) {
        auto const text = path == authentication::Paths::PAMPolicy ? policy : ReadTestPolicy(path);
        return text ? *text : throw authentication::IOError(path);
    };
    return authentication::ActivationPlan::Activating(provider, {})
        .PreviewOf(authentication::Paths::PAMPolicy, read)
        .losses;
}

TEST(PreparePAMTest, WhatIsPreparedLosesNothingAndMeansTheSame) {
    std::mt19937 random(11);
    auto const provider = PlaceholderEntries();
    int carried = 0;
    for (int i = 0; i < 400; ++i) {
        std::string text = usual;
        for (auto lines = 1 + random() % 5; lines > 0; --lines) {
            text += RandomEntry(random) + "\n";
        }
        auto const prepared = PreparePAM(text, provider, ReadTestPolicy, false);
        if (!prepared.impossible.empty()) {
            continue;
        }
        ++carried;
        ASSERT_THAT(LossesOf(prepared.text, provider), IsEmpty()) << text;
        ASSERT_EQ(Expanded(text), Expanded(prepared.text)) << text << "\n=>\n" << prepared.text;
        ASSERT_EQ(prepared.text, PreparePAM(prepared.text, provider, ReadTestPolicy, false).text);
    }
    EXPECT_GT(carried, 200);
}

} // namespace
} // namespace tessel::tslauthctl
