// SPDX-License-Identifier: Apache-2.0
#include "join/DomainJoin.h"

#include "Failure.h"
#include "PlayedHost.h"
#include "host/Membership.h"
#include "join/DomainPart.h"
#include "tslauth_winbind_provider.h"

#include <functional>
#include <gmock/gmock.h>
#include <optional>
#include <string>
#include <sys/stat.h>
#include <unistd.h>

namespace tessel::winbind {
namespace {

using testing::HasSubstr;
using testing::Not;
using Fault = PlayedHost::Fault;
using Code = ActiveDirectoryClientErrorCode;

constexpr char domain[] = "corp.example";
constexpr char controller[] = "dc1.corp.example";
constexpr char administrators[] = "# ours\n[global]\n\tlog level = 1\n";

/// 0 for a success.
Code CodeOf(std::function<void()> const& operation, std::string* text = nullptr) {
    try {
        operation();
        return TSLAUTH_PROVIDER_SUCCESS;
    } catch (Failure const& e) {
        if (text) {
            *text = e.what();
        }
        return e.Code();
    }
}

Code Join(PlayedHost const& host, char const* password = "secret", std::string const& unit = "",
          std::string* text = nullptr) {
    return CodeOf(
        [&] {
            DomainJoin::WithCredentials(host, domain, unit, {"joiner", password});
        },
        text);
}

Code JoinOffline(PlayedHost const& host, char const* blob = "QUJD", char const* name = "node",
                 char const* from = controller, std::string* text = nullptr) {
    return CodeOf(
        [&] {
            DomainJoin::WithMachineAccount(host, {"", "CORP", domain, "S-1-5"},
                                           {name, domain, "", blob, from});
        },
        text);
}

Code Part(PlayedHost const& host) {
    ActiveDirectoryClientCredentials const credentials = {"joiner", "secret"};
    return CodeOf([&] { PartFromDomain(host, &credentials); });
}

/// As an administrator has it, with the secrets and keys of others.
void Furnish(PlayedHost const& host) {
    host.Write(Paths::State, "keytab = \"yes\"\n");
    host.Write(Paths::Keytab, "others' keys, ");
    ASSERT_EQ(0, ::chmod(host.At(Paths::Keytab).c_str(), 0600));
    host.Write(Paths::Samba, administrators);
    host.Write(Paths::Kerberos, "[libdefaults]\n");
    host.Write("/var/lib/samba/private/secrets.tdb", "others' secrets");
    ASSERT_EQ(0, ::chmod(host.At("/var/lib/samba/private/secrets.tdb").c_str(), 0600));
}

/// Starts from a machine of either kind, with winbindd running or not.
struct Start {
    bool isFurnished;
    bool daemonRuns;
};
constexpr Start starts[] = {{false, false}, {true, false}, {true, true}};

void Prepare(PlayedHost& host, Start const& start) {
    if (start.isFurnished) {
        Furnish(host);
    }
    if (start.daemonRuns) {
        host.Winbindd({})->Restart({});
        host.FailNowhere();
    }
}

std::string Preview(PlayedHost const& host, std::string const& unit = "",
                    char const* password = nullptr) {
    ActiveDirectoryClientCredentials const credentials = {"joiner", password};
    return DomainJoin::Preview(host, domain, unit, password ? &credentials : nullptr);
}

TEST(DomainJoinTest, APreviewTellsWhatItFindsAndChangesNothing) {
    for (Start const& start : starts) {
        PlayedHost host;
        Prepare(host, start);
        auto const before = host.Tree();
        EXPECT_EQ("host: can be joined\n"
                  "controller: dc1.corp.example\n"
                  "clock: as the controller's\n"
                  "computer: NODE\n"
                  "unit: left to the domain\n"
                  "account: not looked at, which takes an account\n",
                  Preview(host));
        EXPECT_EQ(before, host.Tree());
        EXPECT_FALSE(host.State().hasAccount);
        EXPECT_EQ(start.daemonRuns, host.State().daemonRuns);
    }
}

TEST(DomainJoinTest, APreviewInSomebodysNameAsksTheDirectory) {
    PlayedHost host;
    host.directory = {{"(sAMAccountName=", "Got 0 replies\n\n"},
                      {"(distinguishedName=OU=Servers,", "Got 1 replies\n\n"
                                                         "distinguishedName: OU=Servers\n"},
                      {"(distinguishedName=", "Got 0 replies\n\n"}};
    EXPECT_THAT(Preview(host, "Servers", "secret"),
                HasSubstr("unit: OU=Servers,DC=corp,DC=example\n"
                          "account: there is none of this name yet\n"));
    EXPECT_THAT(Preview(host, "Nowhere", "secret"),
                HasSubstr("unit: 'OU=Nowhere,DC=corp,DC=example' is not there; the join would be "
                          "refused\n"));
    host.directory = {{"(sAMAccountName=", "Got 1 replies\n\n"
                                           "distinguishedName: CN=NODE,OU=Old\n"}};
    EXPECT_THAT(Preview(host, "", "secret"),
                HasSubstr("account: 'CN=NODE,OU=Old' is there, and would be taken over\n"));
}

TEST(DomainJoinTest, APreviewTellsWhatWouldStopTheJoin) {
    PlayedHost host;
    host.SetInfo("Server time offset: 400\n");
    EXPECT_THAT(Preview(host), HasSubstr("clock: the clock of 'dc1.corp.example' is ahead by 400 "
                                         "seconds; the join would be refused\n"));
    host.SetInfo("Server time offset: -7\n");
    EXPECT_THAT(Preview(host), HasSubstr("clock: 7 seconds ahead of the controller's\n"));
    ASSERT_EQ(0U, Join(host));
    EXPECT_THAT(Preview(host), HasSubstr("host: this host is joined to 'corp.example'; the join "
                                         "would be refused\n"));
}

TEST(DomainJoinTest, AHostIsJoinedAndPartedByteForByte) {
    for (Start const& start : starts) {
        PlayedHost host;
        Prepare(host, start);
        auto const before = host.Tree();

        EXPECT_EQ(0U, Join(host));
        EXPECT_TRUE(host.State().hasAccount);
        EXPECT_TRUE(host.State().daemonRuns);
        auto const membership = Membership::Read(host);
        ASSERT_TRUE(membership);
        EXPECT_EQ(domain, membership->DNSName());
        EXPECT_EQ("CORP", membership->domain.workgroup);
        EXPECT_EQ("NODE", membership->domain.netbiosName);
        EXPECT_EQ("secrets of a join", host.Read("/var/lib/samba/private/secrets.tdb"));
        EXPECT_FALSE(std::filesystem::exists(host.At(Paths::OpenChange)));
        EXPECT_EQ(TSLAUTH_PROVIDER_SETUP_ALREADY_JOINED, Join(host));

        EXPECT_EQ(0U, Part(host));
        EXPECT_FALSE(host.State().hasAccount);
        EXPECT_EQ(start.daemonRuns, host.State().daemonRuns);
        auto after = host.Tree();
        if (!start.daemonRuns) {
            after.erase("/var/lib/samba/winbindd_idmap.tdb"); // the numbers of users stay
        }
        after.erase("/run/samba");
        EXPECT_EQ(before, after);
    }
}

TEST(DomainJoinTest, SambaIsAskedForItsFoldersOnce) {
    PlayedHost host;
    ASSERT_EQ(0U, Join(host));
    std::string const log = host.State().log;
    EXPECT_THAT(log, HasSubstr("testparm"));
    EXPECT_EQ(log.find("testparm"), log.rfind("testparm")) << log;
}

TEST(DomainJoinTest, TheUnitIsHandedOn) {
    PlayedHost host;
    ASSERT_EQ(0U, Join(host, "secret", "Servers/Linux"));
    EXPECT_THAT(host.State().log,
                HasSubstr("createcomputer=OU=Linux,OU=Servers,DC=corp,DC=example\n"));
}

TEST(DomainJoinTest, TheOptionsOfTheProvidersFileCount) {
    PlayedHost host;
    host.Write(Paths::State, "short-names = \"yes\"\nhome-folder = \"/srv/%U\"\n");
    ASSERT_EQ(0U, Join(host));
    EXPECT_THAT(host.Read(Paths::OwnSamba), HasSubstr("winbind use default domain = yes\n"));
    EXPECT_THAT(host.Read(Paths::OwnSamba), HasSubstr("template homedir = /srv/%U\n"));
}

TEST(DomainJoinTest, AnOptionThatIsNoneIsFoundBeforeAnythingIsAsked) {
    PlayedHost host;
    host.Write(Paths::State, "short-names = \"maybe\"\n");
    std::string text;
    EXPECT_EQ(TSLAUTH_PROVIDER_INVALID_PARAMETER, Join(host, "secret", "", &text));
    EXPECT_THAT(text, HasSubstr("the option 'short-names' is 'maybe' and must be 'yes' or 'no'"));
    EXPECT_EQ(0U, host.State().calls);
}

TEST(DomainJoinTest, AHostJoinsUnderTheNameOfTheOption) {
    PlayedHost host;
    host.Write(Paths::State, "computer-name = \"rack17\"\n");
    ASSERT_EQ(0U, Join(host));
    EXPECT_EQ("RACK17", Membership::Read(host)->domain.netbiosName);
    EXPECT_THAT(host.State().log, HasSubstr(" dnshostname=node.corp.example\n"));
}

TEST(DomainJoinTest, AComputerNameThatIsTooLongIsRefused) {
    PlayedHost host;
    host.Write(Paths::State, "computer-name = \"hypervisor-rack17\"\n");
    EXPECT_EQ(TSLAUTH_PROVIDER_INVALID_COMPUTER_NAME, Join(host));
    EXPECT_EQ(0U, host.State().calls);
}

TEST(DomainJoinTest, TheKeytabIsWrittenWhereItIsAskedForAndPutBackByAPart) {
    for (bool const wasThere : {false, true}) {
        PlayedHost host;
        host.Write(Paths::State, "keytab = \"yes\"\n");
        if (wasThere) {
            host.Write(Paths::Keytab, "others' keys, ");
            ASSERT_EQ(0, ::chmod(host.At(Paths::Keytab).c_str(), 0600));
        }
        auto const before = host.Tree();
        ASSERT_EQ(0U, Join(host));
        EXPECT_EQ(wasThere ? "others' keys, keys of node" : "keys of node",
                  host.Read(Paths::Keytab));
        struct stat status = {};
        ASSERT_EQ(0, ::stat(host.At(Paths::Keytab).c_str(), &status));
        EXPECT_EQ(0600U, status.st_mode & 0777U);
        EXPECT_THAT(host.Read(Paths::OwnSamba),
                    HasSubstr("kerberos method = secrets and keytab\n"));
        ASSERT_EQ(0U, Part(host));
        auto after = host.Tree();
        for (char const* const path :
             {"/etc/krb5.keytab", "/etc/krb5.keytab.tslauth-before-join"}) {
            EXPECT_EQ(before.count(path), after.count(path)) << path;
        }
        if (wasThere) {
            EXPECT_EQ(before.at(Paths::Keytab), after.at(Paths::Keytab));
        }
    }
}

TEST(DomainJoinTest, WithoutTheOptionTheKeytabIsLeftAlone) {
    PlayedHost host;
    host.Write(Paths::Keytab, "others' keys");
    ASSERT_EQ(0U, Join(host));
    EXPECT_EQ("others' keys", host.Read(Paths::Keytab));
    EXPECT_THAT(host.State().log, Not(HasSubstr("keytab")));
    EXPECT_THAT(host.State().log, Not(HasSubstr("dns register")));
    ASSERT_EQ(0U, Part(host));
    EXPECT_EQ("others' keys", host.Read(Paths::Keytab));
}

TEST(DomainJoinTest, DNSIsToldWhereItIsAskedForAndItsNoIsNoneForTheJoin) {
    PlayedHost host;
    host.Write(Paths::State, "register-in-dns = \"yes\"\n");
    ASSERT_EQ(0U, Join(host));
    EXPECT_THAT(host.State().log, HasSubstr(" ads dns register -P -S dc1.corp.example "
                                            "node.corp.example\n"));
    std::size_t const last = host.State().calls;
    PlayedHost other;
    other.Write(Paths::State, "register-in-dns = \"yes\"\n");
    other.FailAt(last, Fault::Refused);
    EXPECT_EQ(0U, Join(other));
    EXPECT_TRUE(Membership::Read(other));
}

TEST(DomainJoinTest, NoSecretIsInAnArgument) {
    PlayedHost host;
    ASSERT_EQ(0U, Join(host));
    EXPECT_THAT(host.State().log, Not(HasSubstr("secret")));
}

TEST(DomainJoinTest, AMachineAccountJoinsWithItsControllerFirst) {
    PlayedHost host;
    host.State().hasAccount = true;
    ASSERT_EQ(0U, JoinOffline(host));
    EXPECT_EQ("secrets of an offline join", host.Read("/var/lib/samba/private/secrets.tdb"));
    EXPECT_THAT(host.Read(Paths::OwnSamba), HasSubstr("password server = dc1.corp.example *"));
    EXPECT_THAT(host.State().log, Not(HasSubstr("ads join")));
}

TEST(DomainJoinTest, AMachineAccountForAnotherHostOrWithoutABlobIsRefused) {
    PlayedHost host;
    auto const before = host.Tree();
    EXPECT_EQ(TSLAUTH_PROVIDER_INVALID_COMPUTER_NAME, JoinOffline(host, "QUJD", "other"));
    EXPECT_EQ(TSLAUTH_PROVIDER_INVALID_PARAMETER, JoinOffline(host, ""));
    EXPECT_EQ(TSLAUTH_PROVIDER_INVALID_PARAMETER, JoinOffline(host, "not base64!"));
    EXPECT_EQ(TSLAUTH_PROVIDER_INVALID_PARAMETER, JoinOffline(host, "QUJD", "node", "-S"));
    EXPECT_EQ(0U, host.State().calls);
    EXPECT_EQ(before, host.Tree());
}

TEST(DomainJoinTest, ANoIsHandedOnWithItsReason) {
    PlayedHost host;
    Furnish(host);
    auto const before = host.Tree();
    EXPECT_EQ(TSLAUTH_PROVIDER_LOGON_FAILURE, Join(host, "wrong"));
    host.joinText = "Failed to join domain: failed to precreate account in ou X: No such object\n";
    std::string text;
    EXPECT_EQ(TSLAUTH_PROVIDER_INVALID_PARAMETER, Join(host, "secret", "X", &text));
    EXPECT_THAT(text, HasSubstr("failed to precreate account in ou X"));
    EXPECT_EQ(before, host.Tree());
}

TEST(DomainJoinTest, WhoIsJoinedByOtherMeansOrIsAControllerIsLeftAlone) {
    PlayedHost host;
    host.role = "ROLE_DOMAIN_MEMBER";
    host.security = "ADS";
    EXPECT_EQ(0U, CodeOf([&] { DomainJoin::RequireJoinable(host); }));
    host.hasSecret = true;
    EXPECT_EQ(TSLAUTH_PROVIDER_SETUP_ALREADY_JOINED, Join(host));
    EXPECT_EQ(TSLAUTH_PROVIDER_SETUP_ALREADY_JOINED,
              CodeOf([&] { DomainJoin::RequireJoinable(host); }));
    host.role = "active directory domain controller";
    EXPECT_EQ(TSLAUTH_PROVIDER_SETUP_ALREADY_JOINED, Join(host));
}

TEST(DomainJoinTest, WhatIsMissingIsFoundBeforeAnythingIsAsked) {
    for (std::string const program : {"net", "testparm", "winbindd"}) {
        PlayedHost host;
        host.missing = ' ' + program + ' ';
        std::string text;
        EXPECT_EQ(TSLAUTH_PROVIDER_SERVICE_DOES_NOT_EXIST, Join(host, "secret", "", &text));
        EXPECT_THAT(text, HasSubstr("'" + program + "' is not installed"));
        EXPECT_EQ(TSLAUTH_PROVIDER_SERVICE_DOES_NOT_EXIST, JoinOffline(host));
        EXPECT_EQ(TSLAUTH_PROVIDER_SERVICE_DOES_NOT_EXIST,
                  CodeOf([&] { DomainJoin::RequireJoinable(host); }));
        EXPECT_EQ(0U, host.State().calls);
    }
}

TEST(DomainJoinTest, AFullDiskIsFoundBeforeTheDirectoryIsChanged) {
    for (std::string const folder : {"/var/lib/samba", "/var/lib/samba/private", "/var/cache/samba",
                                     "/run/samba", "/etc/samba", "/etc"}) {
        PlayedHost host;
        auto const before = host.Tree();
        host.free[folder] = 100 * 1024;
        std::string text;
        EXPECT_EQ(TSLAUTH_WINBIND_DISK_FULL, Join(host, "secret", "", &text)) << folder;
        EXPECT_THAT(text, HasSubstr(folder + "' has only 100 KiB left"));
        EXPECT_EQ(TSLAUTH_WINBIND_DISK_FULL, CodeOf([&] { DomainJoin::RequireJoinable(host); }));
        EXPECT_EQ(before, host.Tree());
        EXPECT_FALSE(host.State().hasAccount);
    }
}

TEST(DomainJoinTest, WhereNoStagingFolderCanBeMadeNothingIsAsked) {
    PlayedHost host;
    std::filesystem::remove_all(host.At("/run"));
    EXPECT_NE(0U, CodeOf([&] { DomainJoin::RequireJoinable(host); }));
    EXPECT_NE(0U, JoinOffline(host));
    EXPECT_THAT(host.State().log, Not(HasSubstr("net")));
}

TEST(DomainJoinTest, LookingAtAHostChangesNothing) {
    PlayedHost host;
    Furnish(host);
    host.Write(Paths::OpenChange, "");
    host.Write("/etc/samba/.tslauth-smb.conf.original", "left");
    auto const before = host.Tree();
    EXPECT_EQ(0U, CodeOf([&] { DomainJoin::RequireJoinable(host); }));
    EXPECT_EQ(before, host.Tree());
}

// --- every call of a tool fails once ---

/// What a code promises of the host and of the directory.
void ExpectPromiseKept(PlayedHost const& host, std::map<std::string, std::string> const& before,
                       bool hadAccount, Code code, std::string const& text) {
    if (code == TSLAUTH_PROVIDER_SUCCESS) {
        EXPECT_TRUE(Membership::Read(host));
        EXPECT_TRUE(host.State().hasAccount);
        EXPECT_TRUE(host.State().daemonRuns);
        return;
    }
    if (code != TSLAUTH_WINBIND_HOST_CHANGED) {
        EXPECT_EQ(before, host.Tree());
    }
    if (host.State().hasAccount != hadAccount) {
        EXPECT_TRUE(code == TSLAUTH_WINBIND_ACCOUNT_LEFT || code == TSLAUTH_WINBIND_HOST_CHANGED ||
                    code == TSLAUTH_PROVIDER_NO_LOGON_SERVERS);
        EXPECT_THAT(text, HasSubstr("the account 'NODE$'"));
    }
}

/// Runs `operation` with each of its calls failing, in every way, and each of what follows failing
/// as well.
template <typename Operation>
std::size_t FailEverywhere(Start const& start, bool hadAccount, Operation operation) {
    std::size_t failed = 0;
    for (Fault const fault : {Fault::Refused, Fault::TimedOut, Fault::Killed}) {
        bool isReached = true;
        for (std::size_t first = 1; isReached; ++first) {
            for (std::size_t second = first;; ++second) {
                PlayedHost host;
                Prepare(host, start);
                host.State().hasAccount = hadAccount;
                auto const before = host.Tree();
                bool const daemonRan = host.State().daemonRuns;
                host.FailAt(first, fault);
                host.FailAt(second, fault);
                std::string text;
                Code const code = operation(host, text);
                SCOPED_TRACE("faults at " + std::to_string(first) + " and " +
                             std::to_string(second) + ", code " + std::to_string(code) + ", " +
                             text + '\n' + host.State().log);
                isReached = host.State().calls >= first;
                if (host.State().calls < second) {
                    break;
                }
                ++failed;
                ExpectPromiseKept(host, before, hadAccount, code, text);
                if (code != 0 && code != TSLAUTH_WINBIND_HOST_CHANGED) {
                    EXPECT_EQ(daemonRan, host.State().daemonRuns);
                }
            }
        }
    }
    return failed;
}

TEST(DomainJoinTest, WhateverToolFailsTheHostIsAsItWasOrTheCodeSaysThatItIsNot) {
    for (Start const& start : starts) {
        EXPECT_GT(FailEverywhere(start, false,
                                 [](PlayedHost const& host, std::string& text) {
                                     return Join(host, "secret", "Servers", &text);
                                 }),
                  60U);
    }
}

TEST(DomainJoinTest, WhateverToolFailsAnOfflineJoinLeavesTheHostAsItWas) {
    EXPECT_GT(FailEverywhere(starts[1], true,
                             [](PlayedHost const& host, std::string& text) {
                                 return JoinOffline(host, "QUJD", "node", controller, &text);
                             }),
              35U);
}

TEST(DomainJoinTest, ANetThatDiesAfterItMadeTheAccountIsUndone) {
    PlayedHost host;
    auto const before = host.Tree();
    // testparm, DNS, lookup, DNS, info, join.
    host.FailAt(6, Fault::Killed);
    std::string text;
    EXPECT_EQ(TSLAUTH_WINBIND_SEE_SYSTEM_LOG, Join(host, "secret", "", &text));
    EXPECT_THAT(text, HasSubstr("ended by signal 9 (Killed)"));
    EXPECT_FALSE(host.State().hasAccount);
    EXPECT_THAT(host.State().log, HasSubstr("ads user delete"));
    EXPECT_EQ(before, host.Tree());
}

TEST(DomainJoinTest, AnAccountThatWasThereBeforeIsNotDeleted) {
    PlayedHost host;
    host.rejoins = true;
    host.State().hasAccount = true;
    auto const before = host.Tree();
    host.FailAt(7, Fault::Refused); // the start of winbindd
    std::string text;
    EXPECT_EQ(TSLAUTH_WINBIND_ACCOUNT_LEFT, Join(host, "secret", "", &text));
    EXPECT_THAT(text, HasSubstr("the account 'NODE$' was there before, and stays"));
    EXPECT_TRUE(host.State().hasAccount);
    EXPECT_EQ(before, host.Tree());
}

// --- what an operation without an end has left ---

/// A host that is joined, with the mark of a change that did not end.
void JoinInHalf(PlayedHost& host) {
    Furnish(host);
    ASSERT_EQ(0U, Join(host));
    host.Write(Paths::OpenChange, "");
    host.FailNowhere();
}

TEST(DomainJoinTest, AMembershipWithAnOpenMarkStaysUntilTheNewAttemptHasProvedItsCredentials) {
    PlayedHost host;
    JoinInHalf(host);
    auto const before = host.Tree();
    EXPECT_EQ(TSLAUTH_PROVIDER_LOGON_FAILURE, Join(host, "wrong"));
    EXPECT_EQ(before, host.Tree());
    EXPECT_TRUE(Membership::Read(host));
    EXPECT_TRUE(host.State().daemonRuns);
    EXPECT_THAT(host.State().log, Not(HasSubstr("stop winbindd")));
}

TEST(DomainJoinTest, AMembershipWithAnOpenMarkIsReplacedByTheNewOne) {
    PlayedHost host;
    JoinInHalf(host);
    EXPECT_EQ(0U, Join(host));
    EXPECT_TRUE(Membership::Read(host));
    EXPECT_FALSE(std::filesystem::exists(host.At(Paths::OpenChange)));
    // What a part will put back is of before the first join.
    EXPECT_EQ("others' secrets", host.Read("/var/lib/samba/private/tslauth-before-join.tdb"));
    EXPECT_EQ(0U, Part(host));
    EXPECT_EQ(administrators, host.Read(Paths::Samba));
    EXPECT_EQ("others' secrets", host.Read("/var/lib/samba/private/secrets.tdb"));
}

TEST(DomainJoinTest, AnOpenMembershipThatIsGivenUpInVainIsTold) {
    PlayedHost host;
    JoinInHalf(host);
    // testparm, DNS, lookup, DNS, info, join, stop, restart.
    host.FailAt(8, Fault::Refused);
    std::string text;
    EXPECT_EQ(TSLAUTH_WINBIND_HOST_CHANGED, Join(host, "secret", "", &text));
    EXPECT_THAT(text, HasSubstr("the host is not as it was"));
    EXPECT_FALSE(Membership::Read(host));
    EXPECT_EQ(administrators, host.Read(Paths::Samba));
}

} // namespace
} // namespace tessel::winbind
