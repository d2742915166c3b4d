// SPDX-License-Identifier: Apache-2.0
#include "host/OperationLock.h"

#include "../../TemporaryFolder.h"
#include "Failure.h"
#include "tslauth_winbind_provider.h"

#include <gmock/gmock.h>
#include <memory>
#include <string>
#include <sys/stat.h>
#include <thread>

namespace tessel::winbind {
namespace {

using namespace std::chrono_literals;

ActiveDirectoryClientErrorCode CodeOfLocking(std::string const& path) {
    try {
        OperationLock const lock(path, Clock::now());
        return TSLAUTH_PROVIDER_SUCCESS;
    } catch (Failure const& e) {
        return e.Code();
    }
}

TEST(OperationLockTest, KeepsOthersAwayAndLeavesNothing) {
    TemporaryFolder const folder;
    {
        OperationLock const lock(folder / "lock", Clock::now());
        EXPECT_EQ(TSLAUTH_PROVIDER_TIMED_OUT, CodeOfLocking(folder / "lock"));
    }
    EXPECT_THAT(folder.Names(), testing::IsEmpty());
    EXPECT_EQ(0U, CodeOfLocking(folder / "lock"));
}

TEST(OperationLockTest, WhoWaitsGetsIt) {
    TemporaryFolder const folder;
    auto held = std::make_unique<OperationLock>(folder / "lock", Clock::now());
    std::thread waiter([&] { OperationLock const lock(folder / "lock", Clock::now() + 60s); });
    std::this_thread::sleep_for(20ms);
    held.reset();
    waiter.join();
    EXPECT_THAT(folder.Names(), testing::IsEmpty());
}

TEST(OperationLockTest, FollowsNoLinkAndWaitsForNoPipe) {
    TemporaryFolder const folder;
    SetContents(folder / "other", "other");
    ASSERT_EQ(0, ::symlink("other", (folder / "link").c_str()));
    EXPECT_EQ(TSLAUTH_WINBIND_SEE_SYSTEM_LOG, CodeOfLocking(folder / "link"));
    ASSERT_EQ(0, ::mkfifo((folder / "pipe").c_str(), 0600));
    (void)CodeOfLocking(folder / "pipe"); // returns
    EXPECT_EQ("other", Contents(folder / "other"));
}

} // namespace
} // namespace tessel::winbind
