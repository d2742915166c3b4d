// SPDX-License-Identifier: Apache-2.0
#include "history/Confirmation.h"

#include "analysis/HostFile.h"
#include "history/HistoryArchive.h"
#include "setup/SetupHost.h"
#include "terminal/Console.h"

#include <base/AsciiText.h>
#include <base/FileError.h>
#include <nlohmann/json.hpp>

#include <algorithm>
#include <cerrno>
#include <csignal>
#include <ctime>
#include <fcntl.h>
#include <filesystem>
#include <sys/wait.h>
#include <unistd.h>

namespace tessel::tslauthctl {

namespace {

constexpr char confirmationFile[] = "/var/lib/tslauth/confirmation.json";
constexpr char serviceManager[] = "/run/systemd/system";
constexpr char timerProgram[] = "/usr/bin/systemd-run";

std::string Boot() {
    auto const text = HostFileOrNothing("/proc/sys/kernel/random/boot_id").value_or("");
    return std::string(base::AsciiText::Trimmed(text));
}

std::int64_t Now() {
    timespec now = {};
    (void)clock_gettime(CLOCK_BOOTTIME, &now); // the clock is there, and so is `now`
    return now.tv_sec;
}

std::string ThisProgram() {
    return std::filesystem::read_symlink("/proc/self/exe").string();
}

bool StartTimer(unsigned number, int seconds) {
    if (access(serviceManager, F_OK) != 0 || access(timerProgram, X_OK) != 0) {
        return false;
    }
    try {
        RunProgram({timerProgram, "--quiet", "--collect",
                    "--unit=tslauth-unconfirmed-" + std::to_string(number),
                    "--on-active=" + std::to_string(seconds) + "s",
                    "--timer-property=AccuracySec=1s", ThisProgram(), "undo", "--unconfirmed"});
        return true;
    } catch (Failure const&) {
        return false; // a process does it as well
    }
}

/// Waits and undoes; nothing of the session, its terminal or its signals reaches it.
[[noreturn]] void UndoLater(char const* program, std::int64_t until) {
    int const nothing = open("/dev/null", O_RDWR | O_CLOEXEC);
    for (int const descriptor : {STDIN_FILENO, STDOUT_FILENO, STDERR_FILENO}) {
        (void)dup2(nothing, descriptor); // what is written there is for nobody
    }
    // The host's lock is among the others, and would be held for as long as this waits.
    (void)close_range(STDERR_FILENO + 1, ~0U, 0);
    (void)chdir("/");
    sigset_t none;
    sigemptyset(&none);
    (void)sigprocmask(SIG_SETMASK, &none, nullptr);
    timespec const end = {static_cast<time_t>(until), 0};
    while (clock_nanosleep(CLOCK_BOOTTIME, TIMER_ABSTIME, &end, nullptr) == EINTR) {
    }
    execl(program, program, "undo", "--unconfirmed", static_cast<char*>(nullptr));
    _exit(1);
}

void StartProcess(std::int64_t until) {
    auto const program = ThisProgram();
    pid_t const child = fork();
    if (child == 0) {
        // Its own session, and nobody's child.
        pid_t const waiting = setsid() < 0 ? -1 : fork();
        if (waiting != 0) {
            _exit(waiting < 0 ? 1 : 0);
        }
        UndoLater(program.c_str(), until);
    }
    if (child < 0) {
        throw Failure(ExitCode::failure, "Cannot start a process: " + base::SystemText(errno));
    }
    int status = 0;
    while (waitpid(child, &status, 0) < 0 && errno == EINTR) {
    }
    if (status != 0) {
        throw Failure(ExitCode::failure, "Cannot start a process that would undo the change");
    }
}

} // namespace

std::string PrintConfirmation(Confirmation const& confirmation) {
    return nlohmann::json{{"number", confirmation.number},
                          {"boot", confirmation.boot},
                          {"until", confirmation.until}}
               .dump(2) +
           "\n";
}

Confirmation ReadConfirmation(std::string_view text) {
    auto const document = nlohmann::json::parse(text);
    return {document.at("number").get<unsigned>(), document.at("boot").get<std::string>(),
            document.at("until").get<std::int64_t>()};
}

std::int64_t SecondsLeft(Confirmation const& confirmation, std::string const& boot,
                         std::int64_t now) {
    return confirmation.boot == boot ? std::max<std::int64_t>(confirmation.until - now, 0) : 0;
}

std::int64_t SecondsLeft(Confirmation const& confirmation) {
    return SecondsLeft(confirmation, Boot(), Now());
}

std::optional<Confirmation> OpenConfirmation() {
    auto const text = TextOnHost(confirmationFile);
    if (!text) {
        return std::nullopt;
    }
    try {
        return ReadConfirmation(*text);
    } catch (nlohmann::json::exception const& e) {
        throw Failure(ExitCode::failure,
                      std::string("'") + confirmationFile + "' cannot be read: " + e.what());
    }
}

void AwaitConfirmation(unsigned number, int seconds) {
    auto const until = Now() + seconds;
    PutOnHost(confirmationFile, PrintConfirmation({number, Boot(), until}));
    if (!StartTimer(number, seconds)) {
        StartProcess(until);
    }
}

void ForgetConfirmation() {
    RemoveFromHost(confirmationFile);
}

} // namespace tessel::tslauthctl
