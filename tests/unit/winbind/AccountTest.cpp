// SPDX-License-Identifier: Apache-2.0
#include "samba/Account.h"

#include "Failure.h"

#include <chrono>
#include <gmock/gmock.h>
#include <string>

namespace tessel::winbind {
namespace {

using testing::HasSubstr;
using testing::Not;

/// What a tool reads: its arguments, its environment, the files that these name.
std::string ReadAs(std::string const& user, std::string const& password) {
    Account const account({user.c_str(), password.c_str()});
    ChildProcess::Task task;
    task.arguments = {"sh", "-c",
                      "cat \"$2\"; printf '|'; test -z \"$PASSWD_FILE\" || cat \"$PASSWD_FILE\"",
                      "sh"};
    account.AddTo(task);
    for (std::string const& argument : task.arguments) {
        EXPECT_THAT(argument, Not(HasSubstr(password)));
        EXPECT_THAT(argument, Not(HasSubstr(user)));
    }
    for (std::string const& variable : task.environment) {
        EXPECT_THAT(variable, Not(HasSubstr(password)));
    }
    return ChildProcess::Run(task, Clock::now() + std::chrono::seconds(10)).output;
}

unsigned int CodeFor(char const* user, char const* password) {
    try {
        Account const account({user, password});
        return 0;
    } catch (Failure const& e) {
        return e.Code();
    }
}

TEST(AccountTest, GivesThePasswordInAFileOfItsOwn) {
    EXPECT_EQ("username = CORP\\joiner\n| #\"=p\xC3\xA4'; ",
              ReadAs("CORP\\joiner", " #\"=p\xC3\xA4'; "));
}

TEST(AccountTest, GivesALongPasswordWithTheName) {
    std::string const password(200, 'x');
    EXPECT_EQ("username = joiner\npassword = " + password + "\n|", ReadAs("joiner", password));
}

TEST(AccountTest, TheLongestPasswordOfAFileHas127Bytes) {
    EXPECT_EQ("username = joiner\n| " + std::string(126, 'x'),
              ReadAs("joiner", ' ' + std::string(126, 'x')));
}

TEST(AccountTest, RefusesWhatTheToolsWouldReadOtherwise) {
    EXPECT_EQ(1216U, CodeFor("joiner", "two\nlines"));
    EXPECT_EQ(1216U, CodeFor("joiner", (' ' + std::string(127, 'x')).c_str()));
    EXPECT_EQ(86U, CodeFor("joiner", ""));
    EXPECT_EQ(87U, CodeFor("joiner", nullptr));
    EXPECT_EQ(87U, CodeFor(nullptr, "word"));
    EXPECT_EQ(1315U, CodeFor("", "word"));
    EXPECT_EQ(1315U, CodeFor(" joiner", "word"));
    EXPECT_EQ(1315U, CodeFor("joiner\t", "word"));
    EXPECT_EQ(1315U, CodeFor("joiner\npassword = x", "word"));
    EXPECT_EQ(0U, CodeFor("joiner@corp.example", "word"));
}

} // namespace
} // namespace tessel::winbind
