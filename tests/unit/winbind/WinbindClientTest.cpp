// SPDX-License-Identifier: Apache-2.0
#include "samba/WinbindClient.h"
#include "Failure.h"
#include "FakeWinbindd.h"

#include <gtest/gtest.h>

#include <functional>

using namespace tessel::winbind;
using namespace std::chrono_literals;

bool nss_wrapper_enabled() {
    return true;
}
bool uid_wrapper_enabled() {
    return true;
}

#if defined(__has_feature)
#if __has_feature(address_sanitizer) || __has_feature(thread_sanitizer)
// libwbclient believes the length that an answer states, and does not release all of a bad answer.
extern "C" char const* __asan_default_options();
extern "C" char const* __asan_default_options() {
    return "allocator_may_return_null=1";
}
extern "C" char const* __tsan_default_options();
extern "C" char const* __tsan_default_options() {
    return "allocator_may_return_null=1";
}
extern "C" char const* __lsan_default_suppressions();
extern "C" char const* __lsan_default_suppressions() {
    return "leak:libwbclient.so";
}
#endif
#endif

namespace {

WinbindClient ClientFor(BoundedCall::Clock::duration time) {
    return WinbindClient(BoundedCall::Clock::now() + time);
}

ActiveDirectoryClientErrorCode CodeOf(std::function<void()> const& question) {
    try {
        question();
    } catch (Failure const& failure) {
        return failure.Code();
    }
    return TSLAUTH_PROVIDER_SUCCESS;
}

/// Every question that is asked of winbindd.
std::vector<std::function<void(WinbindClient const&)>> const questions = {
    [](auto const& client) { client.Ping(); },
    [](auto const& client) { client.GetHost(); },
    [](auto const& client) { client.CheckTrustCredentials(); },
    [](auto const& client) { client.ListDomains(); },
    [](auto const& client) { client.FindDomainController("corp.example", ""); },
    [](auto const& client) { client.FindDomainController("corp.example", "Site"); },
    [](auto const& client) { client.GetForest("corp.example"); },
    [](auto const& client) { client.GetUserName("CORP", "user1"); },
};

void ExpectEverywhere(ActiveDirectoryClientErrorCode code, BoundedCall::Clock::duration time) {
    for (std::size_t i = 0; i < questions.size(); ++i) {
        EXPECT_EQ(code, CodeOf([&] { questions[i](ClientFor(time)); })) << "question " << i;
    }
}

void WaitForThreads() {
    while (BoundedCall::Abandoned() != 0) {
        std::this_thread::sleep_for(1ms);
    }
}

} // namespace

TEST(WinbindClientTest, WithoutWinbinddEveryQuestionSaysSo) {
    ASSERT_EQ(0, setenv("SELFTEST_WINBINDD_SOCKET_DIR", "/nonexistent", 1));
    ExpectEverywhere(TSLAUTH_PROVIDER_SERVICE_NOT_ACTIVE, 60s);
}

TEST(WinbindClientTest, EveryQuestionEndsInTimeWhereWinbinddIsSilent) {
    {
        FakeWinbindd const silent([](std::uint32_t) { return FakeWinbindd::Silence(); });
        ExpectEverywhere(TSLAUTH_PROVIDER_TIMED_OUT, 20ms);
        EXPECT_EQ(BoundedCall::MaximumThreads, BoundedCall::Abandoned());
        EXPECT_EQ(TSLAUTH_PROVIDER_TIMED_OUT, CodeOf([] { ClientFor(1h).Ping(); }));
        EXPECT_EQ(BoundedCall::MaximumThreads, silent.Connections());
    }
    WaitForThreads();
}

TEST(WinbindClientTest, ManyThreadsAskASilentWinbinddAtOnce) {
    {
        FakeWinbindd const silent(FakeWinbindd::Greeting(FakeWinbindd::Silence()));
        std::atomic<unsigned> timedOut{0};
        std::vector<std::thread> askers;
        for (unsigned i = 0; i < 40; ++i) {
            askers.emplace_back([&timedOut, i] {
                auto const code =
                    CodeOf([i] { questions[i % questions.size()](ClientFor(300ms)); });
                timedOut += code == TSLAUTH_PROVIDER_TIMED_OUT ? 1 : 0;
            });
        }
        for (std::thread& asker : askers) {
            asker.join();
        }
        EXPECT_EQ(40U, timedOut);
        EXPECT_EQ(BoundedCall::MaximumThreads, BoundedCall::Abandoned());
    }
    WaitForThreads();
}

TEST(WinbindClientTest, ManyThreadsGetTheirAnswers) {
    FakeWinbindd const winbindd(FakeWinbindd::Greeting(FakeWinbindd::Answer(FakeWinbindd::Ok)));
    std::atomic<unsigned> answered{0};
    std::vector<std::thread> askers;
    for (unsigned i = 0; i < 40; ++i) {
        askers.emplace_back([&answered] {
            auto const code = CodeOf([] {
                ClientFor(60s).Ping();
                ClientFor(60s).CheckTrustCredentials();
            });
            answered += code == TSLAUTH_PROVIDER_SUCCESS ? 1 : 0;
        });
    }
    for (std::thread& asker : askers) {
        asker.join();
    }
    EXPECT_EQ(40U, answered);
}

TEST(WinbindClientTest, AWinbinddThatHangsUpIsNotRunning) {
    FakeWinbindd const rude([](std::uint32_t) { return std::string(); });
    ExpectEverywhere(TSLAUTH_PROVIDER_SERVICE_NOT_ACTIVE, 60s);
}

TEST(WinbindClientTest, AWinbinddThatTalksNonsenseIsNotBelieved) {
    for (std::string const& nonsense :
         {std::string(4008, '\xff'), std::string(4008, '\0'),
          FakeWinbindd::Answer(FakeWinbindd::Ok, 7), FakeWinbindd::Answer(FakeWinbindd::Error)}) {
        FakeWinbindd const odd([nonsense](std::uint32_t) { return nonsense; });
        for (auto const& question : questions) {
            EXPECT_NE(TSLAUTH_PROVIDER_SUCCESS, CodeOf([&] { question(ClientFor(60s)); }));
        }
    }
}

TEST(WinbindClientTest, ARefusalIsWhatTheControllerSaid) {
    struct {
        std::uint32_t status;
        ActiveDirectoryClientErrorCode code;
    } const cases[] = {
        {0xC0000022, TSLAUTH_PROVIDER_ACCESS_DENIED},
        {0xC000006D, TSLAUTH_PROVIDER_LOGON_FAILURE},
        {0xC000005E, TSLAUTH_PROVIDER_NO_LOGON_SERVERS},
        {0xC0000133, TSLAUTH_PROVIDER_TIME_SKEW},
        {0xC000018B, TSLAUTH_PROVIDER_NO_TRUST_SAM_ACCOUNT},
        {0xC0000001, TSLAUTH_PROVIDER_INTERNAL_ERROR},
    };
    for (auto const& each : cases) {
        FakeWinbindd const winbindd(
            FakeWinbindd::Greeting(FakeWinbindd::Answer(FakeWinbindd::Error, each.status)));
        EXPECT_EQ(each.code, CodeOf([] { ClientFor(60s).CheckTrustCredentials(); }))
            << std::hex << each.status;
    }
}

TEST(WinbindClientTest, DomainsAreReadFromTheList) {
    std::string const list =
        "CORP\\corp.example\\S-1-5-21-1-2-3\\Workstation\\Yes\\No\\No\\Online\n"
        "OTHER\\other.example\\S-1-5-21-4-5-6\\Routed (via CORP)\\\\\\\\Online\n";
    FakeWinbindd const winbindd(
        FakeWinbindd::Greeting(FakeWinbindd::Answer(FakeWinbindd::Ok, 2, list + '\0')));
    auto const domains = ClientFor(60s).ListDomains();
    ASSERT_EQ(2U, domains.size());
    EXPECT_EQ("corp.example", domains[0].names.DNSName());
    EXPECT_EQ("OTHER", domains[1].names.NetBIOSName());
}

TEST(WinbindClientTest, EveryErrorHasACode) {
    EXPECT_EQ(TSLAUTH_PROVIDER_SUCCESS, CodeOfWinbind(WBC_ERR_SUCCESS));
    for (int error = WBC_ERR_SUCCESS + 1; error <= WBC_ERR_PWD_CHANGE_FAILED; ++error) {
        auto const code = CodeOfWinbind(static_cast<wbcErr>(error));
        EXPECT_NE(TSLAUTH_PROVIDER_SUCCESS, code) << error;
        // The library takes these two for something else than a failure of a question.
        EXPECT_NE(TSLAUTH_PROVIDER_CALL_NOT_IMPLEMENTED, code) << error;
        EXPECT_NE(TSLAUTH_PROVIDER_FILE_NOT_FOUND, code) << error;
    }
}
