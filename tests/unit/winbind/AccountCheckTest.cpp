// SPDX-License-Identifier: Apache-2.0
#include "questions/AccountCheck.h"
#include "PlayedHost.h"
#include "PlayedWbclient.h"

#include <gtest/gtest.h>

#include <filesystem>
#include <string>

using namespace tessel::winbind;
using namespace std::chrono_literals;

namespace {

// 2024-01-01 00:00:00 UTC, in seconds since 1970 and in the directory's count.
constexpr std::chrono::system_clock::time_point now{1704067200s};
constexpr char nowThere[] = "133485408000000000";
constexpr char justAfter[] = "133485408000000001";
constexpr char never[] = "9223372036854775807";

AccountAnswer StateOf(std::string const& control, std::string const& computed,
                      std::string const& expires) {
    return StateOfAccount({{"userAccountControl", control},
                           {"msDS-User-Account-Control-Computed", computed},
                           {"accountExpires", expires}},
                          now);
}

/// A joined host that lets users in off line, and whose winbindd reaches no controller.
void PlayOffLine(PlayedHost const& host) {
    host.Write(Paths::OwnSamba, "[global]\n\tworkgroup = CORP\n\trealm = CORP.EXAMPLE\n"
                                "\tnetbios name = NODE\n\twinbind offline logon = yes\n");
    host.Write(Paths::Samba, "[global]\n\tinclude = /etc/samba/tslauth.conf\n");
    PlayedWinbindd::Here().account = [] { return WBC_ERR_WINBIND_NOT_AVAILABLE; };
}

AccountAnswer AnswerOf(PlayedHost const& host) {
    return AskAboutAccount(host, "CORP\\user1", Clock::now() + 10s);
}

} // namespace

TEST(AccountCheckTest, WithoutAControllerTheAdministratorSaysWhatFollows) {
    PlayedHost const host;
    PlayOffLine(host);
    EXPECT_EQ(AccountAnswer::OffLine, AnswerOf(host));
    std::string const lets = "winbind offline logon = yes";
    std::string text = host.Read(Paths::OwnSamba);
    host.Write(Paths::OwnSamba, text.replace(text.find(lets), lets.size(), ""));
    EXPECT_EQ(AccountAnswer::NoAnswer, AnswerOf(host));
}

TEST(AccountCheckTest, WhereItCannotBeReadWhatFollowsThereIsNoAnswer) {
    PlayedHost const host;
    PlayOffLine(host);
    PlayedWinbindd::Here().account = [&] {
        std::filesystem::remove(host.At(Paths::OwnSamba));
        std::filesystem::create_directory(host.At(Paths::OwnSamba));
        return WBC_ERR_WINBIND_NOT_AVAILABLE;
    };
    EXPECT_EQ(AccountAnswer::NoAnswer, AnswerOf(host));
}

TEST(AccountCheckTest, APlainAccountIsInOrder) {
    EXPECT_EQ(AccountAnswer::InOrder, StateOf("512", "0", never));
    EXPECT_EQ(AccountAnswer::InOrder, StateOf("512", "0", "0"));
    EXPECT_EQ(AccountAnswer::InOrder, StateOf("66048", "0", never)); // its password never expires
}

TEST(AccountCheckTest, ADisabledAccountIsDisabled) {
    EXPECT_EQ(AccountAnswer::Disabled, StateOf("514", "0", never));
    EXPECT_EQ(AccountAnswer::Disabled, StateOf("66050", "16", "1"));
}

TEST(AccountCheckTest, AnAccountExpiresAtItsMoment) {
    EXPECT_EQ(AccountAnswer::Expired, StateOf("512", "0", nowThere));
    EXPECT_EQ(AccountAnswer::InOrder, StateOf("512", "0", justAfter));
    EXPECT_EQ(AccountAnswer::Expired, StateOf("512", "0", "864000000000"));
    EXPECT_EQ(AccountAnswer::InOrder, StateOf("512", "0", "9223372036854775806"));
}

TEST(AccountCheckTest, ALockOutCountsAsLongAsTheControllerReckons) {
    EXPECT_EQ(AccountAnswer::LockedOut, StateOf("512", "16", never));
    EXPECT_EQ(AccountAnswer::LockedOut,
              StateOf("512", "8388624", never)); // and its password expired
    // Old directories keep the bit there, without clearing it at the end.
    EXPECT_EQ(AccountAnswer::InOrder, StateOf("528", "0", never));
}

TEST(AccountCheckTest, AnExpiredPasswordIsNoMatterOfTheAccount) {
    EXPECT_EQ(AccountAnswer::InOrder, StateOf("512", "8388608", never));
}

TEST(AccountCheckTest, AnAccountThatTheHostMayNotReadIsNoAnswer) {
    EXPECT_EQ(AccountAnswer::NoAnswer, StateOfAccount({}, now));
    EXPECT_EQ(AccountAnswer::NoAnswer,
              StateOfAccount(
                  {{"accountExpires", never}, {"msDS-User-Account-Control-Computed", "0"}}, now));
}

TEST(AccountCheckTest, WhereNobodyReckonsALockOutThereIsNone) {
    EXPECT_EQ(AccountAnswer::InOrder, StateOfAccount({{"userAccountControl", "512"}}, now));
}
