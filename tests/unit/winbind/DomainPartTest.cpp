// SPDX-License-Identifier: Apache-2.0
#include "join/DomainPart.h"

#include "Failure.h"
#include "PlayedHost.h"
#include "host/Membership.h"
#include "join/DomainJoin.h"
#include "tslauth_winbind_provider.h"

#include <gmock/gmock.h>
#include <string>

namespace tessel::winbind {
namespace {

using testing::HasSubstr;
using Fault = PlayedHost::Fault;
using Code = ActiveDirectoryClientErrorCode;

ActiveDirectoryClientCredentials const joiner = {"joiner", "secret"};

Code Part(PlayedHost const& host, ActiveDirectoryClientCredentials const* credentials,
          std::string* text = nullptr) {
    try {
        PartFromDomain(host, credentials);
        return TSLAUTH_PROVIDER_SUCCESS;
    } catch (Failure const& e) {
        if (text) {
            *text = e.what();
        }
        return e.Code();
    }
}

void Join(PlayedHost& host) {
    host.Write(Paths::Samba, "[global]\n");
    DomainJoin::WithCredentials(host, "corp.example", "", joiner);
    host.FailNowhere();
}

void ExpectLocal(PlayedHost const& host) {
    EXPECT_FALSE(Membership::Read(host));
    EXPECT_EQ("[global]\n", host.Read(Paths::Samba));
    EXPECT_FALSE(host.State().daemonRuns);
    for (char const* const path :
         {Paths::OwnSamba, Paths::OwnKerberos, Paths::Kerberos, Paths::OpenChange,
          "/var/lib/samba/private/secrets.tdb", "/var/lib/samba/private/tslauth-before-join.tdb"}) {
        EXPECT_FALSE(std::filesystem::exists(host.At(path))) << path;
    }
}

TEST(DomainPartTest, AHostThatIsNotJoinedCannotBeParted) {
    PlayedHost host;
    auto const before = host.Tree();
    EXPECT_EQ(TSLAUTH_PROVIDER_NO_SUCH_DOMAIN, Part(host, nullptr));
    EXPECT_EQ(before, host.Tree());
}

TEST(DomainPartTest, AnAccountThatIsGoneIsNoReasonToStay) {
    PlayedHost host;
    Join(host);
    host.State().hasAccount = false;
    EXPECT_EQ(0U, Part(host, &joiner));
    ExpectLocal(host);
}

TEST(DomainPartTest, WhateverTheDirectorySaysAHostWithoutCredentialsIsLocalAfterwards) {
    for (std::size_t call = 2; call <= 4; ++call) {
        PlayedHost host;
        Join(host);
        host.FailAt(call, Fault::Refused);
        EXPECT_EQ(0U, Part(host, nullptr)) << host.State().log;
        ExpectLocal(host);
    }
}

TEST(DomainPartTest, WhateverToolFailsAPartIsDoneOrNotOrSaysSo) {
    std::size_t failed = 0;
    for (Fault const fault : {Fault::Refused, Fault::TimedOut, Fault::Killed}) {
        for (std::size_t call = 1;; ++call) {
            PlayedHost host;
            Join(host);
            auto const before = host.Tree();
            host.FailAt(call, fault);
            std::string text;
            Code const code = Part(host, &joiner, &text);
            if (host.State().calls < call) {
                break;
            }
            ++failed;
            SCOPED_TRACE("fault at " + std::to_string(call) + ", code " + std::to_string(code) +
                         ", " + text + '\n' + host.State().log);
            if (code == TSLAUTH_PROVIDER_SUCCESS) {
                ExpectLocal(host);
            } else if (code != TSLAUTH_WINBIND_HOST_CHANGED) {
                EXPECT_EQ(before, host.Tree());
            } else {
                // A further part goes on with it, and so does a join.
                host.FailNowhere();
                EXPECT_EQ(TSLAUTH_PROVIDER_NO_SUCH_DOMAIN, Part(host, &joiner));
                ExpectLocal(host);
            }
        }
    }
    EXPECT_GT(failed, 15U);
}

} // namespace
} // namespace tessel::winbind
