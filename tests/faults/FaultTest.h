// SPDX-License-Identifier: Apache-2.0
#ifndef TSLAUTH_TESTS_FAULTTEST_H
#define TSLAUTH_TESTS_FAULTTEST_H

#include "../TemporaryFolder.h"
#include "Faults.h"

#include <gtest/gtest.h>
#include <string>
#include <sys/stat.h>
#include <utility>

/// A file to be replaced under faults. Each test asks the same two questions: is the file whole,
/// and does the caller know?
class FaultTest : public testing::Test {
protected:
    FaultTest(std::string const& name, std::string text)
        : target(folder / name), oldText(std::move(text)) {}

    void SetUp() override {
        if (!faults::Available()) {
            GTEST_SKIP() << "this kernel has no seccomp notifications";
        }
        Reset();
    }

    /// An old file with a mode of its own, and nothing beside it.
    void Reset() {
        for (std::string const& name : folder.Names()) {
            std::filesystem::remove(folder / name);
        }
        SetContents(target, oldText);
        ASSERT_EQ(0, ::chmod(target.c_str(), 0644));
    }

    TemporaryFolder folder;
    std::string target;
    std::string oldText;
};

#endif
