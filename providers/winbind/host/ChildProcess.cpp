// SPDX-License-Identifier: Apache-2.0
#include "host/ChildProcess.h"

#include "Failure.h"
#include "host/HostFile.h"

#include <algorithm>
#include <array>
#include <base/Descriptor.h>
#include <base/SignalsBlocked.h>
#include <cerrno>
#include <csignal>
#include <fcntl.h>
#include <poll.h>
#include <sys/prctl.h>
#include <sys/resource.h>
#include <sys/stat.h>
#include <sys/syscall.h>
#include <sys/types.h>
#include <sys/wait.h>
#include <unistd.h>

namespace tessel::winbind {

namespace {

constexpr std::size_t mostOutput = std::size_t(1024) * 1024;
constexpr char searchPath[] = "PATH=/usr/sbin:/usr/bin:/sbin:/bin";
constexpr char const* folders[] = {"/usr/sbin/", "/usr/bin/", "/sbin/", "/bin/"};
/// How long the host waits beyond the deadline for the process between, which keeps it.
constexpr auto grace = std::chrono::seconds(5);

enum class News : int { Ended, TimedOut, NotStarted };

/// What the process between tells the host, in one write.
struct Report {
    News news;
    /// A wait status, or the error number that kept the program from starting.
    int value;
};

struct Pipe {
    Pipe() {
        std::array<int, 2> ends = {};
        if (::pipe2(ends.data(), O_CLOEXEC) != 0) {
            ThrowSystemFailure("cannot make a pipe", errno);
        }
        reading = base::Descriptor(ends[0]);
        writing = base::Descriptor(ends[1]);
    }
    base::Descriptor reading;
    base::Descriptor writing;
};

/// What both processes need, put together before the first of them is made: afterwards no memory
/// may be allocated and no lock taken, because another thread of the host may have held it.
struct Plan {
    char const* path;
    char* const* arguments;
    char* const* environment;
    /// For the program's descriptors 0, 1, 2, 3, ..., then the one for the report.
    int* descriptors;
    unsigned int count;
    pid_t host;
    timespec deadline;
};

/// Neither of both returns: they tell by ending. The numbers below 128 are left to the program.
[[noreturn]] void End(int code) {
    ::_exit(code);
}

void CloseFrom(unsigned int first) {
#ifdef SYS_close_range
    if (::syscall(SYS_close_range, first, ~0U, 0U) == 0) {
        return;
    }
#endif
    rlimit limit = {};
    if (::getrlimit(RLIMIT_NOFILE, &limit) != 0) {
        return;
    }
    rlim_t const end = std::min(limit.rlim_cur, rlim_t{1} << 20U);
    for (auto number = static_cast<rlim_t>(first); number < end; ++number) {
        (void)::close(static_cast<int>(number)); // most are not open
    }
}

/// Puts the plan's descriptors at 0, 1, 2, ... and closes every other.
bool ArrangeDescriptors(Plan const& plan) {
    // First out of the way of the places that they are to take.
    for (unsigned int i = 0; i < plan.count; ++i) {
        plan.descriptors[i] =
            ::fcntl(plan.descriptors[i], F_DUPFD_CLOEXEC, static_cast<int>(plan.count));
        if (plan.descriptors[i] < 0) {
            return false;
        }
    }
    for (unsigned int i = 0; i < plan.count; ++i) {
        if (::dup2(plan.descriptors[i], static_cast<int>(i)) < 0) {
            return false;
        }
    }
    CloseFrom(plan.count);
    return true;
}

void ResetSignals() {
    for (int signal = 1; signal < NSIG; ++signal) {
        // KILL, STOP and the C library's own refuse, and need none.
        (void)::signal(signal, SIG_DFL);
    }
}

/// A child that outlives who waits for it would go on changing the host or the directory.
bool DieWith(pid_t parent) {
    return ::prctl(PR_SET_PDEATHSIG, SIGKILL) == 0 && ::getppid() == parent;
}

[[noreturn]] void Tell(int reportTo, News news, int value) {
    Report const report = {news, value};
    // Shorter than what a pipe takes at once; where the host is gone nobody is left to tell.
    (void)!::write(reportTo, &report, sizeof report);
    End(0);
}

[[noreturn]] void BecomeProgram(Plan const& plan, pid_t between) {
    int const reportTo = static_cast<int>(plan.count) - 1;
    rlimit const none = {0, 0};
    sigset_t empty;
    (void)::sigemptyset(&empty);
    // A session of its own: a group to end, and no terminal to ask for a password.
    if (!DieWith(between) || ::setsid() < 0 || ::setrlimit(RLIMIT_CORE, &none) != 0 ||
        ::chdir("/") != 0 || ::fcntl(reportTo, F_SETFD, FD_CLOEXEC) != 0 ||
        ::sigprocmask(SIG_SETMASK, &empty, nullptr) != 0) {
        Tell(reportTo, News::NotStarted, errno);
    }
    (void)::umask(022);
    (void)::execve(plan.path, plan.arguments, plan.environment);
    Tell(reportTo, News::NotStarted, errno);
}

timespec Until(timespec const& deadline) {
    timespec now = {};
    (void)::clock_gettime(CLOCK_MONOTONIC, &now); // exists on every system
    timespec left = {deadline.tv_sec - now.tv_sec, deadline.tv_nsec - now.tv_nsec};
    if (left.tv_nsec < 0) {
        --left.tv_sec;
        left.tv_nsec += 1000000000L;
    }
    return left.tv_sec < 0 ? timespec{0, 0} : left;
}

/// The process between. All signals are blocked, here and in the program until it is executed.
[[noreturn]] void Watch(Plan const& plan) {
    rlimit const none = {0, 0};
    // A core file of this process would hold the host's memory.
    if (!DieWith(plan.host) || ::setrlimit(RLIMIT_CORE, &none) != 0 || !ArrangeDescriptors(plan)) {
        End(1);
    }
    ResetSignals();
    int const reportTo = static_cast<int>(plan.count) - 1;
    pid_t const self = ::getpid();
    // With an exit signal of its own, unlike this process: the library's `fork` would run the
    // host's handlers, which may wait for a lock that no thread is left to release.
    long const made = ::syscall(SYS_clone, static_cast<unsigned long>(SIGCHLD), nullptr, nullptr,
                                nullptr, nullptr);
    if (made == 0) {
        BecomeProgram(plan, self);
    }
    if (made < 0) {
        Tell(reportTo, News::NotStarted, errno);
    }
    auto const program = static_cast<pid_t>(made);
    // The program's output ends for the host when the program closes it, not this process.
    for (int number = 0; number < reportTo; ++number) {
        (void)::close(number);
    }
    sigset_t ended;
    (void)::sigemptyset(&ended);
    (void)::sigaddset(&ended, SIGCHLD);
    bool timedOut = false;
    int status = 0;
    for (;;) {
        pid_t const found = ::waitpid(program, &status, WNOHANG);
        if (found == program) {
            break;
        }
        timespec const left = Until(plan.deadline);
        if (left.tv_sec == 0 && left.tv_nsec == 0) {
            timedOut = true;
            // The group first; the process itself where it has not made the group yet.
            (void)::kill(-program, SIGKILL);
            (void)::kill(program, SIGKILL);
            (void)::waitpid(program, &status, 0);
            break;
        }
        (void)::sigtimedwait(&ended, nullptr, &left); // told or not, the loop looks
    }
    Tell(reportTo, timedOut ? News::TimedOut : News::Ended, status);
}

timespec Monotonic(Clock::time_point deadline) {
    // steady_clock counts CLOCK_MONOTONIC.
    auto const since = deadline.time_since_epoch();
    auto const seconds = std::chrono::duration_cast<std::chrono::seconds>(since);
    auto const rest = std::chrono::duration_cast<std::chrono::nanoseconds>(since - seconds);
    return {static_cast<time_t>(seconds.count()), static_cast<long>(rest.count())};
}

std::vector<char*> Pointers(std::vector<std::string> const& texts) {
    std::vector<char*> pointers;
    pointers.reserve(texts.size() + 1);
    for (std::string const& text : texts) {
        // execve(2) takes them so, and leaves them as they are.
        pointers.push_back(const_cast<char*>(text.c_str()));
    }
    pointers.push_back(nullptr);
    return pointers;
}

/// Reads what is there. False at the end of the stream.
bool ReadSome(int from, std::string& output) {
    std::array<char, 4096> buffer = {};
    ssize_t const count = ::read(from, buffer.data(), buffer.size());
    if (count > 0) {
        std::size_t const room = mostOutput - std::min(mostOutput, output.size());
        output.append(buffer.data(), std::min(room, static_cast<std::size_t>(count)));
        return true;
    }
    return count < 0 && errno == EINTR;
}

/// Collects the output until the report comes or the process between ends without one.
bool Follow(int output, int report, Clock::time_point deadline, std::string& text, Report& result) {
    std::array<pollfd, 2> watched = {{{report, POLLIN, 0}, {output, POLLIN, 0}}};
    for (;;) {
        auto const left =
            std::chrono::ceil<std::chrono::milliseconds>(deadline - Clock::now()).count();
        if (left <= 0) {
            return false;
        }
        int const ready = ::poll(watched.data(), watched.size(),
                                 static_cast<int>(std::min<decltype(left)>(left, 60000)));
        if (ready <= 0) {
            continue; // a signal, or a look at the clock
        }
        if (watched[0].revents != 0) {
            break;
        }
        if (watched[1].revents != 0 && !ReadSome(output, text)) {
            watched[1].fd = -1;
        }
    }
    // Before what is left of the output: a daemon holds that open for as long as it likes.
    ssize_t count = 0;
    do {
        count = ::read(report, &result, sizeof result);
    } while (count < 0 && errno == EINTR);
    if (watched[1].fd >= 0 && ::fcntl(output, F_SETFL, O_NONBLOCK) == 0) {
        while (text.size() < mostOutput && ReadSome(output, text)) {
        }
    }
    return count == static_cast<ssize_t>(sizeof result);
}

} // namespace

std::string ChildProcess::Find(std::string const& program) {
    if (program.find('/') != std::string::npos) {
        return ::access(program.c_str(), X_OK) == 0 ? program : std::string();
    }
    for (char const* const folder : folders) {
        std::string path = folder + program;
        if (::access(path.c_str(), X_OK) == 0) {
            return path;
        }
    }
    return {};
}

ChildProcess::Outcome ChildProcess::Run(Task const& task, Clock::time_point deadline) {
    std::string const& program = task.arguments.front();
    std::string const path = Find(program);
    if (path.empty()) {
        throw Failure(TSLAUTH_PROVIDER_SERVICE_DOES_NOT_EXIST,
                      "the program '" + program + "' is not installed");
    }
    base::Descriptor const input(::open("/dev/null", O_RDONLY | O_CLOEXEC));
    if (!input) {
        ThrowSystemFailure("cannot open '/dev/null'", errno);
    }
    Pipe output;
    Pipe report;
    std::vector<int> descriptors = {input.Get(), output.writing.Get(), output.writing.Get()};
    for (SecretFile const* const secret : task.secrets) {
        descriptors.push_back(secret->Descriptor());
    }
    descriptors.push_back(report.writing.Get());
    std::vector<char*> const arguments = Pointers(task.arguments);
    std::vector<std::string> variables = {searchPath, "LC_ALL=C"};
    variables.insert(variables.end(), task.environment.begin(), task.environment.end());
    std::vector<char*> const environment = Pointers(variables);
    Plan const plan = {path.c_str(),
                       arguments.data(),
                       environment.data(),
                       descriptors.data(),
                       static_cast<unsigned int>(descriptors.size()),
                       ::getpid(),
                       Monotonic(deadline)};
    long made = -1;
    int error = 0;
    {
        base::SignalsBlocked const blocked;
        // No exit signal: the host gets no SIGCHLD, and its waiting for any child finds none. As
        // this process executes nothing, it stays that way until it is waited for below.
        made = ::syscall(SYS_clone, 0UL, nullptr, nullptr, nullptr, nullptr);
        if (made == 0) {
            Watch(plan);
        }
        error = errno;
    }
    if (made < 0) {
        ThrowSystemFailure("cannot start '" + program + "'", error);
    }
    output.writing.Close();
    report.writing.Close();
    Outcome outcome = {};
    Report result = {};
    bool told = false;
    try {
        told = Follow(output.reading.Get(), report.reading.Get(), deadline + grace, outcome.output,
                      result);
    } catch (...) {
        (void)::kill(static_cast<pid_t>(made), SIGKILL); // the program dies with it
        while (::waitpid(static_cast<pid_t>(made), nullptr, __WALL) < 0 && errno == EINTR) {
        }
        throw;
    }
    if (!told) {
        (void)::kill(static_cast<pid_t>(made), SIGKILL);
    }
    while (::waitpid(static_cast<pid_t>(made), nullptr, __WALL) < 0 && errno == EINTR) {
    }
    if (!told) {
        throw Failure(TSLAUTH_WINBIND_SEE_SYSTEM_LOG,
                      "the process that ran '" + program + "' ended without a word");
    }
    switch (result.news) {
    case News::NotStarted:
        ThrowSystemFailure("cannot start '" + path + "'", result.value);
    case News::TimedOut:
        outcome.timedOut = true;
        outcome.signal = SIGKILL;
        outcome.code = 128 + SIGKILL;
        break;
    case News::Ended:
        outcome.timedOut = false;
        outcome.signal = WIFSIGNALED(result.value) ? WTERMSIG(result.value) : 0;
        outcome.code = WIFEXITED(result.value) ? WEXITSTATUS(result.value) : 128 + outcome.signal;
        break;
    }
    return outcome;
}

} // namespace tessel::winbind
