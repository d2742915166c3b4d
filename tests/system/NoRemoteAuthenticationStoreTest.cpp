// SPDX-License-Identifier: Apache-2.0
#include "Host.h"

#include <tslauth/AuthenticationStoreFactory.h>
#include <tslauth/Exceptions.h>
#include <tslauth/NoRemoteAuthenticationStore.h>

#include <stdexcept>

TSLAUTH_AUTO_PTR_BEGIN

using namespace tessel::authentication;

namespace {

/// A store that counts its objects and their withdrawals, and can fail to withdraw.
class CountedStore : public RemoteAuthenticationStore {
public:
    static int living;
    static int made;
    static int withdrawn;
    static bool fails;

    CountedStore() {
        ++living;
        ++made;
    }
    ~CountedStore() override {
        --living;
    }
    std::auto_ptr<StoreConfiguration> GetStoreConfiguration() const override {
        return std::auto_ptr<StoreConfiguration>();
    }
    std::string GetDisplayName() const override {
        return "Counted";
    }
    void MakeActive() override {}
    void MakeInactive() override {
        ++withdrawn;
        if (fails) {
            throw LogonFailureException(1326, "withdrawal failed");
        }
    }

    static std::auto_ptr<AuthenticationStore> Create() {
        return std::auto_ptr<AuthenticationStore>(new CountedStore);
    }
};

int CountedStore::living = 0;
int CountedStore::made = 0;
int CountedStore::withdrawn = 0;
bool CountedStore::fails = false;

/// A store that is no remote one.
class LocalStore : public AuthenticationStore {
public:
    static int living;

    LocalStore() {
        ++living;
    }
    ~LocalStore() override {
        --living;
    }
    std::auto_ptr<StoreConfiguration> GetStoreConfiguration() const override {
        return std::auto_ptr<StoreConfiguration>();
    }
    std::string GetDisplayName() const override {
        return "Local";
    }
    bool IsActive() const override {
        return false;
    }
    void MakeActive() override {}

    static std::auto_ptr<AuthenticationStore> Create() {
        return std::auto_ptr<AuthenticationStore>(new LocalStore);
    }
};

int LocalStore::living = 0;

/// A host's own kind of "None".
class RenamedNone : public NoRemoteAuthenticationStore {
public:
    std::string GetDisplayName() const override {
        return "Renamed";
    }
};

constexpr char None[] = "remote-authentication-store = \"None\"\n";

void Record(std::string const& name) {
    Host::Write(Paths::AuthenticationConfiguration,
                "remote-authentication-store = \"" + name + "\"\n");
}

std::string Recorded() {
    return Host::Read(Paths::AuthenticationConfiguration);
}

} // namespace

class NoRemoteAuthenticationStoreTest : public Host::Test {
protected:
    void SetUp() override {
        Host::Test::SetUp();
        _factory.RegisterType("Counted", &CountedStore::Create);
        _factory.RegisterType("Local", &LocalStore::Create);
        CountedStore::made = CountedStore::withdrawn = 0;
        CountedStore::fails = false;
    }

    AuthenticationStoreFactory _factory;
    NoRemoteAuthenticationStore _none;
};

TEST_F(NoRemoteAuthenticationStoreTest, RecordsNoneUnderWhateverNameItIsKnown) {
    RenamedNone renamed;
    Record("Counted");
    renamed.MakeActive();
    EXPECT_EQ(None, Recorded());
    EXPECT_EQ(1, CountedStore::withdrawn);
    Record("Renamed");
    renamed.MakeActive();
    EXPECT_EQ("remote-authentication-store = \"Renamed\"\n", Recorded()) << "it is active already";
}

TEST_F(NoRemoteAuthenticationStoreTest, IsNamedNone) {
    EXPECT_EQ("None", _none.GetDisplayName());
}

TEST_F(NoRemoteAuthenticationStoreTest, ConfigurationIsOfItsOwnClass) {
    std::auto_ptr<StoreConfiguration> const configuration = _none.GetStoreConfiguration();
    ASSERT_TRUE(configuration.get());
    StoreConfiguration const& configured = *configuration;
    EXPECT_EQ(typeid(NoRemoteAuthenticationStoreConfiguration), typeid(configured));
}

TEST_F(NoRemoteAuthenticationStoreTest, ActivatingItAgainTouchesNothing) {
    Host::Write(Paths::AuthenticationConfiguration, " remote-authentication-store='None'");
    auto const before = Host::Snapshot();
    auto const status = Host::Status(Paths::AuthenticationConfiguration);
    _none.MakeActive();
    EXPECT_EQ(before, Host::Snapshot());
    EXPECT_EQ(status.st_ino, Host::Status(Paths::AuthenticationConfiguration).st_ino);
    EXPECT_EQ(status.st_mtim.tv_nsec,
              Host::Status(Paths::AuthenticationConfiguration).st_mtim.tv_nsec);
    EXPECT_EQ(0, CountedStore::made);
}

TEST_F(NoRemoteAuthenticationStoreTest, WithdrawsTheRecordedStoreAfterRecordingNone) {
    Record("Counted");
    _none.MakeActive();
    EXPECT_EQ(None, Recorded());
    EXPECT_EQ(1, CountedStore::made);
    EXPECT_EQ(1, CountedStore::withdrawn);
    EXPECT_EQ(0, CountedStore::living);
    EXPECT_TRUE(_none.IsActive());
}

TEST_F(NoRemoteAuthenticationStoreTest, KeepsOtherKeysInByteOrder) {
    Host::Write(Paths::AuthenticationConfiguration,
                "z=1\nremote-authentication-store = \"Counted\"\nB=2\na='3'\n");
    _none.MakeActive();
    EXPECT_EQ("B = \"2\"\na = \"3\"\nremote-authentication-store = \"None\"\nz = \"1\"\n",
              Recorded());
}

TEST_F(NoRemoteAuthenticationStoreTest, WithdrawsActiveDirectory) {
    auto const before = Host::Read(Paths::PAMPolicy);
    _factory.CreateInstance("Active Directory")->MakeActive();
    EXPECT_NE(std::string::npos, Host::Read(Paths::PAMPolicy).find("pam_plain.so"));
    _none.MakeActive();
    EXPECT_EQ(None, Recorded());
    EXPECT_EQ(std::string::npos, Host::Read(Paths::PAMPolicy).find("pam_plain.so"));
    EXPECT_EQ(std::string::npos, Host::Read(Paths::NSSConfiguration).find("plain"));
}

TEST_F(NoRemoteAuthenticationStoreTest, UnknownStoreIsReportedOnceAndNoneStaysRecorded) {
    Record("Example Store");
    EXPECT_THROW(_none.MakeActive(), UnknownRemoteAuthenticationStoreException);
    EXPECT_EQ(None, Recorded());
    EXPECT_NO_THROW(_none.MakeActive());

    Record("Example Store");
    EXPECT_EQ(
        "UnknownRemoteAuthenticationStoreException: The specified store 'Example Store' is unknown",
        Host::FailureOf([&] { _none.MakeActive(); }));
}

TEST_F(NoRemoteAuthenticationStoreTest, EmptyNameIsUnknown) {
    Record("");
    EXPECT_EQ("UnknownRemoteAuthenticationStoreException: The specified store '' is unknown",
              Host::FailureOf([&] { _none.MakeActive(); }));
    EXPECT_EQ(None, Recorded());
}

TEST_F(NoRemoteAuthenticationStoreTest, StoreThatIsNotRemoteIsInvalid) {
    Record("Local");
    EXPECT_THROW(_none.MakeActive(), InvalidRemoteAuthenticationStoreException);
    EXPECT_EQ(None, Recorded());
    EXPECT_EQ(0, LocalStore::living);
    Record("Local");
    EXPECT_EQ("InvalidRemoteAuthenticationStoreException: The specified store 'Local' is invalid",
              Host::FailureOf([&] { _none.MakeActive(); }));
}

TEST_F(NoRemoteAuthenticationStoreTest, FailedWithdrawalLeavesNoneRecordedAndNoStoreBehind) {
    Record("Counted");
    CountedStore::fails = true;
    EXPECT_THROW(_none.MakeActive(), LogonFailureException);
    EXPECT_EQ(None, Recorded());
    EXPECT_EQ(0, CountedStore::living);
    EXPECT_NO_THROW(_none.MakeActive());
    EXPECT_EQ(1, CountedStore::withdrawn);
}

TEST_F(NoRemoteAuthenticationStoreTest, RecordedStoreThatCannotBeMadePassesItsFailureOn) {
    Record("Active Directory");
    ASSERT_EQ(0, unlink(Paths::ProviderConfiguration));
    EXPECT_THROW(_none.MakeActive(), InvalidActiveDirectoryProviderException);
    EXPECT_EQ(None, Recorded());
}

TEST_F(NoRemoteAuthenticationStoreTest, MissingConfigurationIsAnIOError) {
    ASSERT_EQ(0, unlink(Paths::AuthenticationConfiguration));
    EXPECT_THROW(_none.MakeActive(), IOError);
    EXPECT_NE(0, access(Paths::AuthenticationConfiguration, F_OK));
}

TEST_F(NoRemoteAuthenticationStoreTest, MissingKeyChangesNothing) {
    Host::Write(Paths::AuthenticationConfiguration, "a = \"b\"\n");
    EXPECT_EQ("InvalidKeyException: The specified key 'remote-authentication-store' was not found "
              "in this configuration",
              Host::FailureOf([&] { _none.MakeActive(); }));
    EXPECT_EQ("a = \"b\"\n", Recorded());
}

TEST_F(NoRemoteAuthenticationStoreTest, FileThatCannotBeWrittenStaysAsItWas) {
    Record("Counted");
    std::string const folder = "/etc/tessel/tslauth";
    Mount(folder.c_str(), folder, nullptr, MS_BIND, nullptr);
    ASSERT_EQ(0,
              mount(nullptr, folder.c_str(), nullptr, MS_BIND | MS_REMOUNT | MS_RDONLY, nullptr));
    EXPECT_THROW(_none.MakeActive(), IOError);
    EXPECT_EQ("remote-authentication-store = \"Counted\"\n", Recorded());
    EXPECT_EQ(0, CountedStore::made);
}

TEST_F(NoRemoteAuthenticationStoreTest, CannotBeWithdrawn) {
    EXPECT_THROW(_none.MakeInactive(), std::runtime_error);
    EXPECT_EQ("runtime_error: Attempted to disable None Store",
              Host::FailureOf([&] { _none.MakeInactive(); }));
    try {
        _none.MakeInactive();
    } catch (Exception const&) {
        FAIL() << "is no failure of the library's family";
    } catch (std::exception const&) {
    }
}

TEST(NoRemoteAuthenticationStoreWithoutFactory, FindsTheRecordedStoreAllTheSame) {
    ASSERT_EQ(nullptr, AuthenticationStoreFactory::Instance());
    Record("Example Store");
    NoRemoteAuthenticationStore none;
    EXPECT_THROW(none.MakeActive(), UnknownRemoteAuthenticationStoreException);
    EXPECT_EQ(None, Recorded());
    EXPECT_EQ(nullptr, AuthenticationStoreFactory::Instance());
}

TSLAUTH_AUTO_PTR_END
