// SPDX-License-Identifier: Apache-2.0
#include <tslauth/Configuration.h>

#include "../TemporaryFolder.h"
#include "../faults/Faults.h"

#include <algorithm>
#include <csignal>
#include <gmock/gmock.h>
#include <sys/resource.h>
#include <sys/stat.h>

namespace tessel::authentication {
namespace {

/// Each test asks the same two questions: is the file whole, and does the caller know?
class ConfigurationFaultTest : public testing::Test {
protected:
    void SetUp() override {
        if (!faults::Available()) {
            GTEST_SKIP() << "this kernel has no seccomp notifications";
        }
        Reset();
    }

    void Reset() {
        for (std::string const& name : folder.Names()) {
            std::filesystem::remove(folder / name);
        }
        SetContents(path, oldText);
        ASSERT_EQ(0, ::chmod(path.c_str(), 0644));
    }

    void ExpectUnwritten(faults::Outcome const& outcome, std::string const& reason) {
        EXPECT_EQ("tessel::authentication::IOError", outcome.exception);
        EXPECT_EQ("Cannot write '" + path + "': " + reason, outcome.message);
        EXPECT_EQ(oldText, Contents(path));
        EXPECT_EQ(0644U, ModeOf(path));
    }

    TemporaryFolder folder;
    std::string path = folder / "test.conf";
    std::string oldText = "c=3\nb=2\na=1\n";
    std::string newText = "a = \"1\"\nb = \"changed\"\nc = \"3\"\n";
    std::function<void()> write = [this] {
        Configuration configuration(path);
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
                                     "fsync", "close", "stat", "chmod", "rename", "chmod", "open",
                                     "fsync", "close"));
    EXPECT_EQ(newText, Contents(path));
}

TEST_F(ConfigurationFaultTest, ALineOfAnyLengthIsOneWrite) {
    faults::Outcome const outcome = faults::RunWithFaultAt(0, faults::Killed(), [&] {
        Configuration configuration(path);
        configuration.clear();
        for (std::size_t const size : {1U, 1000U, 1023U, 1024U, 8190U, 8191U, 8192U, 1000000U}) {
            configuration.emplace(std::to_string(size), std::string(size, 'v'));
        }
        configuration.Write();
    });
    EXPECT_EQ(8, std::count(outcome.calls.begin(), outcome.calls.end(), "write"));
    EXPECT_EQ(8U, Configuration(path).size());
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
                    EXPECT_EQ(newText, Contents(path));
                } else {
                    EXPECT_EQ(oldText, Contents(path));
                    // A read error gives an empty configuration, whose keys are not found.
                    EXPECT_THAT(outcome.exception,
                                testing::AnyOf("tessel::authentication::IOError",
                                               "tessel::authentication::InvalidKeyException"));
                }
            });
        EXPECT_EQ(20U, calls);
    }
}

TEST_F(ConfigurationFaultTest, WhereverTheProcessIsKilledTheFileIsWhole) {
    std::size_t const calls = faults::Walk(
        faults::Killed(), [this] { Reset(); }, write,
        [&](std::size_t place, faults::Outcome const& outcome) {
            SCOPED_TRACE("call " + std::to_string(place) + ", " + outcome.calls[place - 1]);
            EXPECT_FALSE(outcome.finished);
            std::size_t const rename = 16;
            EXPECT_EQ(place <= rename ? oldText : newText, Contents(path));
            EXPECT_EQ(0644U, ModeOf(path));
        });
    EXPECT_EQ(20U, calls);
}

TEST_F(ConfigurationFaultTest, AnOpenThatFailsIsReportedWithItsReason) {
    faults::Outcome const outcome =
        faults::RunWithFaultAt(1, faults::FailsWith(EMFILE), [&] { Configuration{path}; });
    EXPECT_EQ("tessel::authentication::IOError", outcome.exception);
    EXPECT_EQ("Unable to open '" + path + "': Too many open files", outcome.message);
}

TEST_F(ConfigurationFaultTest, AReadErrorEndsTheReadingQuietly) {
    faults::Outcome const outcome = faults::RunWithFaultIn("read", faults::FailsWith(EIO), [&] {
        throw std::runtime_error(std::to_string(Configuration(path).size()));
    });
    EXPECT_TRUE(outcome.injected);
    EXPECT_EQ("0", outcome.message);
    EXPECT_EQ(oldText, Contents(path));
}

TEST_F(ConfigurationFaultTest, WhatWasReadBeforeAReadErrorIsKept) {
    faults::Outcome const outcome = faults::RunWithFaultIn(
        "read", faults::FailsWith(EIO),
        [&] { throw std::runtime_error(std::to_string(Configuration(path).size())); }, 2);
    EXPECT_TRUE(outcome.injected);
    EXPECT_EQ("3", outcome.message);
}

TEST_F(ConfigurationFaultTest, AnInterruptedReadIsRepeated) {
    faults::Outcome const outcome = faults::RunWithFaultIn(
        "read", faults::FailsWith(EINTR),
        [&] { throw std::runtime_error(std::to_string(Configuration(path).size())); }, 1, 2);
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
