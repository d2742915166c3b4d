// SPDX-License-Identifier: Apache-2.0
#include "questions/OffLine.h"

#include "Paths.h"
#include "PlayedHost.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <sys/stat.h>
#include <utime.h>

using namespace tessel::winbind;
using testing::HasSubstr;

namespace {

constexpr char toldOffLine[] = "smbcontrol winbindd offline\n";
constexpr char toldOnLine[] = "smbcontrol winbindd online\n";

class OffLineTest : public testing::Test {
protected:
    void Join(char const* offLine) {
        host.Write(Paths::Samba, std::string("[global]\n\tinclude = ") + Paths::OwnSamba + '\n');
        host.Write(Paths::OwnSamba, std::string("[global]\n\trealm = CORP.EXAMPLE\n"
                                                "\tworkgroup = CORP\n"
                                                "\twinbind offline logon = ") +
                                        offLine + '\n');
    }

    /// How often the network was looked at.
    int Tell(bool isReachable) {
        int looks = 0;
        host.FailNowhere();
        TellWinbinddOfControllers(
            host,
            [&](std::string const& domain) {
                EXPECT_EQ("corp.example", domain);
                ++looks;
                return isReachable;
            },
            Clock::now() + std::chrono::seconds(1));
        return looks;
    }

    bool IsMarked() const {
        return std::filesystem::exists(host.At(Paths::OffLine));
    }

    void LetHalfAMinutePass() {
        struct stat status = {};
        ASSERT_EQ(0, ::stat(host.At(Paths::OffLine).c_str(), &status));
        utimbuf const times = {status.st_atime, status.st_mtime - 31};
        ASSERT_EQ(0, ::utime(host.At(Paths::OffLine).c_str(), &times));
    }

    PlayedHost host;
};

} // namespace

TEST_F(OffLineTest, WhereItIsNotChosenNothingIsLookedAt) {
    EXPECT_EQ(0, Tell(false)); // not joined
    Join("no");
    EXPECT_EQ(0, Tell(false));
    EXPECT_STREQ("", host.State().log);
}

TEST_F(OffLineTest, WhereAControllerIsThereNothingIsSaid) {
    Join("yes");
    EXPECT_EQ(1, Tell(true));
    EXPECT_STREQ("", host.State().log);
    EXPECT_FALSE(IsMarked());
}

TEST_F(OffLineTest, WhereNoneIsThereWinbinddIsTold) {
    Join("yes");
    EXPECT_EQ(1, Tell(false));
    EXPECT_STREQ(toldOffLine, host.State().log);
    EXPECT_TRUE(IsMarked());
}

TEST_F(OffLineTest, TheNextLogInDoesWithoutALook) {
    Join("yes");
    EXPECT_EQ(1, Tell(false));
    EXPECT_EQ(0, Tell(false));
    EXPECT_STREQ("", host.State().log);
    LetHalfAMinutePass();
    EXPECT_EQ(1, Tell(false));
    EXPECT_STREQ(toldOffLine, host.State().log);
    EXPECT_EQ(0, Tell(false));
}

TEST_F(OffLineTest, WinbinddIsToldThatAControllerIsBack) {
    Join("yes");
    EXPECT_EQ(1, Tell(false));
    LetHalfAMinutePass();
    EXPECT_EQ(1, Tell(true));
    EXPECT_STREQ(toldOnLine, host.State().log);
    EXPECT_FALSE(IsMarked());
}
