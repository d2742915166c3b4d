// SPDX-License-Identifier: Apache-2.0
/// Runs a program and lets one of the calls by which it changes something fail, or kills it before
/// that call.
///
///   inject REPORT PLACE FAULT COMMAND [ARGUMENT...]
///
/// PLACE counts the changing calls of the command's own process from 1; 0 is none of them. FAULT is
/// "kill", "INT", "TERM" or "HUP" for a signal before the call, or the number of an error. REPORT
/// gets the number of changing calls that were seen, the name of the one at PLACE or "none", and
/// how the command ended: its exit code, or 128 and the signal's number. Killed before each call in
/// turn, a program leaves every state that it can leave: between two calls nothing changes.
#include "Faults.h"

#include <cstdio>
#include <cstdlib>
#include <fcntl.h>
#include <set>
#include <string>

namespace {

using namespace faults;

bool Changes(seccomp_notif const& call) {
    static std::set<std::string> const reading = {"read", "stat", "listxattr", "getxattr", "close"};
    std::string const name = detail::NameOf(call.data.nr);
    if (name != "open") {
        return reading.count(name) == 0;
    }
    bool const at = call.data.nr == __NR_openat;
    auto const flags = static_cast<int>(call.data.args[at ? 2 : 1]);
    return (flags & (O_WRONLY | O_RDWR | O_CREAT | O_TRUNC)) != 0;
}

/// 0 for none.
int SignalNamed(std::string const& name) {
    return name == "INT" ? SIGINT : name == "TERM" ? SIGTERM : name == "HUP" ? SIGHUP : 0;
}

struct Seen {
    std::size_t calls = 0;
    std::string name = "none";
};

/// Answers the calls of all processes of the command until they are gone.
Seen Answer(int listener, pid_t child, std::size_t place, std::string const& fault) {
    Seen seen;
    for (;;) {
        pollfd waiting = {listener, POLLIN, 0};
        if (::poll(&waiting, 1, -1) < 0 && errno == EINTR) {
            continue;
        }
        if ((waiting.revents & POLLIN) == 0) {
            return seen;
        }
        seccomp_notif call = {};
        if (::ioctl(listener, SECCOMP_IOCTL_NOTIF_RECV, &call) != 0) {
            continue;
        }
        seccomp_notif_resp answer = {};
        answer.id = call.id;
        answer.flags = SECCOMP_USER_NOTIF_FLAG_CONTINUE;
        bool const counts = static_cast<pid_t>(call.pid) == child && Changes(call);
        if (counts && ++seen.calls == place) {
            seen.name = detail::NameOf(call.data.nr);
            if (fault == "kill") {
                ::kill(-child, SIGKILL);
                continue;
            }
            if (int const signal = SignalNamed(fault)) {
                ::kill(-child, signal);
            } else {
                answer.flags = 0;
                answer.error = -std::atoi(fault.c_str());
            }
        }
        // It fails only where the process is gone, which the next round finds out.
        (void)::ioctl(listener, SECCOMP_IOCTL_NOTIF_SEND, &answer);
    }
}

} // namespace

int main(int count, char** arguments) {
    if (count < 5) {
        std::fputs("inject: REPORT PLACE FAULT COMMAND [ARGUMENT...]\n", stderr);
        return 2;
    }
    int sockets[2];
    if (::socketpair(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC, 0, sockets) != 0) {
        return detail::cannotBeWatched;
    }
    pid_t const child = ::fork();
    if (child == 0) {
        ::setpgid(0, 0);
        int const listener = detail::InstallFilter();
        if (listener < 0 || !detail::SendDescriptor(sockets[1], listener)) {
            ::_exit(detail::cannotBeWatched);
        }
        ::execv(arguments[4], arguments + 4);
        ::_exit(127);
    }
    ::close(sockets[1]);
    int const listener = detail::ReceiveDescriptor(sockets[0]);
    Seen seen;
    if (listener >= 0) {
        seen = Answer(listener, child, static_cast<std::size_t>(std::atoi(arguments[2])),
                      arguments[3]);
    }
    int status = 0;
    while (::waitpid(child, &status, 0) < 0 && errno == EINTR) {
    }
    int const ended = WIFSIGNALED(status) ? 128 + WTERMSIG(status) : WEXITSTATUS(status);
    std::FILE* const report = std::fopen(arguments[1], "w");
    if (report == nullptr) {
        return 2;
    }
    std::fprintf(report, "%zu %s %d\n", seen.calls, seen.name.c_str(), ended);
    return std::fclose(report) == 0 ? ended : 2;
}
