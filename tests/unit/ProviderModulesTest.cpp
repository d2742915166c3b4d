// SPDX-License-Identifier: Apache-2.0
#include "ProviderModules.h"

#include "SystemFileModels.h"

#include <gtest/gtest.h>

#include <string>

using namespace SystemConfiguration;
using namespace tessel::authentication;
using namespace tessel::authentication::ProviderModules;
using SystemFileModels::Failure;

namespace {

PAMEntry const Entry = PAMEntryFor("pam_ad.so", {"debug", "try=2"});
NSSService const Service = NSSServiceFor("ad", {});

std::string const Header = "#%PAM-1.0\n\n";
std::string const Access = "required\t/lib/security/$ISA/pam_access.so\t\n";
std::string const Provider = "sufficient\t/lib/security/$ISA/pam_ad.so\tdebug try=2 \n";

std::string Insert(std::string const& text) {
    return EditedPAMPolicy(text, Edit::insert, Entry);
}
std::string Remove(std::string const& text) {
    return EditedPAMPolicy(text, Edit::remove, Entry);
}
std::string InsertService(std::string const& text) {
    return EditedNSSConfiguration(text, Edit::insert, Service);
}
std::string RemoveService(std::string const& text) {
    return EditedNSSConfiguration(text, Edit::remove, Service);
}

TEST(ProviderModulesTest, EntryIsSufficientInTheModuleDirectory) {
    EXPECT_EQ(Entry.control(), PAMControl::sufficient);
    EXPECT_EQ(Entry.module(), "/lib/security/$ISA/pam_ad.so");
    EXPECT_EQ(Entry.parameters(), (std::list<std::string>{"debug", "try=2"}));
}

TEST(ProviderModulesTest, ServiceCarriesModuleAndParameters) {
    auto const service = NSSServiceFor("ad", {"NOTFOUND=return"});
    EXPECT_EQ(service.module(), "ad");
    EXPECT_EQ(service.parameters(), (std::list<std::string>{"NOTFOUND=return"}));
}

TEST(ProviderModulesTest, WithoutAnAccessLineTheProviderStandsFirst) {
    EXPECT_EQ(Insert("auth required a\nauth required b\naccount required c\n"),
              Header + "account\t" + Provider + "account\trequired\tc\t\n\n" + "auth\t" + Provider +
                  "auth\trequired\ta\t\nauth\trequired\tb\t\n\n");
}

TEST(ProviderModulesTest, TheProviderStandsRightAfterTheFirstAccessLine) {
    EXPECT_EQ(Insert("auth required a\nauth " + Access + "auth required b\nauth " + Access +
                     "account " + Access),
              Header + "account\t" + Access + "account\t" + Provider + "\n" +
                  "auth\trequired\ta\t\nauth\t" + Access + "auth\t" + Provider +
                  "auth\trequired\tb\t\nauth\t" + Access + "\n");
}

TEST(ProviderModulesTest, AccessLineCountsWhateverItsControlAndParameters) {
    EXPECT_EQ(Insert("auth [default=1] /lib/security/$ISA/pam_access.so x\naccount required c\n"),
              Header + "account\t" + Provider + "account\trequired\tc\t\n\n" +
                  "auth\t[default=1]\t/lib/security/$ISA/pam_access.so\tx \nauth\t" + Provider +
                  "\n");
}

TEST(ProviderModulesTest, AccessModuleOfAnotherDirectoryDoesNotCount) {
    EXPECT_EQ(Insert("auth required pam_access.so\n"), Header + "account\t" + Provider +
                                                           "\nauth\t" + Provider +
                                                           "auth\trequired\tpam_access.so\t\n\n");
}

TEST(ProviderModulesTest, EmptyPolicyGetsBothStacks) {
    EXPECT_EQ(Insert(""), Header + "account\t" + Provider + "\nauth\t" + Provider + "\n");
}

TEST(ProviderModulesTest, OtherStacksAreNotTouched) {
    EXPECT_EQ(Insert("password " + Access + "session " + Access),
              Header + "account\t" + Provider + "\nauth\t" + Provider + "\npassword\t" + Access +
                  "\nsession\t" + Access + "\n");
}

TEST(ProviderModulesTest, InsertingTwiceIsInsertingOnce) {
    for (std::string const& text : {std::string(), "auth " + Access + "account required c\n",
                                    std::string("session required s\n")}) {
        auto const once = Insert(text);
        EXPECT_EQ(Insert(once), once);
    }
}

TEST(ProviderModulesTest, AnEqualEntryAnywhereInTheStackCounts) {
    std::string const text = "auth required a\nauth " + Provider + "account " + Provider;
    EXPECT_EQ(Insert(text),
              Header + "account\t" + Provider + "\nauth\trequired\ta\t\nauth\t" + Provider + "\n");
}

TEST(ProviderModulesTest, AnEntryWithOtherParametersIsAnotherEntry) {
    std::string const other = "sufficient\t/lib/security/$ISA/pam_ad.so\tdebug \n";
    EXPECT_EQ(Insert("auth " + other),
              Header + "account\t" + Provider + "\nauth\t" + Provider + "auth\t" + other + "\n");
    EXPECT_EQ(Remove("auth " + other), Header + "auth\t" + other + "\n");
}

TEST(ProviderModulesTest, RemovingErasesOnlyTheFirstOfTwoCopies) {
    EXPECT_EQ(Remove("auth " + Provider + "auth required a\nauth " + Provider),
              Header + "auth\trequired\ta\t\nauth\t" + Provider + "\n");
}

TEST(ProviderModulesTest, RemovingAnAbsentEntryRewritesANormalisedPolicyUnchanged) {
    for (std::string const& text :
         {Header, Header + "account\trequired\ta\t\n\nauth\t" + Access + "\n",
          Header + "session\trequired\ta\tx \n\n"}) {
        EXPECT_EQ(Remove(text), text);
    }
}

TEST(ProviderModulesTest, RemovingUndoesInserting) {
    std::string const text =
        Header + "account\t" + Access + "\nauth\trequired\ta\t\n\nsession\trequired\ts\t\n\n";
    EXPECT_EQ(Remove(Insert(text)), text);
}

TEST(ProviderModulesTest, ARemovalThatEmptiesAStackLeavesItsEmptyLine) {
    EXPECT_EQ(Remove("auth " + Provider), Header + "\n");
}

TEST(ProviderModulesTest, ServiceIsPutFirstInTheThreeDatabases) {
    EXPECT_EQ(InsertService("passwd: files\ngroup: files sss\nshadow: files\nhosts: files dns\n"),
              "passwd: ad files\ngroup: ad files sss\nshadow: ad files\nhosts: files dns\n");
}

TEST(ProviderModulesTest, AMissingDatabaseComesIntoBeing) {
    EXPECT_EQ(InsertService("passwd: files\n"), "passwd: ad files\ngroup: ad\nshadow: ad\n");
}

TEST(ProviderModulesTest, InsertingAServiceTwiceIsInsertingOnce) {
    for (std::string const text : {"", "passwd: files ad\n", "hosts: files\nshadow: files\n"}) {
        auto const once = InsertService(text);
        EXPECT_EQ(InsertService(once), once);
    }
}

TEST(ProviderModulesTest, AnEqualServiceAnywhereInTheListCounts) {
    EXPECT_EQ(InsertService("passwd: files ad\ngroup: ad\nshadow: ad\n"),
              "passwd: files ad\ngroup: ad\nshadow: ad\n");
}

TEST(ProviderModulesTest, AServiceWithOtherParametersIsAnotherService) {
    EXPECT_EQ(InsertService("passwd: ad [x]\ngroup: ad\nshadow: ad\n"),
              "passwd: ad ad [x]\ngroup: ad\nshadow: ad\n");
}

TEST(ProviderModulesTest, RemovingErasesOnlyTheFirstOfTwoServices) {
    EXPECT_EQ(RemoveService("passwd: ad files ad\nhosts: ad\n"), "passwd: files ad\nhosts: ad\n");
}

TEST(ProviderModulesTest, RemovingAnAbsentServiceRewritesANormalisedFileUnchanged) {
    for (std::string const text : {"", "passwd: files\n", "group: files\nhosts: files dns\n"}) {
        EXPECT_EQ(RemoveService(text), text);
    }
}

TEST(ProviderModulesTest, RemovingAServiceUndoesInsertingIt) {
    std::string const text = "passwd: files\ngroup: files\nshadow: files\nhosts: files dns\n";
    EXPECT_EQ(RemoveService(InsertService(text)), text);
}

TEST(ProviderModulesTest, WhatTheReadersRefuseIsRefused) {
    EXPECT_EQ(Failure([] { Insert("-auth required a\n"); }),
              "InvalidFacilityException: Invalid Facility: -auth");
    EXPECT_EQ(Failure([] { Remove("auth bogus a\n"); }),
              "InvalidControlException: Invalid Control: bogus");
    EXPECT_EQ(Failure([] { InsertService("gshadow: files\n"); }),
              "InvalidDatabaseException: Invalid Database: gshadow");
    EXPECT_EQ(Failure([] { RemoveService("passwd: files \n"); }),
              "std::out_of_range: basic_string::at");
}

} // namespace
