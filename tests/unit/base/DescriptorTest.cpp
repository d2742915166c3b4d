// SPDX-License-Identifier: Apache-2.0
#include <base/Descriptor.h>

#include <cerrno>
#include <fcntl.h>
#include <gtest/gtest.h>
#include <type_traits>
#include <utility>

namespace tessel::base {
namespace {

int Opened() {
    return ::open("/dev/null", O_RDONLY | O_CLOEXEC);
}

bool IsOpen(int number) {
    return ::fcntl(number, F_GETFD) >= 0;
}

TEST(DescriptorTest, ClosesAtItsEnd) {
    int number = -1;
    {
        Descriptor const descriptor(Opened());
        number = descriptor.Get();
        ASSERT_TRUE(descriptor);
        EXPECT_TRUE(IsOpen(number));
    }
    EXPECT_FALSE(IsOpen(number));
}

TEST(DescriptorTest, NoneIsNothingToClose) {
    EXPECT_FALSE(Descriptor());
    EXPECT_FALSE(Descriptor(-1));
    EXPECT_EQ(-1, Descriptor().Get());
    EXPECT_TRUE(Descriptor(Opened()));
}

TEST(DescriptorTest, HasOneOwner) {
    static_assert(!std::is_copy_constructible_v<Descriptor>);
    static_assert(!std::is_copy_assignable_v<Descriptor>);
    Descriptor first(Opened());
    int const number = first.Get();
    Descriptor second(std::move(first));
    EXPECT_EQ(number, second.Get());
    Descriptor third(Opened());
    int const replaced = third.Get();
    third = std::move(second);
    EXPECT_EQ(number, third.Get());
    EXPECT_FALSE(IsOpen(replaced));
    EXPECT_TRUE(IsOpen(number));
}

TEST(DescriptorTest, AssignedToItselfItStays) {
    Descriptor descriptor(Opened());
    Descriptor& itself = descriptor;
    descriptor = std::move(itself);
    EXPECT_TRUE(IsOpen(descriptor.Get()));
}

TEST(DescriptorTest, WhatIsReleasedStaysOpen) {
    int number = -1;
    {
        Descriptor descriptor(Opened());
        number = descriptor.Release();
        EXPECT_FALSE(descriptor);
    }
    EXPECT_TRUE(IsOpen(number));
    Descriptor const closing(number);
}

TEST(DescriptorTest, ClosingKeepsTheNumberOfAnErrorThatIsOnItsWay) {
    Descriptor descriptor(Opened());
    Descriptor const closedBehindItsBack(::dup(descriptor.Get()));
    ::close(closedBehindItsBack.Get());
    errno = ENOSPC;
    descriptor.Close();
    EXPECT_EQ(ENOSPC, errno);
    EXPECT_FALSE(descriptor);
    { Descriptor const failing(closedBehindItsBack.Get()); }
    EXPECT_EQ(ENOSPC, errno);
}

} // namespace
} // namespace tessel::base
