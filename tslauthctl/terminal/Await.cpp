// SPDX-License-Identifier: Apache-2.0
#include "terminal/Await.h"

#include "terminal/Console.h"
#include "terminal/SignalWatch.h"

#include <base/FileError.h>

#include <algorithm>
#include <array>
#include <atomic>
#include <cerrno>
#include <chrono>
#include <csignal>
#include <future>
#include <poll.h>
#include <sys/eventfd.h>
#include <system_error>
#include <thread>
#include <unistd.h>

namespace tessel::tslauthctl {

namespace {

using base::SystemText;
using Clock = std::chrono::steady_clock;

/// Workers that have not ended.
std::atomic<int> running{0};

std::function<void()> beforeInterruption;

} // namespace

/// What the worker shares with who waits for it.
class Work {
public:
    explicit Work(std::function<void()> work)
        : _begin(Clock::now()), _task(std::move(work)), _result(_task.get_future()),
          _done(eventfd(0, EFD_CLOEXEC | EFD_NONBLOCK)) {
        if (_done < 0) {
            throw Failure(ExitCode::failure, "Cannot wait for the call: " + SystemText(errno));
        }
    }
    Work(Work const&) = delete;
    Work& operator=(Work const&) = delete;
    ~Work() {
        close(_done);
    }

    /// On the worker.
    void Do() {
        _task();
        // Cannot fail: it counts to one.
        (void)eventfd_write(_done, 1);
    }

    int Descriptor() const noexcept {
        return _done;
    }
    Clock::duration Elapsed() const {
        return Clock::now() - _begin;
    }
    /// Waits for the end, and throws what the work has thrown.
    void Result() {
        _result.get();
    }

private:
    Clock::time_point _begin;
    std::packaged_task<void()> _task;
    std::future<void> _result;
    int _done;
};

namespace {

std::string Seconds(long long count) {
    return std::to_string(count) + (count == 1 ? " second" : " seconds");
}

/// The line that is shown after `elapsed`; nothing in the first second, in which most calls end.
void ShowProgress(Console& console, Pending const& pending) {
    auto const elapsed = pending.work->Elapsed();
    auto const seconds = std::chrono::duration_cast<std::chrono::seconds>(elapsed).count();
    if (seconds >= 1) {
        console.Progress("waiting for " + pending.what + ": " +
                         (pending.limit
                              ? std::to_string(seconds) + " of " + Seconds(pending.limit->seconds)
                              : Seconds(seconds)) +
                         " (^C interrupts)");
    }
}

/// Until the line that is shown changes, or the limit passes.
int MillisecondsToWait(Pending const& pending) {
    using std::chrono::milliseconds;
    constexpr milliseconds tick(1000);
    auto const elapsed = pending.work->Elapsed();
    auto wait = tick - std::chrono::duration_cast<milliseconds>(elapsed) % tick;
    if (pending.limit) {
        auto const left =
            std::chrono::ceil<milliseconds>(std::chrono::seconds(pending.limit->seconds) - elapsed);
        wait = std::clamp(left, milliseconds(0), wait);
    }
    return static_cast<int>(wait.count());
}

bool HasExpired(Pending const& pending) {
    return pending.limit && pending.work->Elapsed() >= std::chrono::seconds(pending.limit->seconds);
}

/// @return whether the work has ended; it has not where there was a signal or the time has passed
bool WaitForEnd(Console& console, Pending const& pending, SignalWatch const& watch) {
    for (;;) {
        ShowProgress(console, pending);
        std::array<pollfd, 2> waiting = {
            {{pending.work->Descriptor(), POLLIN, 0}, {watch.Descriptor(), POLLIN, 0}}};
        if (poll(waiting.data(), waiting.size(), MillisecondsToWait(pending)) < 0 &&
            errno != EINTR) {
            return true; // out of memory: the end is waited for without a limit
        }
        if (waiting[0].revents != 0) {
            return true;
        }
        if (watch.Signal() != 0 || HasExpired(pending)) {
            return false;
        }
    }
}

[[noreturn]] void End(int signal) {
    // With its own effect, so that whoever started the process sees how it ended.
    (void)raise(signal);
    _exit(128 + signal);
}

[[noreturn]] void Expire(Console& console, Pending const& pending) {
    console.Document()["expired"].push_back({{"limit", Limit::Name},
                                             {"seconds", pending.limit->seconds},
                                             {"waiting_for", pending.what}});
    throw Failure(ExitCode::unreachable, "No answer within " + Seconds(pending.limit->seconds) +
                                             ", the limit of " + Limit::Name + ", waiting for " +
                                             pending.what);
}

} // namespace

Pending Start(std::string what, std::optional<Limit> limit, std::function<void()> work) {
    auto shared = std::make_shared<Work>(std::move(work));
    ++running;
    try {
        std::thread([shared]() mutable {
            shared->Do();
            // Whatever only it still holds goes first.
            shared.reset();
            --running;
        }).detach();
    } catch (std::system_error const& e) {
        --running;
        throw Failure(ExitCode::failure, std::string("Cannot start a thread: ") + e.what());
    }
    return {std::move(shared), std::move(what), limit};
}

void Wait(Console& console, Pending const& pending) {
    SignalWatch watch(SignalWatch::Signals::ending);
    bool const done = WaitForEnd(console, pending, watch);
    console.EndProgress();
    if (int const signal = watch.Stop(); signal != 0) {
        console.Interrupted("interrupted while waiting for " + pending.what);
        if (beforeInterruption) {
            beforeInterruption();
        }
        End(signal);
    }
    if (!done) {
        Expire(console, pending);
    }
    pending.work->Result();
}

void BeforeInterruption(std::function<void()> act) {
    beforeInterruption = std::move(act);
}

bool HasAbandonedCalls() noexcept {
    return running != 0;
}

} // namespace tessel::tslauthctl
