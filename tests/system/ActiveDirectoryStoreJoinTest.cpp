// SPDX-License-Identifier: Apache-2.0
#include "Failure.h"
#include "JoinableHost.h"

#include <strandctl/HostCtlException.h>
#include <tslauth/Exceptions.h>

#include <gmock/gmock.h>

#include <locale>

using namespace tessel::authentication;
using testing::ElementsAre;
using testing::IsEmpty;

namespace {

Failure BadName(std::string const& detail) {
    return Plain<InvalidHostNameException>("The current hostname is invalid: " + detail);
}

Failure BadCredentials(std::string const& detail) {
    return Plain<InvalidCredentialsException>("The credentials that were provided were invalid: " +
                                              detail);
}

constexpr char NoPassword[] = "empty or no password was specified; the account must have a "
                              "non-empty password to join the host to domain";

constexpr char Searching[] = "nameserver 127.0.0.1\nsearch corp.example\n";
constexpr char NotSearching[] = "nameserver 127.0.0.1\n";

} // namespace

class ActiveDirectoryStoreJoinTest : public Host::JoinTest {
protected:
    void Join(std::string const& domain = "corp.example") {
        Store().JoinDomain(domain, {"joiner", "secret"}, false);
    }

    Failure JoinFailure(std::string const& domain = "corp.example") {
        return FailureOf([&] { Join(domain); });
    }

    /// What the provider's join was called with, or that it was not called.
    std::vector<std::string> Joined() const {
        return ArgumentsOf(2);
    }
};

// ---- The arguments ------------------------------------------------------------------------------

TEST_F(ActiveDirectoryStoreJoinTest, EverythingBehindTheFirstSlashIsTheOrganisationalUnit) {
    struct {
        char const* argument;
        char const* domain;
        char const* unit;
    } const rows[] = {
        {"corp.example/Servers/Linux", "corp.example", "Servers/Linux"},
        {"corp.example", "corp.example", "(null)"},
        {"corp.example/", "corp.example", "(null)"},
        {"corp.example//Servers/", "corp.example", "/Servers/"},
        {"/Servers", "", "Servers"},
        {"", "", "(null)"},
    };
    for (auto const& row : rows) {
        Record().calls[2] = 0;
        Store().JoinDomain(row.argument, {"joiner", "secret"}, true);
        EXPECT_THAT(Joined(), ElementsAre(row.domain, row.unit, "joiner", "secret"))
            << row.argument;
    }
}

TEST_F(ActiveDirectoryStoreJoinTest, TheHostNameIsCheckedAgainstTheDomainWithoutTheUnit) {
    Join("corp.example/Servers");
    EXPECT_THAT(Joined(), ElementsAre("corp.example", "Servers", "joiner", "secret"));
    EXPECT_THAT(Host::SystemLog(), IsEmpty());
}

TEST_F(ActiveDirectoryStoreJoinTest, MissingCredentialsAreRefusedBeforeAnythingIsDone) {
    struct {
        Credentials credentials;
        char const* detail;
    } const rows[] = {
        {{nullptr, nullptr}, "no username was specified"},
        {{nullptr, "secret"}, "no username was specified"},
        {{nullptr, ""}, "no username was specified"},
        {{"joiner", nullptr}, NoPassword},
        {{"joiner", ""}, NoPassword},
        {{"", ""}, NoPassword},
        {{"", nullptr}, NoPassword},
    };
    Host::Write(Host::ResolvConf, NotSearching);
    Resolve("node01.elsewhere.example");
    std::string const before = NameFiles();
    for (auto const& row : rows) {
        EXPECT_EQ(BadCredentials(row.detail),
                  FailureOf([&] { Store().JoinDomain("corp.example", row.credentials, false); }));
    }
    EXPECT_THAT(Joined(), ElementsAre("called 0 times"));
    EXPECT_EQ(before, NameFiles());
}

TEST_F(ActiveDirectoryStoreJoinTest, EmptyUserNameReachesTheProvider) {
    Store().JoinDomain("corp.example", {"", "secret"}, false);
    EXPECT_THAT(Joined(), ElementsAre("corp.example", "(null)", "", "secret"));
}

TEST_F(ActiveDirectoryStoreJoinTest, TheCredentialsAreNotCopied) {
    Credentials const credentials = {"joiner", "secret"};
    Store().JoinDomain("corp.example", credentials, true);
    EXPECT_EQ(&credentials, Record().credentials);
}

TEST_F(ActiveDirectoryStoreJoinTest, JoiningAndPartingDoNotActivateTheStore) {
    auto const before = Host::Snapshot();
    Join();
    Store().PartDomain();
    Store().PartDomain({"joiner", "secret"});
    EXPECT_EQ(before, Host::Snapshot());
}

TEST_F(ActiveDirectoryStoreJoinTest, FailureOfTheProviderPropagatesAndUndoesNothing) {
    Resolve("node01.elsewhere.example node01");
    Record().code = 1326;
    EXPECT_EQ(Coded(typeid(LogonFailureException), 1326,
                    "The attempted logon is invalid. This is due to either a bad user name or "
                    "authentication information."),
              JoinFailure());
    EXPECT_EQ("node01.elsewhere.example node01", HostsEntry());
    EXPECT_EQ(Searching, Host::Read(Host::ResolvConf));
}

TEST_F(ActiveDirectoryStoreJoinTest, JoiningAndPartingThatTheProviderLacksAreNotImplemented) {
    Host::Write(Paths::ProviderConfiguration, "provider = \"null-entries\"\n");
    ActiveDirectoryStore store(60);
    EXPECT_EQ(NotImplemented(), FailureOf([&] {
                  store.JoinDomain("corp.example", {"joiner", "secret"}, true);
              }));
    EXPECT_EQ(NotImplemented(), FailureOf([&] { store.PartDomain(); }));
    EXPECT_EQ(NotImplemented(), FailureOf([&] { store.PartDomain({"joiner", "secret"}); }));
}

// ---- Parting ------------------------------------------------------------------------------------

TEST_F(ActiveDirectoryStoreJoinTest, PartingWithoutCredentialsHandsOnNone) {
    Store().PartDomain();
    EXPECT_EQ(1U, Record().calls[3]);
    EXPECT_EQ(nullptr, Record().credentials);
}

TEST_F(ActiveDirectoryStoreJoinTest, PartingHandsOnWhateverCredentialsThereAre) {
    for (Credentials const& credentials :
         {Credentials{"joiner", "secret"}, Credentials{nullptr, nullptr}, Credentials{"", ""}}) {
        Store().PartDomain(credentials);
        EXPECT_EQ(&credentials, Record().credentials);
    }
    EXPECT_EQ(3U, Record().calls[3]);
}

TEST_F(ActiveDirectoryStoreJoinTest, PartingPassesTheProvidersFailureThrough) {
    Record().code = 1355;
    Failure const noSuchDomain =
        Coded(typeid(NoSuchDomainException), 1355,
              "The specified domain either does not exist or could not be contacted.");
    EXPECT_EQ(noSuchDomain, FailureOf([&] { Store().PartDomain(); }));
    EXPECT_EQ(noSuchDomain, FailureOf([&] { Store().PartDomain({"joiner", "secret"}); }));
}

TEST_F(ActiveDirectoryStoreJoinTest, PartingLeavesTheHostsNameAlone) {
    std::string const before = NameFiles();
    Store().PartDomain();
    Store().PartDomain({"joiner", "secret"});
    EXPECT_EQ(before, NameFiles());
}

// ---- The host's name ----------------------------------------------------------------------------

TEST_F(ActiveDirectoryStoreJoinTest, MatchingNameBecomesTheEntryOfTheManagementAddress) {
    Host::Write(Host::Hosts, "192.0.2.99 node01.corp.example node01\n");
    Join();
    EXPECT_EQ("192.0.2.99 node01.corp.example node01\n"
              "192.0.2.10\tnode01.corp.example node01\n",
              Host::Read(Host::Hosts));
    EXPECT_EQ("node01.corp.example node01", HostsEntry());
    EXPECT_EQ(NotSearching, Host::Read(Host::ResolvConf));
    EXPECT_THAT(Host::SystemLog(), IsEmpty());
    EXPECT_THAT(Joined(), ElementsAre("corp.example", "(null)", "joiner", "secret"));
}

TEST_F(ActiveDirectoryStoreJoinTest, EntryIsReplacedWhereItStandsWithTheShortNameAsItsOnlyAlias) {
    Resolve("node01.corp.example a b node01 c");
    Join();
    EXPECT_EQ(HostsWith("node01.corp.example node01"), Host::Read(Host::Hosts));
}

TEST_F(ActiveDirectoryStoreJoinTest, ShortNamesAreComparedWithCase) {
    Resolve("NODE01.CORP.EXAMPLE node01");
    std::string const before = NameFiles();
    EXPECT_EQ(BadName("shortname does not match FQDN"), JoinFailure());
    EXPECT_EQ(before, NameFiles());
    EXPECT_THAT(Joined(), ElementsAre("called 0 times"));
}

TEST_F(ActiveDirectoryStoreJoinTest, ShortNamesThatDifferAreRefused) {
    for (char const* names : {"node02.corp.example node01", "node02 node01",
                              "node011.corp.example node01", "node0.corp.example node01"}) {
        Resolve(names);
        EXPECT_EQ(BadName("shortname does not match FQDN"), JoinFailure()) << names;
    }
}

TEST_F(ActiveDirectoryStoreJoinTest, FullNamesAreComparedWithoutCase) {
    Resolve("node01.CORP.EXAMPLE node01");
    Join();
    EXPECT_THAT(Host::SystemLog(), IsEmpty());
    EXPECT_EQ(NotSearching, Host::Read(Host::ResolvConf));
    EXPECT_EQ("node01.CORP.EXAMPLE node01", HostsEntry());
}

TEST_F(ActiveDirectoryStoreJoinTest, CaseIsWhatTheDefaultLocaleSays) {
    /// Knows one pair of letters more than the classic one.
    class LatinLetters : public std::ctype<char> {
    protected:
        char do_toupper(char c) const override {
            return c == '\xe4' ? '\xc4' : std::ctype<char>::do_toupper(c);
        }
    };
    Resolve("node01.corp.\xc4xample node01");
    std::locale const before =
        std::locale::global(std::locale(std::locale::classic(), new LatinLetters));
    Failure const failure = JoinFailure("corp.\xe4xample");
    std::locale::global(before);
    EXPECT_EQ(NoFailure(), failure);
    EXPECT_THAT(Host::SystemLog(), IsEmpty());
    Join("corp.\xe4xample");
    EXPECT_EQ(1U, Host::SystemLog().size()) << "in the classic locale they are two letters";
}

TEST_F(ActiveDirectoryStoreJoinTest, NameWithoutADotIsCompletedByTheDomain) {
    Resolve("node01");
    Join();
    EXPECT_EQ("node01.corp.example node01", HostsEntry());
    EXPECT_THAT(Host::SystemLog(), IsEmpty());
    EXPECT_EQ(NotSearching, Host::Read(Host::ResolvConf));
}

TEST_F(ActiveDirectoryStoreJoinTest, HostNameWithItsDomainIsCutAtItsFirstDot) {
    NameHost("node01.corp.example");
    Resolve("node01.corp.example");
    Join();
    EXPECT_EQ("node01.corp.example node01", HostsEntry());
}

TEST_F(ActiveDirectoryStoreJoinTest, AnotherNameIsWarnedAboutAndKeptAndTheDomainIsSearched) {
    Resolve("node01.elsewhere.example node01");
    Join();
    EXPECT_THAT(Host::SystemLog(),
                ElementsAre("warning: The fully qualified hostname node01.elsewhere.example does "
                            "not match the expected value node01.corp.example\n"));
    EXPECT_EQ(Searching, Host::Read(Host::ResolvConf));
    EXPECT_EQ("node01.elsewhere.example node01", HostsEntry());
    EXPECT_THAT(Joined(), ElementsAre("corp.example", "(null)", "joiner", "secret"));
}

TEST_F(ActiveDirectoryStoreJoinTest, DomainThatDoesNotResolveIsNotSearched) {
    Resolve("node01.elsewhere.example node01");
    Join("unknown.example");
    EXPECT_EQ(1U, Host::SystemLog().size());
    EXPECT_EQ(NotSearching, Host::Read(Host::ResolvConf));
    EXPECT_EQ("node01.elsewhere.example node01", HostsEntry());
}

TEST_F(ActiveDirectoryStoreJoinTest, NameOfTheSameLengthInAnotherDomainIsAnother) {
    Resolve("node01.corp.examplf node01");
    Join();
    EXPECT_EQ(1U, Host::SystemLog().size());
    Resolve("node01.corp.example.com node01");
    Join();
    EXPECT_EQ(2U, Host::SystemLog().size());
    Resolve("node01.corp node01");
    Join();
    EXPECT_EQ(3U, Host::SystemLog().size());
}

TEST_F(ActiveDirectoryStoreJoinTest, NamesOnTheBlacklistAreRefused) {
    for (std::string const name : {"localhost", "linux", "hostname"}) {
        std::string const fullName = name + ".corp.example";
        NameHost(fullName);
        Resolve(fullName);
        std::string const before = NameFiles();
        EXPECT_EQ(BadName("hostname is in blacklist"), JoinFailure()) << name;
        EXPECT_EQ(before, NameFiles());
        NameHost(name);
        Resolve(name);
        EXPECT_EQ(BadName("hostname is in blacklist"), JoinFailure()) << name;
    }
    EXPECT_THAT(Joined(), ElementsAre("called 0 times"));
}

TEST_F(ActiveDirectoryStoreJoinTest, TheBlacklistMindsCaseAndTheWholeName) {
    for (std::string const name : {"Localhost", "LINUX", "localhost1", "my-linux", "host"}) {
        NameHost(name);
        // Without the local host, whose name the resolver finds whatever the case.
        Host::Write(Host::Hosts,
                    "192.0.2.9 o\n192.0.2.10 " + name + ".corp.example " + name + "\n");
        EXPECT_EQ(NoFailure(), JoinFailure()) << name;
        EXPECT_EQ(name + ".corp.example " + name, HostsEntry());
    }
}

TEST_F(ActiveDirectoryStoreJoinTest, TheBlacklistIsAskedAfterTheDomainHasBecomeASearchDomain) {
    NameHost("linux");
    Resolve("linux.elsewhere.example linux");
    std::string const before = Host::Read(Host::Hosts);
    EXPECT_EQ(BadName("hostname is in blacklist"), JoinFailure());
    EXPECT_EQ(Searching, Host::Read(Host::ResolvConf));
    EXPECT_EQ(before, Host::Read(Host::Hosts));
    EXPECT_EQ(1U, Host::SystemLog().size());
}

TEST_F(ActiveDirectoryStoreJoinTest, SkippingTheCheckTouchesNothingWhateverTheName) {
    NameHost("localhost");
    Resolve("linux.elsewhere.example localhost");
    Run("ip link set management down");
    std::string const before = NameFiles();
    Store().JoinDomain("corp.example", {"joiner", "secret"}, true);
    EXPECT_EQ(before, NameFiles());
    EXPECT_THAT(Host::SystemLog(), IsEmpty());
    EXPECT_THAT(Joined(), ElementsAre("corp.example", "(null)", "joiner", "secret"));
}

TEST_F(ActiveDirectoryStoreJoinTest, SkippingTheCheckDoesNotEvenReadTheName) {
    NameHost(std::string(64, 'x'));
    Store().JoinDomain("corp.example", {"joiner", "secret"}, true);
    EXPECT_THAT(Joined(), ElementsAre("corp.example", "(null)", "joiner", "secret"));
}

TEST_F(ActiveDirectoryStoreJoinTest, HostNameOf64BytesCannotBeReadAndOneOf63Can) {
    NameHost(std::string(64, 'x'));
    EXPECT_EQ(BadName("unable to get hostname"), JoinFailure());
    std::string const longest(63, 'x');
    NameHost(longest);
    Resolve(longest + ".corp.example " + longest);
    EXPECT_EQ(NoFailure(), JoinFailure());
    EXPECT_EQ(longest + ".corp.example " + longest, HostsEntry());
}

TEST_F(ActiveDirectoryStoreJoinTest, HostNameWithoutAnEntryCannotBeResolved) {
    NameHost("node02");
    std::string const before = NameFiles();
    EXPECT_EQ(BadName("hostname cannot be resolved"), JoinFailure());
    EXPECT_EQ(before, NameFiles());
}

TEST_F(ActiveDirectoryStoreJoinTest, FailureOfTheResolverIsToldInItsOwnWords) {
    // Nobody answers there.
    Host::Write(Paths::NSSConfiguration, "hosts: dns\n");
    Host::Write(Host::ResolvConf, "nameserver 127.0.0.1\noptions timeout:1 attempts:1\n");
    NameHost("node01.corp.example");
    EXPECT_EQ(BadName("Host name lookup failure"), JoinFailure());
    EXPECT_THAT(Joined(), ElementsAre("called 0 times"));
}

TEST_F(ActiveDirectoryStoreJoinTest, EntryThatExceedsTheResolversBufferIsItsFailure) {
    std::string names = "node01.corp.example node01";
    for (int i = 0; i < 100; ++i) {
        names += " alias" + std::to_string(i) + ".corp.example";
    }
    Resolve(names);
    EXPECT_EQ(BadName("Resolver internal error"), JoinFailure());
}

// ---- Failures of the host-control library -------------------------------------------------------

TEST_F(ActiveDirectoryStoreJoinTest, HostWithoutAManagementInterfaceIsNotJoined) {
    Run("ip address flush dev management && ip route flush default 2>/dev/null || true");
    Resolve("node01.elsewhere.example node01");
    Failure const failure = JoinFailure();
    EXPECT_EQ(std::type_index(typeid(HostCtl::Lib::HostCtlException)), failure.type)
        << failure.message;
    EXPECT_EQ(Searching, Host::Read(Host::ResolvConf)) << "an earlier step is not undone";
    EXPECT_THAT(Joined(), ElementsAre("called 0 times"));
}

TEST_F(ActiveDirectoryStoreJoinTest, DNSConfigurationOfAnotherOwnerEndsTheJoin) {
    Resolve("node01.elsewhere.example node01");
    Run("mkdir -p /run/somebody && echo 'nameserver 127.0.0.1' > /run/somebody/resolv.conf && "
        "ln -sf /run/somebody/resolv.conf /etc/resolv.conf");
    std::string const before = NameFiles();
    Failure const failure = JoinFailure();
    Run("rm /etc/resolv.conf");
    EXPECT_EQ(std::type_index(typeid(HostCtl::Lib::HostCtlException)), failure.type)
        << failure.message;
    Host::Write(Host::ResolvConf, NotSearching);
    EXPECT_EQ(before, NameFiles());
    EXPECT_THAT(Joined(), ElementsAre("called 0 times"));
}

TEST_F(ActiveDirectoryStoreJoinTest, HostsFileThatCannotBeReplacedEndsTheJoin) {
    Resolve("node01");
    std::string const before = NameFiles();
    // A mount point cannot be renamed over.
    Mount(Host::Hosts, Host::Hosts, nullptr, MS_BIND, nullptr);
    Failure const failure = JoinFailure();
    EXPECT_EQ(std::type_index(typeid(HostCtl::Lib::HostCtlException)), failure.type)
        << failure.message;
    EXPECT_EQ(before, NameFiles());
    EXPECT_THAT(Joined(), ElementsAre("called 0 times"));
}
