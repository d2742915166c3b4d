// SPDX-License-Identifier: Apache-2.0
#include "modules/LocalAccounts.h"
#include "../../TemporaryFolder.h"

#include <gtest/gtest.h>

namespace {

bool IsLocal(std::string const& path, std::string const& name) {
    LocalAccounts accounts = ReadLocalAccounts(path.c_str());
    bool const isLocal = accounts.text != nullptr && IsLocalName(&accounts, name.c_str());
    FreeLocalAccounts(&accounts);
    return isLocal;
}

} // namespace

TEST(LocalAccountsTest, EveryLineOfALongFileIsRead) {
    TemporaryFolder const folder;
    {
        std::ofstream file(folder / "passwd");
        for (int i = 0; i < 5000; ++i) {
            file << "user" << i << ":x:" << i << ":0::/:/bin/sh\n";
        }
    }
    EXPECT_TRUE(IsLocal(folder / "passwd", "user0"));
    EXPECT_TRUE(IsLocal(folder / "passwd", "user4999"));
    EXPECT_FALSE(IsLocal(folder / "passwd", "user5000"));
}

TEST(LocalAccountsTest, AFileWhoseSizeIsNotKnownIsReadWhole) {
    // The kernel makes these when they are read, and says that they are empty.
    LocalAccounts accounts = ReadLocalAccounts("/proc/self/status");
    ASSERT_NE(nullptr, accounts.text);
    EXPECT_TRUE(IsLocalName(&accounts, "Name"));
    EXPECT_TRUE(IsLocalName(&accounts, "nonvoluntary_ctxt_switches"));
    FreeLocalAccounts(&accounts);
}

TEST(LocalAccountsTest, AnAccountCountsFromTheMomentInWhichItIsMade) {
    TemporaryFolder const folder;
    std::ofstream(folder / "passwd") << "root:x:0:0::/:/bin/sh\n";
    EXPECT_FALSE(IsLocal(folder / "passwd", "lena"));
    std::ofstream(folder / "passwd", std::ios::app) << "lena:x:1:1::/:/bin/sh\n";
    EXPECT_TRUE(IsLocal(folder / "passwd", "lena"));
}

TEST(LocalAccountsTest, WhatCannotBeReadHasNoText) {
    TemporaryFolder const folder;
    EXPECT_EQ(nullptr, ReadLocalAccounts((folder / "passwd").c_str()).text);
    EXPECT_EQ(nullptr, ReadLocalAccounts(folder.Path().c_str()).text);
}

TEST(LocalAccountsTest, AnEmptyFileHoldsNobody) {
    TemporaryFolder const folder;
    std::ofstream(folder / "passwd").close();
    LocalAccounts accounts = ReadLocalAccounts((folder / "passwd").c_str());
    ASSERT_NE(nullptr, accounts.text);
    EXPECT_FALSE(IsLocalName(&accounts, "root"));
    EXPECT_FALSE(IsLocalNumber(&accounts, 0));
    FreeLocalAccounts(&accounts);
}
