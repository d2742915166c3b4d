// SPDX-License-Identifier: Apache-2.0
#include <strandctl/HostsFile.h>

#include "../HostCtlFailure.h"
#include "../TemporaryFolder.h"
#include "Node.h"

#include <algorithm>
#include <arpa/inet.h>
#include <filesystem>
#include <gmock/gmock.h>
#include <netdb.h>
#include <netinet/in.h>
#include <string>
#include <sys/mount.h>
#include <sys/stat.h>
#include <sys/types.h>
#include <thread>
#include <unistd.h>
#include <vector>

namespace StrandCtl::Network {
namespace {

constexpr char path[] = "/etc/hosts";

class HostsFileTest : public testing::Test {
protected:
    void SetUp() override {
        std::filesystem::remove(path);
        SetContents(path, "# this host\n127.0.0.1\tlocalhost # loopback\n10.1.2.3 old\n");
        std::filesystem::permissions(path, std::filesystem::perms(0644));
        _names = EtcNames();
    }
    void TearDown() override {
        std::filesystem::remove(path);
        SetContents(path, "127.0.0.1 localhost\n");
    }
    void ExpectNothingLeftBehind() {
        EXPECT_EQ(_names, EtcNames());
    }
    static std::vector<std::string> EtcNames() {
        std::vector<std::string> names;
        for (auto const& entry : std::filesystem::directory_iterator("/etc")) {
            names.push_back(entry.path().filename().string());
        }
        std::sort(names.begin(), names.end());
        return names;
    }

private:
    std::vector<std::string> _names;
};

void Add() {
    HostsFile().AddOrReplaceEntry("10.1.2.3", "node01.corp.example", {"node01"});
}

constexpr char after[] = "# this host\n127.0.0.1\tlocalhost # loopback\n"
                         "10.1.2.3 node01.corp.example node01\n";

TEST_F(HostsFileTest, AnEntryIsReplacedWhereItStands) {
    Add();
    EXPECT_EQ(after, Contents(path));
    ExpectNothingLeftBehind();
}

TEST_F(HostsFileTest, TheResolverAnswersTheEntryAlone) {
    SetContents(path, "::ffff:10.1.2.3 first\n127.0.0.1 localhost\n10.1.2.3 second # two\n");
    Add();
    in_addr address = {};
    ASSERT_EQ(1, inet_pton(AF_INET, "10.1.2.3", &address));
    hostent const* const byAddress = gethostbyaddr(&address, sizeof address, AF_INET);
    ASSERT_TRUE(byAddress);
    EXPECT_STREQ("node01.corp.example", byAddress->h_name);
    ASSERT_TRUE(byAddress->h_aliases[0]);
    EXPECT_STREQ("node01", byAddress->h_aliases[0]);
    EXPECT_FALSE(byAddress->h_aliases[1]);
    hostent const* const byName = gethostbyname("node01");
    ASSERT_TRUE(byName);
    EXPECT_STREQ("node01.corp.example", byName->h_name);
    EXPECT_FALSE(gethostbyname("first"));
    EXPECT_FALSE(gethostbyname("second"));
}

TEST_F(HostsFileTest, ItsModeAndOwnerAreKept) {
    ASSERT_EQ(0, chown(path, 123, 456));
    // Two bits that a change of the owner clears.
    ASSERT_EQ(0, chmod(path, 06750));
    Add();
    struct stat status = {};
    ASSERT_EQ(0, stat(path, &status));
    EXPECT_EQ(06750U, status.st_mode & 07777U);
    EXPECT_EQ(123U, status.st_uid);
    EXPECT_EQ(456U, status.st_gid);
}

TEST_F(HostsFileTest, AMissingFileIsMade) {
    std::filesystem::remove(path);
    Add();
    EXPECT_EQ("10.1.2.3\tnode01.corp.example node01\n", Contents(path));
    EXPECT_EQ(0644U, ModeOf(path));
}

TEST_F(HostsFileTest, NothingIsWrittenWhereNothingChanges) {
    Add();
    struct stat before = {}, now = {};
    ASSERT_EQ(0, stat(path, &before));
    Add();
    ASSERT_EQ(0, stat(path, &now));
    EXPECT_EQ(before.st_ino, now.st_ino);
}

TEST_F(HostsFileTest, ALinkStaysAndItsDestinationIsReplaced) {
    std::filesystem::rename(path, "/etc/tessel/hosts");
    std::filesystem::create_symlink("tessel/hosts", path);
    Add();
    EXPECT_TRUE(std::filesystem::is_symlink(path));
    EXPECT_EQ(after, Contents("/etc/tessel/hosts"));
    std::filesystem::remove("/etc/tessel/hosts");
}

TEST_F(HostsFileTest, AFileThatCannotBeReplacedStaysAsItWas) {
    std::string const before = Contents(path);
    SetContents("/run/hosts", before);
    ASSERT_EQ(0, mount("/run/hosts", path, nullptr, MS_BIND, nullptr));
    std::string const failure = FailureOf(Add);
    std::string const text = Contents(path);
    ASSERT_EQ(0, umount(path));
    EXPECT_EQ("Cannot replace '/etc/hosts': Device or resource busy", failure);
    EXPECT_EQ(before, text);
    EXPECT_EQ(before, Contents(path));
    ExpectNothingLeftBehind();
}

TEST_F(HostsFileTest, AFullFileSystemLeavesTheFileAsItWas) {
    // A small file system of its own, which the link leads to.
    std::filesystem::create_directory("/run/small");
    ASSERT_EQ(0, mount("node", "/run/small", "tmpfs", 0, "size=64k"));
    std::string const before = "10.1.2.3 old\n" + std::string(40000, '#') + "\n";
    SetContents("/run/small/hosts", before);
    std::filesystem::remove(path);
    std::filesystem::create_symlink("/run/small/hosts", path);
    EXPECT_EQ("Cannot replace '/etc/hosts': No space left on device", FailureOf(Add));
    EXPECT_EQ(before, Contents("/run/small/hosts"));
    EXPECT_EQ(1, std::distance(std::filesystem::directory_iterator("/run/small"), {}));
    EXPECT_EQ(0, umount("/run/small"));
}

TEST_F(HostsFileTest, AFileThatCannotBeReadIsAnError) {
    std::filesystem::remove(path);
    std::filesystem::create_directory(path);
    EXPECT_EQ("Cannot read '/etc/hosts': it is not a regular file", FailureOf(Add));
}

TEST_F(HostsFileTest, ReadersAlwaysSeeAWholeFile) {
    std::string const head = std::string(20000, '#') + "\n";
    SetContents(path, head + "10.1.2.3 a\n");
    std::thread writer([] {
        for (int i = 0; i < 40; ++i) {
            HostsFile().AddOrReplaceEntry("10.1.2.3", i % 2 ? "a" : "b", {});
        }
    });
    bool whole = true;
    for (int i = 0; i < 300; ++i) {
        std::string const text = Contents(path);
        whole = whole && (text == head + "10.1.2.3 a\n" || text == head + "10.1.2.3 b\n");
    }
    writer.join();
    EXPECT_TRUE(whole);
}

} // namespace
} // namespace StrandCtl::Network
