// SPDX-License-Identifier: Apache-2.0
#include "../../faults/Faults.h"
#include "Failure.h"
#include "PlayedHost.h"
#include "host/Membership.h"
#include "join/DomainJoin.h"
#include "join/DomainPart.h"
#include "tslauth_winbind_provider.h"

#include <cerrno>
#include <gmock/gmock.h>
#include <memory>
#include <string>

namespace tessel::winbind {
namespace {

using testing::HasSubstr;

constexpr char administrators[] = "[global]\n\tlog level = 1\n";
constexpr char othersSecrets[] = "others' secrets";
constexpr char secretsPath[] = "/var/lib/samba/private/secrets.tdb";
ActiveDirectoryClientCredentials const joiner = {"joiner", "secret"};
ActiveDirectoryClientCredentials const stranger = {"joiner", "wrong"};

/// The code of a failure, at the head of what it says: for what a child process tells its parent.
void Tell(std::function<void()> const& operation) {
    try {
        operation();
    } catch (Failure const& e) {
        throw std::runtime_error(std::to_string(e.Code()) + ": " + e.what());
    } catch (std::exception const& e) {
        throw std::runtime_error(std::to_string(TSLAUTH_PROVIDER_INTERNAL_ERROR) + ": " + e.what());
    }
}

void Join(PlayedHost const& host, ActiveDirectoryClientCredentials const& who = joiner) {
    DomainJoin::WithCredentials(host, "corp.example", "", who);
}

void Part(PlayedHost const& host) {
    PartFromDomain(host, &joiner);
}

/// A join or a part of a host, with each of its system calls that touch a file failing once, or
/// being the last.
class DomainJoinFaultTest : public testing::Test {
protected:
    typedef std::map<std::string, std::string> Tree;

    void SetUp() override {
        if (!faults::Available()) {
            GTEST_SKIP() << "this kernel has no seccomp notifications";
        }
    }

    /// A host that is not joined, as an administrator has it.
    void Reset() {
        _host = std::make_unique<PlayedHost>();
        _host->Write(Paths::Samba, administrators);
        _host->Write(secretsPath, othersSecrets);
        _host->Write(Paths::State, "keytab = \"yes\"\n");
        _host->Write(Paths::Keytab, "others' keys, ");
        _before = _host->Tree();
    }

    void ResetJoined() {
        Reset();
        Join(*_host);
        _joined = _host->Tree();
    }

    static ActiveDirectoryClientErrorCode CodeIn(faults::Outcome const& outcome) {
        return outcome.message.empty()
                   ? ActiveDirectoryClientErrorCode{TSLAUTH_PROVIDER_SUCCESS}
                   : static_cast<ActiveDirectoryClientErrorCode>(std::stoul(outcome.message));
    }

    void ExpectTree(Tree tree, Tree const& expected) {
        // Numbers of users and sockets, which a part leaves.
        tree.erase("/var/lib/samba/winbindd_idmap.tdb");
        tree.erase("/run/samba");
        // A lock that somebody died with is nobody's.
        tree.erase(Paths::Lock);
        EXPECT_EQ(expected, tree);
    }

    std::unique_ptr<PlayedHost> _host;
    Tree _before;
    Tree _joined;
};

TEST_F(DomainJoinFaultTest, WhateverWriteOfAJoinFailsTheHostIsAsItWasOrTheCodeSaysThatItIsNot) {
    for (int const error : {EIO, ENOSPC}) {
        std::size_t const calls = faults::Walk(
            faults::FailsWith(error), [&] { Reset(); }, [&] { Tell([&] { Join(*_host); }); },
            [&](std::size_t place, faults::Outcome const& outcome) {
                auto const code = CodeIn(outcome);
                SCOPED_TRACE(outcome.calls.back() + " at " + std::to_string(place) + ": " +
                             outcome.message + '\n' + _host->State().log);
                ASSERT_TRUE(outcome.finished);
                if (code == TSLAUTH_PROVIDER_SUCCESS) {
                    EXPECT_TRUE(Membership::Read(*_host));
                    EXPECT_TRUE(_host->State().hasAccount);
                    return;
                }
                if (code != TSLAUTH_WINBIND_HOST_CHANGED) {
                    auto tree = _host->Tree();
                    // What a failed removal leaves below /run holds nothing, and the next one
                    // removes it.
                    for (auto entry = tree.begin(); entry != tree.end();) {
                        entry = entry->first.find("/run/tslauth") == 0 ? tree.erase(entry)
                                                                       : std::next(entry);
                    }
                    EXPECT_EQ(_before, tree);
                }
                if (code != TSLAUTH_WINBIND_HOST_CHANGED && code != TSLAUTH_WINBIND_ACCOUNT_LEFT) {
                    EXPECT_FALSE(_host->State().hasAccount);
                }
            });
        EXPECT_GT(calls, 150U);
    }
}

TEST_F(DomainJoinFaultTest, AJoinThatIsKilledIsTakenBackByTheNextOrIsAMembershipThatCanBeParted) {
    std::size_t memberships = 0;
    std::size_t const calls = faults::Walk(
        faults::Killed(), [&] { Reset(); }, [&] { Join(*_host); },
        [&](std::size_t place, faults::Outcome const& outcome) {
            SCOPED_TRACE(outcome.calls.back() + " at " + std::to_string(place));
            EXPECT_THROW(Join(*_host, stranger), Failure);
            if (!Membership::Read(*_host)) {
                ExpectTree(_host->Tree(), _before);
                EXPECT_FALSE(_host->State().daemonRuns);
                return;
            }
            ++memberships;
            Part(*_host);
            ExpectTree(_host->Tree(), _before);
        });
    EXPECT_GT(calls, 150U);
    EXPECT_GT(memberships, 0U);
}

TEST_F(DomainJoinFaultTest,
       WhateverWriteOfAPartFailsTheHostIsJoinedOrLocalOrTheCodeSaysThatItIsNeither) {
    std::size_t const calls = faults::Walk(
        faults::FailsWith(EIO), [&] { ResetJoined(); }, [&] { Tell([&] { Part(*_host); }); },
        [&](std::size_t place, faults::Outcome const& outcome) {
            SCOPED_TRACE(outcome.calls.back() + " at " + std::to_string(place) + ": " +
                         outcome.message + '\n' + _host->State().log);
            ASSERT_TRUE(outcome.finished);
            auto const code = CodeIn(outcome);
            if (code != TSLAUTH_PROVIDER_SUCCESS && code != TSLAUTH_WINBIND_HOST_CHANGED) {
                EXPECT_TRUE(Membership::Read(*_host));
                EXPECT_TRUE(_host->State().hasAccount);
                EXPECT_TRUE(_host->State().daemonRuns);
            }
            try {
                Part(*_host);
            } catch (Failure const& e) {
                EXPECT_EQ(TSLAUTH_PROVIDER_NO_SUCH_DOMAIN, e.Code());
            }
            ExpectTree(_host->Tree(), _before);
        });
    EXPECT_GT(calls, 100U);
}

TEST_F(DomainJoinFaultTest, APartThatIsKilledIsFinishedByTheNext) {
    std::size_t const calls = faults::Walk(
        faults::Killed(), [&] { ResetJoined(); }, [&] { Part(*_host); },
        [&](std::size_t place, faults::Outcome const& outcome) {
            SCOPED_TRACE(outcome.calls.back() + " at " + std::to_string(place));
            try {
                Part(*_host);
            } catch (Failure const& e) {
                EXPECT_EQ(TSLAUTH_PROVIDER_NO_SUCH_DOMAIN, e.Code());
            }
            ExpectTree(_host->Tree(), _before);
        });
    EXPECT_GT(calls, 100U);
}

} // namespace
} // namespace tessel::winbind
