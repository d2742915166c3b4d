// SPDX-License-Identifier: Apache-2.0
#include "Host.h"

#include <tslauth/Exceptions.h>
#include <tslauth/HostLock.h>

#include <chrono>
#include <sys/stat.h>
#include <thread>
#include <unistd.h>

using namespace tessel::authentication;

namespace {

using Clock = std::chrono::steady_clock;

class HostLockTest : public Host::Test {
protected:
    void SetUp() override {
        Host::Test::SetUp();
        (void)unlink(Paths::HostLock); // it need not be there
    }
    void TearDown() override {
        (void)unlink(Paths::HostLock);
        Host::Test::TearDown();
    }
    static std::string Failure() {
        return Host::FailureOf([] { HostLock(); });
    }
};

} // namespace

TEST_F(HostLockTest, OneHolderKeepsTheOthersOut) {
    HostLock first;
    HostLock second;
    EXPECT_TRUE(first.TryLock());
    EXPECT_FALSE(second.TryLock());
}

TEST_F(HostLockTest, ItIsFreeAgainAfterItsHolder) {
    HostLock second;
    {
        HostLock first;
        first.Lock();
        EXPECT_FALSE(second.TryLock());
    }
    EXPECT_TRUE(second.TryLock());
}

TEST_F(HostLockTest, OpeningItDoesNotTakeIt) {
    HostLock const opened;
    EXPECT_TRUE(HostLock().TryLock());
}

TEST_F(HostLockTest, ABoundedWaitEndsInTime) {
    HostLock first;
    first.Lock();
    auto const start = Clock::now();
    EXPECT_FALSE(HostLock().TryLock(1));
    EXPECT_GE(Clock::now() - start, std::chrono::seconds(1));
}

TEST_F(HostLockTest, ABoundedWaitTakesWhatIsLeftMeanwhile) {
    auto first = std::make_unique<HostLock>();
    first->Lock();
    std::thread holder([&first] {
        std::this_thread::sleep_for(std::chrono::milliseconds(100));
        first.reset();
    });
    EXPECT_TRUE(HostLock().TryLock(60));
    holder.join();
}

TEST_F(HostLockTest, AnUnboundedWaitEndsWithTheHolder) {
    auto first = std::make_unique<HostLock>();
    first->Lock();
    std::thread holder([&first] {
        std::this_thread::sleep_for(std::chrono::milliseconds(100));
        first.reset();
    });
    HostLock().Lock();
    holder.join();
}

TEST_F(HostLockTest, NobodyElseMayReadTheFile) {
    HostLock().Lock();
    EXPECT_EQ(0600U, Host::Status(Paths::HostLock).st_mode & 07777);
}

TEST_F(HostLockTest, WhatIsNoFileOfRootsIsRefused) {
    std::string const start = "IOError: Cannot lock '/run/tslauthctl.lock': ";
    ASSERT_EQ(0, symlink("/run/elsewhere", Paths::HostLock));
    EXPECT_EQ(start + "Too many levels of symbolic links", Failure());
    ASSERT_EQ(0, unlink(Paths::HostLock));
    ASSERT_EQ(0, mkfifo(Paths::HostLock, 0600));
    EXPECT_EQ(start + "it is not a file of root's", Failure());
    ASSERT_EQ(0, unlink(Paths::HostLock));
    Host::Write(Paths::HostLock, "");
    ASSERT_EQ(0, chown(Paths::HostLock, 1, 1));
    EXPECT_EQ(start + "it is not a file of root's", Failure());
}
