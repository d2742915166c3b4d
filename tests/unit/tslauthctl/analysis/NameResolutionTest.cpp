// SPDX-License-Identifier: Apache-2.0
#include "analysis/NameResolution.h"

#include <gmock/gmock.h>

namespace tessel::tslauthctl {
namespace {

using testing::ElementsAre;
using testing::IsEmpty;

TEST(NameResolutionTest, OtherNamesOfTheAddressAreThoseThatAreNotTheHosts) {
    EXPECT_THAT(OtherNames("127.0.0.1 localhost\n"
                           "192.0.2.1\tnode.corp.example node files.corp.example # old\n"
                           "192.0.2.1 NODE.old.example backup files.corp.example\n"
                           "192.0.2.10 other\n",
                           "192.0.2.1", "node"),
                ElementsAre("files.corp.example", "backup"));
}

TEST(NameResolutionTest, AHostsFileWithoutTheAddressLosesNothing) {
    EXPECT_THAT(OtherNames("# 192.0.2.1 a\n127.0.0.1 b\n", "192.0.2.1", "node"), IsEmpty());
    EXPECT_THAT(OtherNames("", "192.0.2.1", "node"), IsEmpty());
}

} // namespace
} // namespace tessel::tslauthctl
