// SPDX-License-Identifier: Apache-2.0
#include "samba/WinbindDaemon.h"

#include "../../TemporaryFolder.h"
#include "samba/SambaTools.h"

#include <csignal>
#include <cstdlib>
#include <filesystem>
#include <gtest/gtest.h>
#include <spawn.h>
#include <stdexcept>
#include <string>
#include <sys/wait.h>
#include <unistd.h>

namespace tessel::winbind {
namespace {

/// A program of that name, which does nothing until it is told to end.
class Sleeper {
public:
    explicit Sleeper(std::string const& path) {
        std::filesystem::copy_file("/bin/sleep", path);
        std::string name = path;
        std::string seconds = "60";
        char* const arguments[] = {name.data(), seconds.data(), nullptr};
        if (::posix_spawn(&_process, path.c_str(), nullptr, nullptr, arguments, environ) != 0) {
            throw std::runtime_error("cannot start " + path);
        }
    }
    Sleeper(Sleeper const&) = delete;
    Sleeper& operator=(Sleeper const&) = delete;
    ~Sleeper() {
        (void)::kill(_process, SIGKILL); // it is there until it is waited for
        (void)::waitpid(_process, nullptr, 0);
    }
    std::string Number() const {
        return std::to_string(_process) + "\n";
    }

private:
    pid_t _process = 0;
};

WinbindDaemon Daemon(TemporaryFolder const& folder) {
    SambaFolders folders;
    folders.pid = folder.Path();
    folders.lock = folder.Path();
    return WinbindDaemon(folders);
}

TEST(WinbindDaemonTest, WhatRunsIsNamedByAFileAndByItsProgram) {
    TemporaryFolder const folder;
    Sleeper const winbindd(folder / "winbindd");
    EXPECT_FALSE(Daemon(folder).Runs());
    SetContents(folder / "winbindd.pid", winbindd.Number());
    EXPECT_TRUE(Daemon(folder).Runs());
    // A number that is another program's by now.
    SetContents(folder / "winbindd.pid", std::to_string(::getpid()));
    EXPECT_FALSE(Daemon(folder).Runs());
    SetContents(folder / "winbindd.pid", "none");
    EXPECT_FALSE(Daemon(folder).Runs());
}

TEST(WinbindDaemonTest, IsNotAloneBesideAnotherServer) {
    for (std::string const name : {"smbd", "nmbd"}) {
        TemporaryFolder const folder;
        EXPECT_TRUE(Daemon(folder).IsAlone());
        Sleeper const server(folder / name);
        SetContents(folder / (name + ".pid"), server.Number());
        EXPECT_FALSE(Daemon(folder).IsAlone()) << name;
    }
}

} // namespace
} // namespace tessel::winbind
