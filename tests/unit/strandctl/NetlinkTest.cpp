// SPDX-License-Identifier: Apache-2.0
#include "Netlink.h"

#include <arpa/inet.h>
#include <cstddef>
#include <cstdint>
#include <cstring>
#include <gtest/gtest.h>
#include <linux/if_addr.h>
#include <netinet/in.h>
#include <string>

namespace StrandCtl {
namespace {

/// A message as the kernel lays it out.
class Message {
public:
    template <typename Family> Message(int type, Family const& family) {
        nlmsghdr header = {};
        header.nlmsg_type = static_cast<std::uint16_t>(type);
        Append(&header, sizeof header);
        Append(&family, sizeof family);
    }
    template <typename Value> Message& With(int type, Value const& value, std::size_t size) {
        rtattr attribute = {};
        attribute.rta_type = static_cast<std::uint16_t>(type);
        attribute.rta_len = static_cast<std::uint16_t>(sizeof attribute + size);
        Append(&attribute, sizeof attribute);
        Append(&value, size);
        return *this;
    }
    template <typename Value> Message& With(int type, Value const& value) {
        return With(type, value, sizeof value);
    }
    Message& WithAddress(int type, char const* dotted) {
        in_addr address = {};
        EXPECT_EQ(1, inet_pton(AF_INET, dotted, &address));
        return With(type, address);
    }

    /// The message with its true length, cut off there.
    nlmsghdr const& Cut(std::size_t size) {
        _storage.assign((size + 3) / 4, 0);
        std::memcpy(_storage.data(), _bytes.data(), size);
        auto& header = *reinterpret_cast<nlmsghdr*>(_storage.data());
        header.nlmsg_len = static_cast<std::uint32_t>(size);
        return header;
    }
    nlmsghdr const& Whole() {
        return Cut(_bytes.size());
    }
    std::size_t Size() const {
        return _bytes.size();
    }

private:
    void Append(void const* data, std::size_t size) {
        _bytes.append(static_cast<char const*>(data), size);
        _bytes.resize((_bytes.size() + 3) / 4 * 4);
    }

    std::string _bytes;
    std::vector<std::uint32_t> _storage;
};

rtmsg Route() {
    rtmsg route = {};
    route.rtm_family = AF_INET;
    route.rtm_table = RT_TABLE_MAIN;
    route.rtm_type = RTN_UNICAST;
    return route;
}

ifaddrmsg Address() {
    ifaddrmsg address = {};
    address.ifa_family = AF_INET;
    address.ifa_index = 7;
    address.ifa_scope = RT_SCOPE_LINK;
    return address;
}

std::optional<DefaultRoute> Parse(Message message) {
    return ParseRoute(message.Whole());
}

TEST(NetlinkTest, ADefaultRouteIsRead) {
    auto const route = Parse(Message(RTM_NEWROUTE, Route())
                                 .With(RTA_TABLE, std::uint32_t{RT_TABLE_MAIN})
                                 .With(RTA_PRIORITY, std::uint32_t{4294967295U})
                                 .WithAddress(RTA_GATEWAY, "192.0.2.1")
                                 .With(RTA_OIF, 5));
    ASSERT_TRUE(route);
    EXPECT_EQ(5, route->interface);
    EXPECT_EQ(4294967295U, route->metric);
}

TEST(NetlinkTest, ARouteWithoutMetricHasTheBest) {
    auto const route = Parse(Message(RTM_NEWROUTE, Route()).With(RTA_OIF, 5));
    ASSERT_TRUE(route);
    EXPECT_EQ(0U, route->metric);
}

TEST(NetlinkTest, OfSeveralWaysTheFirstCounts) {
    struct {
        rtnexthop first, second;
    } ways = {};
    ways.first.rtnh_len = ways.second.rtnh_len = sizeof(rtnexthop);
    ways.first.rtnh_ifindex = 8;
    ways.second.rtnh_ifindex = 9;
    auto const route = Parse(Message(RTM_NEWROUTE, Route()).With(RTA_MULTIPATH, ways));
    ASSERT_TRUE(route);
    EXPECT_EQ(8, route->interface);
}

TEST(NetlinkTest, OtherRoutesAreNotDefaultRoutes) {
    rtmsg narrow = Route(), other = Route(), six = Route(), dead = Route(), cloned = Route(),
          unreachable = Route();
    narrow.rtm_dst_len = 24;
    other.rtm_table = 100;
    six.rtm_family = AF_INET6;
    dead.rtm_flags = RTNH_F_DEAD;
    cloned.rtm_flags = RTM_F_CLONED;
    unreachable.rtm_type = RTN_UNREACHABLE;
    for (rtmsg const& route : {narrow, other, six, dead, cloned, unreachable}) {
        EXPECT_FALSE(Parse(Message(RTM_NEWROUTE, route).With(RTA_OIF, 5)));
    }
    EXPECT_FALSE(Parse(Message(RTM_NEWROUTE, Route()))) << "no interface";
    EXPECT_FALSE(Parse(Message(RTM_DELROUTE, Route()).With(RTA_OIF, 5)));
    EXPECT_FALSE(Parse(
        Message(RTM_NEWROUTE, Route()).With(RTA_OIF, 5).With(RTA_TABLE, std::uint32_t{1000})));
}

TEST(NetlinkTest, AnAddressIsRead) {
    ifaddrmsg header = Address();
    header.ifa_flags = IFA_F_SECONDARY;
    Message message(RTM_NEWADDR, header);
    message.WithAddress(IFA_ADDRESS, "192.0.2.9").WithAddress(IFA_LOCAL, "192.0.2.1");
    message.With(IFA_LABEL, "eth0:1");
    auto const address = ParseAddressMessage(message.Whole());
    ASSERT_TRUE(address);
    EXPECT_EQ(7, address->interface);
    EXPECT_EQ("192.0.2.1", address->address) << "its own, not its peer's";
    EXPECT_EQ(unsigned{RT_SCOPE_LINK}, address->scope);
    EXPECT_TRUE(address->secondary);
}

TEST(NetlinkTest, AnAddressWithoutALocalOneIsRead) {
    Message message(RTM_NEWADDR, Address());
    auto const address = ParseAddressMessage(message.WithAddress(IFA_ADDRESS, "192.0.2.9").Whole());
    ASSERT_TRUE(address);
    EXPECT_EQ("192.0.2.9", address->address);
    EXPECT_FALSE(address->secondary);
}

TEST(NetlinkTest, OtherAddressesSayNothing) {
    ifaddrmsg six = Address();
    six.ifa_family = AF_INET6;
    EXPECT_FALSE(
        ParseAddressMessage(Message(RTM_NEWADDR, six).WithAddress(IFA_LOCAL, "192.0.2.1").Whole()));
    EXPECT_FALSE(ParseAddressMessage(Message(RTM_NEWADDR, Address()).Whole()));
    EXPECT_FALSE(ParseAddressMessage(
        Message(RTM_DELADDR, Address()).WithAddress(IFA_LOCAL, "192.0.2.1").Whole()));
}

TEST(NetlinkTest, MessagesCutAnywhereAreSurvived) {
    Message route(RTM_NEWROUTE, Route());
    route.With(RTA_PRIORITY, std::uint32_t{1}).With(RTA_OIF, 5);
    for (std::size_t size = sizeof(nlmsghdr); size < route.Size(); ++size) {
        EXPECT_FALSE(ParseRoute(route.Cut(size))) << size;
    }
    Message address(RTM_NEWADDR, Address());
    address.WithAddress(IFA_LOCAL, "192.0.2.1");
    for (std::size_t size = sizeof(nlmsghdr); size < address.Size(); ++size) {
        EXPECT_FALSE(ParseAddressMessage(address.Cut(size))) << size;
    }
}

TEST(NetlinkTest, AttributesOfTheWrongSizeAreSurvived) {
    EXPECT_FALSE(Parse(Message(RTM_NEWROUTE, Route()).With(RTA_OIF, 5, 2)));
    EXPECT_FALSE(Parse(Message(RTM_NEWROUTE, Route()).With(RTA_MULTIPATH, 5)));
    rtattr endless = {};
    endless.rta_len = 0;
    EXPECT_FALSE(
        Parse(Message(RTM_NEWROUTE, Route()).With(RTA_PRIORITY, endless, 0).With(0, endless)));
    EXPECT_FALSE(
        ParseAddressMessage(Message(RTM_NEWADDR, Address()).With(IFA_LOCAL, 5, 3).Whole()));
}

// Whatever network the machine has: the kernel answers an ordinary user as well.
TEST(NetlinkTest, TheKernelAnswers) {
    EXPECT_NO_THROW(ReadDefaultRoutes());
    EXPECT_NO_THROW(ReadInterfaceAddresses());
}

} // namespace
} // namespace StrandCtl
