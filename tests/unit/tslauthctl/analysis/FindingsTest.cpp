// SPDX-License-Identifier: Apache-2.0
#include "analysis/Findings.h"

#include "analysis/TrustWord.h"

#include <gmock/gmock.h>

namespace tessel::tslauthctl {
namespace {

using authentication::MakeProviderEntries;
using testing::ElementsAre;
using testing::IsEmpty;

constexpr char policyPath[] = "/etc/pam.d/system-auth-generic";
constexpr char commonPath[] = "/etc/pam.d/common-auth";
constexpr char entry[] = "auth sufficient /lib/security/$ISA/pam_prov.so\n";

/// A host that is as its record says.
HostFacts InOrder() {
    HostFacts facts;
    facts.wanted = true;
    facts.configured = MakeProviderEntries("pam_prov.so", {}, "prov", {});
    facts.policies[policyPath] = entry;
    facts.policies[commonPath] = "auth include system-auth-generic\n";
    facts.nameServices = "passwd: prov files\n";
    facts.joined = true;
    return facts;
}

std::vector<std::string> WordsOf(HostFacts const& facts) {
    std::vector<std::string> words;
    for (auto const& finding : FindingsOf(facts)) {
        words.push_back(finding.word);
    }
    return words;
}

TEST(FindingsTest, AHostThatIsInOrderHasNone) {
    EXPECT_THAT(WordsOf(InOrder()), IsEmpty());
}

TEST(FindingsTest, EntriesThatNobodyWantsAreFoundInEveryPolicyAndInTheSwitch) {
    auto facts = InOrder();
    facts.wanted = false;
    facts.policies["/etc/pam.d/sshd"] = entry;
    EXPECT_THAT(WordsOf(facts), ElementsAre("entries-left", "entries-left", "entries-left"));
}

TEST(FindingsTest, WhatThePolicyAsksOfTheModuleWhicheverStoreIsActiveIsNotLeft) {
    std::string const ownLine = "account required pam_prov.so check_only\n";
    auto facts = InOrder();
    facts.policies[policyPath] = ownLine + entry;
    EXPECT_THAT(WordsOf(facts), IsEmpty());
    facts.wanted = false;
    facts.policies[policyPath] = ownLine;
    facts.nameServices = "passwd: files\n";
    EXPECT_THAT(WordsOf(facts), IsEmpty());
    facts.policies[policyPath] = ownLine + entry;
    EXPECT_THAT(WordsOf(facts), ElementsAre("entries-left"));
}

TEST(FindingsTest, EntriesOfAnEarlierProviderAreFoundByTheRecord) {
    auto facts = InOrder();
    facts.inserted = {MakeProviderEntries("pam_old.so", {}, "old", {}), *facts.configured};
    EXPECT_THAT(WordsOf(facts), IsEmpty());
    facts.nameServices = "passwd: prov old files\n";
    EXPECT_THAT(WordsOf(facts), ElementsAre("entries-left"));
}

TEST(FindingsTest, WhatKeepsTheDomainsUsersOutHasAWordEach) {
    auto facts = InOrder();
    facts.policies[commonPath] = "auth sufficient pam_winbind.so\n";
    facts.missingModules = {"the PAM module is not installed"};
    facts.joined = false;
    EXPECT_THAT(WordsOf(facts), ElementsAre("services-not-following", "samba-profile",
                                            "module-missing", "not-joined"));
    facts.wanted = false;
    facts.policies[policyPath] = facts.nameServices = "";
    EXPECT_THAT(WordsOf(facts), IsEmpty()) << "which nobody wants to log in";
}

TEST(FindingsTest, SambasOwnServiceIsFoundBesideTheProviders) {
    auto facts = InOrder();
    facts.nameServices = "passwd: prov files winbind\n";
    EXPECT_THAT(WordsOf(facts), ElementsAre("samba-service"));
    facts.configured = MakeProviderEntries("pam_prov.so", {}, "winbind", {});
    EXPECT_THAT(WordsOf(facts), IsEmpty()) << "of which it is the provider's own";
}

TEST(FindingsTest, TheTrustAndWhatWasNotLookedAtAreTold) {
    auto facts = InOrder();
    facts.trustState = 0;
    EXPECT_THAT(WordsOf(facts), IsEmpty());
    facts.trustState = 1;
    facts.root = false;
    EXPECT_THAT(WordsOf(facts), ElementsAre("trust", "not-looked-at"));
    facts.trustState.reset();
    facts.notTold = "it hangs";
    EXPECT_THAT(WordsOf(facts), ElementsAre("not-told", "not-looked-at"));
}

TEST(FindingsTest, StatesOfTheTrustHaveWords) {
    EXPECT_STREQ("in-order", TrustWord(0));
    EXPECT_STREQ("secret-refused", TrustWord(1));
    EXPECT_STREQ("no-controller", TrustWord(2));
    EXPECT_STREQ("service-not-running", TrustWord(3));
    EXPECT_STREQ("service-not-answering", TrustWord(4));
    EXPECT_STREQ("unknown", TrustWord(5));
    EXPECT_STREQ("clocks-apart", TrustWord(6));
    EXPECT_STREQ("not-joined", TrustWord(7));
    EXPECT_STREQ("other", TrustWord(8));
    EXPECT_STREQ("other", TrustWord(-1));
}

} // namespace
} // namespace tessel::tslauthctl
