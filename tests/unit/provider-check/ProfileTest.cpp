// SPDX-License-Identifier: Apache-2.0
#include "Profile.h"

#include "TemporaryFolder.h"

#include <tslauth/Exceptions.h>

#include <gtest/gtest.h>

using tessel::authentication::ConfigurationError;
using tessel::authentication::IOError;
using tessel::providercheck::Profile;

namespace {

class ProfileTest : public testing::Test {
protected:
    Profile Read(std::string const& text) const {
        std::ofstream(folder / "profile") << text;
        return Profile(folder / "profile");
    }

    TemporaryFolder const folder;
};

} // namespace

TEST_F(ProfileTest, WithoutAFileTheHostIsLeftAlone) {
    EXPECT_FALSE(Profile().hostMayChange);
    EXPECT_FALSE(Profile().HasDirectory());
}

TEST_F(ProfileTest, EveryKeyIsRead) {
    std::ofstream(folder / "password") << "the password\nmore\n";
    Profile const profile =
        Read("seconds = \"7\"\ncodes = \"1 0x10 4294901760\"\n"
             "host-may-change = \"yes\"\ndomain = \"d\"\nuser = \"u\"\n"
             "password-file = \"" +
             folder / "password" + "\"\naccount = \"a\"\nserver = \"s\"\nthumbprint = \"t\"\n");
    EXPECT_EQ(7U, profile.seconds);
    EXPECT_EQ((std::set<unsigned>{1, 16, 0xffff0000U}), profile.codes);
    EXPECT_TRUE(profile.hostMayChange);
    EXPECT_EQ("d", profile.domain);
    EXPECT_EQ("u", profile.user);
    EXPECT_EQ("the password", profile.password);
    EXPECT_EQ("a", profile.account);
    EXPECT_EQ("s", profile.server);
    EXPECT_EQ("t", profile.thumbprint);
    EXPECT_TRUE(profile.HasDirectory());
}

TEST_F(ProfileTest, WhatIsNoKeyOrNoValueIsRefused) {
    for (char const* const text :
         {"host-may-chanfe = \"yes\"", "host-may-change = \"maybe\"", "seconds = \"0\"",
          "seconds = \"soon\"", "codes = \"1 -1\"", "codes = \"5000000000\"", "domain"}) {
        EXPECT_THROW(Read(text), ConfigurationError) << text;
    }
}

TEST_F(ProfileTest, AFileThatCannotBeReadIsRefused) {
    EXPECT_THROW(Profile(folder / "nothing"), IOError);
    EXPECT_THROW(Read("password-file = \"" + folder / "nothing" + "\""), IOError);
}
