// SPDX-License-Identifier: Apache-2.0
#include "setup/SetupPlan.h"

#include "access/AccessRules.h"
#include "setup/SetupPaths.h"
#include "terminal/Console.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <algorithm>
#include <string>

using namespace tessel::tslauthctl;
using testing::ElementsAre;
using testing::HasSubstr;
using testing::IsEmpty;

namespace {

constexpr char Access[] =
    "\trequired\t/lib/security/$ISA/pam_access.so\taccessfile=/etc/tessel/tslauth/access.conf\n";
std::string const DefaultPolicy = std::string("#%PAM-1.0\n\nauth") + Access +
                                  "auth\trequired\tpam_deny.so\n\naccount" + Access +
                                  "account\trequired\tpam_unix.so\n";
constexpr char CheckLine[] = "account\trequired\tpam_p.so check_only";
std::string const ComposedPolicy = std::string("#%PAM-1.0\n\nauth") + Access +
                                   "auth\trequired\tpam_deny.so\n\n" + CheckLine + "\naccount" +
                                   Access + "account\trequired\tpam_unix.so\n";
constexpr char Substack[] = "auth substack system-auth-generic\n";
constexpr char Unix[] = "auth\t[success=1 default=ignore]\tpam_unix.so nullok\n";

/// A host as Debian installs it, with the packages of the provider.
SetupFacts StockHost() {
    SetupFacts facts;
    facts.provider = "p";
    facts.asked = {{CheckLine}, "samba", "pam_samba.so", "samba"};
    facts.defaultPolicy = DefaultPolicy;
    facts.texts[Paths::NSSConfiguration] =
        "passwd:         files systemd samba\ngroup:          files systemd samba\n"
        "shadow:         files systemd\ngshadow:        files systemd\n\n"
        "hosts:          files mdns4_minimal [NOTFOUND=return] dns\n";
    for (auto const* const path : Paths::ServicePolicies) {
        facts.texts[path] = std::string(Unix) + "auth sufficient pam_samba.so krb5_auth\n";
    }
    facts.missingLinks = {"/lib/security/lib/security"};
    facts.moduleFolder = "/lib/x86_64-linux-gnu/security";
    facts.profiles = {"tslauth"};
    return facts;
}

/// The host after what `plan` says, with the services that follow then.
SetupFacts After(SetupPlan const& plan, SetupFacts facts) {
    for (auto const& change : plan.files) {
        facts.texts[change.path] = change.after;
    }
    facts.missingLinks.clear();
    for (auto const* const path : Paths::ServicePolicies) {
        facts.texts[path] = Substack;
    }
    return facts;
}

std::string AfterOf(std::string const& path, SetupPlan const& plan) {
    for (auto const& change : plan.files) {
        if (change.path == path) {
            return change.after;
        }
    }
    return "(not planned)";
}

TEST(SetupPlanTest, AStockHostGetsAllOfIt) {
    auto const plan = MakeSetupPlan(StockHost());
    EXPECT_EQ(AfterOf(Paths::AuthenticationConfiguration, plan),
              "remote-authentication-store = \"None\"\n");
    EXPECT_EQ(AfterOf(Paths::ProviderConfiguration, plan), "provider = \"p\"\n");
    EXPECT_EQ(AfterOf(Paths::AccessRules, plan), FirstAccessRules());
    EXPECT_EQ(AfterOf(Paths::PAMPolicy, plan), ComposedPolicy);
    EXPECT_EQ(AfterOf(Paths::NSSConfiguration, plan),
              "passwd:         files systemd\ngroup:          files systemd\n"
              "shadow:         files systemd\ngshadow:        files systemd\n\n"
              "hosts:          files mdns4_minimal [NOTFOUND=return] dns\n");
    EXPECT_THAT(plan.links, ElementsAre("/lib/security/lib/security"));
    EXPECT_EQ(plan.linkTarget, "/lib/x86_64-linux-gnu/security");
    EXPECT_THAT(plan.profilesOn, ElementsAre("tslauth"));
    EXPECT_THAT(plan.profilesOff, ElementsAre("samba"));
    EXPECT_THAT(plan.notes, IsEmpty());
    EXPECT_TRUE(plan.Changes());
}

TEST(SetupPlanTest, AHostThatIsSetUpStaysAsItIs) {
    auto const facts = StockHost();
    auto const again = MakeSetupPlan(After(MakeSetupPlan(facts), facts));
    EXPECT_FALSE(again.Changes());
}

TEST(SetupPlanTest, AnActiveHostThatIsSetUpStaysAsItIs) {
    auto const stock = StockHost();
    auto facts = After(MakeSetupPlan(stock), stock);
    facts.texts[Paths::AuthenticationConfiguration] =
        "remote-authentication-store = \"Active Directory\"\n";
    facts.texts[Paths::PAMPolicy]->append("auth sufficient /lib/security/$ISA/pam_p.so\n");
    facts.texts[Paths::AccessRules] = "+:CORP\\user1:ALL\n-:ALL:ALL\n";
    EXPECT_FALSE(MakeSetupPlan(facts).Changes());
}

TEST(SetupPlanTest, SambasProfileThatCameBackIsSwitchedOffAgain) {
    auto const stock = StockHost();
    auto facts = After(MakeSetupPlan(stock), stock);
    facts.texts["/etc/pam.d/common-session"]->append("session optional pam_samba.so\n");
    auto const plan = MakeSetupPlan(facts);
    EXPECT_THAT(plan.profilesOff, ElementsAre("samba"));
    EXPECT_TRUE(plan.Changes());
}

TEST(SetupPlanTest, AServicePolicyThatDoesNotFollowIsNamed) {
    auto const stock = StockHost();
    auto facts = After(MakeSetupPlan(stock), stock);
    EXPECT_THAT(FilesThatDoNotFollow(facts.texts), IsEmpty());
    facts.texts["/etc/pam.d/common-account"] = "account required pam_unix.so\n";
    facts.texts["/etc/pam.d/common-password"] = std::nullopt;
    EXPECT_THAT(FilesThatDoNotFollow(facts.texts), ElementsAre("/etc/pam.d/common-account"));
    EXPECT_THAT(MakeSetupPlan(facts).profilesOn, ElementsAre("tslauth"));
}

TEST(SetupPlanTest, WhatIncludesThePolicyInAnyWayIsNamed) {
    PolicyTexts const policies = {{"/a", "@include system-auth-generic\n"},
                                  {"/b", "auth substack system-auth-generic\n"},
                                  {"/c", "-auth [success=1] pam_a.so\nauth include \\\n"
                                         " system-auth-generic\n"},
                                  {"/d", "# @include system-auth-generic\n"},
                                  {"/e", "auth required system-auth-generic\n"},
                                  {"/f", std::nullopt}};
    EXPECT_THAT(FilesThatFollow(policies), ElementsAre("/a", "/b", "/c"));
}

TEST(SetupPlanTest, WithoutAProfileTheServicesAreLeftToTheAdministrator) {
    auto facts = StockHost();
    facts.profiles.clear();
    auto const plan = MakeSetupPlan(facts);
    EXPECT_THAT(plan.profilesOn, IsEmpty());
    EXPECT_THAT(plan.notes, ElementsAre(HasSubstr("include 'system-auth-generic'")));
}

TEST(SetupPlanTest, APolicyThatServesIsKeptWithWhateverElseItSays) {
    auto facts = StockHost();
    auto const own = "# mine\n" + ComposedPolicy + "session optional pam_umask.so\n";
    facts.texts[Paths::PAMPolicy] = own;
    EXPECT_EQ(AfterOf(Paths::PAMPolicy, MakeSetupPlan(facts)), own);
}

TEST(SetupPlanTest, APolicyThatWouldIncludeItselfIsReplaced) {
    auto facts = StockHost();
    facts.texts[Paths::PAMPolicy] = ComposedPolicy + "session include common-session\n";
    EXPECT_EQ(AfterOf(Paths::PAMPolicy, MakeSetupPlan(facts)), ComposedPolicy);
    facts.texts[Paths::PAMPolicy] = ComposedPolicy + "@include common-session\n";
    EXPECT_EQ(AfterOf(Paths::PAMPolicy, MakeSetupPlan(facts)), ComposedPolicy);
}

TEST(SetupPlanTest, WhatTheActiveStoreNeedsIsNotReplaced) {
    auto const stock = StockHost();
    auto active = After(MakeSetupPlan(stock), stock);
    active.texts[Paths::AuthenticationConfiguration] =
        "remote-authentication-store = \"Active Directory\"\n";
    for (auto const* const path : {Paths::PAMPolicy, Paths::ProviderConfiguration}) {
        auto facts = active;
        facts.texts[path] = "other = \"x\"\n";
        EXPECT_THROW(MakeSetupPlan(facts), Failure) << path;
        facts.texts[Paths::AuthenticationConfiguration] =
            "remote-authentication-store = \"None\"\n";
        EXPECT_NO_THROW(MakeSetupPlan(facts)) << path;
    }
}

TEST(SetupPlanTest, OtherKeysOfAFileStay) {
    auto facts = StockHost();
    facts.texts[Paths::ProviderConfiguration] = "a = \"1\"\nprovider = other\n\nb = \"2\"";
    facts.texts[Paths::AuthenticationConfiguration] = "c = \"3\"\n";
    auto const plan = MakeSetupPlan(facts);
    EXPECT_EQ(AfterOf(Paths::ProviderConfiguration, plan),
              "a = \"1\"\nprovider = \"p\"\n\nb = \"2\"\n");
    EXPECT_EQ(AfterOf(Paths::AuthenticationConfiguration, plan),
              "c = \"3\"\nremote-authentication-store = \"None\"\n");
}

TEST(SetupPlanTest, AProvidersFileSaysWhatItAsksFor) {
    auto const setup = ReadProviderSetup(
        "policy-account = \"required\tpam_p.so check_only\"\n"
        "policy-password = \"sufficient\tpam_p.so\"\nreplaced-profile = \"samba\"\n"
        "replaced-module = \"pam_samba.so\"\nreplaced-service = \"samba\"\n");
    EXPECT_THAT(setup.policyLines, ElementsAre("account\trequired\tpam_p.so check_only",
                                               "password\tsufficient\tpam_p.so"));
    EXPECT_EQ(setup.replacedProfile, "samba");
    EXPECT_EQ(setup.replacedModule, "pam_samba.so");
    EXPECT_EQ(setup.replacedService, "samba");
    EXPECT_THAT(ReadProviderSetup("").policyLines, IsEmpty());
}

TEST(SetupPlanTest, AProviderThatAsksForNothingGetsTheDefaultPolicy) {
    auto facts = StockHost();
    facts.asked = {};
    auto const plan = MakeSetupPlan(facts);
    EXPECT_EQ(AfterOf(Paths::PAMPolicy, plan), DefaultPolicy);
    EXPECT_EQ(AfterOf(Paths::NSSConfiguration, plan), "(not planned)");
    EXPECT_THAT(plan.profilesOff, IsEmpty());
}

} // namespace
