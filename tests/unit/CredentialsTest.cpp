// SPDX-License-Identifier: Apache-2.0
#include <tslauth/CAM.h>
#include <tslauth/ComputerPrincipalInfo.h>
#include <tslauth/Credentials.h>
#include <tslauth/tslauth_provider.h>

#include <gtest/gtest.h>

#include <cstring>
#include <type_traits>

using namespace tessel::authentication;

TEST(CredentialsTest, AreInitialisedInTheOrderUserNamePassword) {
    char const* const user = "user";
    char const* const password = "password";
    Credentials const credentials = {user, password};
    EXPECT_EQ(user, credentials.userName);
    EXPECT_EQ(password, credentials.password);
}

TEST(CredentialsTest, HaveNeitherTextByDefault) {
    Credentials const credentials;
    EXPECT_EQ(nullptr, credentials.userName);
    EXPECT_EQ(nullptr, credentials.password);
}

TEST(CredentialsTest, AreByteForByteTheProvidersRecord) {
    Credentials const credentials = {"user", "password"};
    ActiveDirectoryClientCredentials record = {nullptr, nullptr};
    static_assert(sizeof record == sizeof credentials);
    static_assert(std::is_trivially_copyable_v<Credentials>);
    std::memcpy(&record, &credentials, sizeof record);
    EXPECT_STREQ("user", record.userName);
    EXPECT_STREQ("password", record.password);
}

TEST(CAMTest, RecordsAreInitialisedInDeclarationOrder) {
    CAM::ActiveDirectoryDomainInfo const domain = {"1", "2", "3", "4"};
    EXPECT_EQ("1", domain.unused);
    EXPECT_EQ("2", domain.netBIOSDomainName);
    EXPECT_EQ("3", domain.dnsDomainName);
    EXPECT_EQ("4", domain.domainSID);

    CAM::MachineAccountInfo const account = {"1", "2", "3", "4", "5"};
    EXPECT_EQ("1", account.accountName);
    EXPECT_EQ("2", account.dnsDomainName);
    EXPECT_EQ("3", account.unused);
    EXPECT_EQ("4", account.firstResult);
    EXPECT_EQ("5", account.secondResult);

    ComputerPrincipalInfo const principal = {"1", "2", "3"};
    EXPECT_EQ("1", principal.unused);
    EXPECT_EQ("2", principal.firstResult);
    EXPECT_EQ("3", principal.secondResult);
}
