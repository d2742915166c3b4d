// SPDX-License-Identifier: Apache-2.0
// The interface for C, on a host with the example provider.
#include "Node.h"

#include <tslauth/HostLock.h>
#include <tslauth/Paths.h>
#include <tslauth/tslauth_c.h>

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <filesystem>
#include <fstream>
#include <memory>
#include <poll.h>
#include <thread>

using namespace tessel::authentication;
using testing::ElementsAre;
using testing::HasSubstr;
using testing::IsEmpty;

namespace {

struct Free {
    void operator()(tslauth_error* error) const {
        tslauth_error_free(error);
    }
    void operator()(tslauth_texts* texts) const {
        tslauth_texts_free(texts);
    }
    void operator()(tslauth_plan* plan) const {
        tslauth_plan_free(plan);
    }
    void operator()(tslauth_answer* answer) const {
        tslauth_answer_free(answer);
    }
    void operator()(tslauth_directory* directory) const {
        tslauth_directory_free(directory);
    }
};

template <typename T> using Owned = std::unique_ptr<T, Free>;

std::vector<std::string> In(tslauth_texts const* texts) {
    std::vector<std::string> all;
    for (size_t i = 0; tslauth_texts_get(texts, i) != nullptr; ++i) {
        all.emplace_back(tslauth_texts_get(texts, i));
    }
    return all;
}

/// What a call says that fails: "KIND CLASS: TEXT"; empty where it succeeds.
template <typename Call> std::string FailureOf(Call call) {
    tslauth_error* error = nullptr;
    int const result = call(&error);
    Owned<tslauth_error> const owned(error);
    if (result == 0) {
        EXPECT_EQ(nullptr, error);
        return "";
    }
    EXPECT_EQ(-1, result);
    if (error == nullptr) {
        return "no error";
    }
    return std::to_string(tslauth_error_get_kind(error)) + " " + tslauth_error_get_class(error) +
           ": " + tslauth_error_get_text(error);
}

class TslauthCTest : public testing::Test {
protected:
    void SetUp() override {
        namespace files = std::filesystem;
        files::create_directories("/etc/tessel/tslauth");
        files::create_directories("/etc/tslauth-example");
        files::remove_all("/var/lib/tslauth-example");
        files::remove_all("/run/directed");
        Write(Paths::ProviderConfiguration, "provider = \"example\"\n");
        Write(Paths::AuthenticationConfiguration, "remote-authentication-store = \"None\"\n");
        Write(Paths::PAMPolicy, "# ours\nauth required pam_unix.so\naccount required "
                                "pam_unix.so\n");
        Write(Paths::NSSConfiguration, "# ours\npasswd: files\ngroup: files\nshadow: files\n");
        Write("/etc/tslauth-example/accounts", "joiner:the secret\n");
        Write("/etc/tslauth-example/passwords", "alice:!\n");
    }

    static void Write(std::string const& path, std::string const& text) {
        std::ofstream(path) << text;
    }
    static std::string Read(std::string const& path) {
        std::ifstream file(path);
        return {std::istreambuf_iterator<char>(file), {}};
    }

    static Owned<tslauth_directory> Open(int seconds = 5) {
        tslauth_directory* directory = nullptr;
        EXPECT_EQ("", FailureOf([&](tslauth_error** error) {
                      return tslauth_directory_open(seconds, &directory, error);
                  }));
        return Owned<tslauth_directory>(directory);
    }
    static std::string Join(tslauth_directory* directory, char const* password) {
        return FailureOf([&](tslauth_error** error) {
            return tslauth_directory_join(directory, "example.test", "joiner", password,
                                          TSLAUTH_SKIP_HOSTNAME_CHECK, error);
        });
    }
    static std::string Recorded() {
        tslauth_texts* store = nullptr;
        EXPECT_EQ(0, tslauth_recorded_store(&store, nullptr));
        Owned<tslauth_texts> const owned(store);
        return In(store).at(0);
    }
};

} // namespace

TEST_F(TslauthCTest, TheStoresAreThoseOfTheFactory) {
    tslauth_texts* stores = nullptr;
    ASSERT_EQ(0, tslauth_stores(&stores, nullptr));
    Owned<tslauth_texts> const owned(stores);
    EXPECT_THAT(In(stores), ElementsAre("Active Directory", "None"));
    EXPECT_EQ(2U, tslauth_texts_count(stores));
    EXPECT_EQ(1U, tslauth_c_version());
}

TEST_F(TslauthCTest, APlanShowsTheFilesAndWritesNothing) {
    std::string const before = Read(Paths::PAMPolicy);
    tslauth_plan* plan = nullptr;
    ASSERT_EQ("", FailureOf([&](tslauth_error** error) {
                  return tslauth_plan_make("Active Directory", &plan, error);
              }));
    Owned<tslauth_plan> const owned(plan);
    ASSERT_EQ(3U, tslauth_plan_file_count(plan));
    EXPECT_STREQ(Paths::PAMPolicy, tslauth_plan_file_path(plan, 0));
    EXPECT_EQ(before, tslauth_plan_file_before(plan, 0));
    EXPECT_THAT(tslauth_plan_file_after(plan, 0), HasSubstr("pam_pwdfile.so"));
    EXPECT_EQ(nullptr, tslauth_plan_file_path(plan, 3));
    EXPECT_THAT(In(tslauth_plan_losses(plan)), IsEmpty());
    EXPECT_EQ(nullptr, tslauth_plan_refusal(plan));
    EXPECT_EQ(before, Read(Paths::PAMPolicy));
}

TEST_F(TslauthCTest, AnActivationAndItsReturnKeepWhatIsOurs) {
    std::string const pam = Read(Paths::PAMPolicy);
    std::string const nss = Read(Paths::NSSConfiguration);
    ASSERT_EQ("", FailureOf([](tslauth_error** error) {
                  return tslauth_activate("Active Directory", 0, 5, error);
              }));
    EXPECT_EQ("Active Directory", Recorded());
    EXPECT_THAT(Read(Paths::NSSConfiguration), HasSubstr("# ours\npasswd: extrausers files\n"));
    ASSERT_EQ(
        "", FailureOf([](tslauth_error** error) { return tslauth_activate("None", 0, 5, error); }));
    EXPECT_EQ("None", Recorded());
    EXPECT_EQ(pam, Read(Paths::PAMPolicy));
    EXPECT_EQ(nss, Read(Paths::NSSConfiguration));
}

TEST_F(TslauthCTest, WhatWouldBeLostIsNamedAndRefusedUnlessItIsAccepted) {
    // A jump over the place of the provider's entry lands elsewhere with it.
    Write(Paths::PAMPolicy, "auth [success=2 default=ignore] u.so\n"
                            "auth required /lib/security/$ISA/pam_access.so\n"
                            "auth required b.so\nauth required c.so\naccount required c.so\n");
    std::string const pam = Read(Paths::PAMPolicy);
    tslauth_plan* plan = nullptr;
    ASSERT_EQ("", FailureOf([&](tslauth_error** error) {
                  return tslauth_plan_make("Active Directory", &plan, error);
              }));
    Owned<tslauth_plan> const owned(plan);
    ASSERT_THAT(In(tslauth_plan_losses(plan)), testing::Not(IsEmpty()));
    EXPECT_THAT(FailureOf([](tslauth_error** error) {
                    return tslauth_activate("Active Directory", 0, 5, error);
                }),
                HasSubstr("7 Failure: /etc/pam.d/system-auth-generic: "));
    EXPECT_EQ(pam, Read(Paths::PAMPolicy));
    EXPECT_EQ("None", Recorded());
    EXPECT_EQ("", FailureOf([](tslauth_error** error) {
                  return tslauth_activate("Active Directory", TSLAUTH_ACCEPT_LOSS, 5, error);
              }));
    EXPECT_EQ("Active Directory", Recorded());
}

TEST_F(TslauthCTest, AnActivationWaitsForTheLockAndGivesUp) {
    HostLock lock;
    lock.Lock();
    EXPECT_EQ("8 Failure: another change of this host runs", FailureOf([](tslauth_error** error) {
                  return tslauth_activate("Active Directory", 0, 0, error);
              }));
    EXPECT_EQ("None", Recorded());
}

TEST_F(TslauthCTest, AWrongCallIsTold) {
    EXPECT_EQ("1 Failure: the store is null", FailureOf([](tslauth_error** error) {
                  return tslauth_activate(nullptr, 0, 0, error);
              }));
    EXPECT_EQ("1 Failure: a flag that has no meaning here", FailureOf([](tslauth_error** error) {
                  return tslauth_activate("None", 64, 0, error);
              }));
    EXPECT_EQ(
        "1 Failure: 'Nonsense' is no store that can be activated here",
        FailureOf([](tslauth_error** error) { return tslauth_activate("Nonsense", 0, 0, error); }));
    EXPECT_EQ(-1, tslauth_activate(nullptr, 0, 0, nullptr));
}

TEST_F(TslauthCTest, AMissingProviderIsAnErrorWithItsClass) {
    Write(Paths::ProviderConfiguration, "");
    tslauth_directory* directory = nullptr;
    EXPECT_THAT(FailureOf([&](tslauth_error** error) {
                    return tslauth_directory_open(1, &directory, error);
                }),
                HasSubstr("5 InvalidActiveDirectoryProviderException: "));
    EXPECT_EQ(nullptr, directory);
}

TEST_F(TslauthCTest, AHostJoinsAnswersAndParts) {
    auto const directory = Open();
    EXPECT_THAT(Join(directory.get(), "wrong"), HasSubstr("4 LogonFailureException: Exception "
                                                          "0x0000052e"));
    ASSERT_EQ("", Join(directory.get(), "the secret"));
    tslauth_answer* answer = nullptr;
    ASSERT_EQ(
        0, tslauth_directory_ask(directory.get(), TSLAUTH_QUESTION_MEMBERSHIP, &answer, nullptr));
    Owned<tslauth_answer> const owned(answer);
    ASSERT_EQ(1U, tslauth_answer_domain_count(answer));
    EXPECT_STREQ("example.test", tslauth_answer_dns_name(answer, 0));
    EXPECT_STREQ("EXAMPLE", tslauth_answer_netbios_name(answer, 0));
    EXPECT_EQ(nullptr, tslauth_answer_dns_name(answer, 1));
    EXPECT_EQ(0.0, tslauth_answer_get_age(answer));
    EXPECT_THAT(tslauth_answer_machine_account(answer), HasSubstr("CN=Computers"));
    ASSERT_EQ("", FailureOf([&](tslauth_error** error) {
                  return tslauth_directory_part(directory.get(), nullptr, nullptr, error);
              }));
    EXPECT_THAT(FailureOf([&](tslauth_error** error) {
                    return tslauth_directory_part(directory.get(), nullptr, nullptr, error);
                }),
                HasSubstr("2 NoSuchDomainException: "));
}

TEST_F(TslauthCTest, AnAnswerThatDoesNotComeIsTheLastOneWithItsAge) {
    Write(Paths::ProviderConfiguration, "provider = \"directed\"\n");
    auto const directory = Open(1);
    std::filesystem::create_directories("/run/directed");
    Write("/run/directed/domain", "corp.example");
    tslauth_answer* answer = nullptr;
    auto const ask = [&](tslauth_error** error) {
        return tslauth_directory_ask(directory.get(), TSLAUTH_QUESTION_MEMBERSHIP, &answer, error);
    };
    Write("/run/directed/domain", "hang");
    EXPECT_THAT(FailureOf(ask), HasSubstr("3 ProviderCallTimedOutException: "));
    Write("/run/directed/domain", "corp.example");
    std::this_thread::sleep_for(std::chrono::milliseconds(200)); // the one that hung
    ASSERT_EQ("", FailureOf(ask));
    Owned<tslauth_answer> const first(answer);
    EXPECT_EQ(0.0, tslauth_answer_get_age(answer));
    Write("/run/directed/domain", "hang");
    ASSERT_EQ("", FailureOf(ask));
    Owned<tslauth_answer> const second(answer);
    EXPECT_STREQ("corp.example", tslauth_answer_dns_name(answer, 0));
    EXPECT_GE(tslauth_answer_get_age(answer), 1.0);
    Write("/run/directed/domain", "code 5");
    std::this_thread::sleep_for(std::chrono::milliseconds(200));
    EXPECT_THAT(FailureOf(ask), HasSubstr("2 AccessDeniedException: "));
}

TEST_F(TslauthCTest, AJobTellsItsEndThroughADescriptor) {
    auto const directory = Open();
    tslauth_job* job = nullptr;
    ASSERT_EQ(0, tslauth_job_join(directory.get(), "example.test", "joiner", "the secret",
                                  TSLAUTH_SKIP_HOSTNAME_CHECK, &job, nullptr));
    pollfd descriptor = {tslauth_job_descriptor(job), POLLIN, 0};
    ASSERT_EQ(1, poll(&descriptor, 1, 10000));
    ASSERT_EQ("", FailureOf([&](tslauth_error** error) {
                  return tslauth_job_finish(job, nullptr, error);
              }));
    ASSERT_EQ(0, tslauth_job_ask(directory.get(), TSLAUTH_QUESTION_TRUSTED_DOMAINS, &job, nullptr));
    tslauth_answer* answer = nullptr;
    ASSERT_EQ(0, tslauth_job_finish(job, &answer, nullptr)); // waits by itself
    Owned<tslauth_answer> const owned(answer);
    EXPECT_STREQ("example.test", tslauth_answer_dns_name(answer, 0));
    ASSERT_EQ(0, tslauth_job_part(directory.get(), "joiner", "wrong", &job, nullptr));
    EXPECT_THAT(
        FailureOf([&](tslauth_error** error) { return tslauth_job_finish(job, nullptr, error); }),
        HasSubstr("4 LogonFailureException"));
}

TEST_F(TslauthCTest, AJobThatIsAbandonedGoesOnWithoutItsDirectory) {
    Write(Paths::ProviderConfiguration, "provider = \"directed\"\n");
    std::filesystem::create_directories("/run/directed");
    Write("/run/directed/part", "hang");
    auto directory = Open(1);
    tslauth_job* job = nullptr;
    ASSERT_EQ(0, tslauth_job_part(directory.get(), nullptr, nullptr, &job, nullptr));
    pollfd descriptor = {tslauth_job_descriptor(job), POLLIN, 0};
    EXPECT_EQ(0, poll(&descriptor, 1, 100));
    tslauth_job_abandon(job);
    directory.reset();
    std::filesystem::remove("/run/directed/part");
    HostLock lock; // which the job holds as long as it runs
    EXPECT_TRUE(lock.TryLock(10));
}
