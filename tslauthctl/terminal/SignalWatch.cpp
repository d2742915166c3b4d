// SPDX-License-Identifier: Apache-2.0
#include "terminal/SignalWatch.h"

#include "terminal/Console.h"

#include <base/FileError.h>

#include <array>
#include <atomic>
#include <cerrno>
#include <fcntl.h>
#include <unistd.h>

namespace tessel::tslauthctl {

namespace {

std::atomic<int> caught{0};
static_assert(std::atomic<int>::is_always_lock_free, "it is set by a signal handler");

/// A pipe for the whole life of the process: a handler that still runs on another thread must never
/// find another file under its number.
struct Pipe {
    std::array<int, 2> ends{-1, -1};

    Pipe() {
        if (pipe2(ends.data(), O_CLOEXEC | O_NONBLOCK) != 0) {
            throw Failure(ExitCode::failure, "Cannot make a pipe: " + base::SystemText(errno));
        }
    }
};

Pipe const& WakePipe() {
    static Pipe const pipe;
    return pipe;
}

/// The pipe's end for the handler, which may not run a static's constructor.
int writeEnd = -1;

extern "C" void Remember(int signal) {
    int const error = errno;
    // What ends the process counts for more than what continues it.
    int expected = 0;
    if (!caught.compare_exchange_strong(expected, signal) && expected == SIGCONT) {
        caught = signal;
    }
    char const byte = 0;
    // A full pipe wakes just as well.
    ssize_t const written = write(writeEnd, &byte, sizeof byte);
    (void)written; // see above
    errno = error;
}

bool IsWatched(int signal, SignalWatch::Signals signals) {
    switch (signals) {
    case SignalWatch::Signals::ending:
        return signal == SIGINT || signal == SIGTERM || signal == SIGHUP || signal == SIGQUIT;
    case SignalWatch::Signals::all:
        // These four do nothing, and the first two cannot be caught.
        return signal != SIGKILL && signal != SIGSTOP && signal != SIGCHLD && signal != SIGURG &&
               signal != SIGWINCH;
    }
    return false;
}

} // namespace

SignalWatch::SignalWatch(Signals signals) {
    auto const& ends = WakePipe().ends;
    writeEnd = ends[1];
    std::array<char, 64> drained{};
    while (read(ends[0], drained.data(), drained.size()) > 0) {
    }
    caught = 0;
    struct sigaction action = {};
    action.sa_handler = Remember;
    // A provider's system calls go on as if nothing had happened; poll(2) is woken all the same.
    // Where stops are caught, a read from a terminal that is somebody else's has to fail, and would
    // be begun again for ever.
    action.sa_flags = signals == Signals::ending ? SA_RESTART : 0;
    sigemptyset(&action.sa_mask);
    for (int signal = 1; signal <= SIGRTMAX; ++signal) {
        struct sigaction before = {};
        // The C library keeps a few numbers to itself, and says that they are none.
        if (!IsWatched(signal, signals) || sigaction(signal, nullptr, &before) != 0 ||
            before.sa_handler != SIG_DFL || sigaction(signal, &action, nullptr) != 0) {
            continue;
        }
        _before.emplace(signal, before);
    }
}

SignalWatch::~SignalWatch() {
    (void)Stop(); // who wants the signal has stopped it before
}

int SignalWatch::Stop() noexcept {
    for (auto const& [signal, before] : _before) {
        // It could be set, so it can be set back.
        (void)sigaction(signal, &before, nullptr);
    }
    return caught;
}

int SignalWatch::Descriptor() const noexcept {
    return WakePipe().ends[0];
}

int SignalWatch::Signal() const noexcept {
    return caught;
}

} // namespace tessel::tslauthctl
