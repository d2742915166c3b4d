// SPDX-License-Identifier: Apache-2.0
#include "analysis/ProviderCheck.h"

#include "analysis/ProviderOnHost.h"
#include "terminal/Console.h"

#include <tslauth/Paths.h>

#include <algorithm>
#include <cerrno>
#include <chrono>
#include <csignal>
#include <cstring>
#include <dlfcn.h>
#include <fcntl.h>
#include <sys/resource.h>
#include <sys/wait.h>
#include <thread>
#include <unistd.h>
#include <utility>

namespace tessel::tslauthctl {

namespace {

constexpr int SecondsToLoad = 10;

/// Loads a library as the providers' adapter does, and ends the process.
[[noreturn]] void LoadAndExit(std::string const& path) {
    rlimit const noCore = {0, 0};
    (void)setrlimit(RLIMIT_CORE, &noCore); // a core file of this would be of no use to anybody
    (void)dlopen(path.c_str(), RTLD_LAZY); // what it says is said again when it is loaded
    _exit(0);
}

/// Waits for a child, and ends it where it takes too long.
/// @return its status; nothing meaningful where `expired` is set
int WaitFor(pid_t child, int seconds, bool& expired) {
    auto const deadline = std::chrono::steady_clock::now() + std::chrono::seconds(seconds);
    int status = 0;
    expired = false;
    for (auto pause = std::chrono::microseconds(100);;
         pause = std::min(2 * pause, std::chrono::microseconds(20000))) {
        pid_t const ended = waitpid(child, &status, WNOHANG);
        if (ended == child || (ended < 0 && errno != EINTR)) {
            return status;
        }
        if (std::chrono::steady_clock::now() >= deadline) {
            expired = true;
            (void)kill(child, SIGKILL);
            (void)waitpid(child, &status, 0);
            return status;
        }
        std::this_thread::sleep_for(pause);
    }
}

} // namespace

void CheckLoading(std::string const& path, int seconds) {
    pid_t const child = fork();
    if (child < 0) {
        return; // the host is short of everything; loading tells more
    }
    if (child == 0) {
        LoadAndExit(path);
    }
    bool expired = false;
    int const status = WaitFor(child, seconds, expired);
    auto const refuse = [&](std::string const& what) {
        throw Failure(ExitCode::refused, "The provider '" + path + "' is not loaded: " + what);
    };
    if (expired) {
        refuse("that has not ended within " + std::to_string(seconds) + " seconds");
    }
    if (WIFSIGNALED(status)) {
        refuse(std::string("it ends the process that does it (") + strsignal(WTERMSIG(status)) +
               "); the file may be damaged");
    }
}

void CheckProvider() {
    // The next time there may be other threads.
    static bool checked = false;
    if (std::exchange(checked, true)) {
        return;
    }
    auto const name = ProviderName();
    if (name.empty()) {
        return;
    }
    if (name.find('/') != std::string::npos) {
        throw Failure(ExitCode::refused, "The provider '" + name +
                                             "' is not loaded: its name holds a '/', so that it "
                                             "would come from outside the providers' folder");
    }
    using namespace authentication;
    CheckLoading(Paths::ProviderPrefix + name + Paths::ProviderSuffix, SecondsToLoad);
}

} // namespace tessel::tslauthctl
