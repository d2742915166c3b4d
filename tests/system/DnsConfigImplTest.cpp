// SPDX-License-Identifier: Apache-2.0
#include <strandctl/DnsConfigImpl.h>

#include "../HostCtlFailure.h"
#include "../TemporaryFolder.h"
#include "Node.h"

#include <filesystem>
#include <gmock/gmock.h>
#include <netinet/in.h>
#include <resolv.h>
#include <string>
#include <sys/stat.h>
#include <vector>

namespace StrandCtl::Network {
namespace {

using testing::ElementsAre;

constexpr char path[] = "/etc/resolv.conf";
constexpr char before[] = "# name servers\nnameserver 192.0.2.1\noptions ndots:2 \n";

class DnsConfigImplTest : public testing::Test {
protected:
    void SetUp() override {
        std::filesystem::remove(path);
        SetContents(path, before);
        std::filesystem::permissions(path, std::filesystem::perms(0644));
    }
    void TearDown() override {
        std::filesystem::remove(path);
        std::filesystem::remove_all("/run/systemd");
    }
};

void Add(std::string const& domain) {
    DnsConfigImpl configuration;
    configuration.AddSearchDomain(domain);
    configuration.SaveConfig();
}

/// The search list as the system's resolver has it, within the limits that all resolvers share.
std::vector<std::string> SearchList() {
    struct __res_state state = {};
    EXPECT_EQ(0, res_ninit(&state));
    std::vector<std::string> list;
    for (char* const* domain = state.dnsrch; *domain; ++domain) {
        list.push_back(*domain);
    }
    res_nclose(&state);
    return list;
}

TEST_F(DnsConfigImplTest, TheResolverSearchesTheDomain) {
    Add("corp.example");
    EXPECT_EQ(std::string(before) + "search corp.example\n", Contents(path));
    EXPECT_THAT(SearchList(), ElementsAre("corp.example"));
    Add("Other.Example");
    EXPECT_EQ(std::string(before) + "search corp.example Other.Example\n", Contents(path));
    EXPECT_THAT(SearchList(), ElementsAre("corp.example", "Other.Example"));
}

TEST_F(DnsConfigImplTest, TheListOfADomainLineIsKept) {
    SetContents(path, "search x.example\ndomain a.example b\n");
    EXPECT_THAT(SearchList(), ElementsAre("a.example"));
    Add("corp.example");
    EXPECT_THAT(SearchList(), ElementsAre("a.example", "corp.example"));
}

TEST_F(DnsConfigImplTest, CarriageReturnsDoNotHideTheDomain) {
    SetContents(path, "nameserver 192.0.2.1\r\nsearch corp.example\r\n");
    EXPECT_THAT(SearchList(), ElementsAre("corp.example\r"));
    Add("corp.example");
    EXPECT_THAT(SearchList(), ElementsAre("corp.example"));
    SetContents(path, "search a.example\r\n");
    Add("corp.example");
    EXPECT_THAT(SearchList(), ElementsAre("a.example", "corp.example"));
}

TEST_F(DnsConfigImplTest, NothingIsWrittenBeforeSaveConfig) {
    DnsConfigImpl configuration;
    configuration.AddSearchDomain("corp.example");
    EXPECT_EQ(before, Contents(path));
}

TEST_F(DnsConfigImplTest, SaveConfigWithoutDomainsWritesNothing) {
    std::filesystem::remove(path);
    DnsConfigImpl().SaveConfig();
    EXPECT_FALSE(std::filesystem::exists(path));
}

TEST_F(DnsConfigImplTest, ADomainIsAddedOnce) {
    DnsConfigImpl configuration;
    for (char const* const domain :
         {"corp.example", "b.example", "CORP.example", "corp.example."}) {
        configuration.AddSearchDomain(domain);
    }
    configuration.SaveConfig();
    std::string const once = std::string(before) + "search corp.example b.example\n";
    EXPECT_EQ(once, Contents(path));
    struct stat first = {}, second = {};
    ASSERT_EQ(0, stat(path, &first));
    configuration.SaveConfig();
    Add("corp.example");
    ASSERT_EQ(0, stat(path, &second));
    EXPECT_EQ(once, Contents(path));
    EXPECT_EQ(first.st_ino, second.st_ino) << "nothing had to be written";
}

TEST_F(DnsConfigImplTest, WhatOthersWroteInBetweenStays) {
    DnsConfigImpl configuration;
    configuration.AddSearchDomain("corp.example");
    SetContents(path, "nameserver 192.0.2.2\nsearch a.example\n");
    configuration.SaveConfig();
    EXPECT_EQ("nameserver 192.0.2.2\nsearch a.example corp.example\n", Contents(path));
}

TEST_F(DnsConfigImplTest, ItsModeIsKeptAndAMissingFileIsMade) {
    std::filesystem::permissions(path, std::filesystem::perms(0640));
    Add("corp.example");
    EXPECT_EQ(0640U, ModeOf(path));
    std::filesystem::remove(path);
    Add("corp.example");
    EXPECT_EQ("search corp.example\n", Contents(path));
    EXPECT_EQ(0644U, ModeOf(path));
}

TEST_F(DnsConfigImplTest, TheLongestListReachesTheResolverUncut) {
    std::string const label(40, 'a');
    std::string text = "search";
    std::vector<std::string> expected;
    for (char const letter : {'a', 'b', 'c', 'd', 'e'}) {
        expected.push_back(label + "." + letter);
        text += " " + expected.back();
    }
    SetContents(path, text + "\n");
    // 5 * 43 characters and blanks are there.
    expected.push_back(std::string(40, 'x'));
    Add(expected.back());
    EXPECT_EQ(text + " " + expected.back() + "\n", Contents(path));
    EXPECT_EQ(255U, Contents(path).size() - std::string("search \n").size());
    EXPECT_EQ(expected, SearchList());
}

TEST_F(DnsConfigImplTest, ASeventhDomainIsAnErrorAndNothingIsAdded) {
    SetContents(path, "search a b c d e\n");
    DnsConfigImpl configuration;
    configuration.AddSearchDomain("f");
    EXPECT_EQ("Cannot add the search domain 'g': the search list would have 7 domains, and the "
              "limit is 6",
              FailureOf([&] { configuration.AddSearchDomain("g"); }));
    configuration.SaveConfig();
    EXPECT_EQ("search a b c d e f\n", Contents(path));
}

TEST_F(DnsConfigImplTest, AListThatGrewInBetweenIsAnErrorAndStays) {
    DnsConfigImpl configuration;
    configuration.AddSearchDomain("g");
    SetContents(path, "search a b c d e f\n");
    EXPECT_EQ("Cannot add the search domain 'g': the search list would have 7 domains, and the "
              "limit is 6",
              FailureOf([&] { configuration.SaveConfig(); }));
    EXPECT_EQ("search a b c d e f\n", Contents(path));
}

TEST_F(DnsConfigImplTest, ALinkIntoRunNamesItsOwnerAndStays) {
    std::filesystem::remove(path);
    std::filesystem::create_directories("/run/systemd/resolve");
    SetContents("/run/systemd/resolve/stub-resolv.conf", "nameserver 127.0.0.53\nsearch a\n");
    std::filesystem::create_symlink("../run/systemd/resolve/stub-resolv.conf", path);
    EXPECT_EQ("Cannot replace '/etc/resolv.conf': it is kept by systemd-resolved; instead, set "
              "Domains= in /etc/systemd/resolved.conf and restart systemd-resolved",
              FailureOf([] { Add("corp.example"); }));
    EXPECT_TRUE(std::filesystem::is_symlink(path));
    EXPECT_EQ("nameserver 127.0.0.53\nsearch a\n", Contents(path));
    // There is nothing to write for a domain that its owner has put there.
    EXPECT_EQ("(none)", FailureOf([] { Add("a"); }));
    // Before its owner has started, the link leads nowhere.
    std::filesystem::remove_all("/run/systemd");
    EXPECT_THAT(FailureOf([] { Add("corp.example"); }), testing::HasSubstr("systemd-resolved"));
    EXPECT_FALSE(std::filesystem::exists(path));
}

TEST_F(DnsConfigImplTest, AnUnknownOwnerIsNamedByItsFile) {
    std::filesystem::remove(path);
    SetContents("/run/resolv.conf", "search a\n");
    std::filesystem::create_symlink("/var/run/resolv.conf", path);
    EXPECT_EQ("Cannot replace '/etc/resolv.conf': it is kept by the program that writes "
              "'/run/resolv.conf'; instead, set the search domain in that program's own "
              "configuration",
              FailureOf([] { Add("corp.example"); }));
    EXPECT_EQ("search a\n", Contents("/run/resolv.conf"));
}

TEST_F(DnsConfigImplTest, AHeaderNamesTheOwner) {
    std::string const text = "# Generated by NetworkManager\nnameserver 192.0.2.1\n";
    SetContents(path, text);
    EXPECT_EQ("Cannot replace '/etc/resolv.conf': it is kept by NetworkManager; instead, set "
              "ipv4.dns-search of the connection with nmcli and bring it up again",
              FailureOf([] { Add("corp.example"); }));
    EXPECT_EQ(text, Contents(path));
}

TEST_F(DnsConfigImplTest, ALinkElsewhereStaysAndItsDestinationIsReplaced) {
    std::filesystem::rename(path, "/etc/tessel/resolv.conf");
    std::filesystem::create_symlink("tessel/resolv.conf", path);
    Add("corp.example");
    EXPECT_TRUE(std::filesystem::is_symlink(path));
    EXPECT_EQ(std::string(before) + "search corp.example\n", Contents("/etc/tessel/resolv.conf"));
    std::filesystem::remove("/etc/tessel/resolv.conf");
}

} // namespace
} // namespace StrandCtl::Network
