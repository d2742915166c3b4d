// SPDX-License-Identifier: Apache-2.0
#include <strandctl/Ipv4Address.h>

#include "HostCtlFailure.h"

#include <gtest/gtest.h>

namespace HostCtl::Network {
namespace {

TEST(Ipv4AddressTest, StrictDottedDecimalIsValid) {
    for (char const* const address :
         {"0.0.0.0", "1.2.3.4", "10.0.0.1", "99.100.199.200", "249.250.254.255", "255.255.255.255",
          "127.0.0.1", "192.168.1.10"}) {
        EXPECT_TRUE(Ipv4Address::IsValidAddress(address)) << address;
    }
}

TEST(Ipv4AddressTest, NothingElseIsValid) {
    for (char const* const address : {"",           " ",
                                      ".",          "...",
                                      "1",          "1.2",
                                      "1.2.3",      "1.2.3.",
                                      ".1.2.3",     "1..2.3",
                                      "1.2.3.4.",   "1.2.3.4.5",
                                      "256.1.1.1",  "300.1.1.1",
                                      "1.1.1.256",  "1.1.1.999",
                                      "1.1.1.1000", "4294967297.1.1.1",
                                      "01.2.3.4",   "1.2.3.04",
                                      "1.2.3.00",   "000.0.0.0",
                                      "0x1.2.3.4",  "1.2.3.0x4",
                                      "1.2.3.a",    "-1.2.3.4",
                                      "+1.2.3.4",   "1.2.3.-4",
                                      " 1.2.3.4",   "1.2.3.4 ",
                                      "1.2.3.4\n",  "1. 2.3.4",
                                      "1.2.3.4\t",  "1,2,3,4",
                                      "1.2.3.4/24", "1.2.3.4:80",
                                      "::1",        "::ffff:1.2.3.4",
                                      "localhost",  "3232235777",
                                      "1.2.3.4\r",  "\xd9\xa1.2.3.4",
                                      "1.2.3.4e0"}) {
        EXPECT_FALSE(Ipv4Address::IsValidAddress(address)) << '\'' << address << '\'';
    }
}

TEST(Ipv4AddressTest, ANullByteIsNotTheEnd) {
    EXPECT_FALSE(Ipv4Address::IsValidAddress(std::string("1.2.3.4\0", 8)));
    EXPECT_FALSE(Ipv4Address::IsValidAddress(std::string("1.2.3.4\0x", 9)));
    EXPECT_FALSE(Ipv4Address::IsValidAddress(std::string("1.2.3\0.4", 8)));
}

TEST(Ipv4AddressTest, ExactlyTheNumbersUpTo255AreValid) {
    for (int number = 0; number < 2000; ++number) {
        for (int place = 0; place < 4; ++place) {
            std::string address;
            for (int i = 0; i < 4; ++i) {
                address += (i ? "." : "") + std::to_string(i == place ? number : 7);
            }
            EXPECT_EQ(number <= 255, Ipv4Address::IsValidAddress(address)) << address;
        }
    }
}

TEST(Ipv4AddressTest, GivesItsDottedString) {
    EXPECT_EQ("192.0.2.1", Ipv4Address("192.0.2.1").ToString());
}

TEST(Ipv4AddressTest, WhatIsNotValidCannotBeMade) {
    EXPECT_EQ("'192.0.2' is not an IPv4 address", FailureOf([] { Ipv4Address("192.0.2"); }));
}

} // namespace
} // namespace HostCtl::Network
