// SPDX-License-Identifier: Apache-2.0
#include "Failure.h"
#include "LoadedProvider.h"
#include "Node.h"
#include "providers/CAMRecording.h"

#include <tslauth/CAMProxy.h>
#include <tslauth/Exceptions.h>

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <cstdlib>
#include <fstream>
#include <iterator>
#include <memory>
#include <thread>
#include <unistd.h>

using namespace tessel::authentication;
using testing::MatchesRegex;

/// Two CAM providers at once are two global symbols of one name, which the address sanitizer takes
/// for a mistake. They are loaded on purpose: each must be served by its own record.
extern "C" __attribute__((visibility("default"))) char const* __asan_default_options();
extern "C" char const* __asan_default_options() {
    return "detect_odr_violation=0";
}

namespace {

Failure LoadingOf(std::string const& name) {
    return FailureOf([&] { CAMProxy const proxy(name, "192.0.2.1", true, ""); });
}

Failure Unopened(std::string const& loaderText) {
    return Plain<IOError>("Unable to open CAM provider: " + loaderText);
}

Failure WithoutOperations(std::string const& name) {
    return Plain<InvalidCAMProxyProviderException>("The specified CAMProxy provider '" + name +
                                                   "' is invalid: " + LoadedProvider::PathOf(name) +
                                                   ": undefined symbol: CAMProxyClientOperations");
}

/// Every operation that asks the server.
struct Operation {
    char const* name;
    std::string (*call)(CAMProxy const&);
};

Operation const operations[] = {
    {"GetDomainInfo",
     [](CAMProxy const& proxy) {
         char* texts[3] = {nullptr, nullptr, nullptr};
         proxy.GetDomainInfo(&texts[0], &texts[1], &texts[2]);
         return std::string(texts[0]) + "," + texts[1] + "," + texts[2];
     }},
    {"GetNetBIOSDomainName", [](CAMProxy const& proxy) { return proxy.GetNetBIOSDomainName(); }},
    {"GetDNSDomainName", [](CAMProxy const& proxy) { return proxy.GetDNSDomainName(); }},
    {"GetDomainSID", [](CAMProxy const& proxy) { return proxy.GetDomainSID(); }},
    {"CreateMachineAccount",
     [](CAMProxy const& proxy) {
         ComputerPrincipalInfo const info = proxy.CreateMachineAccount("node01", "");
         return info.unused + "," + info.firstResult + "," + info.secondResult;
     }},
};

char const* const answers[] = {"CORP,corp.example,S-1-5-21", "CORP", "corp.example", "S-1-5-21",
                               ",first,second"};

/// With a provider loaded that writes down what reaches it.
class CAMProxyTest : public testing::Test {
protected:
    void SetUp() override {
        Record().netBIOSDomainName = _texts[0];
        Record().dnsDomainName = _texts[1];
        Record().domainSID = _texts[2];
        Record().firstResult = _texts[3];
        Record().secondResult = _texts[4];
    }

    CAMRecording& Record() const {
        return _library.Find<CAMRecording>("camRecording");
    }

    CAMProxy const& Proxy() const {
        return _proxy;
    }

    std::string Log() const {
        return Record().log;
    }

    char _texts[5][16] = {"CORP", "corp.example", "S-1-5-21", "first", "second"};

private:
    LoadedProvider _library{"cam-recording"};
    CAMProxy _proxy{"cam-recording", "192.0.2.1", true, "0A:1B"};
};

} // namespace

// ---- Loading ------------------------------------------------------------------------------------

TEST(CAMProxyLoadingTest, AMissingLibraryIsAnIOErrorWithTheLoadersText) {
    EXPECT_EQ(Unopened("/usr/libexec/tslauth/libabsent.so: cannot open shared object file: No such "
                       "file or directory"),
              LoadingOf("absent"));
}

TEST(CAMProxyLoadingTest, AFileThatIsNoLibraryIsAnIOErrorWithTheLoadersText) {
    EXPECT_EQ(Unopened("/usr/libexec/tslauth/libnot-a-library.so: invalid ELF header"),
              LoadingOf("not-a-library"));
}

TEST(CAMProxyLoadingTest, AnErrorThatSomebodyElseLeftIsNotReported) {
    EXPECT_EQ(nullptr, dlopen("/nowhere/libelse.so", RTLD_LAZY));
    EXPECT_EQ(WithoutOperations("cam-missing-operations"), LoadingOf("cam-missing-operations"));
}

TEST(CAMProxyLoadingTest, AProviderWithoutOperationsIsInvalidAndUnloaded) {
    EXPECT_EQ(WithoutOperations("cam-missing-operations"), LoadingOf("cam-missing-operations"));
    EXPECT_FALSE(LoadedProvider::IsLoaded("cam-missing-operations"));
}

TEST(CAMProxyLoadingTest, OperationsOfAnotherProviderAreNotTakenForItsOwn) {
    CAMProxy const other("cam-recording", "192.0.2.1", true, "");
    EXPECT_EQ(WithoutOperations("cam-missing-operations"), LoadingOf("cam-missing-operations"));
    // Nor is the record of the one that was loaded first taken for the second one's.
    CAMProxy const second("cam-null-entries", "192.0.2.1", true, "");
    EXPECT_EQ(NotImplemented(), FailureOf([&] { second.GetDomainSID(); }));
}

TEST(CAMProxyLoadingTest, AnActiveDirectoryProviderIsNoCAMProvider) {
    EXPECT_EQ(WithoutOperations("null-entries"), LoadingOf("null-entries"));
    EXPECT_FALSE(LoadedProvider::IsLoaded("null-entries"));
}

TEST(CAMProxyLoadingTest, AnEmptyNameLoadsTheFileLibSo) {
    EXPECT_EQ(WithoutOperations(""), LoadingOf(""));
}

TEST(CAMProxyLoadingTest, TheFirstWordOfTheRecordIsNotRead) {
    // It is INT32_MAX there, and 0 here.
    EXPECT_EQ(NoFailure(), LoadingOf("cam-recording"));
    EXPECT_EQ(NoFailure(), LoadingOf("cam-null-entries"));
}

TEST(CAMProxyLoadingTest, TheLibraryStaysLoadedAsLongAsTheProxyLives) {
    EXPECT_FALSE(LoadedProvider::IsLoaded("cam-null-entries"));
    {
        CAMProxy const first("cam-null-entries", "192.0.2.1", true, "");
        { CAMProxy const second("cam-null-entries", "192.0.2.1", false, ""); }
        EXPECT_TRUE(LoadedProvider::IsLoaded("cam-null-entries"));
    }
    EXPECT_FALSE(LoadedProvider::IsLoaded("cam-null-entries"));
}

TEST(CAMProxyLoadingTest, FunctionsAreBoundWhenTheyAreCalledFirst) {
    EXPECT_EQ(NoFailure(), LoadingOf("cam-lazy"));
}

TEST(CAMProxyLoadingTest, ItsSymbolsAreGlobalAsLongAsTheProxyLives) {
    // Through the program's own handle: RTLD_DEFAULT would bind the library to the program for
    // good.
    void* const program = dlopen(nullptr, RTLD_LAZY);
    ASSERT_NE(nullptr, program);
    EXPECT_EQ(nullptr, dlsym(program, "CAMProxyClientOperations"));
    {
        CAMProxy const proxy("cam-recording", "192.0.2.1", true, "");
        EXPECT_NE(nullptr, dlsym(program, "CAMProxyClientOperations"));
        EXPECT_NE(nullptr, dlsym(program, "camRecording"));
    }
    EXPECT_EQ(nullptr, dlsym(program, "CAMProxyClientOperations"));
    (void)dlclose(program); // it is the program itself
}

// ---- What reaches the provider ------------------------------------------------------------------

TEST_F(CAMProxyTest, MakingOneAsksNobody) {
    EXPECT_EQ("", Log());
}

TEST_F(CAMProxyTest, EachOperationAnswersWithItsOwnTexts) {
    for (std::size_t i = 0; i < std::size(operations); ++i) {
        EXPECT_EQ(answers[i], operations[i].call(Proxy())) << operations[i].name;
        EXPECT_TRUE(Record().slotsWereNull) << operations[i].name;
    }
}

TEST_F(CAMProxyTest, DomainInfoHandsOutTheProvidersOwnTexts) {
    char* netBIOSName = nullptr;
    char* dnsName = nullptr;
    char* sid = nullptr;
    Proxy().GetDomainInfo(&netBIOSName, &dnsName, &sid);
    EXPECT_EQ(_texts[0], netBIOSName);
    EXPECT_EQ(_texts[1], dnsName);
    EXPECT_EQ(_texts[2], sid);
}

TEST_F(CAMProxyTest, AnswersAreCopies) {
    std::string const name = Proxy().GetDNSDomainName();
    ComputerPrincipalInfo const info = Proxy().CreateMachineAccount("node01", "");
    for (auto& text : _texts) {
        text[0] = '?';
    }
    EXPECT_EQ("corp.example", name);
    EXPECT_EQ("first", info.firstResult);
    EXPECT_EQ("second", info.secondResult);
}

TEST_F(CAMProxyTest, ThreeQuestionsAboutTheDomainAreThreeRoundTrips) {
    (void)Proxy().GetNetBIOSDomainName(); // only the calls count
    (void)Proxy().GetDNSDomainName();
    (void)Proxy().GetDomainSID();
    EXPECT_EQ("2 '192.0.2.1' '1' '0A:1B'\n"
              "2 '192.0.2.1' '1' '0A:1B'\n"
              "2 '192.0.2.1' '1' '0A:1B'\n",
              Log());
}

TEST_F(CAMProxyTest, AnEmptyOrganisationalUnitIsPassedAsNull) {
    Proxy().CreateMachineAccount("node01", "");
    Proxy().CreateMachineAccount("", "Servers/Linux");
    EXPECT_EQ("3 '192.0.2.1' 'node01' (null) '1' '0A:1B'\n"
              "3 '192.0.2.1' '' 'Servers/Linux' '1' '0A:1B'\n",
              Log());
}

TEST_F(CAMProxyTest, VerificationThatIsOffIsPassedAsZeroAndNoThumbprintAsAnEmptyText) {
    CAMProxy const proxy("cam-recording", "cam.example", false, "");
    (void)proxy.GetDNSDomainName(); // only the call counts
    proxy.CreateMachineAccount("node01", "");
    EXPECT_EQ("2 'cam.example' '0' ''\n"
              "3 'cam.example' 'node01' (null) '0' ''\n",
              Log());
}

TEST_F(CAMProxyTest, TheDomainControllerAndTheDefaultContainerAreEmptyWithoutACall) {
    EXPECT_EQ("", Proxy().GetDomainController());
    EXPECT_EQ("", Proxy().GetDefaultComputerContainer());
    EXPECT_EQ("", Log());
    CAMProxy const bare("cam-null-entries", "192.0.2.1", true, "");
    EXPECT_EQ("", bare.GetDomainController());
    EXPECT_EQ("", bare.GetDefaultComputerContainer());
}

// ---- Failures -----------------------------------------------------------------------------------

TEST_F(CAMProxyTest, EveryCodeOfEveryOperationBecomesItsException) {
    struct {
        int code;
        Failure failure;
    } const rows[] = {
        {8, Coded(typeid(NotEnoughMemoryException), 8, "Not enough memory")},
        {1225, Coded(typeid(ConnectionRefusedException), 1225,
                     "The remote computer refused the network connection.")},
        {1229, Coded(typeid(ConnectionInvalidException), 1229,
                     "An operation was attempted on a nonexistent network connection.")},
        {10060,
         Coded(typeid(WSATimedOutException), 10060,
               "A connection attempt failed because the connected party did not properly respond "
               "after a period of time, or established connection failed because connected host "
               "has failed to respond.")},
        {TSLAUTH_CAM_PROVIDER_INVALID_CERTIFICATE,
         Coded(typeid(InvalidCAMCertificateException), 0x80090325,
               "The CAM server's certificate cannot be verified.")},
        // Codes that an Active Directory provider's failures have classes for mean nothing here.
        {2, Coded(typeid(UnknownException), 2, "Unknown exception")},
        {5, Coded(typeid(UnknownException), 5, "Unknown exception")},
        {120, Coded(typeid(UnknownException), 120, "Unknown exception")},
        {1326, Coded(typeid(UnknownException), 1326, "Unknown exception")},
        {1, Coded(typeid(UnknownException), 1, "Unknown exception")},
        {-1, Coded(typeid(UnknownException), 0xffffffff, "Unknown exception")},
        {INT32_MIN, Coded(typeid(UnknownException), 0x80000000, "Unknown exception")},
    };
    for (auto const& row : rows) {
        for (Operation const& operation : operations) {
            Record().code = row.code;
            EXPECT_EQ(row.failure, FailureOf([&] { operation.call(Proxy()); })) << operation.name;
        }
    }
}

TEST(CAMProxyCodesTest, TheNumbersAreThoseOfTheInterface) {
    EXPECT_EQ(0x80090325U, static_cast<std::uint32_t>(TSLAUTH_CAM_PROVIDER_INVALID_CERTIFICATE));
    EXPECT_EQ(8, int{TSLAUTH_CAM_PROVIDER_NOT_ENOUGH_MEMORY});
    EXPECT_EQ(1225, int{TSLAUTH_CAM_PROVIDER_CONNECTION_REFUSED});
    EXPECT_EQ(1229, int{TSLAUTH_CAM_PROVIDER_CONNECTION_INVALID});
    EXPECT_EQ(10060, int{TSLAUTH_CAM_PROVIDER_TIMED_OUT});
}

TEST_F(CAMProxyTest, AFailedCallLeavesTheProxyUsable) {
    Record().code = 10060;
    EXPECT_THROW((void)Proxy().GetDNSDomainName(), WSATimedOutException);
    Record().code = 0;
    EXPECT_EQ("corp.example", Proxy().GetDNSDomainName());
}

TEST_F(CAMProxyTest, EntriesThatAreNullAreNotImplemented) {
    CAMProxy const proxy("cam-null-entries", "192.0.2.1", true, "");
    for (Operation const& operation : operations) {
        EXPECT_EQ(NotImplemented(), FailureOf([&] { operation.call(proxy); })) << operation.name;
    }
}

// ---- The example CAM provider -------------------------------------------------------------------

namespace {

constexpr char accounts[] = "/etc/tslauth-example/accounts";

std::string TextOf(char const* path) {
    std::ifstream file(path);
    return std::string(std::istreambuf_iterator<char>(file), std::istreambuf_iterator<char>());
}

std::string Output(std::string const& command) {
    std::unique_ptr<FILE, int (*)(FILE*)> const pipe(popen(command.c_str(), "r"), &pclose);
    std::string text;
    for (int c; (c = fgetc(pipe.get())) != EOF;) {
        text += static_cast<char>(c);
    }
    return text;
}

/// With a server at 192.0.2.1.
class ExampleCAMProviderTest : public testing::Test {
protected:
    void SetUp() override {
        ASSERT_EQ(0, std::system("rm -rf /etc/tslauth-example && "
                                 "mkdir -p /etc/tslauth-example/cam && "
                                 "cd /etc/tslauth-example/cam && "
                                 "openssl req -x509 -newkey ec -pkeyopt ec_paramgen_curve:P-256 "
                                 "-nodes -keyout /dev/null -subj /CN=cam.example.test "
                                 "-out 192.0.2.1.pem 2>/dev/null"));
        std::string const line = Output(
            "openssl x509 -noout -fingerprint -sha1 -in /etc/tslauth-example/cam/192.0.2.1.pem");
        _thumbprint = line.substr(line.find('=') + 1, 59);
    }

    static Failure FailureWith(std::string const& server, bool verify,
                               std::string const& thumbprint) {
        CAMProxy const proxy("example-cam", server, verify, thumbprint);
        return FailureOf([&] { (void)proxy.GetDNSDomainName(); }); // only its failure counts
    }

    CAMProxy Trusted() const {
        return CAMProxy("example-cam", "192.0.2.1", true, _thumbprint);
    }

    std::string _thumbprint;
};

Failure const notTrusted = Coded(typeid(InvalidCAMCertificateException), 0x80090325,
                                 "The CAM server's certificate cannot be verified.");

} // namespace

TEST_F(ExampleCAMProviderTest, TellsAboutItsDomainWhereTheCertificateIsThePinnedOne) {
    CAMProxy const proxy = Trusted();
    EXPECT_EQ("EXAMPLE", proxy.GetNetBIOSDomainName());
    EXPECT_EQ("example.test", proxy.GetDNSDomainName());
    EXPECT_THAT(proxy.GetDomainSID(), MatchesRegex("S-1-5-21(-[0-9]+){3}"));
}

TEST_F(ExampleCAMProviderTest, RefusesAnotherCertificateAndOneThatWasNotPinned) {
    std::string other = _thumbprint;
    other[0] = other[0] == '0' ? '1' : '0';
    EXPECT_EQ(notTrusted, FailureWith("192.0.2.1", true, other));
    EXPECT_EQ(notTrusted, FailureWith("192.0.2.1", true, _thumbprint + ":00"));
    EXPECT_EQ(notTrusted, FailureWith("192.0.2.1", true, ""));
    CAMProxy const proxy("example-cam", "192.0.2.1", true, other);
    EXPECT_EQ(notTrusted, FailureOf([&] { proxy.CreateMachineAccount("node01", ""); }));
    EXPECT_NE(0, access(accounts, F_OK)) << "no account was made";
}

TEST_F(ExampleCAMProviderTest, BelievesEveryServerWhereVerificationIsOff) {
    EXPECT_EQ(NoFailure(), FailureWith("192.0.2.1", false, ""));
    std::ofstream("/etc/tslauth-example/cam/192.0.2.2.pem") << "no certificate\n";
    EXPECT_EQ(NoFailure(), FailureWith("192.0.2.2", false, ""));
    EXPECT_EQ(notTrusted, FailureWith("192.0.2.2", true, ""));
}

TEST_F(ExampleCAMProviderTest, AnswersForNoOtherAddress) {
    EXPECT_EQ(1225U, FailureWith("192.0.2.3", false, "").code);
    EXPECT_EQ(1229U, FailureWith("../cam/192.0.2.1", false, "").code);
}

TEST_F(ExampleCAMProviderTest, MakesAnAccountWithASecretOfItsOwnAndKeepsIt) {
    std::ofstream(accounts) << "node1:other\njoiner:secret"; // without an end of line
    ComputerPrincipalInfo const made = Trusted().CreateMachineAccount("node01", "");
    EXPECT_THAT(made.firstResult, MatchesRegex("[0-9a-f]{32}"));
    EXPECT_EQ("", made.secondResult);
    std::string const expected = "node1:other\njoiner:secret\nnode01:" + made.firstResult + "\n";
    EXPECT_EQ(expected, TextOf(accounts));
    EXPECT_EQ(made.firstResult, Trusted().CreateMachineAccount("node01", "").firstResult);
    EXPECT_EQ(expected, TextOf(accounts));
    EXPECT_EQ("other", Trusted().CreateMachineAccount("node1", "").firstResult);
    EXPECT_NE(made.firstResult, Trusted().CreateMachineAccount("node02", "").firstResult);
}

TEST_F(ExampleCAMProviderTest, RefusesNamesThatWouldBreakTheFileAndUnits) {
    for (char const* name : {"", "node:01", "node\n01"}) {
        EXPECT_EQ(1210U, FailureOf([&] { Trusted().CreateMachineAccount(name, ""); }).code);
    }
    EXPECT_EQ(2U, FailureOf([&] { Trusted().CreateMachineAccount("node01", "Servers"); }).code);
    EXPECT_NE(0, access(accounts, F_OK)) << "no account was made";
}

TEST_F(ExampleCAMProviderTest, ThreadsThatAskAtOnceGetTheirOwnAnswers) {
    std::vector<std::thread> threads;
    std::vector<std::string> secrets(8);
    for (std::size_t i = 0; i < secrets.size(); ++i) {
        threads.emplace_back([&, i] {
            CAMProxy const proxy = Trusted();
            secrets[i] = proxy.CreateMachineAccount("node" + std::to_string(i), "").firstResult;
        });
    }
    for (auto& thread : threads) {
        thread.join();
    }
    for (std::size_t i = 0; i < secrets.size(); ++i) {
        EXPECT_NE(std::string::npos,
                  TextOf(accounts).find("node" + std::to_string(i) + ":" + secrets[i] + "\n"));
    }
}
