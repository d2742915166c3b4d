// SPDX-License-Identifier: Apache-2.0
#include "Host.h"

#include <tslauth/ActiveDirectoryStore.h>
#include <tslauth/Exceptions.h>
#include <tslauth/NoRemoteAuthenticationStore.h>

#include <stdexcept>

using namespace tessel::authentication;

TSLAUTH_AUTO_PTR_BEGIN

namespace {

/// A caller's own store, which cannot tell its name.
class NamelessStore : public RemoteAuthenticationStore {
public:
    std::auto_ptr<StoreConfiguration> GetStoreConfiguration() const override {
        return std::auto_ptr<StoreConfiguration>();
    }
    std::string GetDisplayName() const override {
        throw std::runtime_error("no name");
    }
    void MakeActive() override {}
    void MakeInactive() override {}
};

} // namespace

TSLAUTH_AUTO_PTR_END

class RemoteAuthenticationStoreTest : public Host::Test {};

TEST_F(RemoteAuthenticationStoreTest, TheRecordedStoreAloneIsActive) {
    NoRemoteAuthenticationStore const none;
    ActiveDirectoryStore const activeDirectory(60);
    EXPECT_TRUE(none.IsActive());
    EXPECT_FALSE(activeDirectory.IsActive());

    Host::Write(Paths::AuthenticationConfiguration,
                "remote-authentication-store = \"Active Directory\"\n");
    EXPECT_FALSE(none.IsActive());
    EXPECT_TRUE(activeDirectory.IsActive());
}

TEST_F(RemoteAuthenticationStoreTest, NamesAreComparedByteForByte) {
    NoRemoteAuthenticationStore const none;
    for (char const* name : {"none", "NONE", "None ", " None", "Non", "Nonee", ""}) {
        Host::Write(Paths::AuthenticationConfiguration,
                    std::string("remote-authentication-store = \"") + name + "\"\n");
        EXPECT_FALSE(none.IsActive()) << "'" << name << "'";
    }
}

TEST_F(RemoteAuthenticationStoreTest, MissingFileIsAnIOError) {
    ASSERT_EQ(0, unlink(Paths::AuthenticationConfiguration));
    NoRemoteAuthenticationStore const none;
    EXPECT_THROW(none.IsActive(), IOError);
    EXPECT_EQ("IOError: Unable to open '/etc/tessel/tslauth/authentication.conf': No such file or "
              "directory",
              Host::FailureOf([&] { none.IsActive(); }));
}

TEST_F(RemoteAuthenticationStoreTest, MalformedLineIsAConfigurationError) {
    Host::Write(Paths::AuthenticationConfiguration, "\n\n# none\n");
    NoRemoteAuthenticationStore const none;
    EXPECT_THROW(none.IsActive(), ConfigurationError);
    EXPECT_EQ("ConfigurationError: Error parsing configuration on line 3: no delimiter found",
              Host::FailureOf([&] { none.IsActive(); }));
}

TEST_F(RemoteAuthenticationStoreTest, FileIsReadThenTheNameTakenThenTheKeyLookedUp) {
    NamelessStore const nameless;
    Host::Write(Paths::AuthenticationConfiguration, "other = \"None\"\n");
    EXPECT_EQ("runtime_error: no name", Host::FailureOf([&] { nameless.IsActive(); }));
    ASSERT_EQ(0, unlink(Paths::AuthenticationConfiguration));
    EXPECT_THROW(nameless.IsActive(), IOError);
}

TEST_F(RemoteAuthenticationStoreTest, MissingKeyIsNotAnsweredWithFalse) {
    Host::Write(Paths::AuthenticationConfiguration, "other = \"None\"\n");
    NoRemoteAuthenticationStore const none;
    EXPECT_THROW(none.IsActive(), InvalidKeyException);
    EXPECT_EQ("InvalidKeyException: The specified key 'remote-authentication-store' was not found "
              "in this configuration",
              Host::FailureOf([&] { none.IsActive(); }));
}
