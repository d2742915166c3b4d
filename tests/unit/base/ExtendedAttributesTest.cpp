// SPDX-License-Identifier: Apache-2.0
#include <base/ExtendedAttributes.h>

#include "Attributes.h"
#include "TemporaryFolder.h"
#include "faults/Faults.h"

#include <base/Descriptor.h>
#include <cerrno>
#include <fcntl.h>
#include <gmock/gmock.h>
#include <string>

namespace tessel::base {
namespace {

class ExtendedAttributesTest : public testing::Test {
protected:
    void SetUp() override {
        SetContents(from, "");
        SetContents(to, "");
        if (!attributes::Set(from, attributes::AccessList, list)) {
            GTEST_SKIP() << "the temporary folder's file system has no access control lists";
        }
    }
    bool Copy() const {
        Descriptor const source(::open(from.c_str(), O_RDONLY | O_CLOEXEC));
        Descriptor const target(::open(to.c_str(), O_WRONLY | O_CLOEXEC));
        auto const wanted = ReadExtendedAttributes(source.Get());
        return wanted && SetExtendedAttributes(target.Get(), *wanted);
    }

    TemporaryFolder const folder;
    std::string const from = folder / "from";
    std::string const to = folder / "to";
    std::string const list = attributes::ListFor(54321);
};

TEST_F(ExtendedAttributesTest, AnAccessControlListIsTakenOver) {
    EXPECT_TRUE(Copy());
    EXPECT_EQ(list, attributes::Of(to)[attributes::AccessList]);
    EXPECT_EQ(attributes::Of(from), attributes::Of(to));
}

TEST_F(ExtendedAttributesTest, WhatTheSourceDoesNotHaveGoes) {
    ASSERT_TRUE(attributes::Set(to, attributes::AccessList, list));
    std::filesystem::remove(from);
    SetContents(from, "");
    EXPECT_TRUE(Copy());
    EXPECT_EQ(0U, attributes::Of(to).count(attributes::AccessList));
}

TEST_F(ExtendedAttributesTest, AttributesOfUsersAreTakenOver) {
    std::string const large(3000, 'v');
    if (!attributes::Set(from, "user.origin", large)) {
        GTEST_SKIP() << "the temporary folder's file system has no attributes of users";
    }
    ASSERT_TRUE(attributes::Set(from, "user.empty", ""));
    ASSERT_TRUE(attributes::Set(to, "user.other", "x"));
    EXPECT_TRUE(Copy());
    EXPECT_EQ(attributes::Of(from), attributes::Of(to));
}

TEST_F(ExtendedAttributesTest, AFailureIsToldWithItsNumber) {
    if (!faults::Available()) {
        GTEST_SKIP() << "this kernel does not let a process be watched";
    }
    for (char const* const call : {"listxattr", "getxattr", "setxattr"}) {
        auto const outcome = faults::RunWithFaultIn(call, faults::FailsWith(EIO), [&] {
            throw std::runtime_error(!Copy() && errno == EIO ? "failed" : "did not tell");
        });
        EXPECT_TRUE(outcome.injected) << call;
        EXPECT_EQ("failed", outcome.message) << call;
    }
}

TEST_F(ExtendedAttributesTest, WhereThereAreNoneThereIsNothingToCopy) {
    if (!faults::Available()) {
        GTEST_SKIP() << "this kernel does not let a process be watched";
    }
    auto const outcome = faults::RunWithFaultIn("listxattr", faults::FailsWith(ENOTSUP), [&] {
        throw std::runtime_error(Copy() ? "copied" : "failed");
    });
    EXPECT_EQ("copied", outcome.message);
}

} // namespace
} // namespace tessel::base
