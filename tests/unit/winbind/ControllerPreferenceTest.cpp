// SPDX-License-Identifier: Apache-2.0
#include "join/ControllerPreference.h"

#include "Failure.h"
#include "PlayedHost.h"
#include "host/PreferredControllers.h"
#include "join/DomainJoin.h"

#include <gmock/gmock.h>
#include <string>
#include <vector>

namespace tessel::winbind {
namespace {

using testing::ElementsAre;
using testing::HasSubstr;
using testing::Not;

std::vector<std::string> PreferredOf(PlayedHost const& host) {
    return PreferredControllers(host.At(Paths::State)).Read();
}

void Join(PlayedHost& host) {
    DomainJoin::WithCredentials(host, "corp.example", "", {"joiner", "secret"});
    host.FailNowhere();
}

TEST(ControllerPreferenceTest, AHostThatIsNotJoinedKeepsThemForLater) {
    PlayedHost host;
    SetPreferredDomainControllers(host, {"dc2", "dc3"});
    EXPECT_THAT(PreferredOf(host), ElementsAre("dc2", "dc3"));
    EXPECT_EQ(0U, host.State().calls);
    Join(host);
    EXPECT_THAT(host.Read(Paths::OwnSamba), HasSubstr("password server = dc2 dc3 *"));
}

TEST(ControllerPreferenceTest, WinbinddOfAJoinedHostIsTold) {
    PlayedHost host;
    Join(host);
    SetPreferredDomainControllers(host, {"dc2"});
    EXPECT_THAT(host.Read(Paths::OwnSamba), HasSubstr("password server = dc2 *"));
    EXPECT_THAT(host.State().log, HasSubstr("reload winbindd"));
    SetPreferredDomainControllers(host, {});
    EXPECT_THAT(host.Read(Paths::OwnSamba), Not(HasSubstr("password server")));
}

TEST(ControllerPreferenceTest, AFailureLeavesBothFilesAsTheyWere) {
    PlayedHost host;
    Join(host);
    SetPreferredDomainControllers(host, {"dc2"});
    auto const before = host.Tree();
    host.FailNowhere();
    host.FailAt(1, PlayedHost::Fault::Refused); // testparm
    EXPECT_THROW(SetPreferredDomainControllers(host, {"dc3"}), Failure);
    EXPECT_EQ(before, host.Tree());
    EXPECT_THROW(SetPreferredDomainControllers(host, {"not a name"}), Failure);
    EXPECT_EQ(before, host.Tree());
}

} // namespace
} // namespace tessel::winbind
