// SPDX-License-Identifier: Apache-2.0
#include <tslauth/systemconfiguration/NSSConfiguration.h>

#include "GoldenFiles.h"
#include "SystemFileModels.h"

#include <gtest/gtest.h>

#include <random>
#include <sstream>
#include <string>
#include <vector>

using namespace SystemFileModels;

namespace {

std::string const OutOfRange = "std::out_of_range: basic_string::at";

std::vector<std::string> const Pieces = {
    "passwd:",  "hosts:", "group: files\n", "shadow:  files sss\n",
    "aliases:", " files", " dns",           "  ldap",
    "\tnis",    "\n",     "# c\n",          " x",
    "\n\n",
};

std::vector<std::string> const BracketPieces = {
    " [NOTFOUND=return]", "  [a b]", " [", "]", " []", " mdns4_minimal", " [ x  y ] z", "\r\n",
};

std::vector<std::string> const BadPieces = {
    "sudoers: files\n",   " # c\n", "passwd : files\n", "\f", "\v\n", " \n",
    std::string(1, '\0'), "\xff",
};

template <typename... Lists> std::vector<std::string> Joined(Lists const&... lists) {
    std::vector<std::string> all;
    (all.insert(all.end(), lists.begin(), lists.end()), ...);
    return all;
}

TEST(NSSConfigurationTest, GoldenFilesReadAndPrintAsExpected) {
    ExpectGoldenFiles<NSS>(20);
}

TEST(NSSConfigurationTest, PlainLineReadsAndPrintsUnchanged) {
    EXPECT_EQ(Normalised<NSS>("passwd: files\n"), "passwd: files\n");
}

TEST(NSSConfigurationTest, SeveralBlanksBecomeOne) {
    EXPECT_EQ(Normalised<NSS>("group:  files   ldap\n"), "group: files ldap\n");
}

TEST(NSSConfigurationTest, DatabasesAreWrittenInTheOrderOfTheirNumbers) {
    EXPECT_EQ(Normalised<NSS>("hosts: files dns\npasswd: files\n"),
              "passwd: files\nhosts: files dns\n");
}

TEST(NSSConfigurationTest, EveryDatabaseIsReadAndWrittenInTableOrder) {
    char const* const words[] = {"passwd",   "group",      "shadow",    "hosts",     "netmasks",
                                 "networks", "protocols",  "services",  "ethers",    "rpc",
                                 "netgroup", "bootparams", "publickey", "automount", "aliases"};
    std::string text;
    std::string expected;
    for (auto const* word : words) {
        text = std::string(word) + ":\tfiles\n" + text;
        expected += std::string(word) + ": files\n";
    }
    EXPECT_EQ(Normalised<NSS>(text), expected);
}

TEST(NSSConfigurationTest, CommentInTheFirstColumnIsSkipped) {
    EXPECT_EQ(Normalised<NSS>("# comment\n#\npasswd: files\n"), "passwd: files\n");
}

TEST(NSSConfigurationTest, IndentedCommentIsRejected) {
    EXPECT_EQ(FromText<NSS>(" # comment\n"), "InvalidDatabaseException: Invalid Database: ");
    EXPECT_EQ(FromText<NSS>(" #comment here\n"),
              "InvalidDatabaseException: Invalid Database: #commen");
}

TEST(NSSConfigurationTest, UnknownDatabaseIsRejectedByName) {
    EXPECT_EQ(FromText<NSS>("sudoers: files\n"),
              "InvalidDatabaseException: Invalid Database: sudoers");
}

TEST(NSSConfigurationTest, SeparatorIsNotCheckedButCutOff) {
    EXPECT_EQ(FromText<NSS>("passwd : files\n"),
              "InvalidDatabaseException: Invalid Database: passw");
    EXPECT_EQ(FromText<NSS>("passwd:files\n"),
              "InvalidDatabaseException: Invalid Database: passwd:file");
    EXPECT_EQ(Normalised<NSS>("passwd; files\n"), "passwd: files\n");
}

TEST(NSSConfigurationTest, OneTrailingCharacterIsOutOfRange) {
    EXPECT_EQ(FromText<NSS>("passwd: files \n"), OutOfRange);
    EXPECT_EQ(FromText<NSS>("passwd: files\t\n"), OutOfRange);
    EXPECT_EQ(FromText<NSS>("passwd: files\r\n"), OutOfRange);
    EXPECT_EQ(FromText<NSS>("passwd: files "), OutOfRange);
}

TEST(NSSConfigurationTest, OneTrailingCharacterKeepsTheServicesBefore) {
    EXPECT_EQ(FromText<NSS>("group: files\npasswd: files sss \n"),
              "1:\n  {files} \n2:\n  {files} \n" + OutOfRange);
}

TEST(NSSConfigurationTest, TwoTrailingBlanksReadNormally) {
    EXPECT_EQ(Normalised<NSS>("passwd: files  \n"), "passwd: files\n");
    EXPECT_EQ(Normalised<NSS>("passwd: files \r\n"), "passwd: files\n");
}

TEST(NSSConfigurationTest, TrailingCharactersAfterTheDatabaseAloneAreNoService) {
    EXPECT_EQ(FromText<NSS>("netgroup: \n"), "");
    EXPECT_EQ(FromText<NSS>("netgroup:\r\n"), "");
}

TEST(NSSConfigurationTest, DatabaseWithoutServicesLeavesNoTrace) {
    EXPECT_EQ(Normalised<NSS>("netgroup:\npasswd: files\n"), "passwd: files\n");
}

TEST(NSSConfigurationTest, ServicesAfterABracketedListAreLost) {
    EXPECT_EQ(FromText<NSS>("hosts: files [NOTFOUND=return] dns\n"),
              "4:\n  {files} {NOTFOUND=return}\n");
    EXPECT_EQ(Normalised<NSS>("hosts: files [NOTFOUND=return] dns\n"),
              "hosts: files [NOTFOUND=return]\n");
}

TEST(NSSConfigurationTest, AListMovesTheStreamFromTheServiceBeforeIt) {
    // After "files" the stream already moves beyond the list, so the list and its service are lost
    // together with what follows.
    EXPECT_EQ(FromText<NSS>("hosts: files mdns4_minimal [NOTFOUND=return] dns\n"),
              "4:\n  {files} \n");
}

TEST(NSSConfigurationTest, AfterAListAServiceMayBeReadFromTheMiddle) {
    // The word "a" ends at 8 and its list at 11, so reading goes on at 20, within "resolve".
    EXPECT_EQ(FromText<NSS>("hosts: a [b] myhos resolve dns\n"),
              "4:\n  {a} {b}\n  {esolve} \n  {dns} \n");
}

TEST(NSSConfigurationTest, PositionsAreCountedWithoutTheIndent) {
    EXPECT_EQ(FromText<NSS>(" \t hosts: a [b] myhos resolve dns\n"),
              FromText<NSS>("hosts: a [b] myhos resolve dns\n"));
}

TEST(NSSConfigurationTest, ParametersAreSplitAtWhiteSpace) {
    EXPECT_EQ(FromText<NSS>("hosts: files [ a=b\t  c=d ]\n"), "4:\n  {files} {a=b}{c=d}\n");
    EXPECT_EQ(Normalised<NSS>("hosts: files [ a=b\t  c=d ]\n"), "hosts: files [a=b c=d]\n");
    EXPECT_EQ(Normalised<NSS>("hosts: files []\n"), "hosts: files\n");
}

TEST(NSSConfigurationTest, AnUnclosedBracketIsAServiceOfItsOwn) {
    EXPECT_EQ(FromText<NSS>("hosts: files [a b\n"), "4:\n  {files} \n  {[a} \n  {b} \n");
    EXPECT_EQ(FromText<NSS>("hosts: files  [a b\n"), "4:\n  {files} \n  {[a} \n  {b} \n");
}

TEST(NSSConfigurationTest, AListBehindTwoBlanksIsNotSeenButStillMovesTheStream) {
    EXPECT_EQ(FromText<NSS>("hosts: files  [NOTFOUND=return] dns\n"), "4:\n  {files} \n");
}

TEST(NSSConfigurationTest, AListDirectlyBehindTheDatabaseIsAService) {
    EXPECT_EQ(FromText<NSS>("hosts: [a]\n"), "4:\n  {[a]} \n");
}

TEST(NSSConfigurationTest, AWordThatEndsTheLineIsNotLookedBehind) {
    EXPECT_EQ(FromText<NSS>("hosts: a]\n"), "4:\n  {a]} \n");
    EXPECT_EQ(FromText<NSS>("hosts: dns"), "4:\n  {dns} \n");
}

TEST(NSSConfigurationTest, WhiteSpaceOutsideTheIndentSetIsALineWithoutDatabase) {
    EXPECT_EQ(FromText<NSS>("\f\n"), "InvalidDatabaseException: Invalid Database: ");
    EXPECT_EQ(FromText<NSS>(" \v \n"), "InvalidDatabaseException: Invalid Database: ");
    EXPECT_EQ(FromText<NSS>(" \t\r\n\n"), "");
}

TEST(NSSConfigurationTest, ReadingAppendsToTheQueuesThereAre) {
    NSSConfiguration configuration;
    configuration[NSSDatabase::passwd].push_back(NSSService("first"));
    std::istringstream in("passwd: second\npasswd: third\n");
    in >> configuration;
    ReadConfiguration("passwd: fourth\n", configuration);
    std::ostringstream out;
    out << configuration;
    EXPECT_EQ(out.str(), "passwd: first second third fourth\n");
}

TEST(NSSConfigurationTest, StreamIsReadToItsEndWithoutAnException) {
    std::istringstream in("passwd: files");
    NSSConfiguration configuration;
    EXPECT_NO_THROW(in >> configuration);
    EXPECT_TRUE(in.eof());
    EXPECT_FALSE(in.bad());
    EXPECT_EQ(configuration[NSSDatabase::passwd].size(), 1u);
}

TEST(NSSConfigurationTest, AnExceptionKeepsTheLinesBeforeAndLeavesTheStreamAfterTheLine) {
    std::istringstream in("hosts: files\nsudoers: files\npasswd: files\n");
    NSSConfiguration configuration;
    EXPECT_EQ(Failure([&] { in >> configuration; }),
              "InvalidDatabaseException: Invalid Database: sudoers");
    EXPECT_EQ(Describe(configuration), "4:\n  {files} \n");
    std::string rest;
    std::getline(in, rest);
    EXPECT_EQ(rest, "passwd: files");
}

TEST(NSSConfigurationTest, EmptyQueueIsWrittenAsADatabaseWithoutServices) {
    NSSConfiguration configuration;
    EXPECT_TRUE(configuration[NSSDatabase::shadow].empty());
    std::ostringstream out;
    out << configuration;
    EXPECT_EQ(out.str(), "shadow:\n");
}

TEST(NSSConfigurationTest, LookingAtTheDatabasesMakesNone) {
    NSSConfiguration const configuration;
    EXPECT_EQ(configuration.Databases().count(NSSDatabase::shadow), 0u);
    EXPECT_TRUE(configuration.Databases().empty());
}

TEST(NSSConfigurationTest, WritingTheDatabaseWithoutAWordThrowsTheBareText) {
    NSSConfiguration configuration;
    configuration[NSSDatabase::passwd].push_back(NSSService("files"));
    configuration[NSSDatabase()];
    std::ostringstream out;
    EXPECT_EQ(Failure([&] { out << configuration; }),
              "InvalidDatabaseException: Invalid Database: ");
    EXPECT_EQ(out.str(), "");
}

TEST(NSSConfigurationTest, EmptyAndBinaryInputs) {
    EXPECT_EQ(Normalised<NSS>(""), "");
    EXPECT_EQ(FromText<NSS>(std::string("\x7f"
                                        "ELF\0\1",
                                        6)),
              std::string("InvalidDatabaseException: Invalid Database: \x7f"
                          "ELF"));
}

TEST(NSSConfigurationTest, LineOfAMebibyteIsReadInTimeThatGrowsWithItsLength) {
    std::string plain = "hosts:";
    while (plain.size() < 1 << 20) {
        plain += " a";
    }
    EXPECT_EQ(Normalised<NSS>(plain + "\n"), plain + "\n");
    // With a bracket that is far away, or missing, every word asks where it is.
    EXPECT_EQ(FromText<NSS>(plain + " b]"), "4:\n  {a} \n");
    EXPECT_EQ(FromText<NSS>(plain + "\n"), FromStream<NSS>(plain + "\n"));
}

TEST(NSSConfigurationTest, HundredThousandLinesAreReadInOrderBothWays) {
    std::string text;
    std::string expected = "passwd:";
    for (int i = 0; i < 100000; ++i) {
        text += "passwd:  s" + std::to_string(i) + "\n";
        expected += " s" + std::to_string(i);
    }
    expected += "\n";
    EXPECT_EQ(Normalised<NSS>(text), expected);
    EXPECT_EQ(NormalisedThroughStreams<NSS>(text), expected);
}

TEST(NSSConfigurationTest, BothReadersAgreeOnRandomTexts) {
    std::mt19937 random(1);
    auto const pieces = Joined(Pieces, Pieces, BracketPieces, BadPieces);
    for (int i = 0; i < 20000; ++i) {
        auto const text = RandomText(random, pieces, random() % 12);
        ASSERT_EQ(FromText<NSS>(text), FromStream<NSS>(text)) << text;
    }
}

TEST(NSSConfigurationTest, PrintingWhatWasReadIsIdempotentWithoutBrackets) {
    std::mt19937 random(2);
    int compared = 0;
    for (int i = 0; i < 20000; ++i) {
        auto const text = RandomText(random, Pieces, random() % 12);
        auto const read = FromText<NSS>(text);
        if (read.find("Exception") != std::string::npos) {
            continue; // two databases on one line
        }
        ++compared;
        auto const once = Normalised<NSS>(text);
        ASSERT_EQ(Normalised<NSS>(once), once) << text;
        ASSERT_EQ(FromText<NSS>(once), read) << text;
    }
    EXPECT_GT(compared, 1000);
}

TEST(NSSConfigurationTest, PrintingWhatWasReadSettlesAlsoWithBrackets) {
    // Each further pass can only lose services, so it ends in a text that stays.
    std::mt19937 random(3);
    auto const pieces = Joined(Pieces, BracketPieces);
    for (int i = 0; i < 5000; ++i) {
        auto text = RandomText(random, pieces, random() % 12);
        for (int pass = 0; pass < 20; ++pass) {
            text = Normalised<NSS>(text);
        }
        ASSERT_EQ(Normalised<NSS>(text), text);
    }
}

} // namespace
