// SPDX-License-Identifier: Apache-2.0
#include "samba/DomainDiscovery.h"

#include "Failure.h"
#include "PlayedHost.h"
#include "host/StagingFolder.h"
#include "samba/SambaTools.h"

#include <gmock/gmock.h>
#include <string>
#include <vector>

/// As in a Turkish locale, where "I" and "i" are two letters: who compares names of a domain must
/// not ask the locale of the host process.
extern "C" int strcasecmp(char const* left, char const* right) noexcept {
    auto const lower = [](char c) {
        return c >= 'A' && c <= 'Z' && c != 'I' ? static_cast<char>(c - 'A' + 'a') : c;
    };
    while (*left != '\0' && lower(*left) == lower(*right)) {
        ++left;
        ++right;
    }
    return lower(*left) - lower(*right);
}

namespace tessel::winbind {
namespace {

using testing::HasSubstr;
using Fault = PlayedHost::Fault;

ActiveDirectoryClientErrorCode CodeOf(std::function<void()> const& operation) {
    try {
        operation();
        return TSLAUTH_PROVIDER_SUCCESS;
    } catch (Failure const& e) {
        return e.Code();
    }
}

class DomainDiscoveryTest : public testing::Test {
protected:
    ActiveDirectoryClientErrorCode CodeOfFinding(std::vector<std::string> const& preferred = {}) {
        return CodeOf([&] {
            found = DomainDiscovery::FindController(host, tools, "corp.example", preferred,
                                                    Clock::now() + std::chrono::minutes(1));
        });
    }

    PlayedHost host;
    StagingFolder staging{host.At(Paths::Staging)};
    SambaTools tools{host, staging};
    ControllerAnswer found;
};

TEST_F(DomainDiscoveryTest, KnowsTheNamesOfControllers) {
    ControllerAnswer answer;
    answer.computer = "DC1";
    std::vector<std::string> const others = {"dc1.corp.example", "dc2.corp.example",
                                             "a-longer-name-than-fits.corp.example"};
    for (char const* const name : {"DC1", "DC2", "A-LONGER-NAME-T"}) {
        EXPECT_TRUE(DomainDiscovery::IsNameOfController(name, answer, others)) << name;
    }
    for (char const* const name : {"DC", "DC11", "DC2.CORP", "A-LONGER-NAME-TH"}) {
        EXPECT_FALSE(DomainDiscovery::IsNameOfController(name, answer, others)) << name;
    }
    EXPECT_TRUE(DomainDiscovery::IsNameOfController("DC1", answer, {}));
}

TEST_F(DomainDiscoveryTest, KeepsAHostOffAControllersNameInATurkishLocaleAsWell) {
    ControllerAnswer answer;
    answer.computer = "INTERNAL";
    EXPECT_TRUE(DomainDiscovery::IsNameOfController("internal", answer, {}));
    answer.computer = "DC1";
    EXPECT_TRUE(DomainDiscovery::IsNameOfController("LONDON-I", answer, {"london-i.corp.example"}));
}

TEST_F(DomainDiscoveryTest, APreferredControllerIsAskedBeforeDNS) {
    EXPECT_EQ(0U, CodeOfFinding({"dc9.corp.example"}));
    EXPECT_THAT(host.State().log, HasSubstr("ads lookup -S dc9.corp.example"));
    EXPECT_THAT(host.State().log, testing::Not(HasSubstr("DNS")));
}

TEST_F(DomainDiscoveryTest, OneThatDoesNotAnswerIsPassedOver) {
    host.FailAt(1, Fault::TimedOut);
    EXPECT_EQ(0U, CodeOfFinding({"dc9.corp.example"}));
    EXPECT_EQ("dc1.corp.example", found.controller);
}

TEST_F(DomainDiscoveryTest, WhereNoneAnswersThatIsTold) {
    host.FailAt(2, Fault::TimedOut);
    EXPECT_EQ(TSLAUTH_PROVIDER_NO_LOGON_SERVERS, CodeOfFinding());
}

TEST_F(DomainDiscoveryTest, AControllerOfAnotherDomainIsNone) {
    auto const code = CodeOf([&] {
        (void)DomainDiscovery::FindController(host, tools, "other.example", {"dc1.corp.example"},
                                              Clock::now() + std::chrono::minutes(1));
    });
    EXPECT_EQ(TSLAUTH_PROVIDER_NO_SUCH_DOMAIN, code);
}

TEST_F(DomainDiscoveryTest, AHostWithTheNameOfAControllerIsRefusedAlsoWhenDNSIsSilent) {
    ControllerAnswer answer;
    answer.computer = "DC1";
    host.FailAt(1, Fault::TimedOut);
    EXPECT_EQ(TSLAUTH_PROVIDER_INVALID_COMPUTER_NAME,
              CodeOf([&] { DomainDiscovery::CheckHostName(host, "DC1", answer, "corp.example"); }));
    EXPECT_EQ(
        0U, CodeOf([&] { DomainDiscovery::CheckHostName(host, "NODE", answer, "corp.example"); }));
}

TEST_F(DomainDiscoveryTest, ClocksThatAreTooFarApartAreRefused) {
    auto const check = [&] {
        return CodeOf([&] {
            (void)DomainDiscovery::CheckClock(tools, "dc1", Clock::now() + std::chrono::minutes(1));
        });
    };
    EXPECT_EQ(0U, check());
    host.SetInfo(GoldenText("controller/info-two-hours-behind.txt"));
    EXPECT_EQ(TSLAUTH_PROVIDER_TIME_SKEW, check());
    host.SetInfo(GoldenText("controller/info-without-an-answer.txt"));
    EXPECT_EQ(0U, check());
}

} // namespace
} // namespace tessel::winbind
