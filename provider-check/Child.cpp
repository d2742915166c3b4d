// SPDX-License-Identifier: Apache-2.0
#include "Child.h"

#include <base/Descriptor.h>

#include <algorithm>
#include <array>
#include <cerrno>
#include <chrono>
#include <csignal>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <ctime>
#include <sys/mman.h>
#include <sys/prctl.h>
#include <sys/resource.h>
#include <sys/wait.h>
#include <unistd.h>

namespace tessel::providercheck {

namespace {

typedef std::chrono::steady_clock Clock;

[[noreturn]] void Give(char const* what) {
    std::fprintf(stderr, "tslauth-provider-check: %s: %s\n", what, std::strerror(errno));
    std::exit(2);
}

/// A file in memory, in the place of an output: a provider that prints much must not hang.
base::Descriptor Output(char const* name) {
    base::Descriptor output(memfd_create(name, MFD_CLOEXEC));
    if (output.Get() < 0) {
        Give("memfd_create");
    }
    return output;
}

void LookAtOutput(base::Descriptor const& output, char const* name, Recorder& recorder) {
    std::array<char, 120> text{};
    ssize_t const length = pread(output.Get(), text.data(), text.size() - 1, 0);
    recorder.Examined(Rule::Output);
    if (length > 0) {
        recorder.Found(Rule::Output, "%s: printed to the %s: %s", recorder.Doing(), name,
                       text.data());
    }
}

[[noreturn]] void BeChild(base::Descriptor const& output, base::Descriptor const& error,
                          Recorder& recorder, std::function<void(Recorder&)> const& body) {
    rlimit const none = {0, 0};
    // Neither of these fails for a process of its own; without them no more than tidiness is lost.
    (void)setrlimit(RLIMIT_CORE, &none);
    (void)prctl(PR_SET_PDEATHSIG, SIGKILL);
    (void)prctl(PR_SET_CHILD_SUBREAPER, 1); // children that are left behind come here
    (void)setpgid(0, 0);
    if (dup2(output.Get(), STDOUT_FILENO) < 0 || dup2(error.Get(), STDERR_FILENO) < 0) {
        Give("dup2");
    }
    body(recorder);
    recorder.End();
    recorder.complete = true;
    std::exit(0); // and not _exit: what the library has registered runs as well
}

/// What a check itself does between two calls is no provider's time.
constexpr std::chrono::seconds ownTime(10);

bool IsTooLate(Recorder const& recorder, Clock::time_point lastProgress, unsigned seconds) {
    auto const bound = std::chrono::seconds(seconds);
    std::int64_t const began = recorder.Began();
    if (began == 0) {
        return Clock::now() - lastProgress > bound + ownTime;
    }
    return Clock::now().time_since_epoch() - std::chrono::nanoseconds(began) > bound;
}

/// Waits for the child's end. @return false where it had to be ended
bool Await(pid_t child, Recorder const& recorder, unsigned seconds, int* status) {
    timespec const pause = {0, 2000000};
    auto lastProgress = Clock::now();
    unsigned calls = 0;
    while (waitpid(child, status, WNOHANG) == 0) {
        if (recorder.Calls() != calls) {
            calls = recorder.Calls();
            lastProgress = Clock::now();
        }
        if (IsTooLate(recorder, lastProgress, seconds)) {
            (void)kill(-child, SIGKILL); // with what it has started
            (void)kill(child, SIGKILL);
            while (waitpid(child, status, 0) < 0 && errno == EINTR) {
            }
            return false;
        }
        (void)nanosleep(&pause, nullptr); // sooner does no harm
    }
    return true;
}

} // namespace

void RunInChild(Conditions const& conditions, Recorder& recorder,
                std::function<void(Recorder&)> const& body) {
    base::Descriptor const output = Output("standard output");
    base::Descriptor const error = Output("standard error");
    recorder.complete = false;
    recorder.explained = false;
    (void)std::fflush(nullptr); // or the child prints what is not yet printed again
    pid_t const child = fork();
    if (child < 0) {
        Give("fork");
    }
    if (child == 0) {
        BeChild(output, error, recorder, body);
    }
    int status = 0;
    recorder.Examined(conditions.time);
    recorder.Examined(conditions.crash);
    recorder.Examined(Rule::Exit);
    if (!Await(child, recorder, conditions.seconds, &status)) {
        recorder.Found(conditions.time, "%s: no end within %u s", recorder.Doing(),
                       conditions.seconds);
    } else if (recorder.explained) {
        // it ended itself where it found something
    } else if (WIFSIGNALED(status)) {
        recorder.Found(recorder.complete ? Rule::Unloads : conditions.crash, "%s: %s%s",
                       recorder.Doing(), strsignal(WTERMSIG(status)),
                       recorder.complete ? ", when the process ended" : "");
    } else if (!recorder.complete) {
        recorder.Found(Rule::Exit, "%s: the process ended with status %d", recorder.Doing(),
                       WEXITSTATUS(status));
    }
    (void)kill(-child, SIGKILL); // what it has left behind
    LookAtOutput(output, "standard output", recorder);
    LookAtOutput(error, "standard error", recorder);
}

} // namespace tessel::providercheck
