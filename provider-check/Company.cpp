// SPDX-License-Identifier: Apache-2.0
#include "Company.h"

#include "GuardedText.h"

#include <array>
#include <atomic>
#include <chrono>
#include <csignal>
#include <cstring>
#include <ctime>
#include <memory>
#include <pthread.h>
#include <sys/wait.h>
#include <thread>
#include <unistd.h>

namespace tessel::providercheck {

namespace {

typedef std::chrono::steady_clock Clock;

/// How long calls that have company go on.
constexpr std::chrono::seconds shortTime(2);

/// The usual texts of an entry, that many threads read.
class UsualTexts {
public:
    explicit UsualTexts(Entry const& entry) {
        for (std::optional<std::string> const& text : UsualArguments(entry).texts) {
            if (text) {
                _texts.push_back(std::make_unique<GuardedText>(*text));
            }
            _pointers.push_back(text ? _texts.back()->Get() : nullptr);
        }
    }
    std::vector<char const*> const& Get() const {
        return _pointers;
    }

private:
    std::vector<std::unique_ptr<GuardedText>> _texts;
    std::vector<char const*> _pointers;
};

void Sleep(long nanoseconds) {
    timespec const time = {0, nanoseconds};
    (void)nanosleep(&time, nullptr); // how long does not matter
}

/// Calls all of `entries` once, each told by `words`.
void CallEach(Session& session, std::vector<Entry const*> const& entries, char const* words) {
    for (Entry const* const entry : entries) {
        Arguments usual = UsualArguments(*entry);
        usual.words = words;
        session.CallAndRelease(*entry, usual);
    }
}

struct Cancellable {
    Session& session;
    Entry const& entry;
    UsualTexts texts;
    std::atomic<bool> runs{false};
};

void* CallUntilCancelled(void* argument) {
    auto& cancellable = *static_cast<Cancellable*>(argument);
    for (;;) {
        cancellable.runs = true;
        cancellable.session.CallAmongOthers(cancellable.entry, cancellable.texts.Get());
        pthread_testcancel();
    }
}

void CancelInside(Session& session, Entry const& entry, long delay) {
    Cancellable cancellable = {session, entry, UsualTexts(entry)};
    pthread_t thread;
    session.Notes().Begin("%s, cancelled", entry.name);
    if (pthread_create(&thread, nullptr, &CallUntilCancelled, &cancellable) != 0) {
        return; // no thread, no finding
    }
    while (!cancellable.runs) {
        Sleep(10000);
    }
    Sleep(delay);
    (void)pthread_cancel(thread);
    (void)pthread_join(thread, nullptr);
    session.Notes().End();
    session.Notes().Examined(Rule::Cancelled);
}

/// In the child of a process that forked: its other threads are not there.
[[noreturn]] void AskInForked(Session& session, std::vector<Entry const*> const& entries) {
    CallEach(session, entries, "in the child of a process that forked");
    _exit(0);
}

} // namespace

void LookAtThreads(Session& session) {
    constexpr std::size_t threadCount = 32;
    constexpr unsigned rounds = 25;
    auto const entries = session.Callable(true);
    std::vector<std::unique_ptr<UsualTexts>> texts;
    texts.reserve(entries.size());
    for (Entry const* const entry : entries) {
        texts.push_back(std::make_unique<UsualTexts>(*entry));
    }
    session.Notes().Begin("%zu threads at once", threadCount);
    auto const end = Clock::now() + shortTime;
    std::atomic<bool> go{false};
    std::vector<std::thread> threads;
    for (std::size_t thread = 0; thread < threadCount; ++thread) {
        threads.emplace_back([&, thread] {
            while (!go) {
                std::this_thread::yield();
            }
            for (unsigned round = 0; round < rounds && Clock::now() < end; ++round) {
                for (std::size_t i = 0; i < entries.size(); ++i) {
                    std::size_t const own = (i + thread) % entries.size(); // not in step
                    session.CallAmongOthers(*entries[own], texts[own]->Get());
                }
            }
        });
    }
    go = true;
    for (std::thread& thread : threads) {
        thread.join();
    }
    session.Notes().End();
}

void LookAtCancelled(Session& session) {
    constexpr std::array<long, 8> delays = {0, 20000, 100000, 500000, 0, 50000, 200000, 2000000};
    session.ForgiveLeftovers();
    auto const entries = session.Callable(false);
    auto const end = Clock::now() + shortTime;
    for (long const delay : delays) {
        for (Entry const* const entry : entries) {
            if (Clock::now() < end) {
                CancelInside(session, *entry, delay);
            }
        }
    }
    CallEach(session, entries, "after other threads were cancelled");
}

void LookAtForked(Session& session) {
    auto const entries = session.Callable(false);
    if (entries.empty()) {
        return;
    }
    session.Notes().Begin("threads of a process that forks");
    std::atomic<bool> stop{false};
    std::vector<std::thread> threads;
    for (std::size_t thread = 0; thread < 4; ++thread) {
        threads.emplace_back([&, thread] {
            UsualTexts const texts(*entries[thread % entries.size()]);
            while (!stop) {
                session.CallAmongOthers(*entries[thread % entries.size()], texts.Get());
            }
        });
    }
    auto const end = Clock::now() + shortTime;
    for (int time = 0; time < 24 && Clock::now() < end; ++time) {
        Sleep(1000000 + time * 100000);
        pid_t const child = fork();
        if (child == 0) {
            AskInForked(session, entries);
        }
        int status = 0;
        session.Notes().Examined(Rule::Forked);
        if (child > 0 && waitpid(child, &status, 0) == child && WIFSIGNALED(status)) {
            session.Notes().Found(Rule::Forked, "%s: %s", session.Notes().Doing(),
                                  strsignal(WTERMSIG(status)));
        }
    }
    stop = true;
    session.Notes().Begin("threads of a process that forked");
    for (std::thread& thread : threads) {
        thread.join();
    }
    session.Notes().End();
}

} // namespace tessel::providercheck
