// SPDX-License-Identifier: Apache-2.0
// The providers of this tree keep to the rules that others are held to.
#include "CheckedProvider.h"
#include "Node.h"

#include <gtest/gtest.h>

#include <filesystem>
#include <iterator>

namespace {

typedef std::set<std::string> Rules;

/// What only an Active Directory provider has, and one that is handed no secret.
Rules const notOfCAM = {"version", "metadata",      "nss-parameters", "unused",
                        "forked",  "released-once", "joins",          "released-own"};

/// Of rsa.pem.
constexpr char thumbprint[] = "D1:65:22:0C:77:C7:1D:60:A7:28:F0:8C:2B:C3:F8:91:CF:8C:32:03";

class ProviderCheckTest : public testing::Test {
protected:
    void SetUp() override {
        if (SANITIZED != 0) {
            GTEST_SKIP() << "a sanitizer's locks are not made for forks, and what a cancelled "
                            "thread loses it reports";
        }
        for (char const* const path : {"/etc/tslauth-example", "/var/lib/tslauth-example"}) {
            std::filesystem::remove_all(path);
        }
        std::filesystem::create_directories("/etc/tslauth-example/cam");
        std::ofstream("/etc/tslauth-example/accounts") << "joiner:the secret\n";
        std::ofstream("/etc/tslauth-example/passwords") << "alice:!\n";
    }

    /// With what the provider's own author says of it, and `more`.
    static CheckedProvider Checked(std::string const& provider, std::string const& more) {
        std::ifstream file(std::string(PROVIDERS) + "/" + provider + "/check.conf");
        std::string const own((std::istreambuf_iterator<char>(file)), {});
        return CheckedProvider(PROVIDER_CHECK, provider,
                               own + "host-may-change = \"yes\"\n" + more);
    }

    /// Everything was looked at and nothing found, but for `skipped`.
    static void ExpectPasses(CheckedProvider const& checked, Rules const& skipped) {
        EXPECT_EQ(0, checked.exitCode) << checked.tap;
        EXPECT_EQ(34U, checked.points) << checked.tap;
        EXPECT_EQ(skipped, checked.skipped) << checked.tap;
    }
};

} // namespace

TEST_F(ProviderCheckTest, TheExamplePassesAndJoinsItsDirectory) {
    TemporaryFolder const folder;
    std::ofstream(folder / "password") << "the secret\n";
    ExpectPasses(Checked("example", "domain = \"example.test\"\nuser = \"joiner\"\naccount = "
                                    "\"alice\"\npassword-file = \"" +
                                        folder / "password" + "\"\n"),
                 {"secrets"}); // it has no words of its own
}

TEST_F(ProviderCheckTest, TheExampleForCAMServersPassesWithAServer) {
    std::string const certificate = std::string(TESTS_DATA_DIR) + "/certificates/rsa.pem";
    std::filesystem::copy_file(certificate, "/etc/tslauth-example/cam/192.0.2.1.pem");
    Rules skipped = notOfCAM;
    skipped.insert("secrets");
    ExpectPasses(Checked("example-cam", "server = \"192.0.2.1\"\nthumbprint = \"" +
                                            std::string(thumbprint) + "\"\n"),
                 skipped);
}

TEST_F(ProviderCheckTest, TheProviderForWinbindPassesOnAHostWithoutADomain) {
    ExpectPasses(Checked("winbind", ""), {"joins"});
}

TEST_F(ProviderCheckTest, TheCAMProviderForWinbindPassesOnAHostWithoutAServer) {
    ExpectPasses(Checked("winbind-cam", ""), notOfCAM);
}
