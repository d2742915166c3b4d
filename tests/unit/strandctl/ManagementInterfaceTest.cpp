// SPDX-License-Identifier: Apache-2.0
#include "ManagementInterface.h"

#include "HostCtlFailure.h"

#include <gtest/gtest.h>
#include <linux/rtnetlink.h>

namespace StrandCtl {
namespace {

using Addresses = std::vector<InterfaceAddress>;

InterfaceAddress Global(int interface, char const* address, bool secondary = false) {
    return {interface, address, RT_SCOPE_UNIVERSE, secondary};
}

InterfaceAddress const loopback = {1, "127.0.0.1", RT_SCOPE_HOST, false};

TEST(ManagementInterfaceTest, TheDefaultRouteDecides) {
    EXPECT_EQ(3, ChooseManagementInterface({{3, 0}}, {loopback, Global(2, "192.0.2.1")}));
}

TEST(ManagementInterfaceTest, TheLowestMetricWinsAndOfEqualOnesTheFirst) {
    EXPECT_EQ(3, ChooseManagementInterface({{2, 100}, {3, 50}, {4, 50}, {5, 4294967295U}}, {}));
    EXPECT_EQ(5, ChooseManagementInterface({{2, 4294967295U}, {5, 0}}, {}));
}

TEST(ManagementInterfaceTest, WithoutADefaultRouteTheOnlyGlobalAddressDecides) {
    EXPECT_EQ(4, ChooseManagementInterface({}, {loopback,
                                                Global(4, "192.0.2.1"),
                                                Global(4, "192.0.2.2", true),
                                                {5, "169.254.1.1", RT_SCOPE_LINK, false}}));
}

TEST(ManagementInterfaceTest, NoInterfaceIsAnError) {
    EXPECT_EQ("There is no management interface: no IPv4 default route, and no interface with a "
              "global IPv4 address; 'management-interface' in '/etc/tessel/host.conf' can name one",
              FailureOf([] { ChooseManagementInterface({}, {loopback}); }));
}

TEST(ManagementInterfaceTest, SeveralInterfacesAreAnError) {
    EXPECT_EQ(
        "There is no management interface: no IPv4 default route, and 2 interfaces with a "
        "global IPv4 address; 'management-interface' in '/etc/tessel/host.conf' can name one",
        FailureOf([] {
            ChooseManagementInterface({}, {Global(2, "192.0.2.1"), Global(3, "198.51.100.1")});
        }));
}

TEST(ManagementInterfaceTest, TheAddressIsTheFirstPrimaryOneOfTheWidestScope) {
    Addresses const addresses = {loopback,
                                 {2, "169.254.1.1", RT_SCOPE_LINK, false},
                                 Global(2, "192.0.2.3", true),
                                 Global(2, "192.0.2.1"),
                                 Global(2, "192.0.2.2"),
                                 {3, "169.254.1.2", RT_SCOPE_LINK, false}};
    EXPECT_EQ("192.0.2.1", ChooseAddress(2, addresses));
    EXPECT_EQ("169.254.1.2", ChooseAddress(3, addresses));
    EXPECT_EQ("127.0.0.1", ChooseAddress(1, addresses));
    EXPECT_EQ(std::nullopt, ChooseAddress(4, addresses));
}

} // namespace
} // namespace StrandCtl
