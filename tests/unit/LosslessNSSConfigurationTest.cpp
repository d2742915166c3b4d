// SPDX-License-Identifier: Apache-2.0
#include "lossless/LosslessNSSConfiguration.h"

#include "GoldenFiles.h"
#include "LosslessEdits.h"

#include <gtest/gtest.h>

#include <filesystem>
#include <string>
#include <vector>

using namespace SystemFileModels;
using namespace tessel::authentication;
using namespace tessel::authentication::ProviderModules;

namespace {

std::string Insert(std::string const& text) {
    return LosslessEdits::NSS::Lossless(text, Edit::insert);
}

std::string Remove(std::string const& text) {
    return LosslessEdits::NSS::Lossless(text, Edit::remove);
}

TEST(LosslessNSSConfigurationTest, OnlyTheServiceIsAdded) {
    EXPECT_EQ(
        Insert("# who is who\npasswd:\t\tfiles  systemd\ngroup:files\nshadow:\ngshadow: files "
               "\nhosts: files mdns4_minimal [NOTFOUND=return] dns\n# end"),
        "# who is who\npasswd:\t\tad files  systemd\ngroup:ad files\nshadow: ad\ngshadow: "
        "files \nhosts: files mdns4_minimal [NOTFOUND=return] dns\n# end");
}

TEST(LosslessNSSConfigurationTest, ADatabaseWithoutALineGetsItsDefaultToo) {
    std::string const text = "# header\n\nhosts: files dns\ngroup: files\nshadow: files";
    auto const made = Insert(text);
    EXPECT_EQ(made, "# header\n\n"
                    "# Added by tslauth: without a line, 'passwd' is looked up in 'files'.\n"
                    "passwd: ad files\nhosts: files dns\ngroup: ad files\nshadow: ad files");
    EXPECT_EQ(Remove(made), text);
}

TEST(LosslessNSSConfigurationTest, AnAddedLineThatWasChangedSinceStays) {
    auto made = Insert("group: files\nshadow: files\n");
    made.insert(made.find("passwd: ad files") + 16, " systemd");
    EXPECT_EQ(Remove(made),
              "# Added by tslauth: without a line, 'passwd' is looked up in 'files'.\n"
              "passwd: files systemd\ngroup: files\nshadow: files\n");
}

TEST(LosslessNSSConfigurationTest, AnEmptyFileComesBack) {
    for (std::string const text : {"", "\n", "# nothing", "# nothing\n", "\r\n"}) {
        EXPECT_NE(Insert(text), text);
        EXPECT_EQ(Remove(Insert(text)), text);
    }
}

TEST(LosslessNSSConfigurationTest, EveryCopyIsTakenOut) {
    EXPECT_EQ(Remove("passwd: ad files ad\npasswd: ad\ngroup: files ad [NOTFOUND=return] "
                     "sss\nshadow:ad files\nhosts: ad\n"),
              "passwd: files\npasswd:\ngroup: files ad [NOTFOUND=return] sss\nshadow:files\n"
              "hosts: ad\n");
}

TEST(LosslessNSSConfigurationTest, AServiceBehindABracketThatTheModelDoesNotReachIsNoHindrance) {
    EXPECT_EQ(Insert("passwd: files [NOTFOUND=return] ad\ngroup: files\nshadow: files\n"),
              "passwd: ad files [NOTFOUND=return] ad\ngroup: ad files\nshadow: ad files\n");
}

TEST(LosslessNSSConfigurationTest, ALineThatTheTwoReadersUnderstandDifferentlyIsRefused) {
    std::string const rest = "group: files\nshadow: files\n";
    for (std::string const line : {
             "passwd: files\npasswd: files\n",    // the C library uses the last, the model both
             "passwd: a [x] bbbbbbbbad\n",        // the model reads from the middle of a word
             "passwd: [NOTFOUND=return] files\n", // the C library gives up
         }) {
        EXPECT_THROW(Insert(line + rest), ConfigurationError) << line;
    }
}

TEST(LosslessNSSConfigurationTest, GoldenFilesAreEditedWithoutLoss) {
    LosslessEdits::Tally<LosslessEdits::NSS> tally;
    for (auto const& path : GoldenTexts<NSS>()) {
        tally.Add(Contents(path));
    }
    EXPECT_EQ(tally.broken, "");
    EXPECT_EQ(tally.refused, 2U) << "the ones with NUL bytes, and with two lines for a database";
    EXPECT_GE(tally.unreadable, 10U);
    EXPECT_GE(tally.compared, 15U);
}

TEST(LosslessNSSConfigurationTest, TheFilesOfDebianHostsAreEditedAsShown) {
    std::size_t cases = 0;
    for (auto path : GoldenTexts<NSS>()) {
        auto const text = Contents(path);
        if (std::filesystem::exists(path.replace_extension(".activated"))) {
            SCOPED_TRACE(path.filename());
            ++cases;
            EXPECT_EQ(Insert(text), Contents(path));
            EXPECT_EQ(Remove(Contents(path)), text);
        }
    }
    EXPECT_EQ(cases, 4U);
}

TEST(LosslessNSSConfigurationTest, GeneratedFilesAreEditedWithoutLoss) {
    std::vector<std::string> const usual = {"passwd: files\n",
                                            "group:\tfiles  sss\n",
                                            "shadow: files\n",
                                            "hosts: files dns\n",
                                            "passwd: files [NOTFOUND=return] sss\n",
                                            "group: files [ SUCCESS=merge ] systemd\n",
                                            "# comment\n",
                                            "\n",
                                            " \t\n",
                                            "services: db files\n",
                                            "  shadow: files sss\n",
                                            "group: files[NOTFOUND=return] sss\n",
                                            "passwd:\n",
                                            "shadow: files"};
    std::vector<std::string> const rare = {"gshadow: files systemd\n",
                                           "passwd:files\n",
                                           "group : files\n",
                                           "shadow: files \n",
                                           "passwd: files\r\n",
                                           "initgroups: files [SUCCESS=continue] sss\n",
                                           "subid: files\n",
                                           " # indented\n",
                                           "passwd: ad files\n",
                                           "group: files ad\n",
                                           "passwdX files\n",
                                           "passwd: a [x] bbbbbbbbad\n",
                                           "shadow: [x]\n",
                                           "group: files [bogus\n",
                                           " ",
                                           "]",
                                           "[",
                                           std::string("\0", 1)};
    auto const tally = LosslessEdits::JudgeGenerated<LosslessEdits::NSS>(usual, rare);
    EXPECT_EQ(tally.broken, "");
    EXPECT_GT(tally.compared, 1200U);
    EXPECT_GT(tally.unreadable, 160U);
    EXPECT_GT(tally.refused, 160U);
}

} // namespace
