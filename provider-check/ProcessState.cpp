// SPDX-License-Identifier: Apache-2.0
#include "ProcessState.h"

#include <cerrno>
#include <clocale>
#include <cstring>
#include <ctime>
#include <dirent.h>
#include <fstream>
#include <linux/limits.h>
#include <memory>
#include <sys/wait.h>
#include <unistd.h>

namespace tessel::providercheck {

namespace {

std::set<std::string> NamesIn(char const* folder) {
    std::set<std::string> names;
    std::unique_ptr<DIR, int (*)(DIR*)> const directory(opendir(folder), &closedir);
    if (directory == nullptr) {
        return names;
    }
    std::string const own = std::to_string(dirfd(directory.get()));
    while (dirent const* const entry = readdir(directory.get())) {
        if (entry->d_name[0] != '.' && entry->d_name != own) {
            names.insert(entry->d_name);
        }
    }
    return names;
}

std::string Target(std::string const& descriptor) {
    char target[PATH_MAX];
    std::string const link = "/proc/self/fd/" + descriptor;
    ssize_t const length = readlink(link.c_str(), target, sizeof target);
    return length < 0 ? std::string("?") : std::string(target, static_cast<std::size_t>(length));
}

std::string Umask() {
    std::ifstream status("/proc/self/status");
    for (std::string line; std::getline(status, line);) {
        if (line.rfind("Umask:", 0) == 0) {
            return line;
        }
    }
    return {};
}

std::string Environment() {
    std::string all;
    for (char** variable = environ; *variable != nullptr; ++variable) {
        all += *variable;
        all += '\n';
    }
    return all;
}

std::string Folder() {
    char folder[PATH_MAX];
    return getcwd(folder, sizeof folder) == nullptr ? std::string() : std::string(folder);
}

/// Whether `condition` comes true within a second.
template <typename Condition> bool Soon(Condition condition) {
    timespec const pause = {0, 10000000};
    for (int i = 0; i < 100; ++i) {
        if (condition()) {
            return true;
        }
        (void)nanosleep(&pause, nullptr); // sooner does no harm
    }
    return condition();
}

/// Whether there is no child, once those that have ended are reaped.
bool NoChild() {
    pid_t child = 0;
    do {
        child = waitpid(-1, nullptr, WNOHANG);
    } while (child > 0);
    return child < 0 && errno == ECHILD;
}

bool SameHandler(struct sigaction const& left, struct sigaction const& right) {
    constexpr int ofTheCLibrary = 0x04000000; // SA_RESTORER, where it has set a handler
    return left.sa_handler == right.sa_handler &&
           (left.sa_flags | ofTheCLibrary) == (right.sa_flags | ofTheCLibrary);
}

void Compare(char const* what, std::string const& before, std::string const& now,
             Recorder& recorder) {
    if (before != now) {
        recorder.Found(Rule::Process, "the %s has changed", what);
    }
}

} // namespace

std::size_t ProcessState::Threads() {
    return NamesIn("/proc/self/task").size();
}

ProcessState ProcessState::Now() {
    ProcessState state;
    state._descriptors = NamesIn("/proc/self/fd");
    state._threads = Threads();
    for (int signal = 1; signal <= 64; ++signal) {
        // The C library's own two are refused, and stay as they are.
        (void)sigaction(signal, nullptr, &state._handlers[static_cast<std::size_t>(signal)]);
    }
    (void)pthread_sigmask(SIG_BLOCK, nullptr, &state._mask);
    state._locale = std::setlocale(LC_ALL, nullptr);
    state._folder = Folder();
    state._umask = Umask();
    state._environment = Environment();
    return state;
}

void ProcessState::LookForChanges(Recorder& recorder) const {
    recorder.Examined(Rule::ThreadsLeft);
    if (!Soon([this] { return Threads() <= _threads; })) {
        recorder.Found(Rule::ThreadsLeft, "%zu threads are left", Threads() - _threads);
    }
    recorder.Examined(Rule::Children);
    if (!Soon(&NoChild)) {
        recorder.Found(Rule::Children, "a process that it started is still there");
    }
    ProcessState const now = Now();
    recorder.Examined(Rule::Descriptors);
    if (now._descriptors.empty()) {
        recorder.Found(Rule::Descriptors, "there is none left to look for them with");
        return;
    }
    for (std::string const& descriptor : now._descriptors) {
        if (_descriptors.count(descriptor) == 0) {
            recorder.Found(Rule::Descriptors, "a descriptor of %s is open",
                           Target(descriptor).c_str());
        }
    }
    for (std::string const& descriptor : _descriptors) {
        if (now._descriptors.count(descriptor) == 0) {
            recorder.Found(Rule::Descriptors, "descriptor %s of the process was closed",
                           descriptor.c_str());
        }
    }
    recorder.Examined(Rule::Process);
    for (std::size_t signal = 1; signal < _handlers.size(); ++signal) {
        if (!SameHandler(_handlers[signal], now._handlers[signal])) {
            recorder.Found(Rule::Process, "the handler of %s has changed",
                           strsignal(static_cast<int>(signal)));
        }
    }
    for (int signal = 1; signal <= 64; ++signal) {
        if (sigismember(&_mask, signal) != sigismember(&now._mask, signal)) {
            recorder.Found(Rule::Process, "the mask of %s has changed", strsignal(signal));
        }
    }
    Compare("locale", _locale, now._locale, recorder);
    Compare("working folder", _folder, now._folder, recorder);
    Compare("umask", _umask, now._umask, recorder);
    Compare("environment", _environment, now._environment, recorder);
}

} // namespace tessel::providercheck
