// SPDX-License-Identifier: Apache-2.0
#include "trial/LogIns.h"

#include <gmock/gmock.h>
#include <string>

namespace tessel::tslauthctl {
namespace {

using testing::ElementsAre;
using testing::IsEmpty;

constexpr char passwd[] = "root:x:0:0:root:/root:/bin/bash\n"
                          "alice:x:1000:1000::/home/alice:/bin/bash\n"
                          "bob:x:1001:1001::/home/bob:/bin/bash\n";

TEST(LogInsTest, RootAndOneWhoMayBecomeRootAreTried) {
    EXPECT_THAT(UsersToTry(passwd, "sudo:x:27:gone,bob,alice\n", ""), ElementsAre("root", "bob"));
    EXPECT_THAT(UsersToTry(passwd, "sudo:x:27:bob\n", "alice"), ElementsAre("root", "alice"));
    EXPECT_THAT(UsersToTry(passwd, "sudo:x:27:bob\n", "CORP\\ann"), ElementsAre("root", "bob"));
    EXPECT_THAT(UsersToTry(passwd, "users:x:100:bob\nsudo:x:27:\n", "root"), ElementsAre("root"));
}

TEST(LogInsTest, WhoGotInBeforeAndNoLongerDoesIsLost) {
    LogInAnswers const before = {{{"sshd", "root"}, "Success"},
                                 {{"sshd", "bob"}, "Permission denied"},
                                 {{NameServiceTrial, "root"}, "number 0"}};
    EXPECT_THAT(LogInsLost(before, before), IsEmpty());
    auto after = before;
    after[{"sshd", "root"}] = "Module is unknown";
    after[{"sshd", "bob"}] = "Module is unknown";
    EXPECT_THAT(LogInsLost(before, after),
                ElementsAre("'root' would no longer get in through sshd: Module is unknown"));
    after[{"sshd", "root"}] = NoSuchService;
    EXPECT_THAT(LogInsLost(before, after), IsEmpty());
    after = before;
    after[{NameServiceTrial, "root"}] = "number 7";
    EXPECT_THAT(LogInsLost(before, after),
                ElementsAre("'root' would no longer be found by the name service: number 7"));
    after.erase({"sshd", "root"});
    EXPECT_EQ(2U, LogInsLost(before, after).size()) << "a module that ends the process";
}

} // namespace
} // namespace tessel::tslauthctl
