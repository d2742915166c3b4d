// SPDX-License-Identifier: Apache-2.0
#include <strandctl/NetworkInfoImpl.h>

#include "../HostCtlFailure.h"
#include "../TemporaryFolder.h"
#include "Node.h"

#include <cstdlib>
#include <filesystem>
#include <gtest/gtest.h>
#include <sched.h>
#include <string>

namespace StrandCtl::Network {
namespace {

constexpr char path[] = "/etc/tessel/host.conf";

/// Each test has a network of its own: "eth0" and "eth1", both ends of one cable.
class NetworkInfoImplTest : public testing::Test {
protected:
    void SetUp() override {
        std::filesystem::remove_all(path);
        ASSERT_EQ(0, unshare(CLONE_NEWNET));
        IP("link set lo up");
        IP("link add eth0 type veth peer name eth1");
        IP("link set eth0 up");
        IP("link set eth1 up");
    }
    void TearDown() override {
        std::filesystem::remove_all(path);
    }

    static void IP(std::string const& arguments) {
        ASSERT_EQ(0, std::system(("ip " + arguments).c_str())) << arguments;
    }
    static std::string Interface() {
        auto const interface = NetworkInfoImpl().GetManagementInterface();
        return interface.GetName() + " " + interface.GetIpConfig().GetIpv4Address().ToString();
    }
};

TEST_F(NetworkInfoImplTest, IsTheInterfaceOfTheDefaultRoute) {
    IP("address add 192.0.2.1/24 dev eth0");
    IP("address add 198.51.100.1/24 dev eth1");
    IP("route add default via 198.51.100.254");
    EXPECT_EQ("eth1 198.51.100.1", Interface());
}

TEST_F(NetworkInfoImplTest, OfSeveralDefaultRoutesTheLowestMetricCounts) {
    IP("address add 192.0.2.1/24 dev eth0");
    IP("address add 198.51.100.1/24 dev eth1");
    IP("route add default via 192.0.2.254 metric 200");
    IP("route add default via 198.51.100.254 metric 100");
    EXPECT_EQ("eth1 198.51.100.1", Interface());
    IP("route add default via 192.0.2.254 metric 50");
    EXPECT_EQ("eth0 192.0.2.1", Interface());
    IP("route add default via 198.51.100.254");
    EXPECT_EQ("eth1 198.51.100.1", Interface());
}

TEST_F(NetworkInfoImplTest, OtherTablesAndOtherRoutesDoNotCount) {
    IP("address add 192.0.2.1/24 dev eth0");
    IP("address add 198.51.100.1/24 dev eth1");
    IP("route add default via 192.0.2.254 table 100");
    IP("route add 203.0.113.0/24 via 192.0.2.254");
    IP("route add unreachable default metric 1");
    IP("route add default via 198.51.100.254 metric 100");
    EXPECT_EQ("eth1 198.51.100.1", Interface());
}

TEST_F(NetworkInfoImplTest, ADefaultRouteOfSeveralWaysLeadsTheFirstWay) {
    IP("address add 192.0.2.1/24 dev eth0");
    IP("address add 198.51.100.1/24 dev eth1");
    IP("route add default nexthop via 198.51.100.254 nexthop via 192.0.2.254");
    EXPECT_EQ("eth1 198.51.100.1", Interface());
}

TEST_F(NetworkInfoImplTest, WithoutADefaultRouteIsTheOnlyOneWithAGlobalAddress) {
    IP("address add 192.0.2.1/24 dev eth1");
    IP("address add 169.254.1.1/16 dev eth0 scope link");
    EXPECT_EQ("eth1 192.0.2.1", Interface());
}

TEST_F(NetworkInfoImplTest, NoInterfaceIsAnError) {
    EXPECT_EQ("There is no management interface: no IPv4 default route, and no interface with a "
              "global IPv4 address; 'management-interface' in '/etc/tessel/host.conf' can name one",
              FailureOf([] { Interface(); }));
}

TEST_F(NetworkInfoImplTest, SeveralInterfacesAreAnError) {
    IP("address add 192.0.2.1/24 dev eth0");
    IP("address add 198.51.100.1/24 dev eth1");
    EXPECT_EQ("There is no management interface: no IPv4 default route, and 2 interfaces with a "
              "global IPv4 address; 'management-interface' in '/etc/tessel/host.conf' can name one",
              FailureOf([] { Interface(); }));
}

TEST_F(NetworkInfoImplTest, AnInterfaceWithoutIPv4IsAnError) {
    IP("address add 192.0.2.1/24 dev eth0");
    IP("route add default dev eth1");
    EXPECT_EQ("The management interface 'eth1' has no IPv4 address",
              FailureOf([] { Interface(); }));
    SetContents(path, "management-interface = \"eth1\"\n");
    EXPECT_EQ("The management interface 'eth1' has no IPv4 address",
              FailureOf([] { Interface(); }));
}

TEST_F(NetworkInfoImplTest, TheFirstPrimaryAddressOfGlobalScopeIsTaken) {
    IP("address add 169.254.1.1/16 dev eth0 scope link");
    IP("address add 192.0.2.1/24 dev eth0");
    IP("address add 192.0.2.2/24 dev eth0 label eth0:1");
    IP("address add 198.51.100.1/24 dev eth0");
    IP("route add default via 192.0.2.254");
    EXPECT_EQ("eth0 192.0.2.1", Interface());
}

TEST_F(NetworkInfoImplTest, ItIsTheInterfacesOwnAddressAndNotItsPeers) {
    IP("address add 192.0.2.1 peer 192.0.2.9 dev eth0");
    IP("route add default dev eth0");
    EXPECT_EQ("eth0 192.0.2.1", Interface());
}

TEST_F(NetworkInfoImplTest, TheAdministratorsChoiceComesFirst) {
    IP("address add 192.0.2.1/24 dev eth0");
    IP("address add 198.51.100.1/24 dev eth1");
    IP("route add default via 192.0.2.254");
    SetContents(path, "other = x\nmanagement-interface = 'eth1'\n");
    EXPECT_EQ("eth1 198.51.100.1", Interface());
    SetContents(path, "management-interface = lo\n");
    EXPECT_EQ("lo 127.0.0.1", Interface());
    for (char const* const text : {"", "other = x\n", "management-interface = \"\"\n"}) {
        SetContents(path, text);
        EXPECT_EQ("eth0 192.0.2.1", Interface()) << text;
    }
}

TEST_F(NetworkInfoImplTest, AChosenInterfaceThatDoesNotExistIsAnError) {
    IP("address add 192.0.2.1/24 dev eth0");
    IP("route add default via 192.0.2.254");
    for (std::string const name : {"eth9", "a-name-longer-than-the-kernel-allows", "eth0 "}) {
        SetContents(path, "management-interface = \"" + name + "\"\n");
        EXPECT_EQ("The management interface '" + name +
                      "' that '/etc/tessel/host.conf' names does not exist",
                  FailureOf([] { Interface(); }));
    }
}

TEST_F(NetworkInfoImplTest, ABadConfigurationIsAnErrorAndNotIgnored) {
    IP("address add 192.0.2.1/24 dev eth0");
    SetContents(path, "\neth0\n");
    EXPECT_EQ("Cannot read '/etc/tessel/host.conf': Error parsing configuration on line 2: no "
              "delimiter found",
              FailureOf([] { Interface(); }));
    std::filesystem::remove(path);
    std::filesystem::create_directory(path);
    EXPECT_EQ("Cannot read '/etc/tessel/host.conf': it is not a regular file",
              FailureOf([] { Interface(); }));
}

TEST_F(NetworkInfoImplTest, HundredsOfInterfacesAndRoutesAreRead) {
    // More than one part of the kernel's answer.
    std::string batch;
    for (int i = 0; i < 2000; ++i) {
        std::string const address = std::to_string(i / 250) + "." + std::to_string(i % 250 + 1);
        batch += "address add 10.9." + address + "/32 dev eth0\n";
        batch += "route add 10.8." + address + "/32 dev eth0\n";
    }
    batch += "address add 192.0.2.1/24 dev eth1\n";
    batch += "route add default via 192.0.2.254\n";
    SetContents("/run/batch", batch);
    IP("-batch /run/batch");
    EXPECT_EQ("eth1 192.0.2.1", Interface());
}

} // namespace
} // namespace StrandCtl::Network
