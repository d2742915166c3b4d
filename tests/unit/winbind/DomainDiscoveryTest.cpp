// SPDX-License-Identifier: Apache-2.0
#include "samba/DomainDiscovery.h"

#include "Failure.h"

#include <clocale>
#include <gmock/gmock.h>
#include <string>
#include <vector>

namespace tessel::winbind {
namespace {

TEST(DomainDiscoveryTest, KnowsTheNamesOfControllers) {
    ControllerAnswer answer;
    answer.computer = "DC1";
    std::vector<std::string> const others = {"dc1.corp.example", "dc2.corp.example",
                                             "a-longer-name-than-fits.corp.example"};
    for (char const* const name : {"DC1", "DC2", "A-LONGER-NAME-T"}) {
        EXPECT_TRUE(DomainDiscovery::IsNameOfController(name, answer, others)) << name;
    }
    for (char const* const name : {"DC", "DC11", "DC2.CORP", "A-LONGER-NAME-TH"}) {
        EXPECT_FALSE(DomainDiscovery::IsNameOfController(name, answer, others)) << name;
    }
    EXPECT_TRUE(DomainDiscovery::IsNameOfController("DC1", answer, {}));
}

} // namespace
} // namespace tessel::winbind
