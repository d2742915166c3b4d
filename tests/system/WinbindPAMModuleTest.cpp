// SPDX-License-Identifier: Apache-2.0
// The PAM module of the provider `winbind` as libpam loads it, beside a module that plays Samba's
// and with a program that plays the one that asks the domain. What it does in a domain is shown by
// tests/lab.
#include "Node.h"
#include "TemporaryFolder.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <chrono>
#include <cstdlib>
#include <cstring>
#include <filesystem>
#include <fstream>
#include <security/pam_appl.h>
#include <string>
#include <vector>

using namespace std::chrono_literals;
using testing::ElementsAre;
using testing::IsEmpty;

namespace {

constexpr char program[] = "/usr/libexec/tslauth/winbind-account";
constexpr char programCalls[] = "/run/winbind-account.calls";

extern "C" int Converse(int count, pam_message const** messages, pam_response** responses,
                        void* said) {
    for (int i = 0; i < count; ++i) {
        static_cast<std::vector<std::string>*>(said)->emplace_back(messages[i]->msg);
    }
    // libpam's, which frees it.
    *responses = static_cast<pam_response*>(
        std::calloc(static_cast<std::size_t>(count), sizeof(pam_response)));
    return PAM_SUCCESS;
}

/// A log-in through a policy of the test's own.
class LogIn {
public:
    LogIn(std::string const& folder, std::string const& user) {
        EXPECT_EQ(PAM_SUCCESS, ::pam_start_confdir("service", user.c_str(), &_conversation,
                                                   folder.c_str(), &_handle));
    }
    LogIn(LogIn const&) = delete;
    LogIn& operator=(LogIn const&) = delete;
    ~LogIn() {
        (void)::pam_end(_handle, PAM_SUCCESS);
    }

    pam_handle_t* Handle() const {
        return _handle;
    }

    std::string User() const {
        void const* user = nullptr;
        EXPECT_EQ(PAM_SUCCESS, ::pam_get_item(_handle, PAM_USER, &user));
        return static_cast<char const*>(user);
    }

    /// What Samba's module was called with.
    std::string Calls() const {
        char const* const calls = ::pam_getenv(_handle, "CALLS");
        return calls == nullptr ? "" : calls;
    }

    std::vector<std::string> const& Said() const {
        return _said;
    }

private:
    std::vector<std::string> _said;
    pam_conv _conversation = {&Converse, &_said};
    pam_handle_t* _handle = nullptr;
};

void Play(std::string const& script) {
    std::filesystem::create_directories("/usr/libexec/tslauth");
    std::filesystem::remove(program);
    std::ofstream(program) << "#!/bin/sh\necho \"$*\" >>" << programCalls << '\n' << script << '\n';
    std::filesystem::permissions(program, std::filesystem::perms(0755));
}

class WinbindPAMModuleTest : public testing::Test {
protected:
    void SetUp() override {
        if (sizeof(void*) != 8) {
            GTEST_SKIP() << "the machine's PAM modules are of 64 bits";
        }
        std::filesystem::remove(programCalls);
        std::filesystem::create_symlink(MODULES "/pam_tslauth_winbind.so", Module());
        std::filesystem::create_symlink(MODULES "/pam_winbind.so", _folder / "pam_winbind.so");
        Play("echo in-order");
    }

    std::string Module() const {
        return _folder / "pam_tslauth_winbind.so";
    }

    /// Every facility has the module with these parameters, and then whatever `behind` is.
    void SetPolicy(std::string const& parameters, std::string const& behind) {
        std::ofstream policy(_folder / "service");
        for (char const* const facility : {"auth", "account", "password", "session"}) {
            policy << facility << " required " << Module() << ' ' << parameters << '\n';
            policy << facility << " required " << behind << '\n';
        }
    }

    LogIn Begin(std::string const& user) const {
        return {_folder.Path(), user};
    }

    std::string AskedFor() const {
        return std::filesystem::exists(programCalls) ? Contents(programCalls) : std::string();
    }

    /// What a log-in without a password ends with.
    int CheckOf(std::string const& user) {
        SetPolicy("check_only", "pam_permit.so");
        LogIn const login = Begin(user);
        int const result = ::pam_acct_mgmt(login.Handle(), 0);
        said = login.Said();
        EXPECT_EQ("", login.Calls());
        return result;
    }

    std::vector<std::string> said;

private:
    TemporaryFolder _folder;
};

} // namespace

TEST_F(WinbindPAMModuleTest, ALocalUserIsPassedOver) {
    for (char const* const parameters : {"try_first_pass", "check_only"}) {
        SetPolicy(parameters, "pam_permit.so");
        LogIn const login = Begin("root");
        EXPECT_EQ(PAM_SUCCESS, ::pam_authenticate(login.Handle(), 0));
        EXPECT_EQ(PAM_SUCCESS, ::pam_acct_mgmt(login.Handle(), 0));
        EXPECT_EQ(PAM_SUCCESS, ::pam_setcred(login.Handle(), PAM_ESTABLISH_CRED));
        EXPECT_EQ(PAM_SUCCESS, ::pam_open_session(login.Handle(), 0));
        EXPECT_EQ(PAM_SUCCESS, ::pam_close_session(login.Handle(), 0));
        EXPECT_EQ(PAM_SUCCESS, ::pam_chauthtok(login.Handle(), 0));
        EXPECT_EQ("", login.Calls());
        EXPECT_EQ("", AskedFor());
    }
}

TEST_F(WinbindPAMModuleTest, ALocalUserWhomOthersRefuseStaysRefused) {
    SetPolicy("", "pam_deny.so");
    LogIn const login = Begin("root");
    EXPECT_EQ(PAM_AUTH_ERR, ::pam_authenticate(login.Handle(), 0));
    EXPECT_EQ(PAM_AUTH_ERR, ::pam_acct_mgmt(login.Handle(), 0));
}

TEST_F(WinbindPAMModuleTest, AUserOfTheDomainIsSambas) {
    SetPolicy("try_first_pass debug", "pam_permit.so");
    LogIn const login = Begin("CORP\\user1");
    EXPECT_EQ(PAM_SUCCESS, ::pam_authenticate(login.Handle(), 0));
    EXPECT_EQ(PAM_SUCCESS, ::pam_acct_mgmt(login.Handle(), 0));
    EXPECT_EQ(PAM_SUCCESS, ::pam_setcred(login.Handle(), PAM_ESTABLISH_CRED));
    EXPECT_EQ(PAM_SUCCESS, ::pam_open_session(login.Handle(), 0));
    EXPECT_EQ(PAM_SUCCESS, ::pam_close_session(login.Handle(), 0));
    EXPECT_EQ("pam_sm_authenticate try_first_pass debug;"
              "pam_sm_acct_mgmt try_first_pass debug;"
              "pam_sm_setcred try_first_pass debug;"
              "pam_sm_open_session try_first_pass debug;"
              "pam_sm_close_session try_first_pass debug;",
              login.Calls());
    EXPECT_EQ("", AskedFor());
}

TEST_F(WinbindPAMModuleTest, APasswordIsChangedBySambasModule) {
    SetPolicy("use_authtok", "pam_permit.so");
    LogIn const login = Begin("CORP\\user1");
    EXPECT_EQ(PAM_SUCCESS, ::pam_chauthtok(login.Handle(), 0));
    EXPECT_EQ("pam_sm_chauthtok use_authtok;pam_sm_chauthtok use_authtok;", login.Calls());
}

TEST_F(WinbindPAMModuleTest, WhatSambasModuleAnswersIsTheAnswer) {
    SetPolicy("answer=" + std::to_string(PAM_AUTH_ERR), "pam_permit.so");
    LogIn const login = Begin("CORP\\user1");
    EXPECT_EQ(PAM_AUTH_ERR, ::pam_authenticate(login.Handle(), 0));
}

TEST_F(WinbindPAMModuleTest, ANameThatBecomesALocalOneIsRefused) {
    SetPolicy("become=root", "pam_permit.so");
    for (char const* const user : {"ROOT", "CORP\\root", "root@corp.example"}) {
        LogIn const login = Begin(user);
        EXPECT_EQ(PAM_PERM_DENIED, ::pam_authenticate(login.Handle(), 0));
        EXPECT_EQ(user, login.User());
        EXPECT_EQ(PAM_PERM_DENIED, ::pam_acct_mgmt(login.Handle(), 0));
        EXPECT_EQ(user, login.User());
    }
}

TEST_F(WinbindPAMModuleTest, ANameThatBecomesAnotherOfTheDomainIsLetIn) {
    SetPolicy("become=CORP\\user1", "pam_permit.so");
    LogIn const login = Begin("user1@corp.example");
    EXPECT_EQ(PAM_SUCCESS, ::pam_authenticate(login.Handle(), 0));
    EXPECT_EQ("CORP\\user1", login.User());
}

TEST_F(WinbindPAMModuleTest, WithoutSambasModuleNobodyOfTheDomainIsLetIn) {
    SetPolicy("", "pam_permit.so");
    std::filesystem::remove(std::filesystem::path(Module()).replace_filename("pam_winbind.so"));
    LogIn const login = Begin("CORP\\user1");
    EXPECT_EQ(PAM_MODULE_UNKNOWN, ::pam_authenticate(login.Handle(), 0));
}

TEST_F(WinbindPAMModuleTest, WithoutTheLocalFileNobodyIsLetIn) {
    SetPolicy("", "pam_permit.so");
    std::filesystem::rename("/etc/passwd", "/etc/passwd.away");
    LogIn const login = Begin("CORP\\user1");
    int const result = ::pam_authenticate(login.Handle(), 0);
    std::filesystem::rename("/etc/passwd.away", "/etc/passwd");
    EXPECT_EQ(PAM_SYSTEM_ERR, result);
    EXPECT_EQ("", login.Calls());
}

TEST_F(WinbindPAMModuleTest, TheDomainIsAskedOfWhoComesWithoutAPassword) {
    EXPECT_EQ(PAM_SUCCESS, CheckOf("CORP\\user1"));
    EXPECT_THAT(said, IsEmpty());
    EXPECT_EQ("CORP\\user1\n", AskedFor());
}

TEST_F(WinbindPAMModuleTest, WhomTheDomainHasDisabledLockedOrExpiredIsToldAndRefused) {
    Play("echo disabled");
    EXPECT_EQ(PAM_ACCT_EXPIRED, CheckOf("CORP\\user1"));
    EXPECT_THAT(said,
                ElementsAre("Your account is disabled. Please see your system administrator."));
    Play("echo locked-out");
    EXPECT_EQ(PAM_PERM_DENIED, CheckOf("CORP\\user1"));
    EXPECT_THAT(said,
                ElementsAre("Your account has been locked. Please see your system administrator."));
    Play("echo expired");
    EXPECT_EQ(PAM_ACCT_EXPIRED, CheckOf("CORP\\user1"));
    EXPECT_THAT(said,
                ElementsAre("Your account has expired. Please see your system administrator."));
}

TEST_F(WinbindPAMModuleTest, SomebodyElsesUserIsPassedOver) {
    Play("echo not-of-the-domain");
    EXPECT_EQ(PAM_SUCCESS, CheckOf("extra"));
}

TEST_F(WinbindPAMModuleTest, WhereUsersMayLogInOffLineTheyAreLetIn) {
    Play("echo off-line");
    EXPECT_EQ(PAM_SUCCESS, CheckOf("CORP\\user1"));
    EXPECT_THAT(said, IsEmpty());
}

TEST_F(WinbindPAMModuleTest, ADomainThatDoesNotAnswerLetsNobodyIn) {
    for (char const* const script :
         {"echo no-answer", "", "exit 1", "echo in-orderly", "printf in-order", "kill -SEGV $$"}) {
        Play(script);
        EXPECT_EQ(PAM_AUTHINFO_UNAVAIL, CheckOf("CORP\\user1")) << script;
        EXPECT_THAT(said, ElementsAre("The domain does not answer whether you may log in. "
                                      "Please try again later."));
    }
    std::filesystem::remove(program);
    EXPECT_EQ(PAM_AUTHINFO_UNAVAIL, CheckOf("CORP\\user1"));
}

TEST_F(WinbindPAMModuleTest, ADomainThatHangsIsWaitedForFiveSeconds) {
    Play("sleep 60");
    auto const start = std::chrono::steady_clock::now();
    EXPECT_EQ(PAM_AUTHINFO_UNAVAIL, CheckOf("CORP\\user1"));
    auto const taken = std::chrono::steady_clock::now() - start;
    EXPECT_GE(taken, 5s);
    EXPECT_LT(taken, 10s); // what a busy machine adds
}

TEST_F(WinbindPAMModuleTest, WhosePasswordTheDomainHasTakenIsNotAskedAbout) {
    Play("echo disabled");
    std::ofstream(std::filesystem::path(Module()).replace_filename("service"))
        << "auth required " << Module() << " become=CORP\\user1\n"
        << "account required " << Module() << " check_only\n";
    LogIn const login = Begin("user1@corp.example");
    ASSERT_EQ(PAM_SUCCESS, ::pam_authenticate(login.Handle(), 0));
    EXPECT_EQ(PAM_SUCCESS, ::pam_acct_mgmt(login.Handle(), 0));
    EXPECT_EQ("", AskedFor());
    // It was that user's password.
    ASSERT_EQ(PAM_SUCCESS, ::pam_set_item(login.Handle(), PAM_USER, "CORP\\user2"));
    EXPECT_EQ(PAM_ACCT_EXPIRED, ::pam_acct_mgmt(login.Handle(), 0));
    EXPECT_EQ("CORP\\user2\n", AskedFor());
}

TEST_F(WinbindPAMModuleTest, TheCheckIsQuietWhereItIsToBe) {
    Play("echo disabled");
    SetPolicy("check_only", "pam_permit.so");
    LogIn const login = Begin("CORP\\user1");
    EXPECT_EQ(PAM_ACCT_EXPIRED, ::pam_acct_mgmt(login.Handle(), static_cast<int>(PAM_SILENT)));
    EXPECT_THAT(login.Said(), IsEmpty());
}
