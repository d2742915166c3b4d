// SPDX-License-Identifier: Apache-2.0
#include "text/ProviderOptions.h"
#include "Failure.h"

#include <gtest/gtest.h>

using namespace tessel::winbind;

namespace {

std::string Refusal(std::string const& key, std::string const& value) {
    try {
        (void)OptionsIn({{key, value}});
    } catch (Failure const& failure) {
        EXPECT_EQ(ActiveDirectoryClientErrorCode{TSLAUTH_PROVIDER_INVALID_PARAMETER},
                  failure.Code());
        return failure.what();
    }
    return {};
}

} // namespace

TEST(ProviderOptionsTest, WithoutAFileEverythingIsAsPeersHaveIt) {
    ProviderOptions const options = OptionsIn({});
    EXPECT_EQ("", options.computerName);
    EXPECT_FALSE(options.shortNames);
    EXPECT_EQ("/bin/bash", options.loginShell);
    EXPECT_EQ("/home/%D/%U", options.homeFolder);
    EXPECT_FALSE(options.offlineLogIn);
    EXPECT_FALSE(options.keytab);
    EXPECT_FALSE(options.registerInDNS);
}

TEST(ProviderOptionsTest, EveryOptionIsTaken) {
    ProviderOptions const options = OptionsIn({{"computer-name", "node17"},
                                               {"short-names", "yes"},
                                               {"login-shell", "/bin/sh"},
                                               {"home-folder", "/srv/%U"},
                                               {"offline-log-in", "yes"},
                                               {"keytab", "yes"},
                                               {"register-in-dns", "yes"},
                                               {"preferred-domain-controllers", "dc1"}});
    EXPECT_EQ("node17", options.computerName);
    EXPECT_TRUE(options.shortNames);
    EXPECT_EQ("/bin/sh", options.loginShell);
    EXPECT_EQ("/srv/%U", options.homeFolder);
    EXPECT_TRUE(options.offlineLogIn);
    EXPECT_TRUE(options.keytab);
    EXPECT_TRUE(options.registerInDNS);
}

TEST(ProviderOptionsTest, AValueThatIsNoneIsRefusedByName) {
    for (char const* const key : {"short-names", "offline-log-in", "keytab", "register-in-dns"}) {
        for (char const* const value : {"", "YES", "true", "1", "yes "}) {
            EXPECT_EQ(std::string("the option '") + key + "' is '" + value +
                          "' and must be 'yes' or 'no'",
                      Refusal(key, value));
        }
    }
    for (char const* const key : {"login-shell", "home-folder"}) {
        for (char const* const value : {"", "bash", "/bin/\nbash"}) {
            EXPECT_EQ(std::string("the option '") + key + "' is '" + value +
                          "' and must be a path that begins with '/'",
                      Refusal(key, value));
        }
    }
}
