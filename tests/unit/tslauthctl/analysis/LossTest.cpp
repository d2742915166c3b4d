// SPDX-License-Identifier: Apache-2.0
#include "analysis/Loss.h"

#include "analysis/Prepare.h"

#include <gmock/gmock.h>

#include <stdexcept>

namespace tessel::tslauthctl {
namespace {

using namespace authentication::ProviderModules;
using testing::ElementsAre;
using testing::HasSubstr;
using testing::IsEmpty;

constexpr char local[] = "passwd: files\ngroup: files\nshadow: files\n";

std::optional<std::string> NoPolicy(std::string const&) {
    return std::nullopt;
}

/// What an activation loses of the local databases and `line`.
std::vector<std::string> NSSInsertLosses(std::string const& text,
                                         std::list<std::string> const& parameters = {}) {
    auto const service = NSSServiceFor("prov", parameters);
    return NSSLosses(text, EditedNSSConfiguration(text, Edit::insert, service), Edit::insert,
                     service);
}

/// Of `text` and an "account" that is no matter.
std::vector<std::string> PAMInsertLosses(std::string text,
                                         PAMPolicyReader const& reader = NoPolicy) {
    auto const entry = PAMEntryFor("pam_prov.so", {"a"});
    text = "auth required first.so\naccount required a.so\n" + text;
    return PAMLosses(text, EditedPAMPolicy(text, Edit::insert, entry), Edit::insert, entry, reader);
}

TEST(LossTest, TheIntendedEditIsNone) {
    auto const provider = NSSServiceFor("prov", {});
    auto const active = EditedNSSConfiguration(local, Edit::insert, provider);
    EXPECT_THAT(NSSInsertLosses(local), IsEmpty());
    EXPECT_THAT(NSSInsertLosses(active), IsEmpty());
    EXPECT_THAT(NSSLossesOnReturn(active, provider), IsEmpty());
    EXPECT_THAT(NSSLossesOnReturn(local, provider), IsEmpty());
    EXPECT_THAT(PAMInsertLosses("auth required a.so\nsession required b.so x\n"), IsEmpty());
}

TEST(LossTest, AServiceBehindABracketIsNamed) {
    EXPECT_THAT(NSSInsertLosses(local + std::string("hosts: files [NOTFOUND=return] dns\n")),
                ElementsAre("hosts: service 'dns' would be lost"));
}

TEST(LossTest, AServiceBeforeALaterBracketLosesItsNeighbours) {
    EXPECT_THAT(
        NSSInsertLosses(local + std::string("hosts: files mdns4_minimal [NOTFOUND=return] dns\n")),
        ElementsAre("hosts: service 'mdns4_minimal [NOTFOUND=return]' would be lost",
                    "hosts: service 'dns' would be lost"));
}

TEST(LossTest, AServiceReadFromTheMiddleOfAWordIsNamed) {
    auto const losses =
        NSSInsertLosses(local + std::string("rpc: a [NOTFOUND=return] longservicename\n"));
    EXPECT_THAT(losses, ElementsAre(AnyOf(HasSubstr("'longservicename' would be lost"),
                                          HasSubstr("would be lost")),
                                    HasSubstr("would be added")));
}

TEST(LossTest, AMissingShadowLineHadADefault) {
    EXPECT_THAT(
        NSSInsertLosses("passwd: files\ngroup: files\n"),
        ElementsAre("shadow: the default 'files', which holds without a line, would be lost"));
}

TEST(LossTest, MergedLinesAreNamed) {
    EXPECT_THAT(NSSInsertLosses(local + std::string("hosts: dns\nhosts: files\n")),
                ElementsAre("hosts: service 'dns' would be added"));
}

TEST(LossTest, AProvidersParametersCostItsNeighboursOnTheWayBack) {
    auto const provider = NSSServiceFor("prov", {"NOTFOUND=continue"});
    auto const active = EditedNSSConfiguration(local, Edit::insert, provider);
    EXPECT_THAT(NSSInsertLosses(local, {"NOTFOUND=continue"}), IsEmpty());
    EXPECT_THAT(NSSLossesOnReturn(active, provider),
                ElementsAre("group: service 'files' would be lost",
                            "passwd: service 'files' would be lost",
                            "shadow: service 'files' would be lost"));
}

TEST(LossTest, ABracketInAnEditedDatabaseCostsTheServicesBeforeItOnTheWayBack) {
    auto const provider = NSSServiceFor("prov", {});
    auto const active = EditedNSSConfiguration(
        "passwd: files [NOTFOUND=return]\ngroup: files\nshadow: files\n", Edit::insert, provider);
    EXPECT_THAT(NSSLossesOnReturn(active, provider),
                ElementsAre("passwd: service 'files [NOTFOUND=return]' would be lost"));
}

TEST(LossTest, CommentsAreNoLoss) {
    EXPECT_THAT(NSSInsertLosses("# c\n" + std::string(local)), IsEmpty());
    EXPECT_THAT(PAMInsertLosses("# c\nauth required a.so # d\n"), IsEmpty());
}

TEST(LossTest, AJumpOverTheInsertedEntryLandsElsewhere) {
    EXPECT_THAT(PAMInsertLosses("auth [success=1 default=ignore] u.so\n"
                                "auth required /lib/security/$ISA/pam_access.so\n"
                                "auth required b.so\nauth required c.so\n"),
                IsEmpty())
        << "going on at the inserted entry is going on at what follows it";
    EXPECT_THAT(PAMInsertLosses("auth [success=2 default=ignore] u.so\n"
                                "auth required /lib/security/$ISA/pam_access.so\n"
                                "auth required b.so\nauth required c.so\n"),
                ElementsAre("auth: the jump 'success=2' of '[success=2 default=ignore] u.so' would "
                            "land elsewhere"));
    EXPECT_THAT(PAMInsertLosses("auth [success=1 default=ignore] u.so\nauth required b.so\n"
                                "auth required c.so\n"),
                IsEmpty())
        << "the entry is inserted before the jump";
}

TEST(LossTest, AJumpOverTheRemovedEntryLandsElsewhere) {
    auto const entry = PAMEntryFor("pam_prov.so", {});
    EXPECT_THAT(PAMLossesOnReturn("auth [success=2 default=ignore] u.so\n"
                                  "auth sufficient /lib/security/$ISA/pam_prov.so\n"
                                  "auth required b.so\nauth required c.so\n",
                                  entry, NoPolicy),
                ElementsAre(HasSubstr("the jump 'success=2'")));
    EXPECT_THAT(PAMLossesOnReturn("auth [success=1 default=ignore] u.so\nauth required b.so\n"
                                  "auth sufficient /lib/security/$ISA/pam_prov.so\n"
                                  "auth required c.so\n",
                                  entry, NoPolicy),
                IsEmpty());
}

TEST(LossTest, AnArgumentWithARunOfBlanksIsAltered) {
    EXPECT_THAT(
        PAMInsertLosses("auth required a.so [x  y]\n"),
        ElementsAre("auth: entry 'required a.so [x  y]' would become 'required a.so [x y]'"));
}

TEST(LossTest, AnEntryThatEndsTooEarlyTakesFromTheNext) {
    EXPECT_THAT(PAMInsertLosses("session required\nsession required b.so\n"),
                ElementsAre(HasSubstr("would be lost"), HasSubstr("would be lost"),
                            HasSubstr("would be added")));
}

TEST(LossTest, ACarriageReturnIsPartOfTheLastWordToLibpam) {
    EXPECT_THAT(PAMInsertLosses("session required b.so\r\n"), Not(IsEmpty()));
}

TEST(LossTest, AFacilityWithoutEntriesWasDecidedByAnotherPolicy) {
    auto const entry = PAMEntryFor("pam_prov.so", {});
    constexpr char text[] = "auth required u.so\naccount include empty\n";
    auto const empty = [](std::string const&) { return std::optional<std::string>(""); };
    EXPECT_THAT(
        PAMLosses(text, EditedPAMPolicy(text, Edit::insert, entry), Edit::insert, entry, empty),
        ElementsAre(HasSubstr("account: the policy 'other'")));
    EXPECT_THAT(
        PAMLosses(text, EditedPAMPolicy(text, Edit::insert, entry), Edit::insert, entry, NoPolicy),
        IsEmpty());
}

TEST(LossTest, TheClassOfAnExceptionIsNamedInFull) {
    EXPECT_EQ("std::out_of_range", ClassName(std::out_of_range("x")));
}

} // namespace
} // namespace tessel::tslauthctl
