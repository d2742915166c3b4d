// SPDX-License-Identifier: Apache-2.0
#include "questions/Questions.h"
#include "Failure.h"
#include "PlayedHost.h"
#include "PlayedWbclient.h"
#include "tslauth_winbind_provider.h"

#include <functional>
#include <gmock/gmock.h>
#include <string>

using namespace tessel::winbind;
using tessel::authentication::Domain;
using testing::ElementsAre;
using testing::HasSubstr;
using testing::IsEmpty;

namespace {

/// A host that is joined to corp.example, which trusts other.example.
class QuestionsTest : public testing::Test {
protected:
    QuestionsTest() {
        winbindd = {};
        winbindd.domains = {
            {"NODE", "", WBC_DOMINFO_TRUSTTYPE_LOCAL, "", ""},
            {"CORP", "corp.example", WBC_DOMINFO_TRUSTTYPE_NONE, "corp.example",
             "dc1.corp.example"},
        };
        winbindd.users = {{{"CORP", "user1"}, "CORP\\user1"}};
    }

    void Join() {
        host.Write(Paths::OwnSamba, "[global]\n\tworkgroup = CORP\n\trealm = CORP.EXAMPLE\n"
                                    "\tnetbios name = NODE\n");
        host.Write(Paths::Samba, "[global]\n\tinclude = /etc/samba/tslauth.conf\n");
    }

    /// winbindd has met one of its users.
    void Meet() {
        winbindd.domains.push_back({"OTHER", "other.example", WBC_DOMINFO_TRUSTTYPE_FOREST,
                                    "other.example", "dc2.other.example"});
    }

    /// The directory has a trust of these numbers.
    void Trust(std::string const& direction, std::string const& attributes) {
        host.directory = {{"trustedDomain", "Got 1 replies\n\ntrustPartner: other.example\n"
                                            "flatName: OTHER\ntrustDirection: " +
                                                direction + "\ntrustAttributes: " + attributes +
                                                "\n"}};
    }

    static ActiveDirectoryClientErrorCode CodeOf(std::function<void()> const& question) {
        try {
            question();
            return TSLAUTH_PROVIDER_SUCCESS;
        } catch (Failure const& e) {
            return e.Code();
        }
    }

    PlayedHost host;
    PlayedWinbindd& winbindd = PlayedWinbindd::Here();
};

} // namespace

// What a code means is what administrators act on: part and join again, or wait for the network.
TEST_F(QuestionsTest, TheStateOfTheTrustFollowsFromTheCode) {
    EXPECT_EQ(TSLAUTH_WINBIND_TRUST_HEALTHY, TrustStateOf(TSLAUTH_PROVIDER_SUCCESS));
    EXPECT_EQ(TSLAUTH_WINBIND_TRUST_SECRET_REFUSED, TrustStateOf(TSLAUTH_PROVIDER_ACCESS_DENIED));
    EXPECT_EQ(TSLAUTH_WINBIND_TRUST_SECRET_REFUSED, TrustStateOf(TSLAUTH_PROVIDER_LOGON_FAILURE));
    EXPECT_EQ(TSLAUTH_WINBIND_TRUST_SECRET_REFUSED,
              TrustStateOf(TSLAUTH_PROVIDER_NO_TRUST_SAM_ACCOUNT));
    EXPECT_EQ(TSLAUTH_WINBIND_TRUST_NO_CONTROLLER, TrustStateOf(TSLAUTH_PROVIDER_NO_LOGON_SERVERS));
    EXPECT_EQ(TSLAUTH_WINBIND_TRUST_NO_CONTROLLER, TrustStateOf(TSLAUTH_PROVIDER_TIMED_OUT));
    EXPECT_EQ(TSLAUTH_WINBIND_TRUST_NOT_RUNNING, TrustStateOf(TSLAUTH_PROVIDER_SERVICE_NOT_ACTIVE));
    EXPECT_EQ(TSLAUTH_WINBIND_TRUST_CLOCK, TrustStateOf(TSLAUTH_PROVIDER_TIME_SKEW));
    EXPECT_EQ(TSLAUTH_WINBIND_TRUST_UNKNOWN, TrustStateOf(TSLAUTH_PROVIDER_INTERNAL_ERROR));
    EXPECT_EQ(TSLAUTH_WINBIND_TRUST_UNKNOWN, TrustStateOf(TSLAUTH_WINBIND_SEE_SYSTEM_LOG));
}

// Administrators' scripts know the numbers, and the library gives 7 by itself.
TEST_F(QuestionsTest, TheNumbersStay) {
    EXPECT_EQ(0, TSLAUTH_WINBIND_TRUST_HEALTHY);
    EXPECT_EQ(1, TSLAUTH_WINBIND_TRUST_SECRET_REFUSED);
    EXPECT_EQ(2, TSLAUTH_WINBIND_TRUST_NO_CONTROLLER);
    EXPECT_EQ(3, TSLAUTH_WINBIND_TRUST_NOT_RUNNING);
    EXPECT_EQ(4, TSLAUTH_WINBIND_TRUST_NOT_ANSWERING);
    EXPECT_EQ(5, TSLAUTH_WINBIND_TRUST_UNKNOWN);
    EXPECT_EQ(6, TSLAUTH_WINBIND_TRUST_CLOCK);
    EXPECT_EQ(7, TSLAUTH_WINBIND_TRUST_NOT_JOINED);
    EXPECT_EQ(0x1, TSLAUTH_WINBIND_TRUST_IN_FOREST);
    EXPECT_EQ(0x2, TSLAUTH_WINBIND_TRUST_TRANSITIVE);
    EXPECT_EQ(0x4, TSLAUTH_WINBIND_TRUST_INBOUND);
    EXPECT_EQ(0x8, TSLAUTH_WINBIND_TRUST_OUTBOUND);
}

TEST_F(QuestionsTest, AHostThatIsNotJoinedHasNothingToAskAbout) {
    EXPECT_EQ(Domain(), GetActiveDomain(host));
    EXPECT_EQ(TSLAUTH_WINBIND_TRUST_NOT_JOINED, GetDomainTrustState(host));
    EXPECT_THAT(GetTrustedDomains(host), IsEmpty());
    EXPECT_EQ("", GetMachineAccountDN(host));
    EXPECT_EQ(0, GetDomainTrustRelationship(host, "other.example"));
    EXPECT_EQ(TSLAUTH_PROVIDER_NO_SUCH_DOMAIN,
              CodeOf([&] { ConvertCanonicalUsername(host, "CORP\\user1"); }));
    EXPECT_EQ(TSLAUTH_PROVIDER_NO_SUCH_DOMAIN,
              CodeOf([&] { GetHostPrincipalForDomain(host, "corp.example"); }));
    EXPECT_EQ("dc1.corp.example", GetAnyDomainController(host, "", "corp.example"));
    EXPECT_EQ(TSLAUTH_PROVIDER_NO_SUCH_DOMAIN,
              CodeOf([&] { GetAnyDomainController(host, "", "other.example"); }));
}

TEST_F(QuestionsTest, TheDomainIsTheOneThatTheJoinRecorded) {
    Join();
    EXPECT_EQ(Domain("corp.example", "CORP"), GetActiveDomain(host));
    host.Write(Paths::State, "preferred-domain-controllers = \"dc2 dc3\"\n");
    EXPECT_THAT(GetPreferredDomainControllers(host), ElementsAre("dc2", "dc3"));
}

TEST_F(QuestionsTest, TheStateIsWhatWinbinddSays) {
    Join();
    EXPECT_EQ(TSLAUTH_WINBIND_TRUST_HEALTHY, GetDomainTrustState(host));
    winbindd.trust = WBC_ERR_AUTH_ERROR;
    winbindd.trustStatus = 0xC000018B;
    EXPECT_EQ(TSLAUTH_WINBIND_TRUST_SECRET_REFUSED, GetDomainTrustState(host));
    winbindd.ping = WBC_ERR_WINBIND_NOT_AVAILABLE;
    EXPECT_EQ(TSLAUTH_WINBIND_TRUST_NOT_RUNNING, GetDomainTrustState(host));
    winbindd.ping = WBC_ERR_INVALID_RESPONSE;
    EXPECT_EQ(TSLAUTH_WINBIND_TRUST_NOT_ANSWERING, GetDomainTrustState(host));
}

TEST_F(QuestionsTest, TrustedDomainsAreTheDirectorysAndThoseThatWereMet) {
    Join();
    Trust("2", "8");
    winbindd.domains.push_back({"FAR", "far.example", WBC_DOMINFO_TRUSTTYPE_FOREST, "", ""});
    EXPECT_THAT(GetTrustedDomains(host),
                ElementsAre(Domain("other.example", "OTHER"), Domain("far.example", "FAR")));
    // Whom the host's domain does not trust does not log in.
    Trust("1", "8");
    winbindd.domains.pop_back();
    EXPECT_THAT(GetTrustedDomains(host), IsEmpty());
}

TEST_F(QuestionsTest, WithoutAControllerTheLastAnswerStands) {
    Join();
    Trust("3", "8");
    EXPECT_THAT(GetTrustedDomains(host), ElementsAre(Domain("other.example", "OTHER")));
    host.directory = {{"trustedDomain", "No logon servers are currently available\n"}};
    EXPECT_THAT(GetTrustedDomains(host), ElementsAre(Domain("other.example", "OTHER")));
    host.directory = {{"trustedDomain", "NT_STATUS_ACCESS_DENIED\n"}};
    EXPECT_EQ(TSLAUTH_PROVIDER_ACCESS_DENIED, CodeOf([&] { GetTrustedDomains(host); }));
}

TEST_F(QuestionsTest, TheMachineAccountIsAsTheDirectoryHasIt) {
    Join();
    host.directory = {{"(sAMAccountName=NODE$)", "Got 1 replies\n\ndistinguishedName: CN=NODE\n"}};
    EXPECT_EQ("CN=NODE", GetMachineAccountDN(host));
    EXPECT_THAT(host.State().log, HasSubstr("/run/tslauth-winbind."));
    host.directory.clear();
    EXPECT_EQ(TSLAUTH_PROVIDER_NO_TRUST_SAM_ACCOUNT, CodeOf([&] { GetMachineAccountDN(host); }));
    host.FailAt(host.State().calls + 1, PlayedHost::Fault::TimedOut);
    EXPECT_EQ(TSLAUTH_PROVIDER_TIMED_OUT, CodeOf([&] { GetMachineAccountDN(host); }));
}

TEST_F(QuestionsTest, AControllerIsFoundByEitherNameAndInASite) {
    Join();
    EXPECT_EQ("dc1.corp.example", GetAnyDomainController(host, "", "corp.example."));
    EXPECT_EQ("dc1.corp.example", GetAnyDomainController(host, "", "CORP"));
    EXPECT_EQ("Here.dc1.corp.example", GetAnyDomainController(host, "Here", "corp.example"));
    EXPECT_EQ(TSLAUTH_PROVIDER_NO_SUCH_DOMAIN,
              CodeOf([&] { GetAnyDomainController(host, "", "nowhere.example"); }));
    // Trusted, and winbindd finds none.
    Trust("3", "8");
    EXPECT_EQ(TSLAUTH_PROVIDER_NO_LOGON_SERVERS,
              CodeOf([&] { GetAnyDomainController(host, "", "other.example"); }));
}

TEST_F(QuestionsTest, AUserHasOneNameInEveryForm) {
    Join();
    EXPECT_EQ("CORP\\user1", ConvertCanonicalUsername(host, "CORP\\user1"));
    EXPECT_EQ("CORP\\user1", ConvertCanonicalUsername(host, "corp.example\\user1"));
    EXPECT_EQ("CORP\\user1", ConvertCanonicalUsername(host, "user1@corp.example"));
    winbindd.users[{"CORP", "one@elsewhere.example"}] = "CORP\\user1";
    EXPECT_EQ("CORP\\user1", ConvertCanonicalUsername(host, "one@elsewhere.example"));
    host.directory = {{"(cn=User One)",
                       "Got 2 replies\n\ncanonicalName: corp.example/Staff/User One\n"
                       "sAMAccountName: user1\n\n"
                       "canonicalName: corp.example/Gone/User One\n"
                       "sAMAccountName: other\n"}};
    EXPECT_EQ("CORP\\user1", ConvertCanonicalUsername(host, "corp.example/Staff/User One"));
    EXPECT_EQ(TSLAUTH_PROVIDER_NO_SUCH_USER,
              CodeOf([&] { ConvertCanonicalUsername(host, "corp.example/Nowhere/User One"); }));
    EXPECT_EQ(TSLAUTH_PROVIDER_NO_SUCH_USER,
              CodeOf([&] { ConvertCanonicalUsername(host, "CORP\\nobody"); }));
    EXPECT_EQ(TSLAUTH_PROVIDER_NO_SUCH_DOMAIN,
              CodeOf([&] { ConvertCanonicalUsername(host, "NOWHERE\\user1"); }));
}

TEST_F(QuestionsTest, AUserOfATrustedDomainIsAskedForThere) {
    Join();
    Meet();
    winbindd.users[{"OTHER", "user2"}] = "OTHER\\user2";
    EXPECT_EQ("OTHER\\user2", ConvertCanonicalUsername(host, "OTHER\\user2"));
    host.directory = {
        {"-S dc2.other.example",
         "Got 1 replies\n\ncanonicalName: other.example/Two\nsAMAccountName: user2\n"}};
    EXPECT_EQ("OTHER\\user2", ConvertCanonicalUsername(host, "other.example/Two"));
    winbindd.lookup = WBC_ERR_WINBIND_NOT_AVAILABLE;
    EXPECT_EQ(TSLAUTH_PROVIDER_TIMED_OUT,
              CodeOf([&] { ConvertCanonicalUsername(host, "two@other.example"); }));
}

TEST_F(QuestionsTest, ThePrincipalIsTheSameForEveryDomain) {
    Join();
    Meet();
    EXPECT_THAT(GetHostPrincipalForDomain(host, "corp.example"),
                testing::EndsWith("@CORP.EXAMPLE"));
    EXPECT_THAT(GetHostPrincipalForDomain(host, "corp.example"), testing::StartsWith("host/node"));
    EXPECT_EQ(GetHostPrincipalForDomain(host, "corp.example"),
              GetHostPrincipalForDomain(host, "OTHER"));
    EXPECT_EQ(TSLAUTH_PROVIDER_NO_SUCH_DOMAIN,
              CodeOf([&] { GetHostPrincipalForDomain(host, "nowhere.example"); }));
}

TEST_F(QuestionsTest, ARelationshipIsTheDirectorysOrFollowsFromTheForest) {
    Join();
    EXPECT_EQ(0xF, GetDomainTrustRelationship(host, "CORP"));
    EXPECT_EQ(0, GetDomainTrustRelationship(host, "nowhere.example"));
    Trust("3", "8");
    EXPECT_EQ(0xE, GetDomainTrustRelationship(host, "other.example"));
    Trust("1", "32");
    EXPECT_EQ(0x7, GetDomainTrustRelationship(host, "OTHER"));
    Trust("2", "1");
    EXPECT_EQ(0x8, GetDomainTrustRelationship(host, "OTHER"));
    host.directory.clear();
    Meet();
    EXPECT_EQ(0xA, GetDomainTrustRelationship(host, "other.example"));
    winbindd.domains.back().forest = "corp.example";
    EXPECT_EQ(0xF, GetDomainTrustRelationship(host, "other.example"));
}
