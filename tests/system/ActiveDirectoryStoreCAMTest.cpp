// SPDX-License-Identifier: Apache-2.0
#include "Failure.h"
#include "JoinableHost.h"
#include "faults/Faults.h"
#include "providers/CAMRecording.h"

#include <strandctl/HostCtlException.h>
#include <tslauth/Exceptions.h>

#include <gmock/gmock.h>

#include <fcntl.h>
#include <sys/inotify.h>

using namespace tessel::authentication;
using HostCtl::Lib::HostCtlException;
using testing::ElementsAre;
using testing::IsEmpty;

namespace {

/// While it is set, no file gets the permissions it should have.
bool permissionsAreRefused = false;

} // namespace

/// In place of the C library's, for the libraries as well.
__attribute__((visibility("default"))) int chmod(char const* path, mode_t mode) noexcept {
    if (permissionsAreRefused) {
        errno = EPERM;
        return -1;
    }
    return fchmodat(AT_FDCWD, path, mode, 0);
}

namespace {

constexpr char Server[] = "192.0.2.20";
constexpr char Certificate[] = "/tmp/certificate.pem";
constexpr char AdvancedOptions[] = "/etc/tessel/advanced.conf";

// What cam-recording writes down: a question about the domain, and one for an account.
constexpr char Asked[] = "2 '192.0.2.20' '1' '0A:1B'\n";
constexpr char Created[] = "3 '192.0.2.20' 'node01' (null) '1' '0A:1B'\n";

Failure BadAddress(std::string const& address) {
    return Plain<InvalidIPAddressException>("The IP Address is invalid: IPv4 address '" + address +
                                            "' cannot be parsed as an IP address");
}

Failure BadCAMProvider(std::string const& name) {
    return Plain<InvalidCAMProxyProviderException>("The specified CAMProxy provider '" + name +
                                                   "' is invalid");
}

Failure BadOption() {
    return Plain<InvalidVerifyCAMCertificateOptionException>(
        "The VerifyCAMCertificate option is invalid: Invalid value for "
        "UserVars.ActiveDirectoryVerifyCAMCertificate");
}

Failure BadStore() {
    return Plain<InvalidThumbprintStoreException>(
        "The specified thumbprint store '/etc/tessel/tslauth/camservers.conf' is invalid");
}

Failure NotPEM() {
    return Plain<InvalidCertificateException>(
        "The certificate format is invalid; only PEM format is supported.");
}

std::string Option(std::string const& value) {
    return "UserVars.ActiveDirectoryVerifyCAMCertificate = \"" + value + "\"\n";
}

/// Counts the files opened below the library's configuration while it lives.
class OpenedFiles {
public:
    OpenedFiles() : _watch(inotify_init1(IN_NONBLOCK | IN_CLOEXEC)) {
        EXPECT_LE(0, inotify_add_watch(_watch, "/etc/tessel", IN_OPEN));
        EXPECT_LE(0, inotify_add_watch(_watch, "/etc/tessel/tslauth", IN_OPEN));
        EXPECT_LE(0, inotify_add_watch(_watch, "/usr/libexec/tslauth", IN_OPEN));
    }
    OpenedFiles(OpenedFiles const&) = delete;
    OpenedFiles& operator=(OpenedFiles const&) = delete;
    ~OpenedFiles() {
        close(_watch);
    }

    /// The names, in order; asking forgets them.
    std::vector<std::string> Names() const {
        std::vector<std::string> names;
        alignas(inotify_event) char buffer[8192];
        ssize_t const size = read(_watch, buffer, sizeof buffer);
        for (char const* at = buffer; size > 0 && at < buffer + size;) {
            inotify_event const& event = *reinterpret_cast<inotify_event const*>(at);
            names.push_back(event.len != 0 ? event.name : "(folder)");
            at += sizeof event + event.len;
        }
        return names;
    }

private:
    int _watch;
};

} // namespace

class ActiveDirectoryStoreCAMTest : public Host::JoinTest {
protected:
    void SetUp() override {
        JoinTest::SetUp();
        Host::Write(Paths::CAMProviderConfiguration, "provider = \"cam-recording\"\n");
        Host::Write(Paths::CAMThumbprintStore, "192.0.2.20 = \"0A:1B\"\n");
        Host::Write(AdvancedOptions, Option("1"));
        _camLibrary = std::make_unique<LoadedProvider>("cam-recording");
        CAM().netBIOSDomainName = _texts[0];
        CAM().dnsDomainName = _texts[1];
        CAM().domainSID = _texts[2];
        CAM().firstResult = _texts[3];
        CAM().secondResult = _texts[4];
    }

    void TearDown() override {
        permissionsAreRefused = false;
        _camLibrary.reset();
        JoinTest::TearDown();
    }

    CAMRecording& CAM() {
        return _camLibrary->Find<CAMRecording>("camRecording");
    }
    std::string Log() {
        return CAM().log;
    }
    /// From now on nobody but a store may hold the CAM provider.
    void ReleaseCAMProvider() {
        _camLibrary.reset();
    }

    void Join() {
        Store().JoinDomainWithCAM(Server, "", true);
    }
    Failure JoinFailure() {
        return FailureOf([&] { Join(); });
    }
    Failure CheckedJoinFailure() {
        return FailureOf([&] { Store().JoinDomainWithCAM(Server, "", false); });
    }
    Failure DomainFailure() {
        return FailureOf([&] { (void)Store().GetDomainForCAMService(Server); });
    }
    Failure ImportFailure(std::string const& file = Certificate) {
        return FailureOf([&] { Store().ImportCertificateForCAM(file, Server); });
    }

    /// What the provider's join with a machine account was called with, or that it was not called.
    std::vector<std::string> Joined() const {
        return ArgumentsOf(13);
    }

    /// Makes a certificate, and tells its thumbprint as the openssl program prints it.
    static std::string MakeCertificate(std::string const& name = "cam.example") {
        Run("openssl req -x509 -newkey ec -pkeyopt ec_paramgen_curve:P-256 -nodes -keyout "
            "/dev/null "
            "-subj /CN=" +
            name + " -out " + Certificate + " 2>/dev/null");
        Run(std::string("openssl x509 -noout -fingerprint -sha1 -in ") + Certificate +
            " | sed 's/.*=//' > /tmp/thumbprint");
        return Host::Read("/tmp/thumbprint").substr(0, 59);
    }

private:
    char _texts[5][16] = {"CORP", "corp.example", "S-1-5-21", "first", "second"};
    std::unique_ptr<LoadedProvider> _camLibrary;
};

// ---- The server's address -----------------------------------------------------------------------

TEST_F(ActiveDirectoryStoreCAMTest, AddressThatIsNoneIsRefusedBeforeAnyFileIsOpened) {
    MakeCertificate();
    OpenedFiles const opened;
    for (std::string const address :
         {"300.1.1.1", "", "192.0.2", "192.0.2.20.", " 192.0.2.20", "192.0.2.020", "0xc0.0.2.20",
          "cam.example", "::1", "192.0.2.20/24"}) {
        EXPECT_EQ(BadAddress(address),
                  FailureOf([&] { Store().ImportCertificateForCAM(Certificate, address); }));
        EXPECT_EQ(BadAddress(address),
                  FailureOf([&] { Store().JoinDomainWithCAM(address, "", false); }));
        EXPECT_EQ(BadAddress(address),
                  FailureOf([&] { (void)Store().GetDomainForCAMService(address); }));
    }
    EXPECT_THAT(opened.Names(), IsEmpty());
    EXPECT_EQ("", Log());
}

// ---- Importing a certificate --------------------------------------------------------------------

TEST_F(ActiveDirectoryStoreCAMTest, ImportPinsTheThumbprintThatOpenSSLPrints) {
    std::string const thumbprint = MakeCertificate();
    Store().ImportCertificateForCAM(Certificate, "192.0.2.1");
    EXPECT_EQ("192.0.2.1 = \"" + thumbprint + "\"\n192.0.2.20 = \"0A:1B\"\n",
              Host::Read(Paths::CAMThumbprintStore));
}

TEST_F(ActiveDirectoryStoreCAMTest, ImportReplacesThePinnedThumbprintOfThatServerAlone) {
    std::string const first = MakeCertificate("first");
    Store().ImportCertificateForCAM(Certificate, "192.0.2.1");
    Store().ImportCertificateForCAM(Certificate, Server);
    std::string const second = MakeCertificate("second");
    EXPECT_NE(first, second);
    Store().ImportCertificateForCAM(Certificate, Server);
    EXPECT_EQ("192.0.2.1 = \"" + first + "\"\n192.0.2.20 = \"" + second + "\"\n",
              Host::Read(Paths::CAMThumbprintStore));
}

TEST_F(ActiveDirectoryStoreCAMTest, ImportOfTheSameCertificateWritesTheFileOnce) {
    MakeCertificate();
    Store().ImportCertificateForCAM(Certificate, Server);
    auto const before = Host::Status(Paths::CAMThumbprintStore).st_ino;
    Store().ImportCertificateForCAM(Certificate, Server);
    EXPECT_EQ(before, Host::Status(Paths::CAMThumbprintStore).st_ino);
}

TEST_F(ActiveDirectoryStoreCAMTest, MissingCertificateIsReportedBeforeTheStoreIsOpened) {
    ASSERT_EQ(0, unlink(Paths::CAMThumbprintStore));
    EXPECT_EQ(Coded(typeid(FileNotFoundException), 2, "The system cannot find the file specified."),
              ImportFailure("/tmp/absent.pem"));
}

TEST_F(ActiveDirectoryStoreCAMTest, CertificateThatIsNotInPEMFormIsRefusedAndTheStoreStays) {
    std::string const before = Host::Read(Paths::CAMThumbprintStore);
    MakeCertificate();
    Run(std::string("openssl x509 -outform DER -out /tmp/certificate.der -in ") + Certificate);
    Host::Write("/tmp/empty.pem", "");
    for (char const* file : {"/tmp/certificate.der", "/tmp/empty.pem"}) {
        EXPECT_EQ(NotPEM(), ImportFailure(file)) << file;
    }
    EXPECT_EQ(before, Host::Read(Paths::CAMThumbprintStore));
}

TEST_F(ActiveDirectoryStoreCAMTest, StoreThatDoesNotExistIsInvalidAndNotCreated) {
    MakeCertificate();
    ASSERT_EQ(0, unlink(Paths::CAMThumbprintStore));
    EXPECT_EQ(BadStore(), ImportFailure());
    EXPECT_NE(0, access(Paths::CAMThumbprintStore, F_OK));
}

TEST_F(ActiveDirectoryStoreCAMTest, StoreThatCannotBeReplacedIsInvalidAndStaysAsItWas) {
    MakeCertificate();
    std::string const before = Host::Read(Paths::CAMThumbprintStore);
    // A mount point cannot be renamed over.
    Mount(Paths::CAMThumbprintStore, Paths::CAMThumbprintStore, nullptr, MS_BIND, nullptr);
    EXPECT_EQ(BadStore(), ImportFailure());
    EXPECT_EQ(before, Host::Read(Paths::CAMThumbprintStore));
}

TEST_F(ActiveDirectoryStoreCAMTest, PermissionsThatCannotBeKeptAreReportedAsSuch) {
    std::string const thumbprint = MakeCertificate();
    permissionsAreRefused = true;
    EXPECT_EQ(Plain<FilePermissionError>("Failed to save file permissions, file permissions may be "
                                         "incorrect: Operation not permitted"),
              ImportFailure());
    EXPECT_EQ("192.0.2.20 = \"" + thumbprint + "\"\n", Host::Read(Paths::CAMThumbprintStore))
        << "it was replaced all the same";
}

TEST_F(ActiveDirectoryStoreCAMTest, MalformedStoreIsAConfigurationError) {
    MakeCertificate();
    Host::Write(Paths::CAMThumbprintStore, "192.0.2.20\n");
    Failure const malformed =
        Plain<ConfigurationError>("Error parsing configuration on line 1: no delimiter found");
    EXPECT_EQ(malformed, ImportFailure());
    EXPECT_EQ(malformed, JoinFailure());
}

TEST_F(ActiveDirectoryStoreCAMTest, PinningReplacesTheOneThumbprintAsImportingDoes) {
    std::string const thumbprint = MakeCertificate();
    Host::Write(Paths::CAMThumbprintStore, "192.0.2.20 = \"0A:1B\"\n192.0.2.21 = \"2C\"\n");
    Store().PinCertificateForCAM(Certificate, Server);
    EXPECT_EQ("192.0.2.20 = \"" + thumbprint + "\"\n192.0.2.21 = \"2C\"\n",
              Host::Read(Paths::CAMThumbprintStore));
    EXPECT_EQ(BadAddress("x"), FailureOf([&] { Store().PinCertificateForCAM(Certificate, "x"); }));
    ASSERT_EQ(0, unlink(Paths::CAMThumbprintStore));
    EXPECT_EQ(
        Plain<IOError>("Unable to open '/etc/tessel/tslauth/camservers.conf': No such file or "
                       "directory"),
        FailureOf([&] { Store().PinCertificateForCAM(Certificate, Server); }));
}

TEST_F(ActiveDirectoryStoreCAMTest, PinningLosesNoThumbprintToAReadError) {
    if (!faults::Available()) {
        GTEST_SKIP() << "this kernel does not let a process be watched";
    }
    std::string const thumbprint = MakeCertificate();
    std::string const before = "192.0.2.20 = \"0A:1B\"\n192.0.2.21 = \"2C\"\n";
    std::string const after = "192.0.2.20 = \"" + thumbprint + "\"\n192.0.2.21 = \"2C\"\n";
    // Fails the reads that `call` makes, one after the other, and tells `tried` what came of it.
    auto const failEachRead = [&](auto call, auto tried) {
        for (std::size_t read = 1;; ++read) {
            Host::Write(Paths::CAMThumbprintStore, before);
            faults::Outcome const outcome =
                faults::RunWithFaultIn("read", faults::FailsWith(EIO), call, read, 1);
            if (!outcome.injected) {
                return;
            }
            tried(outcome);
        }
    };
    ActiveDirectoryStore store(60);
    int refused = 0;
    failEachRead([&] { store.PinCertificateForCAM(Certificate, Server); },
                 [&](faults::Outcome const& outcome) {
                     EXPECT_NE("", outcome.exception);
                     EXPECT_EQ(before, Host::Read(Paths::CAMThumbprintStore)) << outcome.message;
                     refused += outcome.message == "Cannot read '/etc/tessel/tslauth/"
                                                   "camservers.conf': Input/output error";
                 });
    EXPECT_EQ(2, refused);
    // What importing does instead is part of its contract.
    int lost = 0;
    failEachRead([&] { store.ImportCertificateForCAM(Certificate, Server); },
                 [&](faults::Outcome const& outcome) {
                     std::string const now = Host::Read(Paths::CAMThumbprintStore);
                     lost += outcome.exception.empty() && now != after;
                 });
    EXPECT_EQ(1, lost);
}

// ---- Joining ------------------------------------------------------------------------------------

TEST_F(ActiveDirectoryStoreCAMTest, JoinAsksForTheAccountThenForEachNameAndHandsBothOn) {
    Join();
    EXPECT_EQ(std::string(Created) + Asked + Asked + Asked, Log());
    EXPECT_THAT(Joined(), ElementsAre("", "CORP", "corp.example", "S-1-5-21", // the domain
                                      "node01", "corp.example", "", "first", "second"));
}

TEST_F(ActiveDirectoryStoreCAMTest, NamesAreAskedForInTheOrderNetBIOSThenDNSThenSID) {
    CAM().numbered = 1;
    Join();
    EXPECT_THAT(Joined(), ElementsAre("", "2", "3", "4", "node01", "3", "", "first", "second"));
}

TEST_F(ActiveDirectoryStoreCAMTest, OrganisationalUnitIsHandedToTheServer) {
    Store().JoinDomainWithCAM(Server, "Servers/Linux", true);
    EXPECT_EQ("3 '192.0.2.20' 'node01' 'Servers/Linux' '1' '0A:1B'\n" + std::string(Asked) + Asked +
                  Asked,
              Log());
}

TEST_F(ActiveDirectoryStoreCAMTest, AccountIsNamedAfterTheHostUpToItsFirstDot) {
    struct {
        char const* hostName;
        char const* account;
    } const rows[] = {{"host01.corp.example", "host01"},
                      {"host01", "host01"},
                      {"Host01.", "Host01"},
                      {"a.b.c", "a"}};
    for (auto const& row : rows) {
        NameHost(row.hostName);
        CAM().log[0] = '\0';
        Record().calls[13] = 0;
        Join();
        EXPECT_EQ(std::string("3 '192.0.2.20' '") + row.account + "' (null) '1' '0A:1B'\n" + Asked +
                      Asked + Asked,
                  Log());
        EXPECT_EQ(row.account, Joined()[4]);
    }
}

TEST_F(ActiveDirectoryStoreCAMTest, HostNameIsTakenFromTheKernelAndNotResolved) {
    NameHost("nobody");
    Join();
    EXPECT_EQ("nobody", Joined()[4]);
}

TEST_F(ActiveDirectoryStoreCAMTest, HostNameThatCannotBeReadEndsTheJoinBeforeTheProviderIsChosen) {
    NameHost(std::string(64, 'x'));
    ASSERT_EQ(0, unlink(Paths::CAMProviderConfiguration));
    EXPECT_EQ(
        Plain<InvalidHostNameException>("The current hostname is invalid: unable to get hostname"),
        JoinFailure());
}

TEST_F(ActiveDirectoryStoreCAMTest, ServerWithoutAPinnedThumbprintIsAskedWithAnEmptyOne) {
    Host::Write(Paths::CAMThumbprintStore, "192.0.2.2 = \"0A:1B\"\n");
    Join();
    EXPECT_EQ("3 '192.0.2.20' 'node01' (null) '1' ''\n", Log().substr(0, 38));
    EXPECT_EQ("first", Joined()[7]);
    EXPECT_EQ("192.0.2.2 = \"0A:1B\"\n", Host::Read(Paths::CAMThumbprintStore));
}

TEST_F(ActiveDirectoryStoreCAMTest, JoinDoesNotActivateTheStore) {
    auto const before = Host::Snapshot();
    Join();
    EXPECT_EQ(before, Host::Snapshot());
}

TEST_F(ActiveDirectoryStoreCAMTest, FailureOfTheProviderPropagatesAfterTheAccountWasMade) {
    Record().code = 2691;
    EXPECT_EQ(Coded(typeid(SetupAlreadyJoinedException), 2691,
                    "This machine is already joined to a domain."),
              JoinFailure());
    EXPECT_EQ(std::string(Created) + Asked + Asked + Asked, Log());
}

TEST_F(ActiveDirectoryStoreCAMTest, ProviderThatCannotJoinWithAnAccountIsNotImplemented) {
    Host::Write(Paths::ProviderConfiguration, "provider = \"version-1\"\n");
    ActiveDirectoryStore store(60);
    EXPECT_EQ(NotImplemented(), FailureOf([&] { store.JoinDomainWithCAM(Server, "", true); }));
}

// ---- The check of the host's name ---------------------------------------------------------------

TEST_F(ActiveDirectoryStoreCAMTest, CheckUsesTheDomainThatTheServerNames) {
    Resolve("node01");
    Store().JoinDomainWithCAM(Server, "", false);
    EXPECT_EQ("node01.corp.example node01", HostsEntry());
    EXPECT_EQ(std::string(Asked) + Created + Asked + Asked + Asked, Log());
    EXPECT_THAT(Host::SystemLog(), IsEmpty());
}

TEST_F(ActiveDirectoryStoreCAMTest, CheckThatFailsEndsTheJoinBeforeAnAccountIsMade) {
    NameHost("linux");
    Resolve("linux.corp.example linux");
    EXPECT_EQ(Plain<InvalidHostNameException>(
                  "The current hostname is invalid: hostname is in blacklist"),
              CheckedJoinFailure());
    EXPECT_EQ(Asked, Log());
    EXPECT_THAT(Joined(), ElementsAre("called 0 times"));
}

TEST_F(ActiveDirectoryStoreCAMTest, SkippingTheCheckTouchesNothing) {
    NameHost("localhost");
    Resolve("linux.elsewhere.example localhost");
    std::string const before = NameFiles();
    Join();
    EXPECT_EQ(before, NameFiles());
    EXPECT_THAT(Host::SystemLog(), IsEmpty());
    EXPECT_EQ("localhost", Joined()[4]);
}

// ---- The option ---------------------------------------------------------------------------------

TEST_F(ActiveDirectoryStoreCAMTest, OptionAtZeroTurnsVerificationOffAndKeepsTheThumbprint) {
    Host::Write(AdvancedOptions, Option("0"));
    Join();
    EXPECT_EQ("3 '192.0.2.20' 'node01' (null) '0' '0A:1B'\n"
              "2 '192.0.2.20' '0' '0A:1B'\n"
              "2 '192.0.2.20' '0' '0A:1B'\n"
              "2 '192.0.2.20' '0' '0A:1B'\n",
              Log());
}

TEST_F(ActiveDirectoryStoreCAMTest, OptionIsReadAnewForEachJoin) {
    Host::Write(AdvancedOptions, Option("2"));
    EXPECT_EQ(BadOption(), JoinFailure());
    Host::Write(AdvancedOptions, Option("1"));
    EXPECT_EQ(NoFailure(), JoinFailure());
}

TEST_F(ActiveDirectoryStoreCAMTest, OtherValuesFailBeforeTheCAMProviderIsLoaded) {
    OpenedFiles const opened;
    for (char const* value : {"2", "-1", "2147483647", "-2147483648"}) {
        Host::Write(AdvancedOptions, Option(value));
        (void)opened.Names(); // the test's own
        EXPECT_EQ(BadOption(), JoinFailure()) << value;
        EXPECT_THAT(opened.Names(), ElementsAre("advanced.conf")) << value;
    }
    EXPECT_EQ("", Log());
}

TEST_F(ActiveDirectoryStoreCAMTest, EachMissingPieceOfTheOptionSaysSo) {
    constexpr char noInteger[] =
        "Unable to get advanced option UserVars.ActiveDirectoryVerifyCAMCertificate";
    struct {
        std::string text;
        char const* failure;
    } const rows[] = {
        {"", "Unable to get user from root"},
        {"Misc.ActiveDirectoryVerifyCAMCertificate = \"1\"\n", "Unable to get user from root"},
        {"UserVars.Other = \"1\"\n", "Unable to get the user option"},
        {Option("yes"), noInteger},
        {Option(""), noInteger},
        {Option("1.0"), noInteger},
        {Option("4294967297"), noInteger},
    };
    for (auto const& row : rows) {
        Host::Write(AdvancedOptions, row.text);
        EXPECT_EQ(Plain<HostCtlException>(row.failure), JoinFailure()) << row.text;
    }
    ASSERT_EQ(0, unlink(AdvancedOptions));
    EXPECT_EQ(Plain<HostCtlException>("Unable to get root option branch"), JoinFailure());
    EXPECT_EQ("", Log());
}

// ---- The CAM provider ---------------------------------------------------------------------------

TEST_F(ActiveDirectoryStoreCAMTest, MissingConfigurationMeansNoneInstalled) {
    ASSERT_EQ(0, unlink(Paths::CAMProviderConfiguration));
    EXPECT_EQ(BadCAMProvider("(none installed)"), JoinFailure());
    EXPECT_EQ(BadCAMProvider("(none installed)"), DomainFailure());
}

TEST_F(ActiveDirectoryStoreCAMTest, MissingLibraryMeansNoneInstalled) {
    Host::Write(Paths::CAMProviderConfiguration, "provider = \"absent\"\n");
    EXPECT_EQ(BadCAMProvider("(none installed)"), JoinFailure());
    EXPECT_EQ(BadCAMProvider("(none installed)"), DomainFailure());
}

TEST_F(ActiveDirectoryStoreCAMTest, EmptyNameMeansUnset) {
    Host::Write(Paths::CAMProviderConfiguration, "provider = \"\"\n");
    EXPECT_EQ(BadCAMProvider("(unset)"), JoinFailure());
    EXPECT_EQ(BadCAMProvider("(unset)"), DomainFailure());
}

TEST_F(ActiveDirectoryStoreCAMTest, MissingNameIsAnInvalidKey) {
    Host::Write(Paths::CAMProviderConfiguration, "other = \"cam-recording\"\n");
    Failure const invalidKey = Plain<InvalidKeyException>(
        "The specified key 'provider' was not found in this configuration");
    EXPECT_EQ(invalidKey, JoinFailure());
    EXPECT_EQ(invalidKey, DomainFailure());
}

TEST_F(ActiveDirectoryStoreCAMTest, MalformedConfigurationIsAConfigurationError) {
    Host::Write(Paths::CAMProviderConfiguration, "provider\n");
    Failure const malformed =
        Plain<ConfigurationError>("Error parsing configuration on line 1: no delimiter found");
    EXPECT_EQ(malformed, JoinFailure());
    EXPECT_EQ(malformed, DomainFailure());
}

TEST_F(ActiveDirectoryStoreCAMTest, ProviderWithoutItsRecordKeepsItsOwnReason) {
    Host::Write(Paths::CAMProviderConfiguration, "provider = \"cam-missing-operations\"\n");
    Failure const invalid = Plain<InvalidCAMProxyProviderException>(
        "The specified CAMProxy provider 'cam-missing-operations' is invalid: "
        "/usr/libexec/tslauth/libcam-missing-operations.so: undefined symbol: "
        "CAMProxyClientOperations");
    EXPECT_EQ(invalid, JoinFailure());
    EXPECT_EQ(invalid, DomainFailure());
}

TEST_F(ActiveDirectoryStoreCAMTest, MissingThumbprintStoreIsInvalidAndNotNoneInstalled) {
    ASSERT_EQ(0, unlink(Paths::CAMThumbprintStore));
    EXPECT_EQ(BadStore(), JoinFailure());
    // It comes between the provider's name and its library.
    Host::Write(Paths::CAMProviderConfiguration, "provider = \"absent\"\n");
    EXPECT_EQ(BadStore(), JoinFailure());
    Host::Write(Paths::CAMProviderConfiguration, "provider = \"\"\n");
    EXPECT_EQ(BadCAMProvider("(unset)"), JoinFailure());
    EXPECT_NE(0, access(Paths::CAMThumbprintStore, F_OK));
}

TEST_F(ActiveDirectoryStoreCAMTest, FilesAreReadInTheirOrder) {
    ReleaseCAMProvider();
    Host::Write(Paths::CAMProviderConfiguration, "provider = \"cam-null-entries\"\n");
    OpenedFiles const opened;
    EXPECT_EQ(NotImplemented(), JoinFailure());
    EXPECT_THAT(opened.Names(), ElementsAre("advanced.conf", "camprovider.conf", "camservers.conf",
                                            "libcam-null-entries.so"));
}

TEST_F(ActiveDirectoryStoreCAMTest, FailureOfTheServerEndsTheJoinAtThatStep) {
    struct {
        int code;
        Failure failure;
    } const rows[] = {
        {TSLAUTH_CAM_PROVIDER_INVALID_CERTIFICATE,
         Coded(typeid(InvalidCAMCertificateException), 0x80090325,
               "The CAM server's certificate cannot be verified.")},
        {1225, Coded(typeid(ConnectionRefusedException), 1225,
                     "The remote computer refused the network connection.")},
        {5, Coded(typeid(UnknownException), 5, "Unknown exception")},
    };
    for (auto const& row : rows) {
        CAM().code = row.code;
        for (unsigned call = 1; call <= 5; ++call) {
            CAM().calls = 0;
            CAM().failingCall = call;
            EXPECT_EQ(row.failure, CheckedJoinFailure());
            EXPECT_EQ(call, CAM().calls);
        }
        CAM().failingCall = 0;
        EXPECT_EQ(row.failure, DomainFailure());
    }
    EXPECT_THAT(Joined(), ElementsAre("called 0 times"));
}

TEST_F(ActiveDirectoryStoreCAMTest, ProxyIsGoneHoweverTheJoinEnds) {
    ReleaseCAMProvider();
    Host::Write(Paths::CAMProviderConfiguration, "provider = \"cam-null-entries\"\n");
    EXPECT_EQ(NotImplemented(), JoinFailure());
    EXPECT_FALSE(LoadedProvider::IsLoaded("cam-null-entries"));
    EXPECT_EQ(NotImplemented(), CheckedJoinFailure());
    EXPECT_FALSE(LoadedProvider::IsLoaded("cam-null-entries"));
    EXPECT_EQ(NotImplemented(), DomainFailure());
    EXPECT_FALSE(LoadedProvider::IsLoaded("cam-null-entries"));
}

// ---- The domain of a server ---------------------------------------------------------------------

TEST_F(ActiveDirectoryStoreCAMTest, DomainIsAskedForWithoutVerificationAndThumbprint) {
    EXPECT_EQ("corp.example", Store().GetDomainForCAMService(Server));
    EXPECT_EQ("2 '192.0.2.20' '0' ''\n", Log());
}

TEST_F(ActiveDirectoryStoreCAMTest, DomainIsToldWhateverTheOptionAndTheThumbprintStoreAre) {
    ASSERT_EQ(0, unlink(AdvancedOptions));
    ASSERT_EQ(0, unlink(Paths::CAMThumbprintStore));
    NameHost(std::string(64, 'x'));
    std::string const before = NameFiles();
    EXPECT_EQ("corp.example", Store().GetDomainForCAMService(Server));
    EXPECT_EQ(before, NameFiles());
}

// ---- With the example providers -----------------------------------------------------------------

class ExampleCAMJoinTest : public ActiveDirectoryStoreCAMTest {
protected:
    void SetUp() override {
        ActiveDirectoryStoreCAMTest::SetUp();
        Run("rm -rf /etc/tslauth-example /var/lib/tslauth-example && "
            "mkdir -p /etc/tslauth-example/cam");
        Host::Write(Paths::ProviderConfiguration, "provider = \"example\"\n");
        Host::Write(Paths::CAMProviderConfiguration, "provider = \"example-cam\"\n");
        MakeCertificate("server");
        Run(std::string("cp ") + Certificate + " /etc/tslauth-example/cam/" + Server + ".pem");
        _example = std::make_unique<ActiveDirectoryStore>(60);
    }
    void TearDown() override {
        _example.reset();
        ActiveDirectoryStoreCAMTest::TearDown();
    }

    std::unique_ptr<ActiveDirectoryStore> _example;
};

TEST_F(ExampleCAMJoinTest, JoinsWithoutCredentialsAfterPinningTheCertificate) {
    EXPECT_EQ("example.test", _example->GetDomainForCAMService(Server));
    _example->ImportCertificateForCAM(Certificate, Server);
    Resolve("node01");
    _example->JoinDomainWithCAM(Server, "", false);
    EXPECT_EQ("node01.example.test node01", HostsEntry());
    EXPECT_EQ(1, _example->GetDomainTrustRelationship("example.test"));
    EXPECT_EQ("host/node01@EXAMPLE.TEST", _example->GetHostPrincipalForDomain("example.test"));
    _example->PartDomain();
    EXPECT_EQ(0, _example->GetDomainTrustRelationship("example.test"));
}

TEST_F(ExampleCAMJoinTest, RefusesTheServerWhoseCertificateIsNotThePinnedOne) {
    Failure const notVerified = Coded(typeid(InvalidCAMCertificateException), 0x80090325,
                                      "The CAM server's certificate cannot be verified.");
    EXPECT_EQ(notVerified, FailureOf([&] { _example->JoinDomainWithCAM(Server, "", true); }))
        << "nothing of it is pinned yet";
    MakeCertificate("another");
    _example->ImportCertificateForCAM(Certificate, Server);
    EXPECT_EQ(notVerified, FailureOf([&] { _example->JoinDomainWithCAM(Server, "", true); }));
    EXPECT_EQ(0, _example->GetDomainTrustRelationship("example.test"));
    // The administrator may say that it does not matter.
    Host::Write(AdvancedOptions, Option("0"));
    _example->JoinDomainWithCAM(Server, "", true);
    EXPECT_EQ(1, _example->GetDomainTrustRelationship("example.test"));
}
