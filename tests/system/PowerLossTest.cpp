// SPDX-License-Identifier: Apache-2.0
#include "Node.h"
#include "TemporaryFolder.h"
#include "faults/Faults.h"

#include <base/WholeFile.h>
#include <tslauth/Configuration.h>

#include <cstdlib>
#include <filesystem>
#include <functional>
#include <sys/stat.h>
#include <unistd.h>
#include <utility>
#include <vector>

using tessel::authentication::Configuration;

namespace {

bool Succeeds(std::string const& command) {
    return std::system((command + " >/dev/null 2>&1").c_str()) == 0;
}

/// A disk of our own, with a file system that has no journal to put things right again. What a cut
/// of the power leaves is what the kernel has handed to the disk so far.
class PowerLossTest : public testing::Test {
protected:
    static constexpr char Old[] = "key = \"old\"\n";
    static constexpr char New[] = "key = \"new\"\n";

    void SetUp() override {
        std::filesystem::create_directory(mounted);
        std::filesystem::create_directory(afterwards);
        if (!faults::Available() || !Succeeds("truncate -s 2M " + disk) ||
            !Succeeds("mke2fs -q -t ext4 -O ^has_journal " + disk) ||
            !Succeeds("mount -o loop " + disk + " " + mounted)) {
            GTEST_SKIP()
                << "no loop device, no mke2fs, or a kernel that lets no process be watched";
        }
        isMounted = true;
    }
    void TearDown() override {
        if (isMounted) {
            EXPECT_TRUE(Succeeds("umount " + mounted));
        }
    }

    /// The file as it is found after the power was cut when the disk was as `copy` is.
    std::string FoundOn(std::string const& copy) const {
        (void)Succeeds("e2fsck -fy " + copy); // its exit code says only that it had something to do
        if (!Succeeds("mount -o loop,ro " + copy + " " + afterwards)) {
            return "(no file system)";
        }
        std::string const path = afterwards + "/file";
        struct stat status = {};
        std::string const found = ::stat(path.c_str(), &status) != 0
                                      ? "(no file)"
                                      : Contents(path) + std::to_string(status.st_mode & 07777);
        EXPECT_TRUE(Succeeds("umount " + afterwards));
        return found;
    }

    /// Cuts the power before each call of a replacement, and right after its end.
    void ExpectWholeAtEachCut(std::function<void(std::string const& path)> const& replace) {
        std::string const path = mounted + "/file";
        SetContents(path, Old);
        ASSERT_EQ(0, ::chmod(path.c_str(), 0644));
        ::sync();
        std::vector<std::string> copies;
        auto const cut = [&] {
            copies.push_back(folder / "copy-" + std::to_string(copies.size()));
            std::filesystem::copy_file(disk, copies.back());
        };
        faults::Outcome const outcome = faults::Run([&] { replace(path); },
                                                    [&](std::size_t, std::string const&) {
                                                        cut();
                                                        return faults::Happens();
                                                    });
        ASSERT_TRUE(outcome.finished);
        ASSERT_EQ("", outcome.message);
        cut();
        std::string const mode = std::to_string(0644);
        for (std::size_t i = 0; i + 1 < copies.size(); ++i) {
            std::string const found = FoundOn(copies[i]);
            EXPECT_TRUE(found == Old + mode || found == New + mode)
                << found << ", cut before " << outcome.calls[i] << ", call " << i + 1;
        }
        EXPECT_EQ(New + mode, FoundOn(copies.back())) << "cut after success";
    }

    TemporaryFolder const folder;
    std::string const disk = folder / "disk";
    std::string const mounted = folder / "mounted";
    std::string const afterwards = folder / "afterwards";
    bool isMounted = false;
};

} // namespace

TEST_F(PowerLossTest, WhatTheLibraryWritesIsWholeAndHasItsMode) {
    ExpectWholeAtEachCut([](std::string const& path) {
        Configuration configuration(path);
        configuration["key"] = "new";
        configuration.Write();
    });
}

TEST_F(PowerLossTest, WhatEverythingElseOfOursReplacesIsWholeAndHasItsMode) {
    ExpectWholeAtEachCut([](std::string const& path) { tessel::base::ReplaceFile(path, New); });
}
