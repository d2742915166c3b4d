// SPDX-License-Identifier: Apache-2.0
// The provider `winbind` as the library loads it, with a winbindd that answers badly or not at all.
// What it does in a domain is shown by tests/lab.
#include "Failure.h"
#include "LoadedProvider.h"
#include "Node.h"
#include "SystemLog.h"
#include "unit/winbind/FakeWinbindd.h"

#include <tslauth/ActiveDirectoryProvider.h>
#include <tslauth/ActiveDirectoryStore.h>
#include <tslauth/Exceptions.h>
#include <tslauth/tslauth_provider.h>

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <chrono>
#include <filesystem>
#include <fstream>
#include <functional>
#include <memory>
#include <sys/wait.h>

using namespace tessel::authentication;
using namespace std::chrono_literals;
using testing::Contains;
using testing::ElementsAre;
using testing::IsEmpty;
using testing::StartsWith;

#if defined(__has_feature)
#if __has_feature(address_sanitizer)
// A program that ends while a thread of it hangs: the leak checker cannot always stop that thread,
// and then misses what glibc keeps for it.
extern "C" char const* __lsan_default_suppressions();
extern "C" char const* __lsan_default_suppressions() {
    return "leak:_dlerror_run";
}
#endif
#endif

namespace {

/// Of a process that ends beside a thread that hangs: what that thread holds is no leak, and the
/// leak checker sometimes cannot stop it to see so.
bool endsBesideAThread = false;

} // namespace

/// Asked by the leak checker, where there is one (sanitizer/lsan_interface.h).
extern "C" int __lsan_is_turned_off() {
    return endsBesideAThread ? 1 : 0;
}

namespace {

typedef std::chrono::steady_clock Clock;

constexpr char socketFolder[] = "/run/samba/winbindd";
/// What a question may take, and what a busy machine adds.
constexpr auto bound = 10s;
constexpr auto slack = 5s;

std::type_index ClassOf(std::function<void()> const& question) {
    return FailureOf(question).type;
}

class WinbindProviderTest : public testing::Test {
protected:
    void SetUp() override {
        std::filesystem::create_directories(socketFolder);
        std::filesystem::create_directories("/etc/samba");
        std::filesystem::remove("/etc/samba/tslauth.conf");
    }

    /// As a join leaves the host.
    void Join() {
        std::ofstream("/etc/samba/tslauth.conf") << "[global]\n"
                                                    "\tworkgroup = CORP\n"
                                                    "\trealm = CORP.EXAMPLE\n"
                                                    "\tnetbios name = NODE\n"
                                                    "\tsecurity = ads\n";
        std::ofstream("/etc/samba/smb.conf") << "[global]\n"
                                                "\tinclude = /etc/samba/tslauth.conf\n";
    }

    static FakeWinbindd::Script Silent() {
        return [](std::uint32_t) { return FakeWinbindd::Silence(); };
    }
};

} // namespace

TEST_F(WinbindProviderTest, EveryEntryButTheUnusedOneIsThere) {
    LoadedProvider const library("winbind");
    auto const& operations =
        library.Find<ActiveDirectoryClientOperationsRecord>("ActiveDirectoryClientOperations");
    EXPECT_EQ(2, operations.apiVersion);
    EXPECT_NE(nullptr, operations.joinDomain);
    EXPECT_NE(nullptr, operations.partDomain);
    EXPECT_NE(nullptr, operations.getActiveDomain);
    EXPECT_NE(nullptr, operations.setPreferredDomainControllers);
    EXPECT_NE(nullptr, operations.getPreferredDomainControllers);
    EXPECT_EQ(nullptr, operations.unused);
    EXPECT_NE(nullptr, operations.getDomainTrustState);
    EXPECT_NE(nullptr, operations.getTrustedDomains);
    EXPECT_NE(nullptr, operations.getMachineAccountDN);
    EXPECT_NE(nullptr, operations.getAnyDomainController);
    EXPECT_NE(nullptr, operations.convertCanonicalUsername);
    EXPECT_NE(nullptr, operations.joinDomainWithMachineAccount);
    EXPECT_NE(nullptr, operations.getHostPrincipalForDomain);
    EXPECT_NE(nullptr, operations.getDomainTrustRelationship);
}

TEST_F(WinbindProviderTest, ItNamesItsModules) {
    ActiveDirectoryProvider const provider("winbind");
    EXPECT_EQ("pam_tslauth_winbind.so", provider.PAMModule());
    EXPECT_THAT(provider.PAMModuleParameters(), ElementsAre("try_first_pass", "cached_login"));
    EXPECT_EQ("tslauth_winbind", provider.NSSModule());
    EXPECT_THAT(provider.NSSModuleParameters(), IsEmpty());
    EXPECT_EQ(2, provider.GetAPIVersion());
}

TEST_F(WinbindProviderTest, AHostThatIsNotJoinedHasNoDomain) {
    ActiveDirectoryProvider const provider("winbind");
    EXPECT_EQ(Domain(), provider.GetActiveDomain());
    EXPECT_THAT(provider.GetTrustedDomains(), IsEmpty());
    EXPECT_EQ(7, provider.GetDomainTrustState());
    EXPECT_EQ(0, provider.GetDomainTrustRelationship("corp.example"));
    EXPECT_THROW(provider.GetHostPrincipalForDomain("corp.example"), NoSuchDomainException);
    EXPECT_EQ("", provider.GetMachineAccountDN());
    EXPECT_THROW(provider.ConvertCanonicalUsername("CORP\\user1"), NoSuchDomainException);
    EXPECT_THROW(provider.ConvertCanonicalUsername("user1"), InvalidAccountNameException);
    // The node has no network.
    EXPECT_THROW(provider.GetAnyDomainController("", "corp.example"), NoSuchDomainException);
    EXPECT_THROW(provider.GetAnyDomainController("", "bad name"), InvalidDomainNameException);
}

TEST_F(WinbindProviderTest, CredentialsWithoutANameOrAPasswordAreRefused) {
    ActiveDirectoryProvider const provider("winbind");
    for (Credentials const& credentials : {Credentials{"user", nullptr}, {nullptr, "password"}}) {
        EXPECT_THROW(provider.JoinDomain("corp.example", "", credentials),
                     InvalidParameterException);
        EXPECT_THROW(provider.PartDomain(credentials), InvalidParameterException);
    }
}

TEST_F(WinbindProviderTest, WithoutWinbinddTheStateIsThree) {
    Join();
    SystemLog log;
    ActiveDirectoryProvider const provider("winbind");
    EXPECT_EQ(Domain("corp.example", "CORP"), provider.GetActiveDomain());
    EXPECT_EQ(3, provider.GetDomainTrustState());
    EXPECT_THROW(provider.GetTrustedDomains(), ServiceNotActiveException);
    EXPECT_THROW(provider.ConvertCanonicalUsername("CORP\\user1"), ServiceNotActiveException);
    EXPECT_THAT(log.Messages(),
                Contains(StartsWith(SystemLog::Warning("winbind: get trusted domains: "))));
}

TEST_F(WinbindProviderTest, AWinbinddThatNeverAnswersIsWaitedForNoLongerThanTheBound) {
    Join();
    {
        FakeWinbindd const silent(Silent(), socketFolder);
        auto provider = std::make_unique<ActiveDirectoryProvider>("winbind");

        auto start = Clock::now();
        EXPECT_EQ(4, provider->GetDomainTrustState());
        EXPECT_LT(Clock::now() - start, 3s + slack);

        // Many threads ask at once.
        std::vector<std::function<void()>> const questions = {
            [&] { provider->GetTrustedDomains(); },
            [&] { provider->GetAnyDomainController("", "corp.example"); },
            [&] { provider->ConvertCanonicalUsername("CORP\\user1"); },
            [&] { provider->GetHostPrincipalForDomain("corp.example"); },
        };
        std::vector<std::thread> askers;
        std::atomic<unsigned> inTime{0};
        for (unsigned i = 0; i < 24; ++i) {
            askers.emplace_back([&, i] {
                auto const before = Clock::now();
                bool const timedOut =
                    ClassOf(questions[i % questions.size()]) == typeid(WSATimedOutException);
                inTime += timedOut && Clock::now() - before < bound + slack ? 1 : 0;
            });
        }
        for (std::thread& asker : askers) {
            asker.join();
        }
        EXPECT_EQ(24U, inTime);

        // No thread is left to wait: whoever asks now hears so at once.
        start = Clock::now();
        EXPECT_THROW(provider->GetTrustedDomains(), WSATimedOutException);
        EXPECT_EQ(4, provider->GetDomainTrustState());
        EXPECT_LT(Clock::now() - start, slack);
        EXPECT_LE(silent.Connections(), 8U);

        // The abandoned threads outlive the provider's adapter, and do no harm to a child.
        provider.reset();
        EXPECT_TRUE(LoadedProvider::IsLoaded("winbind"));
        pid_t const child = fork();
        ASSERT_NE(-1, child);
        if (child == 0) {
            ActiveDirectoryProvider const own("winbind");
            _exit(own.GetDomainTrustState());
        }
        int status = -1;
        ASSERT_EQ(child, waitpid(child, &status, 0));
        EXPECT_TRUE(WIFEXITED(status) && WEXITSTATUS(status) == 4) << status;
    }
    // Now it is gone, and the threads with it: questions are asked again.
    ActiveDirectoryProvider const provider("winbind");
    for (int i = 0; provider.GetDomainTrustState() != 3 && i < 500; ++i) {
        std::this_thread::sleep_for(10ms);
    }
    EXPECT_EQ(3, provider.GetDomainTrustState());
}

TEST_F(WinbindProviderTest, AProgramEndsWhileAQuestionHangs) {
    Join();
    FakeWinbindd const silent(Silent(), socketFolder);
    pid_t const child = fork();
    ASSERT_NE(-1, child);
    if (child == 0) {
        endsBesideAThread = true;
        ActiveDirectoryProvider const provider("winbind");
        exit(provider.GetDomainTrustState());
    }
    int status = -1;
    ASSERT_EQ(child, waitpid(child, &status, 0));
    EXPECT_TRUE(WIFEXITED(status) && WEXITSTATUS(status) == 4) << status;
}

TEST_F(WinbindProviderTest, TheStoreAnswersFromItsCacheWhileWinbinddHangs) {
    Join();
    std::ofstream("/etc/tessel/tslauth/provider.conf") << "provider = \"winbind\"\n";
    FakeWinbindd const silent(Silent(), socketFolder);
    SystemLog log;
    ActiveDirectoryStore const store(1);
    auto const start = Clock::now();
    EXPECT_THAT(store.GetTrustedDomains(), IsEmpty());
    EXPECT_LT(Clock::now() - start, 1s + slack);
    EXPECT_THAT(log.Messages(), Contains(SystemLog::Warning(
                                    "GetTrustedDomains call timedout. Returning cached value.")));
}
