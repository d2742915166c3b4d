// SPDX-License-Identifier: Apache-2.0
#include <tslauth/Configuration.h>

#include "../faults/FaultTest.h"

#include <algorithm>
#include <csignal>
#include <gmock/gmock.h>
#include <sys/resource.h>

namespace tessel::authentication {
namespace {

class ConfigurationFaultTest : public FaultTest {
protected:
    ConfigurationFaultTest() : FaultTest("test.conf", "c=3\nb=2\na=1\n") {}

    void ExpectUnwritten(faults::Outcome const& outcome, std::string const& reason) {
        EXPECT_EQ("tessel::authentication::IOError", outcome.exception);
        EXPECT_EQ("Cannot write '" + target + "': " + reason, outcome.message);
        EXPECT_EQ(oldText, Contents(target));
        EXPECT_EQ(0644U, ModeOf(target));
    }

    std::string newText = "a = \"1\"\nb = \"changed\"\nc = \"3\"\n";
    std::function<void()> write = [this] {
        Configuration configuration(target);
        configuration["b"] = "changed";
        configuration.Write();
    };
};

TEST_F(ConfigurationFaultTest, ReadingAndWritingMakesExactlyTheseCalls) {
    faults::Outcome const outcome = faults::RunWithFaultAt(0, faults::Killed(), write);
    EXPECT_TRUE(outcome.finished);
    EXPECT_EQ("", outcome.message);
    EXPECT_THAT(outcome.calls,
                testing::ElementsAre("open", "stat", "read", "read", "close", // the reading
                                     "open", "close", "open",                 // the temporary file
                                     "write", "write", "write",               // a line each
                                     "stat", "chmod", "fsync", "close", // what makes it durable
                                     "stat", "rename", "chmod", "open", "fsync", "close"));
    EXPECT_EQ(newText, Contents(target));
}

TEST_F(ConfigurationFaultTest, ALineOfAnyLengthIsOneWrite) {
    faults::Outcome const outcome = faults::RunWithFaultAt(0, faults::Killed(), [&] {
        Configuration configuration(target);
        configuration.clear();
        for (std::size_t const size : {1U, 1000U, 1023U, 1024U, 8190U, 8191U, 8192U, 1000000U}) {
            configuration.emplace(std::to_string(size), std::string(size, 'v'));
        }
        configuration.Write();
    });
    EXPECT_EQ(8, std::count(outcome.calls.begin(), outcome.calls.end(), "write"));
    EXPECT_EQ(8U, Configuration(target).size());
}

TEST_F(ConfigurationFaultTest, WhicheverCallFailsTheFileIsWholeAndTheCallerKnows) {
    for (int const error : {EIO, ENOSPC, EACCES}) {
        std::size_t const calls = faults::Walk(
            faults::FailsWith(error), [this] { Reset(); }, write,
            [&](std::size_t place, faults::Outcome const& outcome) {
                SCOPED_TRACE("call " + std::to_string(place) + ", " + outcome.calls[place - 1]);
                EXPECT_TRUE(outcome.finished);
                if (outcome.exception == "" ||
                    outcome.exception == "tessel::authentication::FilePermissionError") {
                    EXPECT_EQ(newText, Contents(target));
                } else {
                    EXPECT_EQ(oldText, Contents(target));
                    // A read error gives an empty configuration, whose keys are not found.
                    EXPECT_THAT(outcome.exception,
                                testing::AnyOf("tessel::authentication::IOError",
                                               "tessel::authentication::InvalidKeyException"));
                }
            });
        EXPECT_EQ(21U, calls);
    }
}

TEST_F(ConfigurationFaultTest, WhereverTheProcessIsKilledTheFileIsWhole) {
    std::size_t const calls = faults::Walk(
        faults::Killed(), [this] { Reset(); }, write,
        [&](std::size_t place, faults::Outcome const& outcome) {
            SCOPED_TRACE("call " + std::to_string(place) + ", " + outcome.calls[place - 1]);
            EXPECT_FALSE(outcome.finished);
            std::size_t const rename = 17;
            EXPECT_EQ(place <= rename ? oldText : newText, Contents(target));
            EXPECT_EQ(0644U, ModeOf(target));
        });
    EXPECT_EQ(21U, calls);
}

TEST_F(ConfigurationFaultTest, AnOpenThatFailsIsReportedWithItsReason) {
    faults::Outcome const outcome =
        faults::RunWithFaultAt(1, faults::FailsWith(EMFILE), [&] { Configuration{target}; });
    EXPECT_EQ("tessel::authentication::IOError", outcome.exception);
    EXPECT_EQ("Unable to open '" + target + "': Too many open files", outcome.message);
}

TEST_F(ConfigurationFaultTest, AReadErrorEndsTheReadingQuietly) {
    faults::Outcome const outcome = faults::RunWithFaultIn("read", faults::FailsWith(EIO), [&] {
        throw std::runtime_error(std::to_string(Configuration(target).size()));
    });
    EXPECT_TRUE(outcome.injected);
    EXPECT_EQ("0", outcome.message);
    EXPECT_EQ(oldText, Contents(target));
}

TEST_F(ConfigurationFaultTest, WhatWasReadBeforeAReadErrorIsKept) {
    faults::Outcome const outcome = faults::RunWithFaultIn(
        "read", faults::FailsWith(EIO),
        [&] { throw std::runtime_error(std::to_string(Configuration(target).size())); }, 2);
    EXPECT_TRUE(outcome.injected);
    EXPECT_EQ("3", outcome.message);
}

TEST_F(ConfigurationFaultTest, WhoWritesTheFileBackIsToldOfAReadError) {
    for (std::size_t const call : {1U, 2U}) {
        faults::Outcome const outcome = faults::RunWithFaultIn(
            "read", faults::FailsWith(EIO), [&] { Configuration(target, OnReadError::Throw); },
            call, 1);
        EXPECT_TRUE(outcome.injected);
        EXPECT_EQ("tessel::authentication::IOError", outcome.exception);
        EXPECT_EQ("Cannot read '" + target + "': Input/output error", outcome.message);
    }
}

TEST_F(ConfigurationFaultTest, AnInterruptedReadIsRepeated) {
    faults::Outcome const outcome = faults::RunWithFaultIn(
        "read", faults::FailsWith(EINTR),
        [&] { throw std::runtime_error(std::to_string(Configuration(target).size())); }, 1, 2);
    EXPECT_TRUE(outcome.injected);
    EXPECT_EQ("3", outcome.message);
}

TEST_F(ConfigurationFaultTest, AFullDiskAtAnyLineLeavesTheFileAsItWas) {
    for (std::size_t const line : {1U, 2U, 3U}) {
        ExpectUnwritten(faults::RunWithFaultIn("write", faults::FailsWith(ENOSPC), write, line, 1),
                        "No space left on device");
        Reset();
    }
}

TEST_F(ConfigurationFaultTest, AfterAFailedLineNoOtherLineIsWritten) {
    faults::Outcome const outcome =
        faults::RunWithFaultIn("write", faults::FailsWith(ENOSPC), write, 1, 1);
    EXPECT_TRUE(outcome.injected);
    // The stream's end offers the failed line once more to the file that nobody will look at.
    ASSERT_EQ(2U, folder.Names().size());
    EXPECT_EQ("a = \"1\"\n", Contents(folder / folder.Names().back()));
}

TEST_F(ConfigurationFaultTest, AFailedReopenLeavesTheFileAsItWas) {
    ExpectUnwritten(faults::RunWithFaultIn("open", faults::FailsWith(EMFILE), write, 3, 1),
                    "Too many open files");
}

TEST_F(ConfigurationFaultTest, AFailedSyncLeavesTheFileAsItWas) {
    ExpectUnwritten(faults::RunWithFaultIn("fsync", faults::FailsWith(EIO), write, 1, 1),
                    "Input/output error");
}

TEST_F(ConfigurationFaultTest, AFileThatOutgrowsTheDiskLeavesTheOldOne) {
    for (std::size_t limit = 0; limit < newText.size(); ++limit) {
        ExpectUnwritten(faults::RunWithFaultAt(0, faults::Killed(),
                                               [&] {
                                                   std::signal(SIGXFSZ, SIG_IGN);
                                                   rlimit const size = {limit, limit};
                                                   if (::setrlimit(RLIMIT_FSIZE, &size) == 0) {
                                                       write();
                                                   }
                                               }),
                        "File too large");
        Reset();
    }
}

} // namespace
} // namespace tessel::authentication
