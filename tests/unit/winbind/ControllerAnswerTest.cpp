// SPDX-License-Identifier: Apache-2.0
#include "text/ControllerAnswer.h"

#include "Failure.h"
#include "GoldenText.h"

#include <gtest/gtest.h>

#include <chrono>
#include <optional>
#include <string>
#include <vector>

using namespace tessel::winbind;
using std::chrono::seconds;

namespace {

std::string Without(std::string text, std::string const& line) {
    auto const begin = text.find('\n' + line) + 1;
    return text.erase(begin, text.find('\n', begin) + 1 - begin);
}

void ExpectRefused(std::string const& text) {
    try {
        (void)ReadControllerAnswer(text);
        ADD_FAILURE() << "taken: " << text;
    } catch (Failure const& failure) {
        EXPECT_EQ(failure.Code(), 1311U);
    }
}

TEST(ControllerAnswerTest, AnAnswerOfARealControllerIsRead) {
    ControllerAnswer const answer = ReadControllerAnswer(GoldenText("controller/lookup.txt"));
    EXPECT_EQ(answer.address, "10.99.0.1");
    EXPECT_EQ(answer.controller, "dc1.corp.example");
    EXPECT_EQ(answer.computer, "DC1");
    EXPECT_EQ(answer.domain, "corp.example");
    EXPECT_EQ(answer.netBIOSDomain, "CORP");
    EXPECT_EQ(answer.forest, "corp.example");
    EXPECT_EQ(answer.site, "Default-First-Site-Name");
    EXPECT_EQ(answer.clientSite, "Default-First-Site-Name");
    EXPECT_TRUE(answer.writable);
    EXPECT_EQ(answer.Realm(), "CORP.EXAMPLE");
}

TEST(ControllerAnswerTest, SitesAndAddressMayBeMissing) {
    std::string text = GoldenText("controller/lookup.txt");
    text = Without(text, "Server Site Name:");
    text = Without(text, "Client Site Name:");
    text = text.substr(text.find("Response Type:"));
    ControllerAnswer const answer = ReadControllerAnswer(text);
    EXPECT_EQ(answer.address, "");
    EXPECT_EQ(answer.site, "");
    EXPECT_EQ(answer.clientSite, "");
}

TEST(ControllerAnswerTest, AControllerThatIsReadOnlySaysSo) {
    EXPECT_FALSE(
        ReadControllerAnswer(Without(GoldenText("controller/lookup.txt"), "\tIs writable:"))
            .writable);
}

TEST(ControllerAnswerTest, AnAnswerWithoutANameIsRefused) {
    for (std::string const& line :
         std::vector<std::string>{"Domain:", "Domain Controller:", "Forest:", "Pre-Win2k Domain:",
                                  "Pre-Win2k Hostname:"}) {
        ExpectRefused(Without(GoldenText("controller/lookup.txt"), line));
    }
    ExpectRefused("");
    ExpectRefused("Didn't find the cldap server!\n");
}

TEST(ControllerAnswerTest, AnAnswerWithANameThatIsNoneIsRefused) {
    for (std::string const& name : std::vector<std::string>{"", "-x", "a b", "x;y", "..", "%h",
                                                            std::string(300, 'a'), "\x1b[31m"}) {
        ExpectRefused(Without(GoldenText("controller/lookup.txt"), "Domain:") + "Domain: " + name +
                      '\n');
    }
}

TEST(ControllerAnswerTest, TheOffsetOfTheClockIsSigned) {
    EXPECT_EQ(ReadServerTimeOffset(GoldenText("controller/info.txt")), seconds(0));
    EXPECT_EQ(ReadServerTimeOffset(GoldenText("controller/info-two-hours-behind.txt")),
              seconds(-7200));
    EXPECT_EQ(ReadServerTimeOffset("Server time offset: 301\r\n"), seconds(301));
}

TEST(ControllerAnswerTest, AnOffsetWithoutATimeIsNone) {
    std::string const text = GoldenText("controller/info-without-an-answer.txt");
    EXPECT_EQ(ReadServerTimeOffset(text), std::nullopt);
    // Also where only the standard output was kept.
    EXPECT_EQ(ReadServerTimeOffset(text.substr(text.find('\n') + 1)), std::nullopt);
}

TEST(ControllerAnswerTest, AnOffsetThatIsNoNumberIsNone) {
    for (std::string const& text : std::vector<std::string>{
             "", "Server time offset:", "Server time offset: -\n", "Server time offset: 1x\n",
             "Server time offset: 99999999999\n", "Server time offset: --1\n"}) {
        EXPECT_EQ(ReadServerTimeOffset(text), std::nullopt) << text;
    }
}

} // namespace
