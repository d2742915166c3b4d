// SPDX-License-Identifier: Apache-2.0
#include "lossless/LosslessPAMPolicy.h"

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

std::string const Access = "required\t/lib/security/$ISA/pam_access.so\t\n";
std::string const Provider = "sufficient\t/lib/security/$ISA/pam_ad.so\tdebug try=2 \n";

std::string Insert(std::string const& text) {
    return LosslessEdits::PAM::Lossless(text, Edit::insert);
}

std::string Remove(std::string const& text) {
    return LosslessEdits::PAM::Lossless(text, Edit::remove);
}

TEST(LosslessPAMPolicyTest, OnlyTheEntryIsAdded) {
    std::string const text = "#%PAM-1.0\n# who may log in\n\nauth   required a.so  # why\n@include "
                             "common-auth\n-session optional b.so\naccount required c.so \\\n  d\n";
    EXPECT_EQ(Insert(text),
              "#%PAM-1.0\n# who may log in\n\nauth\t" + Provider +
                  "auth   required a.so  # why\naccount\t" + Provider +
                  "@include "
                  "common-auth\n-session optional b.so\naccount required c.so \\\n  d\n");
}

TEST(LosslessPAMPolicyTest, TheEntryStandsBehindTheAccessModule) {
    EXPECT_EQ(Insert("auth required a\nauth " + Access + "auth required b\naccount " + Access),
              "auth required a\nauth " + Access + "auth\t" + Provider +
                  "auth required b\naccount " + Access + "account\t" + Provider);
}

TEST(LosslessPAMPolicyTest, TheEntryStandsBehindAContinuedAccessLine) {
    std::string const text = "auth required /lib/security/$ISA/pam_access.so \\\n  nodefgroup\n"
                             "auth required b\n@include common-account\n";
    EXPECT_EQ(Insert(text), "auth required /lib/security/$ISA/pam_access.so \\\n  nodefgroup\n"
                            "auth\t" +
                                Provider + "auth required b\naccount\t" + Provider +
                                "@include common-account\n");
}

TEST(LosslessPAMPolicyTest, AContinuedLineThatOnlyLibpamKnowsAsOneIsRefused) {
    std::string const text = "auth required /lib/security/$ISA/pam_access.so x \\\n"
                             "auth required b\naccount required c\n";
    EXPECT_TRUE(LosslessEdits::ModelReads<LosslessEdits::PAM>(text));
    EXPECT_THROW(Insert(text), ConfigurationError);
}

TEST(LosslessPAMPolicyTest, AFileWithoutEntriesGetsThemAtItsEnd) {
    EXPECT_EQ(Insert(""), "account\t" + Provider + "auth\t" + Provider);
    EXPECT_EQ(Insert("# nothing\n"), "# nothing\naccount\t" + Provider + "auth\t" + Provider);
    auto const unfinished = Insert("# nothing");
    EXPECT_EQ(unfinished + "\n", "# nothing\naccount\t" + Provider + "auth\t" + Provider);
    EXPECT_EQ(Remove(unfinished), "# nothing");
}

TEST(LosslessPAMPolicyTest, EveryCopyIsTakenOutAlsoOneThatOnlyLibpamReads) {
    EXPECT_EQ(Remove("auth " + Provider + "auth required a\nAUTH " + Provider +
                     "auth sufficient \\\n /lib/security/$ISA/pam_ad.so debug try=2 # mine\n" +
                     "@include b\n"),
              "auth required a\n@include b\n");
    EXPECT_EQ(Remove("auth required a\nauth sufficient /lib/security/$ISA/pam_ad.so debug try=2 # "
                     "mine\n"),
              "auth required a\n");
}

TEST(LosslessPAMPolicyTest, ALineEndOfWindowsStays) {
    std::string const text = "auth required a\r\nauth required /lib/security/$ISA/pam_access.so\r\n"
                             "account required c\r\n";
    EXPECT_EQ(Insert(text), "auth required a\r\nauth required /lib/security/$ISA/pam_access.so\r\n"
                            "auth\t" +
                                Provider + "account\t" + Provider + "account required c\r\n");
}

TEST(LosslessPAMPolicyTest, GoldenFilesAreEditedWithoutLoss) {
    LosslessEdits::Tally<LosslessEdits::PAM> tally;
    for (auto const& path : GoldenTexts<PAM>()) {
        tally.Add(Contents(path));
    }
    EXPECT_EQ(tally.broken, "");
    EXPECT_EQ(tally.refused, 1U) << "the one with NUL bytes";
    EXPECT_GE(tally.unreadable, 10U);
    EXPECT_GE(tally.compared, 20U);
}

TEST(LosslessPAMPolicyTest, GeneratedFilesAreEditedWithoutLoss) {
    std::vector<std::string> const usual = {"auth required a.so\n",
                                            "account required c.so x y\n",
                                            "auth " + Access,
                                            "account\t" + Access,
                                            "session optional s.so\n",
                                            "# comment\n",
                                            "\n",
                                            "  \t\n",
                                            "password [success=1 default=ignore] p.so # why\n",
                                            "auth\trequired b.so z\r\n",
                                            "auth required",
                                            "account [a=b  c=d] e.so",
                                            " \tauth required i.so\n"};
    std::vector<std::string> const rare = {"@include common-auth\n",
                                           "-session optional q.so\n",
                                           "AUTH required r.so\n",
                                           "auth required t.so \\\n",
                                           "  tail\n",
                                           "auth " + Provider,
                                           "account " + Provider,
                                           "auth\n",
                                           "account [unclosed\n",
                                           "\\\n",
                                           std::string("\0", 1)};
    auto const tally = LosslessEdits::JudgeGenerated<LosslessEdits::PAM>(usual, rare);
    EXPECT_EQ(tally.broken, "");
    EXPECT_GT(tally.compared, 1200U);
    EXPECT_GT(tally.unreadable, 160U);
    EXPECT_LT(tally.refused, 700U);
}

} // namespace
