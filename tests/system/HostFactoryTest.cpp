// SPDX-License-Identifier: Apache-2.0
#include <strandctl/HostFactory.h>

#include "../HostCtlFailure.h"
#include "../TemporaryFolder.h"
#include "Node.h"

#include <filesystem>
#include <gtest/gtest.h>
#include <string>

namespace HostCtl {
namespace {

constexpr char path[] = "/etc/tessel/advanced.conf";

class HostFactoryTest : public testing::Test {
protected:
    void SetUp() override {
        std::filesystem::remove_all(path);
    }
    void TearDown() override {
        std::filesystem::remove_all(path);
    }
};

/// The option as the library's only caller reads it.
int Verify() {
    return HostFactory::GetHost()
        .GetAdvancedOptionRoot()
        .GetBranch("UserVars")
        .GetIntegerOption("ActiveDirectoryVerifyCAMCertificate")
        .GetValue();
}

std::string FailureWith(std::string const& text) {
    SetContents(path, text);
    return FailureOf(Verify);
}

TEST_F(HostFactoryTest, TheOptionIsRead) {
    SetContents(path, "UserVars.ActiveDirectoryVerifyCAMCertificate = \"1\"\n");
    EXPECT_EQ(1, Verify());
    SetContents(path, "Other = x\n\nUserVars.ActiveDirectoryVerifyCAMCertificate=0\n");
    EXPECT_EQ(0, Verify());
}

TEST_F(HostFactoryTest, TheOptionsAreThoseOfTheMomentTheRootIsAskedFor) {
    Host const host = HostFactory::GetHost();
    SetContents(path, "UserVars.x = 1\n");
    auto const root = host.GetAdvancedOptionRoot();
    SetContents(path, "UserVars.x = 2\n");
    EXPECT_EQ(1, root.GetBranch("UserVars").GetIntegerOption("x").GetValue());
    EXPECT_EQ(2,
              host.GetAdvancedOptionRoot().GetBranch("UserVars").GetIntegerOption("x").GetValue());
}

TEST_F(HostFactoryTest, AMissingFileMeansNoRoot) {
    EXPECT_EQ("Unable to get root option branch", FailureOf(Verify));
}

TEST_F(HostFactoryTest, NoUserVarsMeansNoBranch) {
    EXPECT_EQ("Unable to get user from root", FailureWith(""));
    EXPECT_EQ("Unable to get user from root", FailureWith("Other.x = 1\n"));
}

TEST_F(HostFactoryTest, AMissingOptionHasItsOwnText) {
    EXPECT_EQ("Unable to get the user option", FailureWith("UserVars.Other = 1\n"));
}

TEST_F(HostFactoryTest, WhatIsNoWholeNumberIsNoIntegerOption) {
    for (char const* const value : {"yes", "\"\"", "1.5", "\" 1\"", "99999999999", "\"1\"\r"}) {
        EXPECT_EQ("Unable to get advanced option UserVars.ActiveDirectoryVerifyCAMCertificate",
                  FailureWith("UserVars.ActiveDirectoryVerifyCAMCertificate = " +
                              std::string(value) + "\n"))
            << value;
    }
}

TEST_F(HostFactoryTest, AFileThatCannotBeReadSaysWhy) {
    EXPECT_EQ("Unable to get root option branch: Error parsing configuration on line 1: no "
              "delimiter found",
              FailureWith("UserVars\n"));
    std::filesystem::remove(path);
    std::filesystem::create_directory(path);
    EXPECT_EQ("Unable to get root option branch: Cannot read '/etc/tessel/advanced.conf': it is "
              "not a regular file",
              FailureOf(Verify));
}

TEST_F(HostFactoryTest, TheInstalledFileTurnsVerificationOn) {
    std::filesystem::copy(TESTS_DATA_DIR "/../../etc/advanced.conf", path);
    EXPECT_EQ(1, Verify());
}

} // namespace
} // namespace HostCtl
