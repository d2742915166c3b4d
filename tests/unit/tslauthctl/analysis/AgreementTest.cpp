// SPDX-License-Identifier: Apache-2.0
#include "analysis/Agreement.h"

#include <gtest/gtest.h>

namespace tessel::tslauthctl {
namespace {

authentication::ProviderEntries const provider =
    authentication::MakeProviderEntries("pam_prov.so", {"a"}, "prov", {});

TEST(AgreementTest, AFileIsInStepPartlyOrNotAtAll) {
    auto const together = [&](char const* text, bool wanted) {
        return Together(NSSParts(text, provider.nss, wanted));
    };
    constexpr char all[] = "passwd: prov files\ngroup: prov\nshadow: files prov\n";
    constexpr char some[] = "passwd: prov files\ngroup: files\nshadow: files\n";
    constexpr char none[] = "passwd: files\n";
    EXPECT_EQ(Agreement::inStep, together(all, true));
    EXPECT_EQ(Agreement::partly, together(some, true));
    EXPECT_EQ(Agreement::notAtAll, together(none, true));
    EXPECT_EQ(Agreement::notAtAll, together(all, false));
    EXPECT_EQ(Agreement::partly, together(some, false));
    EXPECT_EQ(Agreement::inStep, together(none, false));
    EXPECT_EQ(Agreement::unknown, Together(UnknownNSSParts()));
}

TEST(AgreementTest, AnEntryCountsAsLibpamReadsIt) {
    auto const parts = PAMParts("AUTH Sufficient \\\n /lib/security/$ISA/pam_prov.so a # c\n"
                                "account sufficient /lib/security/$ISA/pam_prov.so b\n",
                                provider.pam, true);
    ASSERT_EQ(2U, parts.size());
    EXPECT_EQ("auth", parts[0].name);
    EXPECT_EQ(Agreement::inStep, parts[0].agreement);
    EXPECT_EQ(Agreement::notAtAll, parts[1].agreement);
    EXPECT_EQ(Agreement::partly, Together(parts));
}

TEST(AgreementTest, TheWordsAreStable) {
    EXPECT_STREQ("in-step", Word(Agreement::inStep));
    EXPECT_STREQ("partly", Word(Agreement::partly));
    EXPECT_STREQ("not-at-all", Word(Agreement::notAtAll));
    EXPECT_STREQ("unknown", Word(Agreement::unknown));
}

} // namespace
} // namespace tessel::tslauthctl
