// SPDX-License-Identifier: Apache-2.0
#include "Node.h"
#include "SystemLog.h"

#include "../TemporaryFolder.h"

#include <tslauth/CAMProxy.h>
#include <tslauth/Exceptions.h>

#include <arpa/inet.h>
#include <chrono>
#include <csignal>
#include <cstdlib>
#include <dlfcn.h>
#include <filesystem>
#include <functional>
#include <gmock/gmock.h>
#include <memory>
#include <netinet/in.h>
#include <regex>
#include <sched.h>
#include <sys/mount.h>
#include <sys/socket.h>
#include <sys/wait.h>
#include <thread>

/// The CAM provider `winbind-cam` and its service, with real certificates and TLS between them.
/// Samba's program is a stand-in: what a domain does with the blob is not looked at here.
namespace tessel::authentication {
namespace {

using testing::AllOf;
using testing::HasSubstr;
using testing::IsEmpty;
using testing::Not;
namespace fs = std::filesystem;
using std::chrono::steady_clock;

std::string const Sources = TESTS_DATA_DIR "/../..";
std::string const ServiceProgram = Sources + "/cam-service/tslauth-cam-service";
std::string const StandIn = "/run/stand-in";
std::string const CodeFile = "/etc/tessel/tslauth/winbind-cam.code";
std::string const AuthoritiesFile = "/etc/tessel/tslauth/winbind-cam-ca.pem";
std::string const Server = "127.0.0.1";

void WriteText(std::string const& path, std::string const& text, mode_t mode = 0644) {
    std::ofstream(path, std::ios::binary) << text;
    ASSERT_EQ(0, chmod(path.c_str(), mode)) << path;
}

/// What a shell command prints; it has to succeed.
std::string Output(std::string const& command) {
    std::string text;
    FILE* const pipe = popen(command.c_str(), "re");
    char buffer[4096];
    while (std::size_t const size = fread(buffer, 1, sizeof buffer, pipe)) {
        text.append(buffer, size);
    }
    EXPECT_EQ(0, pclose(pipe)) << command;
    while (!text.empty() && text.back() == '\n') {
        text.pop_back();
    }
    return text;
}

/// A program that runs until the object goes, with all that it prints in a file.
class Program {
public:
    Program(std::vector<std::string> const& arguments, std::string log) : _log(std::move(log)) {
        std::vector<char*> words;
        for (std::string const& argument : arguments) {
            words.push_back(const_cast<char*>(argument.c_str()));
        }
        words.push_back(nullptr);
        (void)unlink(_log.c_str()); // an earlier one's
        _process = fork();
        if (_process == 0) {
            int const file = open(_log.c_str(), O_WRONLY | O_CREAT | O_APPEND, 0600);
            if (dup2(file, STDOUT_FILENO) >= 0 && dup2(file, STDERR_FILENO) >= 0) {
                execv(words[0], words.data());
            }
            _exit(127);
        }
        auto const end = steady_clock::now() + std::chrono::seconds(30);
        while (Log().find("serving") == std::string::npos) {
            if (waitpid(_process, nullptr, WNOHANG) != 0 || steady_clock::now() > end) {
                ADD_FAILURE() << arguments[0] << " does not serve: " << Log();
                return;
            }
            std::this_thread::sleep_for(std::chrono::milliseconds(5));
        }
    }
    Program(Program const&) = delete;
    Program& operator=(Program const&) = delete;
    ~Program() {
        End(SIGKILL);
    }

    int End(int signal) {
        int status = 0;
        if (_process > 0) {
            kill(_process, signal);
            EXPECT_EQ(_process, waitpid(_process, &status, 0));
            _process = 0;
        }
        return status;
    }

    std::string Log() const {
        return fs::exists(_log) ? Contents(_log) : "";
    }

private:
    std::string _log;
    pid_t _process = 0;
};

/// How a call failed.
struct Failed {
    unsigned long code = 0;
    std::string type;
};

Failed HowFailed(std::function<void()> const& call) {
    try {
        call();
    } catch (Exception const& e) {
        // The innermost name alone.
        std::string const name = typeid(e).name();
        std::smatch found;
        std::regex_search(name, found, std::regex("[A-Z][A-Za-z]*Exception"));
        return {e.Code(), found.str()};
    }
    return {};
}

MATCHER_P2(FailsWith, code, type, "") {
    *result_listener << arg.type << " " << arg.code;
    return arg.code == static_cast<unsigned long>(code) && arg.type == type;
}

auto const IsRefusedCertificate = FailsWith(0x80090325UL, "InvalidCAMCertificateException");
auto const IsBroken = FailsWith(1229, "ConnectionInvalidException");

auto IsUnknown(unsigned long code) {
    return FailsWith(code, "UnknownException");
}

class WinbindCAMTest : public testing::Test {
protected:
    static void SetUpTestSuite() {
        SystemLog::MakePrivateDevices();
        _certificates = std::make_unique<TemporaryFolder>();
        MakeAuthority("ca");
        MakeAuthority("other");
        MakeCertificate("good", "ca", "subjectAltName=IP:127.0.0.1");
        MakeCertificate("second", "ca", "subjectAltName=IP:127.0.0.1");
        MakeCertificate("unknown", "other", "subjectAltName=IP:127.0.0.1");
        MakeCertificate("elsewhere", "ca", "subjectAltName=IP:127.0.0.2,DNS:127.0.0.1");
        MakeCertificate("nowhere", "ca", "basicConstraints=CA:FALSE");
        MakeCertificate("expired", "ca", "subjectAltName=IP:127.0.0.1", "-days -1");
        MakeCertificate("client", "ca", "subjectAltName=IP:127.0.0.1\nextendedKeyUsage=clientAuth");
    }

    static void TearDownTestSuite() {
        _certificates.reset();
    }

    void SetUp() override {
        fs::remove_all(StandIn);
        fs::remove_all(State());
        fs::remove(CodeFile);
        fs::remove(AuthoritiesFile);
        fs::create_directories(StandIn);
        fs::create_directories("/etc/tessel/tslauth");
        WriteText(StandIn + "/accounts", "");
        WriteText(_folder / "credentials", "username = joiner\npassword = secret\n", 0600);
        InstallSamba();
    }

    /// What a host that is to be joined has of Samba; here it is looked for, and hardly asked.
    static void InstallSamba() {
        fs::create_directories("/etc/samba");
        fs::remove("/etc/samba/smb.conf");
        WriteText("/usr/sbin/winbindd", "#!/bin/sh\nexit 1\n", 0755);
        WriteText("/usr/bin/net", "#!/bin/sh\nexit 1\n", 0755);
        std::string folders;
        for (std::string const name : {"cache directory", "lock directory", "pid directory",
                                       "private dir", "state directory"}) {
            folders += "\t" + name + " = /var/lib/samba\n";
        }
        WriteText("/usr/bin/testparm",
                  "#!/bin/sh\ncat <<'EOF'\n[global]\n" + folders +
                      "\tsecurity = AUTO\n\tserver role = ROLE_STANDALONE\nEOF\n",
                  0755);
    }

    // --- certificates ---

    static std::string File(std::string const& name, std::string const& suffix) {
        return *_certificates / (name + suffix);
    }

    static void MakeAuthority(std::string const& name) {
        Output("openssl req -x509 -newkey rsa:2048 -nodes -days 2 -subj /CN=" + name + " -keyout " +
               File(name, ".key") + " -out " + File(name, ".pem") + " 2>&1");
    }

    static void MakeCertificate(std::string const& name, std::string const& authority,
                                std::string const& extensions,
                                std::string const& validity = "-days 2") {
        WriteText(File(name, ".ext"), extensions + "\n");
        Output("cd " + _certificates->Path() +
               " && openssl req -newkey rsa:2048 -nodes -subj /CN=127.0.0.1 -keyout " + name +
               ".key -out " + name + ".csr 2>&1 && openssl x509 -req -in " + name + ".csr -CA " +
               authority + ".pem -CAkey " + authority + ".key -CAcreateserial " + validity +
               " -extfile " + name + ".ext -out " + name + ".pem 2>&1 && chmod 0600 " + name +
               ".key");
    }

    static std::string ThumbprintOf(std::string const& name) {
        std::string const text =
            Output("openssl x509 -noout -fingerprint -sha1 -in " + File(name, ".pem"));
        return text.substr(text.find('=') + 1);
    }

    static void TrustAuthority(std::string const& name) {
        WriteText(AuthoritiesFile, Contents(File(name, ".pem")));
    }

    // --- the service ---

    std::string State() const {
        return _folder / "state";
    }

    std::unique_ptr<Program> Serve(std::string const& certificate = "good",
                                   std::string const& more = "") {
        return std::make_unique<Program>(
            std::vector<std::string>{"/usr/bin/python3", "-B", ServiceProgram, "serve",
                                     "--configuration", Configure(certificate, more)},
            _folder / "log");
    }

    /// The service's configuration. `more` has sections, and members of [domain] before them.
    std::string Configure(std::string const& certificate = "good", std::string const& more = "") {
        std::string path = _folder / "service.toml";
        WriteText(path, "state = \"" + State() + "\"\n[server]\ncertificate = \"" +
                            File(certificate, ".pem") + "\"\nkey = \"" + File(certificate, ".key") +
                            "\"\n[domain]\ncontroller = \"dc1.corp.example\"\ncredentials = \"" +
                            _folder / "credentials" + "\"\nnet_program = \"" + Sources +
                            "/tests/system/stand-in-net\"\n" + more);
        return path;
    }

    std::unique_ptr<Program> ServeFault(std::string const& fault,
                                        std::string const& address = Server) {
        return std::make_unique<Program>(
            std::vector<std::string>{"/usr/bin/python3", "-B",
                                     Sources + "/tests/system/faulty-cam-server", address,
                                     File("good", ".pem"), File("good", ".key"), fault},
            _folder / ("log-" + address));
    }

    /// A command line of the service.
    std::string Command(std::string const& verb) {
        std::string const configuration = _folder / "service.toml";
        return "/usr/bin/python3 -B " + ServiceProgram + " " + verb + " --configuration " +
               (fs::exists(configuration) ? configuration : Configure());
    }

    std::string IssueCode(std::string const& arguments) {
        return Output(Command("issue-code " + arguments));
    }

    /// Lets every claim's time be over.
    void EndLeases() const {
        Output("/usr/bin/python3 -B -c 'import sqlite3, sys; c = sqlite3.connect(sys.argv[1]); "
               "c.execute(\"UPDATE codes SET claim_until = 0\"); c.commit()' " +
               State() + "/codes.db");
    }

    /// What the audit of the service's tables says of the host's last step.
    std::string LastStep() const {
        return Output("/usr/bin/python3 -B -c 'import sqlite3, sys; print(*sqlite3.connect("
                      "sys.argv[1]).execute(\"SELECT action FROM audit ORDER BY id DESC LIMIT "
                      "1\").fetchone())' " +
                      State() + "/codes.db");
    }

    void WaitForStep(std::string const& step) const {
        auto const end = steady_clock::now() + std::chrono::seconds(10);
        while (LastStep() != step && steady_clock::now() < end) {
            std::this_thread::sleep_for(std::chrono::milliseconds(5));
        }
        EXPECT_EQ(step, LastStep());
    }

    void GiveCode(std::string const& arguments) {
        WriteText(CodeFile, IssueCode(arguments) + "\n", 0600);
    }

    // --- the provider ---

    static CAMProxy Pinned(std::string const& certificate = "good") {
        return CAMProxy("winbind-cam", Server, false, ThumbprintOf(certificate));
    }

    static Failed AccountFailure(CAMProxy const& proxy, std::string const& host = "host01",
                                 std::string const& unit = "") {
        return HowFailed([&] { (void)proxy.CreateMachineAccount(host, unit); });
    }

    static Failed NameFailure(CAMProxy const& proxy) {
        return HowFailed([&] { (void)proxy.GetDNSDomainName(); });
    }

    /// What a host gets, as the stand-in makes it.
    static std::string BlobOf(std::string const& host) {
        return Output("printf 'the blob of the account that was made for the host %-20s' " + host +
                      " | base64 -w 0");
    }

    std::string Calls() const {
        std::string const path = StandIn + "/calls";
        return fs::exists(path) ? Contents(path) : "";
    }

    static std::unique_ptr<TemporaryFolder> _certificates;
    TemporaryFolder _folder;
};

std::unique_ptr<TemporaryFolder> WinbindCAMTest::_certificates;

TEST_F(WinbindCAMTest, TheServiceTellsItsDomain) {
    auto const service = Serve();
    CAMProxy const proxy = Pinned();
    EXPECT_EQ("CORP", proxy.GetNetBIOSDomainName());
    EXPECT_EQ("corp.example", proxy.GetDNSDomainName());
    EXPECT_EQ("S-1-5-21-1-2-3", proxy.GetDomainSID());
}

TEST_F(WinbindCAMTest, ACodeGivesABlobAndIsGone) {
    auto const service = Serve();
    GiveCode("--host host01 --unit Servers/Linux");
    std::string const code = Contents(CodeFile);
    ComputerPrincipalInfo const account = Pinned().CreateMachineAccount("host01", "");
    EXPECT_EQ(BlobOf("host01"), account.firstResult);
    EXPECT_EQ("dc1.corp.example", account.secondResult);
    EXPECT_FALSE(fs::exists(CodeFile));
    EXPECT_THAT(Calls(),
                AllOf(HasSubstr("machine_name=host01 "), HasSubstr("domain=corp.example "),
                      HasSubstr("machine_account_ou=OU=Linux,OU=Servers,DC=corp,DC=example"),
                      Not(HasSubstr("reuse")), Not(HasSubstr("secret"))));
    EXPECT_THAT(service->Log(), AllOf(HasSubstr("127.0.0.1: made the account of host01"),
                                      Not(HasSubstr(code.substr(0, 9))),
                                      Not(HasSubstr(account.firstResult.substr(0, 20)))));
}

TEST_F(WinbindCAMTest, TheUnitThatTheCodeIsForMayBeNamed) {
    auto const service = Serve();
    GiveCode("--host host01 --unit Servers/Linux");
    EXPECT_THAT(AccountFailure(Pinned(), "host01", "Servers"), IsUnknown(5));
    EXPECT_TRUE(fs::exists(CodeFile)); // not taken
    EXPECT_EQ(BlobOf("host01"),
              Pinned().CreateMachineAccount("host01", "ou=Linux,ou=Servers").firstResult);
}

TEST_F(WinbindCAMTest, ACertificateThatIsNotThePinnedOneIsRefused) {
    auto const service = Serve("second");
    GiveCode("--host host01");
    SystemLog log;
    EXPECT_THAT(AccountFailure(Pinned("good")), IsRefusedCertificate);
    EXPECT_THAT(log.Messages(),
                testing::Contains(AllOf(HasSubstr("winbind-cam: create machine account: "),
                                        HasSubstr(ThumbprintOf("good")),
                                        HasSubstr(ThumbprintOf("second")))));
    EXPECT_THAT(NameFailure(Pinned("good")), IsRefusedCertificate);
    // Nothing was said to it.
    EXPECT_THAT(service->Log(), Not(HasSubstr("host01")));
    EXPECT_EQ(BlobOf("host01"), Pinned("second").CreateMachineAccount("host01", "").firstResult);
}

TEST_F(WinbindCAMTest, AThumbprintThatIsNoneMatchesNothing) {
    auto const service = Serve();
    for (std::string const& pin : {std::string("x"), std::string(59, 'A'),
                                   ThumbprintOf("good") + ":00", ThumbprintOf("good").substr(3)}) {
        EXPECT_THAT(NameFailure(CAMProxy("winbind-cam", Server, false, pin)), IsRefusedCertificate);
    }
}

TEST_F(WinbindCAMTest, WithNeitherPinNorVerificationOnlyNamesAreAsked) {
    auto const service = Serve("unknown");
    GiveCode("--host host01");
    CAMProxy const proxy("winbind-cam", Server, false, "");
    EXPECT_EQ("corp.example", proxy.GetDNSDomainName());
    EXPECT_THAT(AccountFailure(proxy), IsRefusedCertificate);
    EXPECT_THAT(service->Log(), Not(HasSubstr("host01")));
    EXPECT_TRUE(fs::exists(CodeFile));
}

TEST_F(WinbindCAMTest, AVerifiedChainNeedsNoPin) {
    auto const service = Serve();
    GiveCode("--host host01");
    TrustAuthority("ca");
    EXPECT_EQ(
        BlobOf("host01"),
        CAMProxy("winbind-cam", Server, true, "").CreateMachineAccount("host01", "").firstResult);
}

TEST_F(WinbindCAMTest, ACertificateMayBeItsOwnAuthority) {
    Output("openssl req -x509 -newkey rsa:2048 -nodes -days 2 -subj /CN=cam -addext "
           "subjectAltName=IP:127.0.0.1 -keyout " +
           File("self", ".key") + " -out " + File("self", ".pem") + " 2>&1 && chmod 0600 " +
           File("self", ".key"));
    auto const service = Serve("self");
    TrustAuthority("self");
    EXPECT_EQ("corp.example", CAMProxy("winbind-cam", Server, true, "").GetDNSDomainName());
}

TEST_F(WinbindCAMTest, TheSystemsAuthoritiesServeWhereThereAreNoOthers) {
    auto const service = Serve();
    CAMProxy const proxy("winbind-cam", Server, true, "");
    EXPECT_THAT(NameFailure(proxy), IsRefusedCertificate);
    std::string const link =
        "/etc/ssl/certs/" + Output("openssl x509 -noout -hash -in " + File("ca", ".pem")) + ".0";
    fs::copy_file(File("ca", ".pem"), link);
    EXPECT_EQ("corp.example", proxy.GetDNSDomainName());
    // One of one's own takes their place.
    TrustAuthority("other");
    EXPECT_THAT(NameFailure(proxy), IsRefusedCertificate);
    fs::remove(link);
}

TEST_F(WinbindCAMTest, ACertificateThatCannotBeVerifiedIsRefused) {
    TrustAuthority("ca");
    GiveCode("--host host01");
    for (char const* name : {"unknown", "elsewhere", "nowhere", "expired", "client"}) {
        auto const service = Serve(name);
        SystemLog log;
        CAMProxy const proxy("winbind-cam", Server, true, "");
        EXPECT_THAT(NameFailure(proxy), IsRefusedCertificate) << name;
        EXPECT_THAT(AccountFailure(proxy), IsRefusedCertificate) << name;
        // The right pin does not replace what was asked for as well.
        CAMProxy const pinned("winbind-cam", Server, true, ThumbprintOf(name));
        EXPECT_THAT(AccountFailure(pinned), IsRefusedCertificate) << name;
        EXPECT_THAT(log.Messages(), testing::Contains(HasSubstr("the server's certificate: ")))
            << name;
        EXPECT_THAT(service->Log(), Not(HasSubstr("host01"))) << name;
    }
}

TEST_F(WinbindCAMTest, AVerifiedChainDoesNotReplaceThePin) {
    auto const service = Serve("second");
    TrustAuthority("ca");
    EXPECT_THAT(NameFailure(CAMProxy("winbind-cam", Server, true, ThumbprintOf("good"))),
                IsRefusedCertificate);
    EXPECT_EQ("corp.example",
              CAMProxy("winbind-cam", Server, true, ThumbprintOf("second")).GetDNSDomainName());
}

TEST_F(WinbindCAMTest, AuthoritiesThatCannotBeReadAreNotIgnored) {
    auto const service = Serve();
    WriteText(AuthoritiesFile, "no certificate\n");
    EXPECT_THAT(NameFailure(CAMProxy("winbind-cam", Server, true, "")), IsRefusedCertificate);
}

TEST_F(WinbindCAMTest, APipeInThePlaceOfTheAuthoritiesIsNotWaitedFor) {
    auto const service = Serve();
    fs::remove(AuthoritiesFile);
    ASSERT_EQ(0, mkfifo(AuthoritiesFile.c_str(), 0644));
    EXPECT_THAT(NameFailure(CAMProxy("winbind-cam", Server, true, "")), IsRefusedCertificate);
    fs::remove(AuthoritiesFile);
}

TEST_F(WinbindCAMTest, AServerThatIsNotThere) {
    EXPECT_THAT(NameFailure(Pinned()), FailsWith(1225, "ConnectionRefusedException"));
    // The node's network is a loopback interface.
    EXPECT_THAT(NameFailure(CAMProxy("winbind-cam", "192.0.2.1", false, "")), IsBroken);
    EXPECT_THAT(NameFailure(CAMProxy("winbind-cam", "dc1.corp.example", false, "")), IsBroken);
}

TEST_F(WinbindCAMTest, AServerThatEndsTooEarly) {
    GiveCode("--host host01");
    for (char const* fault : {"cut", "plain", "cut-hello", "cut-tls",
                              "raw:HTTP/1.1 200 OK\\r\\nContent-Length: 9\\r\\n\\r\\n{}"}) {
        auto const server = ServeFault(fault);
        EXPECT_THAT(NameFailure(Pinned()), IsBroken) << fault;
        EXPECT_THAT(AccountFailure(Pinned()), IsBroken) << fault;
    }
    // It may have arrived or not: an administrator knows better.
    EXPECT_TRUE(fs::exists(CodeFile));
}

TEST_F(WinbindCAMTest, AServerThatTalksNonsense) {
    GiveCode("--host host01");
    for (char const* fault :
         {"huge", "answer:", "answer:hello", "answer:{}", "answer:{} {}",
          "answer:{\"controller\": \"a\\x00b\", \"blob\": \"QUJD\", \"claim\": \"1\"}",
          "answer:{\"controller\": \"dc1\", \"blob\": \"no blob\", \"claim\": \"1\"}",
          "raw:HTTP/1.1 200 OK\\r\\nContent-Le", "raw:SSH-2.0 at your service\\r\\n\\r\\n"}) {
        auto const server = ServeFault(fault);
        EXPECT_THAT(NameFailure(Pinned()), IsUnknown(13)) << fault;
        EXPECT_THAT(AccountFailure(Pinned()), IsUnknown(13)) << fault;
    }
}

TEST_F(WinbindCAMTest, AServerThatIsSilentIsWaitedForNoLongerThanTheLimit) {
    struct {
        char const* address;
        char const* fault;
    } const silent[] = {
        {"127.0.0.11", "silent"}, {"127.0.0.12", "silent-tls"}, {"127.0.0.13", "drip"}};
    std::vector<std::unique_ptr<Program>> servers;
    std::vector<std::thread> threads;
    for (auto const& one : silent) {
        servers.push_back(ServeFault(one.fault, one.address));
        threads.emplace_back([&one] {
            auto const begin = steady_clock::now();
            EXPECT_THAT(NameFailure(CAMProxy("winbind-cam", one.address, false, "")),
                        FailsWith(10060, "WSATimedOutException"))
                << one.fault;
            std::chrono::duration<double> const took = steady_clock::now() - begin;
            EXPECT_GE(took.count(), 14.9) << one.fault;
            EXPECT_LE(took.count(), 18) << one.fault;
        });
    }
    for (std::thread& thread : threads) {
        thread.join();
    }
}

TEST_F(WinbindCAMTest, AHostWithoutACodeIsToldSo) {
    auto const service = Serve();
    SystemLog log;
    EXPECT_THAT(AccountFailure(Pinned()), IsUnknown(2));
    EXPECT_THAT(log.Messages(), testing::Contains(HasSubstr(CodeFile)));
    WriteText(CodeFile, IssueCode("--host host01"), 0644);
    EXPECT_THAT(AccountFailure(Pinned()), IsUnknown(1338));
    WriteText(CodeFile, "no code", 0600);
    EXPECT_THAT(AccountFailure(Pinned()), IsUnknown(87));
    EXPECT_THAT(service->Log(), Not(HasSubstr("host01")));
}

TEST_F(WinbindCAMTest, AHostThatCannotBeJoinedKeepsItsCode) {
    auto const service = Serve();
    GiveCode("--host host01");
    std::string const code = Contents(CodeFile);

    fs::remove("/usr/sbin/winbindd");
    EXPECT_THAT(AccountFailure(Pinned()), IsUnknown(1060));
    InstallSamba();

    WriteText("/etc/samba/smb.conf", "[global]\n\tinclude = /etc/samba/tslauth.conf\n", 0644);
    WriteText("/etc/samba/tslauth.conf",
              "[global]\n\tworkgroup = CORP\n\trealm = CORP.EXAMPLE\n\tnetbios name = HOST01\n",
              0644);
    EXPECT_THAT(AccountFailure(Pinned()), IsUnknown(2691));
    fs::remove("/etc/samba/tslauth.conf");

    EXPECT_EQ(code, Contents(CodeFile));
    EXPECT_THAT(Calls(), IsEmpty());
    EXPECT_THAT(service->Log(), Not(HasSubstr("host01")));
    EXPECT_EQ(BlobOf("host01"), Pinned().CreateMachineAccount("host01", "").firstResult);
}

TEST_F(WinbindCAMTest, ACodeThatIsNotThisHostsIsRefused) {
    auto const service = Serve();
    SystemLog log;
    GiveCode("--host host02");
    EXPECT_THAT(AccountFailure(Pinned(), "host01"), IsUnknown(5));
    (void)IssueCode("--host host01");
    EXPECT_THAT(AccountFailure(Pinned(), "host01"), IsUnknown(5));
    EXPECT_THAT(service->Log(), AllOf(HasSubstr("host01: refused, no code is issued"),
                                      HasSubstr("host01: refused, the code is wrong")));
    EXPECT_THAT(Calls(), IsEmpty());
    EXPECT_THAT(log.Messages(), testing::Contains(HasSubstr("refuses the one-time code")).Times(2));
    // It is still the other one's.
    EXPECT_EQ(BlobOf("host02"), Pinned().CreateMachineAccount("host02", "").firstResult);
}

TEST_F(WinbindCAMTest, ACodeServesOnce) {
    auto const service = Serve();
    GiveCode("--host host01");
    std::string const code = Contents(CodeFile);
    (void)Pinned().CreateMachineAccount("host01", "");
    WriteText(CodeFile, code, 0600);
    EXPECT_THAT(AccountFailure(Pinned()), IsUnknown(5));
}

TEST_F(WinbindCAMTest, AnExpiredCodeIsRefused) {
    auto const service = Serve();
    GiveCode("--host host01 --valid-for 1");
    Output("/usr/bin/python3 -B -c 'import sqlite3, sys; c = sqlite3.connect(sys.argv[1]); "
           "c.execute(\"UPDATE codes SET expires_at = expires_at - 60\"); c.commit()' " +
           State() + "/codes.db");
    EXPECT_THAT(AccountFailure(Pinned()), IsUnknown(5));
    EXPECT_THAT(service->Log(), HasSubstr("the code has expired"));
}

TEST_F(WinbindCAMTest, WhoGuessesIsNotHeardAnyMore) {
    auto const service = Serve();
    std::string const right = IssueCode("--host host01");
    WriteText(CodeFile, "AAAA-BBBB", 0600);
    for (int i = 0; i < 5; ++i) {
        EXPECT_THAT(AccountFailure(Pinned()), IsUnknown(5)) << i;
    }
    WriteText(CodeFile, right, 0600);
    EXPECT_THAT(AccountFailure(Pinned()), IsUnknown(1909));
    EXPECT_TRUE(fs::exists(CodeFile));
}

TEST_F(WinbindCAMTest, AnAccountThatExistsIsTakenOverOnRequestAlone) {
    auto const service = Serve();
    WriteText(StandIn + "/accounts", "host01\n");
    GiveCode("--host host01");
    EXPECT_THAT(AccountFailure(Pinned()), IsUnknown(1316));
    EXPECT_TRUE(fs::exists(CodeFile)); // of use again when the account is deleted
    EXPECT_THAT(Calls(), IsEmpty());
    GiveCode("--host host01 --reuse");
    EXPECT_EQ(BlobOf("host01"), Pinned().CreateMachineAccount("host01", "").firstResult);
    EXPECT_THAT(Calls(), HasSubstr(" reuse "));
}

TEST_F(WinbindCAMTest, WhatTheDomainRefusesHasACode) {
    auto const service = Serve("good", "default_unit = \"Servers\"\n");
    struct {
        char const* says;
        unsigned long code;
    } const refusals[] = {
        {"failed to precreate account in ou OU=Servers,DC=corp,DC=example: No such object", 87},
        {"User specified does not have administrator privileges", 1359},
    };
    for (auto const& refusal : refusals) {
        WriteText(StandIn + "/says", refusal.says);
        GiveCode("--host host01");
        EXPECT_THAT(AccountFailure(Pinned()), IsUnknown(refusal.code)) << refusal.says;
        // The host may come back with it when that is mended.
        fs::remove(StandIn + "/says");
        EXPECT_EQ(BlobOf("host01"), Pinned().CreateMachineAccount("host01", "").firstResult);
        WriteText(StandIn + "/accounts", "");
    }
    EXPECT_THAT(service->Log(), HasSubstr("does not have administrator privileges"));
}

TEST_F(WinbindCAMTest, ANameThatNoAccountCanHaveIsNotAskedFor) {
    GiveCode("--host host01");
    EXPECT_THAT(AccountFailure(Pinned(), "a234567890123456"), IsUnknown(1210));
    EXPECT_THAT(AccountFailure(Pinned(), "host)(x"), IsUnknown(1210));
}

TEST_F(WinbindCAMTest, HostsThatAskAtOnceGetTheirOwn) {
    auto const service = Serve();
    constexpr int hosts = 8;
    std::vector<pid_t> processes;
    for (int i = 0; i < hosts; ++i) {
        std::string const name = "host" + std::to_string(i);
        std::string const code = IssueCode("--host " + name);
        std::string const blob = BlobOf(name);
        std::string const pin = ThumbprintOf("good");
        pid_t const process = fork();
        if (process == 0) {
            // A host of its own, as far as the provider can tell. Nothing of the test's is run
            // down.
            bool isRight = unshare(CLONE_NEWNS) == 0 &&
                           mount("none", "/", nullptr, MS_REC | MS_PRIVATE, nullptr) == 0 &&
                           mount("host", "/etc/tessel/tslauth", "tmpfs", 0, "mode=0755") == 0;
            WriteText(CodeFile, code, 0600);
            try {
                ComputerPrincipalInfo const account =
                    CAMProxy("winbind-cam", Server, false, pin).CreateMachineAccount(name, "");
                isRight = isRight && account.firstResult == blob && !fs::exists(CodeFile);
            } catch (std::exception const& e) {
                fprintf(stderr, "%s: %s\n", name.c_str(), e.what());
                isRight = false;
            }
            _exit(isRight ? 0 : 1);
        }
        processes.push_back(process);
    }
    for (pid_t const process : processes) {
        int status = -1;
        EXPECT_EQ(process, waitpid(process, &status, 0));
        EXPECT_EQ(0, status);
    }
    EXPECT_EQ("", Output(Command("list-codes")));
}

TEST_F(WinbindCAMTest, ThreadsOfAProcessMayAskAtOnce) {
    auto const service = Serve();
    CAMProxy const proxy = Pinned();
    std::vector<std::thread> threads;
    for (int i = 0; i < 6; ++i) {
        threads.emplace_back([&proxy] {
            for (int j = 0; j < 5; ++j) {
                EXPECT_EQ("S-1-5-21-1-2-3", proxy.GetDomainSID());
            }
        });
    }
    for (std::thread& thread : threads) {
        thread.join();
    }
}

TEST_F(WinbindCAMTest, NoFileOfTheEnvironmentGetsTheKeysOfAConnection) {
    auto const service = Serve();
    std::string const file = StandIn + "/keys";
    setenv("SSLKEYLOGFILE", file.c_str(), 1);
    EXPECT_EQ("corp.example", Pinned().GetDNSDomainName());
    unsetenv("SSLKEYLOGFILE");
    EXPECT_TRUE(!fs::exists(file) || fs::file_size(file) == 0);
}

TEST_F(WinbindCAMTest, NoProxyOfTheEnvironmentIsUsed) {
    auto const service = Serve();
    setenv("https_proxy", "http://127.0.0.1:1", 1);
    EXPECT_EQ("corp.example", Pinned().GetDNSDomainName());
    unsetenv("https_proxy");
}

TEST_F(WinbindCAMTest, NobodyIsFollowedToAnotherServer) {
    auto const server = ServeFault("raw:HTTP/1.1 302 Found\\r\\nLocation: https://127.0.0.1:1/"
                                   "\\r\\nContent-Length: 2\\r\\n\\r\\n{}");
    EXPECT_THAT(NameFailure(Pinned()), IsUnknown(13));
}

TEST_F(WinbindCAMTest, WhoSaysNothingGivesItsPlaceToWhoAsks) {
    auto const service = Serve("good", "[limits]\nconnections_of_an_address = 8\n");
    std::vector<int> sockets;
    for (int i = 0; i < 12; ++i) {
        int const one = socket(AF_INET, SOCK_STREAM | SOCK_CLOEXEC, 0);
        sockaddr_in address = {};
        address.sin_family = AF_INET;
        address.sin_port = htons(8989);
        address.sin_addr.s_addr = htonl(INADDR_LOOPBACK);
        ASSERT_EQ(0, connect(one, reinterpret_cast<sockaddr const*>(&address), sizeof address));
        sockets.push_back(one);
    }
    std::this_thread::sleep_for(std::chrono::milliseconds(600));
    for (int i = 0; i < 8; ++i) {
        EXPECT_EQ("corp.example", Pinned().GetDNSDomainName()) << i;
    }
    EXPECT_THAT(service->Log(), HasSubstr("127.0.0.1: too many connections"));
    for (int const one : sockets) {
        close(one);
    }
}

TEST_F(WinbindCAMTest, AnAccountThatDidNotArriveIsFoundAgainByTheSameHostAlone) {
    auto service = Serve();
    GiveCode("--host host01");
    WriteText(StandIn + "/hangs", "");
    std::thread asking([] { EXPECT_THAT(AccountFailure(Pinned()), IsBroken); });
    WaitForStep("claimed");
    service->End(SIGKILL);
    asking.join();
    fs::remove(StandIn + "/hangs");
    WriteText(StandIn + "/accounts", "host01\n"); // as if it had come so far
    service = Serve();
    EXPECT_TRUE(fs::exists(CodeFile));
    EXPECT_THAT(AccountFailure(Pinned()), IsUnknown(1359)); // whoever makes it may be alive
    EndLeases();
    // Another machine with the same code.
    std::string const machine = Contents("/etc/machine-id");
    WriteText("/etc/machine-id", "00000000000000000000000000000000\n");
    EXPECT_THAT(AccountFailure(Pinned()), IsUnknown(5));
    WriteText("/etc/machine-id", machine);
    EXPECT_EQ(BlobOf("host01"), Pinned().CreateMachineAccount("host01", "").firstResult);
    EXPECT_THAT(Calls(), HasSubstr(" reuse "));
    EXPECT_EQ("received", LastStep());
}

TEST_F(WinbindCAMTest, AServiceThatIsToldToEndAnswersFirst) {
    auto service = Serve();
    GiveCode("--host host01");
    WriteText(StandIn + "/hangs", "");
    std::thread asking([] {
        EXPECT_EQ(BlobOf("host01"), Pinned().CreateMachineAccount("host01", "").firstResult);
    });
    WaitForStep("claimed");
    std::thread ending([&service] { EXPECT_EQ(0, service->End(SIGTERM)); });
    std::this_thread::sleep_for(std::chrono::milliseconds(200));
    fs::remove(StandIn + "/hangs");
    asking.join();
    ending.join();
}

TEST_F(WinbindCAMTest, RootIssuesCodesForAServiceThatIsNot) {
    fs::create_directories(State());
    ASSERT_EQ(0, chmod(State().c_str(), 0700));
    ASSERT_EQ(0, chmod(_folder.Path().c_str(), 0711));
    ASSERT_EQ(0, chown(State().c_str(), 65534, 65534));
    (void)IssueCode("--host host01 --unit Servers --reuse");
    EXPECT_EQ(
        "HOST01\tServers\t60 min\treuse",
        Output("setpriv --reuid=65534 --regid=65534 --clear-groups " + Command("list-codes")));
}

TEST_F(WinbindCAMTest, RootGivesTheServiceNoFileOfAnybodyElses) {
    fs::create_directories(State());
    ASSERT_EQ(0, chmod(State().c_str(), 0700));
    ASSERT_EQ(0, chmod(_folder.Path().c_str(), 0711));
    ASSERT_EQ(0, chown(State().c_str(), 65534, 65534));
    struct stat before = {};
    ASSERT_EQ(0, stat("/etc/shadow", &before));
    for (std::string const name : {"codes.db", "codes.db-wal", "codes.json"}) {
        fs::create_symlink("/etc/shadow", State() + "/" + name);
        (void)Output(Command("issue-code --host host01") + " 2>&1 || :");
        struct stat after = {};
        ASSERT_EQ(0, stat("/etc/shadow", &after));
        EXPECT_EQ(before.st_uid, after.st_uid);
        EXPECT_EQ(before.st_ino, after.st_ino);
        EXPECT_EQ(before.st_ctim.tv_sec, after.st_ctim.tv_sec);
        fs::remove(State() + "/" + name);
    }
}

TEST_F(WinbindCAMTest, TheCodesOfAFormerVersionAreTakenIn) {
    fs::create_directories(State());
    ASSERT_EQ(0, chmod(State().c_str(), 0700));
    // The digest of the salt, the host and the code, with zero bytes between them.
    std::string const digest =
        Output("printf '\\0\\1\\0HOST01\\0ABCDABCD' | sha256sum | cut -c1-64");
    WriteText(State() + "/codes.json",
              "{\"version\": 1, \"codes\": {\"HOST01\": {\"salt\": \"0001\", \"digest\": \"" +
                  digest + "\", \"unit\": null, \"expires\": " +
                  std::to_string(time(nullptr) + 600) + ", \"reuse\": false}}}",
              0600);
    auto const service = Serve();
    WriteText(CodeFile, "ABCD-ABCD\n", 0600);
    EXPECT_EQ(BlobOf("host01"), Pinned().CreateMachineAccount("host01", "").firstResult);
    EXPECT_FALSE(fs::exists(State() + "/codes.json"));
}

TEST_F(WinbindCAMTest, TheServiceKeepsItsSecretsFromOthers) {
    struct {
        std::string file;
        mode_t mode;
    } const open[] = {
        {_folder / "credentials", 0640}, {File("good", ".key"), 0644}, {State(), 0750}};
    fs::create_directories(State());
    ASSERT_EQ(0, chmod(State().c_str(), 0700));
    for (auto const& one : open) {
        struct stat before = {};
        ASSERT_EQ(0, stat(one.file.c_str(), &before));
        ASSERT_EQ(0, chmod(one.file.c_str(), one.mode));
        EXPECT_THAT(Output(Command("serve") + " 2>&1; test $? = 1"),
                    AllOf(HasSubstr(one.file), HasSubstr("alone")));
        ASSERT_EQ(0, chmod(one.file.c_str(), before.st_mode & 07777));
    }
}

TEST_F(WinbindCAMTest, NothingButTheRecordIsExported) {
    EXPECT_EQ("CAMProxyClientOperations",
              Output("nm -D --defined-only --format=posix /usr/libexec/tslauth/libwinbind-cam.so | "
                     "cut -d ' ' -f 1"));
}

} // namespace
} // namespace tessel::authentication
