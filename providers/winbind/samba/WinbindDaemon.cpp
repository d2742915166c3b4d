// SPDX-License-Identifier: Apache-2.0
#include "samba/WinbindDaemon.h"

#include "Failure.h"
#include "Paths.h"
#include "host/HostFile.h"
#include "host/SystemLog.h"
#include "samba/WinbindClient.h"
#include "text/ToolFailure.h"

#include <algorithm>
#include <array>
#include <base/AsciiText.h>
#include <cerrno>
#include <climits>
#include <csignal>
#include <cstdlib>
#include <filesystem>
#include <system_error>
#include <thread>
#include <unistd.h>
#include <utility>
#include <vector>

namespace tessel::winbind {

namespace {

constexpr char daemonProgram[] = "winbindd";
/// Answers for winbindd and smbd, with a server for each matter.
constexpr char helperProgram[] = "samba-dcerpcd";
constexpr char serverPrefix[] = "rpcd_";
constexpr char unit[] = "winbind.service";
constexpr auto pause = std::chrono::milliseconds(25);
constexpr auto longPause = std::chrono::milliseconds(250);
/// What it is given to end by itself.
constexpr auto politeness = std::chrono::seconds(5);
constexpr auto helperPatience = std::chrono::seconds(2);
constexpr auto refusalPatience = std::chrono::seconds(6);
constexpr auto onePing = std::chrono::seconds(2);

bool SystemdManages() {
    return FileExists(Paths::SystemdRunning) && !ChildProcess::Find("systemctl").empty();
}

ChildProcess::Outcome RunSystemctl(std::vector<std::string> const& arguments,
                                   Clock::time_point deadline) {
    ChildProcess::Task task;
    task.arguments = {"systemctl", "--no-ask-password"};
    task.arguments.insert(task.arguments.end(), arguments.begin(), arguments.end());
    return ChildProcess::Run(task, deadline);
}

void RequireSuccess(std::string const& what, ChildProcess::Outcome const& outcome) {
    if (outcome.timedOut) {
        throw Failure(TSLAUTH_PROVIDER_TIMED_OUT, what + " did not end in time");
    }
    if (outcome.code != 0) {
        throw Failure(TSLAUTH_PROVIDER_SERVICE_NOT_ACTIVE, what + " ended with code " +
                                                               std::to_string(outcome.code) + ": " +
                                                               ToolFailureText(outcome.output));
    }
}

/// The name of the program that a process executes; empty where there is no such process.
std::string ProgramOf(pid_t process) {
    std::array<char, PATH_MAX> buffer = {};
    ssize_t const length = ::readlink(("/proc/" + std::to_string(process) + "/exe").c_str(),
                                      buffer.data(), buffer.size());
    if (length <= 0) {
        return {};
    }
    std::string const path(buffer.data(), static_cast<std::size_t>(length));
    std::string const name = path.substr(path.rfind('/') + 1);
    return name.substr(0, name.find(' ')); // a program that was replaced has a word behind its path
}

bool WaitForEnd(pid_t process, Clock::time_point deadline) {
    while (::kill(process, 0) == 0) {
        if (Clock::now() >= deadline) {
            return false;
        }
        std::this_thread::sleep_for(pause);
    }
    return true;
}

} // namespace

WinbindDaemon::WinbindDaemon(SambaFolders const& folders)
    : _pidFolder(folders.pid), _messagingFolder(folders.lock + "/msg.lock") {}

pid_t WinbindDaemon::Process(std::string const& program) const {
    std::string const text = ReadHostFile(_pidFolder + '/' + program + ".pid").value_or("");
    auto const process = static_cast<pid_t>(std::strtol(text.c_str(), nullptr, 10));
    if (process <= 1) {
        return 0;
    }
    // The file may be older than the system's start, and the number somebody else's by now.
    return ProgramOf(process) == program ? process : 0;
}

bool WinbindDaemon::Runs() const {
    return Process(daemonProgram) != 0;
}

bool WinbindDaemon::IsAlone() const {
    return Process("smbd") == 0 && Process("nmbd") == 0;
}

std::vector<pid_t> WinbindDaemon::Companions() const {
    bool const withServers = Process("smbd") == 0;
    std::vector<pid_t> found;
    std::error_code error;
    for (std::filesystem::directory_iterator entry(_messagingFolder, error), end;
         !error && entry != end; entry.increment(error)) {
        auto const process =
            static_cast<pid_t>(std::strtol(entry->path().filename().c_str(), nullptr, 10));
        std::string const name = process > 1 ? ProgramOf(process) : std::string();
        if (name == daemonProgram ||
            (withServers &&
             (name == helperProgram || base::AsciiText::StartsWith(name, serverPrefix)))) {
            found.push_back(process);
        }
    }
    return found;
}

/// They end by themselves, a little after winbindd, and write files on the way.
void WinbindDaemon::StopCompanions() const {
    for (int const signal : {SIGTERM, SIGKILL}) {
        auto const companions = Companions();
        for (pid_t const process : companions) {
            (void)::kill(process, signal); // it may have ended meanwhile
        }
        auto const patience = Clock::now() + helperPatience;
        for (pid_t const process : companions) {
            (void)WaitForEnd(process, patience); // who stays is met with the next signal
        }
    }
}

void WinbindDaemon::StopProcess(Clock::time_point deadline) const {
    pid_t const process = Process(daemonProgram);
    if (process == 0) {
        StopCompanions();
        return;
    }
    (void)::kill(process, SIGTERM); // it may have ended by itself; the wait tells
    if (!WaitForEnd(process, std::min(deadline, Clock::now() + politeness))) {
        (void)::kill(process, SIGKILL); // likewise
        if (!WaitForEnd(process, Clock::now() + politeness)) {
            throw Failure(TSLAUTH_PROVIDER_SERVICE_CANNOT_ACCEPT_CONTROL,
                          "winbindd cannot be stopped");
        }
    }
    StopCompanions();
}

void WinbindDaemon::Stop(Clock::time_point deadline) const {
    if (SystemdManages()) {
        // A unit that is unknown here has nothing to stop.
        (void)RunSystemctl({"stop", unit}, deadline);
    }
    StopProcess(deadline);
}

void WinbindDaemon::Restart(Clock::time_point deadline) const {
    if (SystemdManages()) {
        RequireSuccess("systemctl restart", RunSystemctl({"restart", unit}, deadline));
    } else {
        StopProcess(deadline);
        ChildProcess::Task task;
        task.arguments = {daemonProgram, "-D"};
        RequireSuccess(daemonProgram, ChildProcess::Run(task, deadline));
    }
    for (;;) {
        auto const now = Clock::now();
        try {
            WinbindClient(std::min(deadline, now + onePing)).Ping();
            return;
        } catch (Failure const& e) {
            if (now + pause >= deadline) {
                throw Failure(TSLAUTH_PROVIDER_SERVICE_NOT_ACTIVE,
                              std::string("winbindd does not answer: ") + e.what());
            }
        }
        std::this_thread::sleep_for(pause);
    }
}

void WinbindDaemon::Reload() const noexcept {
    try {
        pid_t const process = Process(daemonProgram);
        if (process != 0) {
            (void)::kill(process, SIGHUP); // where it has just ended, there is nobody to tell
        }
    } catch (std::exception const& e) {
        LogWarning(std::string("winbindd is not told of its new configuration: ") + e.what());
    }
}

void WinbindDaemon::CheckTrust(Clock::time_point deadline) const {
    // A controller that has not heard of a new secret yet does so soon, or another one is asked.
    auto const certain = std::min(deadline, Clock::now() + refusalPatience);
    // Soon at first: it takes winbindd a moment to find its controller.
    for (auto wait = pause;; wait = std::min(2 * wait, longPause)) {
        try {
            WinbindClient(deadline).CheckTrustCredentials();
            return;
        } catch (Failure const& e) {
            bool const isRefused = e.Code() == TSLAUTH_PROVIDER_LOGON_FAILURE ||
                                   e.Code() == TSLAUTH_PROVIDER_ACCESS_DENIED ||
                                   e.Code() == TSLAUTH_PROVIDER_NO_TRUST_SAM_ACCOUNT;
            if (Clock::now() + wait >= (isRefused ? certain : deadline)) {
                throw;
            }
        }
        std::this_thread::sleep_for(wait);
    }
}

} // namespace tessel::winbind
