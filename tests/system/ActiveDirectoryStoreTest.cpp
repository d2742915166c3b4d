// SPDX-License-Identifier: Apache-2.0
#include "Host.h"

#include <tslauth/ActiveDirectoryStore.h>
#include <tslauth/AuthenticationConfiguration.h>
#include <tslauth/Exceptions.h>
#include <tslauth/systemconfiguration/NSSDatabase.h>
#include <tslauth/systemconfiguration/PAMControl.h>
#include <tslauth/systemconfiguration/PAMFacility.h>

#include <stdexcept>
#include <sys/stat.h>
#include <sys/sysmacros.h>

using namespace tessel::authentication;
using SystemConfiguration::InvalidControlException;
using SystemConfiguration::InvalidDatabaseException;
using SystemConfiguration::InvalidFacilityException;

namespace {

constexpr char Entry[] = "sufficient\t/lib/security/$ISA/pam_plain.so\tfirst=1 second ";

constexpr char ActivePolicy[] =
    "#%PAM-1.0\n"
    "\n"
    "account\tsufficient\t/lib/security/$ISA/pam_plain.so\tfirst=1 second \n"
    "account\trequired\tpam_unix.so\t\n"
    "\n"
    "auth\trequired\tpam_env.so\t\n"
    "auth\trequired\t/lib/security/$ISA/pam_access.so\t\n"
    "auth\tsufficient\t/lib/security/$ISA/pam_plain.so\tfirst=1 second \n"
    "auth\t[success=ok default=bad]\tpam_unix.so\tnullok "
    "try_first_pass \n"
    "\n"
    "password\trequired\tpam_unix.so\t\n"
    "\n"
    "session\trequired\tpam_unix.so\t\n"
    "\n";

constexpr char ActiveSwitch[] = "passwd: plain files\n"
                                "group: plain files\n"
                                "shadow: plain files\n"
                                "hosts: files dns\n";

constexpr char Recorded[] = "remote-authentication-store = \"Active Directory\"\n";

std::string const NoFile = ": No such file or directory";

} // namespace

class ActiveDirectoryStoreTest : public Host::Test {
protected:
    static void Activate() {
        ActiveDirectoryStore(60).MakeActive();
    }
    static void Deactivate() {
        ActiveDirectoryStore(60).MakeInactive();
    }
    static std::string ActivationFailure() {
        return Host::FailureOf(&Activate);
    }
    static std::string ConstructionFailure() {
        return Host::FailureOf([] { ActiveDirectoryStore(60); });
    }
    /// No temporary file of a failed write is taken for a policy.
    static std::string PolicyAfterActivationOf(std::string const& policy) {
        Host::Write(Paths::PAMPolicy, policy);
        Activate();
        return Host::Read(Paths::PAMPolicy);
    }
};

TEST_F(ActiveDirectoryStoreTest, IsNamedActiveDirectory) {
    EXPECT_EQ("Active Directory", ActiveDirectoryStore(60).GetDisplayName());
}

// Construction

TEST_F(ActiveDirectoryStoreTest, ProviderThatIsNotChosenIsUnset) {
    for (char const* text : {"provider = \"\"\n", "provider =\n", "other = \"plain\"\n", ""}) {
        Host::Write(Paths::ProviderConfiguration, text);
        EXPECT_THROW(ActiveDirectoryStore(60), InvalidActiveDirectoryProviderException) << text;
        EXPECT_EQ("InvalidActiveDirectoryProviderException: The specified Active Directory "
                  "provider '(unset)' is invalid",
                  ConstructionFailure())
            << text;
    }
}

TEST_F(ActiveDirectoryStoreTest, MissingProviderConfigurationMeansNoneInstalled) {
    ASSERT_EQ(0, unlink(Paths::ProviderConfiguration));
    EXPECT_THROW(ActiveDirectoryStore(60), InvalidActiveDirectoryProviderException);
    EXPECT_EQ("InvalidActiveDirectoryProviderException: The specified Active Directory provider "
              "'(none installed)' is invalid",
              ConstructionFailure());
}

TEST_F(ActiveDirectoryStoreTest, MalformedProviderConfigurationIsAConfigurationError) {
    Host::Write(Paths::ProviderConfiguration, "provider = \"\nplain");
    EXPECT_THROW(ActiveDirectoryStore(60), ConfigurationError);
    EXPECT_EQ("ConfigurationError: Error parsing configuration at line 1: invalid quoting",
              ConstructionFailure());
}

TEST_F(ActiveDirectoryStoreTest, ProviderThatDoesNotLoadPassesItsOwnExceptionThrough) {
    Host::Write(Paths::ProviderConfiguration, "provider = absent\n");
    EXPECT_THROW(ActiveDirectoryStore(60), IOError);
    EXPECT_EQ(
        "IOError: Unable to open provider: /usr/libexec/tslauth/libabsent.so: cannot open shared "
        "object file" +
            NoFile,
        ConstructionFailure());

    Host::Write(Paths::ProviderConfiguration, "provider = too-new\n");
    EXPECT_THROW(ActiveDirectoryStore(60), InvalidActiveDirectoryProviderException);
    EXPECT_EQ("InvalidActiveDirectoryProviderException: The specified Active Directory provider "
              "'too-new' is invalid: The API version (3) "
              "is not supported by this version of libtslauth",
              ConstructionFailure());
}

TEST_F(ActiveDirectoryStoreTest, ConstructionAndDestructionTouchNoFile) {
    auto const before = Host::Snapshot();
    { ActiveDirectoryStore const store(60); }
    EXPECT_EQ(before, Host::Snapshot());
}

// Activation

TEST_F(ActiveDirectoryStoreTest, ActivationWritesAllThreeFiles) {
    Activate();
    EXPECT_EQ(ActivePolicy, Host::Read(Paths::PAMPolicy));
    EXPECT_EQ(ActiveSwitch, Host::Read(Paths::NSSConfiguration));
    EXPECT_EQ(Recorded, Host::Read(Paths::AuthenticationConfiguration));
    EXPECT_TRUE(ActiveDirectoryStore(60).IsActive());
}

TEST_F(ActiveDirectoryStoreTest, SecondActivationLeavesPolicyAndSwitchByteForByte) {
    Activate();
    auto const first = Host::Snapshot();
    Activate();
    EXPECT_EQ(first, Host::Snapshot());
}

TEST_F(ActiveDirectoryStoreTest, ActivationRewritesTheRecordEvenWhenItStandsThere) {
    Host::Write(Paths::AuthenticationConfiguration, Recorded);
    auto const before = Host::Status(Paths::AuthenticationConfiguration).st_ino;
    Activate();
    EXPECT_EQ(Recorded, Host::Read(Paths::AuthenticationConfiguration));
    EXPECT_NE(before, Host::Status(Paths::AuthenticationConfiguration).st_ino);
}

TEST_F(ActiveDirectoryStoreTest, EntryStandsFirstWhereThereIsNoAccessModule) {
    EXPECT_EQ("#%PAM-1.0\n\n"
              "account\t" +
                  std::string(Entry) +
                  "\n"
                  "account\trequired\tpam_unix.so\t\n\n"
                  "auth\t" +
                  Entry +
                  "\n"
                  "auth\trequired\tpam_unix.so\t\n\n",
              PolicyAfterActivationOf("auth required pam_unix.so\naccount required pam_unix.so\n"));
}

TEST_F(ActiveDirectoryStoreTest, EntryStandsRightAfterTheFirstAccessModule) {
    EXPECT_EQ("#%PAM-1.0\n\n"
              "account\trequired\tpam_access.so\t\n"
              "account\trequisite\t/lib/security/$ISA/pam_access.so\tx \n"
              "account\t" +
                  std::string(Entry) +
                  "\n"
                  "account\trequired\tpam_unix.so\t\n"
                  "account\trequired\t/lib/security/$ISA/pam_access.so\t\n\n"
                  "auth\t" +
                  Entry + "\n\n",
              PolicyAfterActivationOf("account required pam_access.so\n"
                                      "account requisite /lib/security/$ISA/pam_access.so x\n"
                                      "account required pam_unix.so\n"
                                      "account required /lib/security/$ISA/pam_access.so\n"));
}

TEST_F(ActiveDirectoryStoreTest, EqualEntryAnywhereInTheStackIsNotAddedAgain) {
    std::string const policy = "#%PAM-1.0\n\n"
                               "account\t" +
                               std::string(Entry) +
                               "\n\n"
                               "auth\trequired\t/lib/security/$ISA/pam_access.so\t\n"
                               "auth\trequired\tpam_unix.so\t\n"
                               "auth\t" +
                               Entry + "\n\n";
    EXPECT_EQ(policy, PolicyAfterActivationOf(policy));
}

TEST_F(ActiveDirectoryStoreTest, EntryWithOtherParametersIsAnotherEntry) {
    std::string const policy = PolicyAfterActivationOf(
        "auth sufficient /lib/security/$ISA/pam_plain.so first=1\n"
        "account required /lib/security/$ISA/pam_plain.so first=1 second\n");
    EXPECT_NE(std::string::npos, policy.find(std::string("auth\t") + Entry + "\nauth\t"));
    EXPECT_NE(std::string::npos, policy.find(std::string("account\t") + Entry + "\naccount\t"));
}

TEST_F(ActiveDirectoryStoreTest, EmptyPolicyGetsTheEntriesAlone) {
    for (char const* policy : {"", "# only a comment", "\n\n\n"}) {
        EXPECT_EQ("#%PAM-1.0\n\naccount\t" + std::string(Entry) + "\n\nauth\t" + Entry + "\n\n",
                  PolicyAfterActivationOf(policy));
    }
}

TEST_F(ActiveDirectoryStoreTest, MissingDatabaseGetsTheServiceAlone) {
    Host::Write(Paths::NSSConfiguration, "hosts: files\ngroup: files\n");
    Activate();
    EXPECT_EQ("passwd: plain\ngroup: plain files\nshadow: plain\nhosts: files\n",
              Host::Read(Paths::NSSConfiguration));
}

TEST_F(ActiveDirectoryStoreTest, OtherKeysOfTheRecordSurvive) {
    Host::Write(Paths::AuthenticationConfiguration,
                "z='1'\n remote-authentication-store = None\nA = 2\n");
    Activate();
    EXPECT_EQ("A = \"2\"\nremote-authentication-store = \"Active Directory\"\nz = \"1\"\n",
              Host::Read(Paths::AuthenticationConfiguration));
}

TEST_F(ActiveDirectoryStoreTest, EveryModeBitOfEachFileIsKept) {
    ASSERT_EQ(0, chmod(Paths::PAMPolicy, 0640));
    ASSERT_EQ(0, chmod(Paths::NSSConfiguration, 06755));
    ASSERT_EQ(0, chmod(Paths::AuthenticationConfiguration, 01600));
    Activate();
    EXPECT_EQ(0640U, Host::Status(Paths::PAMPolicy).st_mode & 07777);
    EXPECT_EQ(06755U, Host::Status(Paths::NSSConfiguration).st_mode & 07777);
    EXPECT_EQ(01600U, Host::Status(Paths::AuthenticationConfiguration).st_mode & 07777);
}

// Deactivation

TEST_F(ActiveDirectoryStoreTest, DeactivationTakesTheEntriesOutAndLeavesTheRecord) {
    Activate();
    Deactivate();
    std::string policy = Host::Read(Paths::PAMPolicy);
    EXPECT_EQ(std::string::npos, policy.find("plain"));
    EXPECT_EQ("passwd: files\ngroup: files\nshadow: files\nhosts: files dns\n",
              Host::Read(Paths::NSSConfiguration));
    EXPECT_EQ(Recorded, Host::Read(Paths::AuthenticationConfiguration));
}

TEST_F(ActiveDirectoryStoreTest, DeactivationWithoutEntriesRewritesNormalisedFilesUnchanged) {
    Activate();
    Deactivate();
    auto const before = Host::Snapshot();
    Deactivate();
    EXPECT_EQ(before, Host::Snapshot());
}

TEST_F(ActiveDirectoryStoreTest, DeactivationRemovesTheFirstOfTwoEqualEntriesAlone) {
    std::string const twice = std::string("auth\t") + Entry + "\nauth\trequired\tpam_unix.so\t\n" +
                              "auth\t" + Entry + "\naccount\t" + Entry + "\n";
    Host::Write(Paths::PAMPolicy, twice);
    Host::Write(Paths::NSSConfiguration, "passwd: files plainer\npasswd: plain\n"
                                         "passwd: sss\npasswd: plain\n");
    Deactivate();
    EXPECT_EQ(std::string("#%PAM-1.0\n\n\nauth\trequired\tpam_unix.so\t\nauth\t") + Entry + "\n\n",
              Host::Read(Paths::PAMPolicy));
    EXPECT_EQ("passwd: files plainer sss plain\n", Host::Read(Paths::NSSConfiguration));
    // The second copy goes the second time. "account" was empty, so the file no longer holds it.
    Deactivate();
    EXPECT_EQ("#%PAM-1.0\n\nauth\trequired\tpam_unix.so\t\n\n", Host::Read(Paths::PAMPolicy));
}

TEST_F(ActiveDirectoryStoreTest, ServiceWithParametersHidesTheServicesBehindItWhenReadAgain) {
    // The reader passes over what follows a bracketed list. Deliberate in the model, which is why
    // `tslauthctl` looks before it activates such a provider.
    Host::Write(Paths::ProviderConfiguration, "provider = \"recording\"\n");
    Activate();
    EXPECT_EQ(0U, Host::Read(Paths::NSSConfiguration).find("passwd: recording [third] files\n"));
    Activate();
    EXPECT_EQ(0U, Host::Read(Paths::NSSConfiguration).find("passwd: recording [third]\n"));
}

// Failures: what was not written is as it was

TEST_F(ActiveDirectoryStoreTest, RecordIsReadBeforeAnythingIsWritten) {
    auto before = Host::Snapshot();
    for (char const* text : {"no delimiter\n", "a = \"\n"}) {
        Host::Write(Paths::AuthenticationConfiguration, text);
        before = Host::Snapshot();
        EXPECT_THROW(Activate(), Exception) << text;
        EXPECT_EQ(before, Host::Snapshot()) << text;
    }
    ASSERT_EQ(0, unlink(Paths::AuthenticationConfiguration));
    before = Host::Snapshot();
    EXPECT_EQ("IOError: Unable to open '/etc/tessel/tslauth/authentication.conf'" + NoFile,
              ActivationFailure());
    EXPECT_EQ(before, Host::Snapshot());
}

TEST_F(ActiveDirectoryStoreTest, MissingKeyIsFoundOutAfterPolicyAndSwitchWereRewired) {
    Host::Write(Paths::AuthenticationConfiguration, "other = \"1\"\n");
    EXPECT_THROW(Activate(), InvalidKeyException);
    EXPECT_EQ(
        "InvalidKeyException: The specified key 'remote-authentication-store' was not found in "
        "this configuration",
        ActivationFailure());
    EXPECT_EQ(ActivePolicy, Host::Read(Paths::PAMPolicy));
    EXPECT_EQ(ActiveSwitch, Host::Read(Paths::NSSConfiguration));
    EXPECT_EQ("other = \"1\"\n", Host::Read(Paths::AuthenticationConfiguration));
}

TEST_F(ActiveDirectoryStoreTest, PlanShowsWhatActivationWritesAndWritesNothing) {
    auto const before = Host::Snapshot();
    auto const preview = ActiveDirectoryStore(60).GetActivationPlan().Preview();
    EXPECT_EQ(before, Host::Snapshot());
    EXPECT_FALSE(preview.refusal);
    ASSERT_EQ(3U, preview.files.size());
    Activate();
    for (auto const& file : preview.files) {
        EXPECT_EQ(file.after, Host::Read(file.path)) << file.path;
    }
    EXPECT_EQ("Active Directory", RecordedStore());
}

TEST_F(ActiveDirectoryStoreTest, ExecutedPlanIsTheActivation) {
    ActiveDirectoryStore(60).GetActivationPlan().Execute();
    EXPECT_EQ(ActivePolicy, Host::Read(Paths::PAMPolicy));
    EXPECT_EQ(ActiveSwitch, Host::Read(Paths::NSSConfiguration));
    EXPECT_EQ(Recorded, Host::Read(Paths::AuthenticationConfiguration));
}

TEST_F(ActiveDirectoryStoreTest, MissingPolicyIsAnIOErrorAndNothingIsCreated) {
    ASSERT_EQ(0, unlink(Paths::PAMPolicy));
    auto const before = Host::Snapshot();
    EXPECT_THROW(Activate(), IOError);
    EXPECT_EQ("IOError: Cannot open '/etc/pam.d/system-auth-generic'" + NoFile,
              ActivationFailure());
    EXPECT_EQ(before, Host::Snapshot());
}

TEST_F(ActiveDirectoryStoreTest, MissingSwitchLeavesThePolicyChangedAndTheRecordAsItWas) {
    ASSERT_EQ(0, unlink(Paths::NSSConfiguration));
    EXPECT_EQ("IOError: Cannot open '/etc/nsswitch.conf'" + NoFile, ActivationFailure());
    EXPECT_EQ(ActivePolicy, Host::Read(Paths::PAMPolicy));
    EXPECT_NE(0, access(Paths::NSSConfiguration, F_OK));
    EXPECT_EQ("remote-authentication-store = \"None\"\n",
              Host::Read(Paths::AuthenticationConfiguration));
}

TEST_F(ActiveDirectoryStoreTest, PolicyThatTheModelRefusesStaysAsItIs) {
    struct {
        char const* text;
        char const* message;
    } const cases[] = {
        {"@include common-auth\n", "InvalidFacilityException: Invalid Facility: @include"},
        {"-session optional pam_systemd.so\n",
         "InvalidFacilityException: Invalid Facility: -session"},
        {"auth Required pam_unix.so\n", "InvalidControlException: Invalid Control: Required"},
        {"auth required pam_unix.so \\\n  nullok\n",
         "InvalidFacilityException: Invalid Facility: nullok"},
        {"auth", "InvalidControlException: Invalid Control: "},
        {"\x7f"
         "ELF\x01",
         "InvalidFacilityException: Invalid Facility: \x7f"
         "ELF\x01"},
    };
    for (auto const& refused : cases) {
        Host::Write(Paths::PAMPolicy, std::string("auth required pam_unix.so\n") + refused.text);
        auto const before = Host::Snapshot();
        EXPECT_EQ(refused.message, ActivationFailure());
        EXPECT_EQ(before, Host::Snapshot());
        EXPECT_EQ(refused.message, Host::FailureOf(&Deactivate));
        EXPECT_EQ(before, Host::Snapshot());
    }
}

TEST_F(ActiveDirectoryStoreTest, SwitchThatTheModelRefusesStaysAsItIs) {
    struct {
        char const* text;
        char const* message;
    } const cases[] = {
        {"gshadow: files\n", "InvalidDatabaseException: Invalid Database: gshadow"},
        {" # indented\n", "InvalidDatabaseException: Invalid Database: "},
        {"passwd : files\n", "InvalidDatabaseException: Invalid Database: passw"},
        {"passwd: files\r\n", "out_of_range: basic_string::at"},
        {"passwd: files \n", "out_of_range: basic_string::at"},
    };
    for (auto const& refused : cases) {
        Host::Write(Paths::NSSConfiguration, std::string("hosts: files\n") + refused.text);
        EXPECT_EQ(refused.message, ActivationFailure());
        EXPECT_EQ(std::string("hosts: files\n") + refused.text,
                  Host::Read(Paths::NSSConfiguration));
        EXPECT_EQ("remote-authentication-store = \"None\"\n",
                  Host::Read(Paths::AuthenticationConfiguration));
    }
    Host::Write(Paths::NSSConfiguration, "gshadow: files\n");
    EXPECT_THROW(Activate(), InvalidDatabaseException);
    Host::Write(Paths::NSSConfiguration, "passwd: files \n");
    EXPECT_THROW(Activate(), std::out_of_range);
}

TEST_F(ActiveDirectoryStoreTest, HugeFilesAreCarriedWhole) {
    std::string policy = "auth required pam_unix.so " + std::string(1 << 20, 'x') + "\n";
    std::string expected = "auth\trequired\tpam_unix.so\t" + std::string(1 << 20, 'x') + " \n";
    for (int i = 0; i < 100000; ++i) {
        policy += "auth required pam_unix.so\n";
        expected += "auth\trequired\tpam_unix.so\t\n";
    }
    std::string const written = PolicyAfterActivationOf(policy);
    EXPECT_TRUE(written == "#%PAM-1.0\n\naccount\t" + std::string(Entry) + "\n\nauth\t" + Entry +
                               "\n" + expected + "\n");

    std::string services;
    for (int i = 0; i < 100000; ++i) {
        services += " s" + std::to_string(i);
    }
    Host::Write(Paths::NSSConfiguration, "netgroup:" + services + "\n");
    Activate();
    EXPECT_TRUE(Host::Read(Paths::NSSConfiguration) ==
                "passwd: plain\ngroup: plain\nshadow: plain\nnetgroup:" + services + "\n");
}

// Every kind of bad file, for each file

namespace {

/// Gives up root's rights to files for its lifetime.
class AsNobody {
public:
    AsNobody() {
        EXPECT_EQ(0, seteuid(65534));
    }
    ~AsNobody() {
        EXPECT_EQ(0, seteuid(0));
    }
};

/// A line of 1 MiB in the form of a key-value file.
std::string LongAssignment() {
    return "long = \"" + std::string(1 << 20, 'x') + "\"\n";
}

std::string ManyAssignments() {
    std::string text;
    for (int i = 100000; i < 200000; ++i) {
        text += "key" + std::to_string(i) + " = \"" + std::to_string(i) + "\"\n";
    }
    return text;
}

std::string const Binary("\x7f"
                         "ELF\0\1 \xff\n\0",
                         10);

} // namespace

TEST_F(ActiveDirectoryStoreTest, UnreadableFileIsNamedAndNothingChanges) {
    struct {
        char const* path;
        char const* message;
    } const cases[] = {
        {Paths::PAMPolicy,
         "IOError: Cannot open '/etc/pam.d/system-auth-generic': Permission denied"},
        {Paths::AuthenticationConfiguration,
         "IOError: Unable to open '/etc/tessel/tslauth/authentication.conf': Permission denied"},
        {Paths::ProviderConfiguration, "InvalidActiveDirectoryProviderException: The specified "
                                       "Active Directory provider '(none installed)' is invalid"},
    };
    auto const before = Host::Snapshot();
    for (auto const& unreadable : cases) {
        ASSERT_EQ(0, chmod(unreadable.path, 0));
        std::string failure;
        {
            AsNobody const nobody;
            failure = ActivationFailure();
        }
        ASSERT_EQ(0, chmod(unreadable.path, 0644));
        EXPECT_EQ(unreadable.message, failure);
        EXPECT_EQ(before, Host::Snapshot());
    }
    // The policy comes first: give it away, so that the switch is what fails.
    ASSERT_EQ(0, chown("/etc/pam.d", 65534, 65534));
    ASSERT_EQ(0, chown(Paths::PAMPolicy, 65534, 65534));
    ASSERT_EQ(0, chmod(Paths::NSSConfiguration, 0));
    std::string failure;
    {
        AsNobody const nobody;
        failure = ActivationFailure();
    }
    ASSERT_EQ(0, chmod(Paths::NSSConfiguration, 0644));
    ASSERT_EQ(0, chown("/etc/pam.d", 0, 0));
    EXPECT_EQ("IOError: Cannot open '/etc/nsswitch.conf': Permission denied", failure);
    EXPECT_EQ(before.at(Paths::NSSConfiguration), Host::Read(Paths::NSSConfiguration));
}

TEST_F(ActiveDirectoryStoreTest, PolicyWithCarriageReturnsReadsAsWithoutThem) {
    std::string const withReturns =
        PolicyAfterActivationOf("# x\r\nauth required pam_unix.so nullok\r\n\r\n");
    EXPECT_EQ(PolicyAfterActivationOf("auth required pam_unix.so nullok\n"), withReturns);
}

TEST_F(ActiveDirectoryStoreTest, EmptySwitchGetsTheServicesAlone) {
    Host::Write(Paths::NSSConfiguration, "");
    Activate();
    EXPECT_EQ("passwd: plain\ngroup: plain\nshadow: plain\n", Host::Read(Paths::NSSConfiguration));
}

TEST_F(ActiveDirectoryStoreTest, BinarySwitchIsRefusedWhole) {
    Host::Write(Paths::NSSConfiguration, Binary);
    EXPECT_THROW(Activate(), InvalidDatabaseException);
    EXPECT_EQ(Binary, Host::Read(Paths::NSSConfiguration));
}

TEST_F(ActiveDirectoryStoreTest, SwitchOfManyLinesIsCarriedWhole) {
    std::string lines, services;
    for (int i = 0; i < 100000; ++i) {
        lines += "hosts: s" + std::to_string(i) + "\n";
        services += " s" + std::to_string(i);
    }
    std::string const longName(1 << 20, 'x');
    Host::Write(Paths::NSSConfiguration, lines + "networks: " + longName + "\n");
    Activate();
    EXPECT_TRUE(Host::Read(Paths::NSSConfiguration) ==
                "passwd: plain\ngroup: plain\nshadow: plain\nhosts:" + services +
                    "\nnetworks: " + longName + "\n");
}

TEST_F(ActiveDirectoryStoreTest, HugeRecordIsCarriedWhole) {
    Host::Write(Paths::AuthenticationConfiguration,
                "remote-authentication-store = None\n" + LongAssignment() + ManyAssignments());
    Activate();
    EXPECT_TRUE(Host::Read(Paths::AuthenticationConfiguration) ==
                ManyAssignments() + LongAssignment() + Recorded);
}

TEST_F(ActiveDirectoryStoreTest, BadRecordStopsTheActivationBeforeItBegins) {
    struct {
        std::string text;
        char const* message;
    } const cases[] = {
        {Binary, "ConfigurationError: Error parsing configuration on line 1: no delimiter found"},
        {ManyAssignments() + "x\n",
         "ConfigurationError: Error parsing configuration on line 100001: no delimiter found"},
        {LongAssignment() + "x = '",
         "ConfigurationError: Error parsing configuration at line 2: invalid quoting"},
    };
    for (auto const& bad : cases) {
        Host::Write(Paths::AuthenticationConfiguration, bad.text);
        auto const before = Host::Snapshot();
        EXPECT_EQ(bad.message, ActivationFailure());
        EXPECT_EQ(before, Host::Snapshot());
    }
}

TEST_F(ActiveDirectoryStoreTest, CarriageReturnBelongsToTheRecordedName) {
    Host::Write(Paths::AuthenticationConfiguration,
                "remote-authentication-store = \"Active Directory\"\r\n");
    EXPECT_FALSE(ActiveDirectoryStore(60).IsActive());
    Activate();
    EXPECT_EQ(Recorded, Host::Read(Paths::AuthenticationConfiguration));
}

TEST_F(ActiveDirectoryStoreTest, BadProviderConfigurationIsReportedWithItsText) {
    struct {
        std::string text;
        char const* message;
    } const cases[] = {
        {Binary, "ConfigurationError: Error parsing configuration on line 1: no delimiter found"},
        {"provider = \"plain\"\r\n", "IOError: Unable to open provider: "
                                     "/usr/libexec/tslauth/lib\"plain\"\r.so: cannot open shared "
                                     "object file: No such file or directory"},
        {ManyAssignments() + "provider =\n",
         "InvalidActiveDirectoryProviderException: The specified Active Directory provider "
         "'(unset)' is invalid"},
        {LongAssignment() + ManyAssignments() + "provider = absent",
         "IOError: Unable to open provider: /usr/libexec/tslauth/libabsent.so: cannot open shared "
         "object "
         "file: No such file or directory"},
    };
    for (auto const& bad : cases) {
        Host::Write(Paths::ProviderConfiguration, bad.text);
        EXPECT_EQ(bad.message, ConstructionFailure());
        EXPECT_EQ(bad.text, Host::Read(Paths::ProviderConfiguration));
    }
}

TEST_F(ActiveDirectoryStoreTest, DirectoryInThePlaceOfAFileIsAnIOError) {
    ASSERT_EQ(0, unlink(Paths::PAMPolicy));
    ASSERT_EQ(0, mkdir(Paths::PAMPolicy, 0755));
    EXPECT_THROW(Activate(), IOError);
    EXPECT_EQ("IOError: Cannot read '/etc/pam.d/system-auth-generic': it is not a regular file",
              ActivationFailure());
    ASSERT_EQ(0, rmdir(Paths::PAMPolicy));
}

TEST_F(ActiveDirectoryStoreTest, PipeOrDeviceInThePlaceOfAFileIsRefusedAndNotWaitedFor) {
    for (std::string const& path : Host::Files()) {
        for (mode_t const kind : {mode_t{S_IFIFO}, mode_t{S_IFCHR}}) {
            std::string const text = Host::Read(path);
            ASSERT_EQ(0, unlink(path.c_str()));
            ASSERT_EQ(0, mknod(path.c_str(), kind | 0644U, makedev(1, 5))); // zeros without an end
            EXPECT_EQ("IOError: Cannot read '" + path + "': it is not a regular file",
                      ActivationFailure());
            ASSERT_EQ(0, unlink(path.c_str()));
            Host::Write(path, text);
        }
    }
    ASSERT_EQ(0, unlink(Paths::ProviderConfiguration));
    ASSERT_EQ(0, mkfifo(Paths::ProviderConfiguration, 0644));
    EXPECT_EQ("InvalidActiveDirectoryProviderException: The specified Active Directory provider "
              "'(none installed)' is invalid",
              ConstructionFailure());
    ASSERT_EQ(0, unlink(Paths::ProviderConfiguration));
}

TEST_F(ActiveDirectoryStoreTest, FolderThatCannotBeWrittenLeavesThePolicyAsItWas) {
    std::string const folder = "/etc/pam.d";
    Mount(folder.c_str(), folder, nullptr, MS_BIND, nullptr);
    ASSERT_EQ(0,
              mount(nullptr, folder.c_str(), nullptr, MS_BIND | MS_REMOUNT | MS_RDONLY, nullptr));
    auto const before = Host::Snapshot();
    EXPECT_EQ("IOError: Unable to create temporary file to write '/etc/pam.d/system-auth-generic': "
              "Read-only file system",
              ActivationFailure());
    EXPECT_EQ(before, Host::Snapshot());
}

TEST_F(ActiveDirectoryStoreTest, FullDiskLeavesThePolicyAsItWas) {
    // Room for the policy of one page, and for the beginning of the next one alone.
    Mount("full", "/etc/pam.d", "tmpfs", 0, "size=8k");
    std::string policy = "auth required pam_unix.so";
    while (policy.size() < 4000) {
        policy += " argument";
    }
    policy += "\n";
    Host::Write(Paths::PAMPolicy, policy);
    Host::Write("/etc/pam.d/filler", std::string(4096, 'x'));
    auto const before = Host::Snapshot();
    EXPECT_THROW(Activate(), IOError);
    EXPECT_EQ("IOError: Cannot write '/etc/pam.d/system-auth-generic': No space left on device",
              ActivationFailure());
    EXPECT_EQ(before, Host::Snapshot());
}

TEST_F(ActiveDirectoryStoreTest, FileThatCannotBeMovedIntoPlaceLeavesTheOldOne) {
    Mount(Paths::NSSConfiguration, Paths::NSSConfiguration, nullptr, MS_BIND, nullptr);
    std::string const failure = ActivationFailure();
    EXPECT_EQ(0U, failure.find("IOError: Unable to rename '/etc/nsswitch.conf.")) << failure;
    EXPECT_NE(std::string::npos, failure.find("' to '/etc/nsswitch.conf': Device or resource busy"))
        << failure;
    EXPECT_EQ(Host::Switch, Host::Read(Paths::NSSConfiguration));
    EXPECT_EQ("remote-authentication-store = \"None\"\n",
              Host::Read(Paths::AuthenticationConfiguration));
}
