// SPDX-License-Identifier: Apache-2.0
#include "Checks.h"

#include "Allocator.h"
#include "Child.h"
#include "Company.h"
#include "Directory.h"
#include "Session.h"

#include <array>
#include <chrono>
#include <clocale>
#include <csignal>
#include <cstdio>
#include <cstdlib>
#include <functional>
#include <memory>
#include <sys/time.h>
#include <thread>
#include <unistd.h>

namespace tessel::providercheck {

namespace {

typedef std::chrono::steady_clock Clock;

/// Repeats `call` up to `times`, for `time` at most. @return how often
template <typename Call> unsigned Repeat(unsigned times, std::chrono::seconds time, Call call) {
    auto const end = Clock::now() + time;
    unsigned done = 0;
    while (done < times && Clock::now() < end) {
        call();
        ++done;
    }
    return done;
}

/// A folder with nothing in it but what somebody else puts there.
class EmptyFolder {
public:
    EmptyFolder() : _path("/tmp/tslauth-provider-check-XXXXXX") {
        if (mkdtemp(_path.data()) == nullptr) {
            std::perror("tslauth-provider-check: mkdtemp");
            std::exit(2);
        }
    }
    EmptyFolder(EmptyFolder const&) = delete;
    EmptyFolder& operator=(EmptyFolder const&) = delete;
    ~EmptyFolder() {
        (void)unlink(Trap().c_str());
        (void)rmdir(_path.c_str()); // what else is in it is somebody's, and stays
    }

    std::string Trap() const {
        return _path + "/trap";
    }

private:
    std::string _path;
};

/// Runs a body in children, and keeps what they note.
class Children {
public:
    Children(Subject const& subject, Report& report) : _subject(subject), _report(report) {}

    typedef std::function<void(Session&)> Body;

    void Run(Conditions const& conditions, Body const& body) const {
        Recorder& recorder = Recorder::Make();
        RunInChild(conditions, recorder, [&](Recorder& notes) {
            Session session(_subject, notes);
            body(session);
        });
        recorder.AddTo(_report);
        Recorder::Destroy(recorder);
    }

    /// Runs `body(session, step)` for each step in one child; where one ends in the middle, the
    /// next child goes on behind it. Gives up after `mostChildren`, which tell enough.
    void RunSteps(unsigned steps, std::function<void(Session&, unsigned)> const& body) const {
        constexpr unsigned mostChildren = 4;
        Recorder& recorder = Recorder::Make();
        for (unsigned child = 0; child < mostChildren && recorder.step < steps; ++child) {
            RunInChild({_subject.profile.seconds}, recorder, [&](Recorder& notes) {
                Session session(_subject, notes);
                while (notes.step < steps) {
                    body(session, notes.step++);
                }
            });
        }
        recorder.AddTo(_report);
        Recorder::Destroy(recorder);
    }

private:
    Subject const& _subject;
    Report& _report;
};

// --- one entry at a time -------------------------------------------------------------------------

void LookAtMemory(Session& session, Entry const& entry, Arguments const& arguments) {
    if (!Allocator::Watches()) {
        return;
    }
    using namespace std::chrono_literals;
    auto const call = [&] { session.CallAndRelease(entry, arguments); };
    (void)Repeat(8, 2s, call); // what is made once is made now
    std::size_t const before = Allocator::Live();
    unsigned const calls = Repeat(64, 2s, call);
    std::size_t const after = Allocator::Live();
    if (calls < 4) {
        return; // too slow to tell a loss from a cache
    }
    session.Notes().Examined(Rule::ReleasedAll);
    if (after >= before + calls) {
        session.Notes().Found(Rule::ReleasedAll, "%s, %s: %zu more pieces of memory after %u calls",
                              entry.name, arguments.words.c_str(), after - before, calls);
    }
}

/// Whether what was handed out still says the same.
bool Stays(Answer const& answer) {
    for (std::size_t i = 0; i < answer.held.size(); ++i) {
        if (answer.texts[i] != answer.held[i]) {
            return false;
        }
    }
    return true;
}

void LookAtResults(Session& session, Entry const& entry, Kind kind) {
    Arguments const usual = UsualArguments(entry);
    Answer const first = session.Call(entry, usual);
    auto const again = [&] { session.CallAndRelease(entry, usual); };
    if (kind == Kind::CAM) {
        std::thread(again).join(); // the same thread's next call may replace it
    } else {
        again();
    }
    session.Notes().Examined(Rule::Results);
    if (!Stays(first)) {
        session.Notes().Found(Rule::Results, "%s: its result changes with the next call",
                              entry.name);
    }
    session.Release(entry, first);
}

/// Ordinary calls, one after the other, say the same but for what `during` brings.
void LookAtSameAnswer(Session& session, Entry const& entry, Rule rule, char const* words,
                      std::function<void()> const& begin, std::function<void()> const& end) {
    using namespace std::chrono_literals;
    Arguments const usual = UsualArguments(entry);
    Answer const first = session.CallAndRelease(entry, usual);
    if (!(session.CallAndRelease(entry, usual) == first)) {
        return; // it has more than one answer anyway
    }
    bool same = true;
    begin();
    (void)Repeat(16, 2s, [&] { same = session.CallAndRelease(entry, usual) == first && same; });
    end();
    session.Notes().Examined(rule);
    if (!same) {
        session.Notes().Found(rule, "%s: another answer %s", entry.name, words);
    }
}

void Nothing(int /*signal*/) {}

void LookAtSignals(Session& session, Entry const& entry) {
    struct sigaction action = {};
    struct sigaction before = {};
    action.sa_handler = &Nothing; // and no SA_RESTART
    itimerval const often = {{0, 1000}, {0, 1000}};
    itimerval const never = {};
    LookAtSameAnswer(
        session, entry, Rule::Signals, "with a signal each millisecond",
        [&] {
            (void)sigaction(SIGALRM, &action, &before);
            (void)setitimer(ITIMER_REAL, &often, nullptr);
        },
        [&] {
            (void)setitimer(ITIMER_REAL, &never, nullptr);
            (void)sigaction(SIGALRM, &before, nullptr);
        });
}

void LookAtLocales(Session& session, Entry const& entry) {
    for (char const* const locale : {"C.UTF-8", "tr_TR.UTF-8", "de_DE.UTF-8"}) {
        if (std::setlocale(LC_ALL, locale) == nullptr) {
            continue; // this host does not have it
        }
        (void)std::setlocale(LC_ALL, "C");
        std::string const words = std::string("in the locale ") + locale;
        LookAtSameAnswer(
            session, entry, Rule::Locale, words.c_str(),
            [&] { (void)std::setlocale(LC_ALL, locale); },
            [] { (void)std::setlocale(LC_ALL, "C"); });
    }
}

/// Everything about one entry, step after step.
void CheckEntry(Children const& children, Subject const& subject, std::size_t index,
                std::vector<Arguments> const& arguments) {
    typedef std::function<void(Session&, Entry const&)> Step;
    std::vector<Step> steps;
    steps.reserve(arguments.size() + 5);
    for (Arguments const& combination : arguments) {
        steps.emplace_back([&combination](Session& session, Entry const& entry) {
            session.CallAndRelease(entry, combination);
        });
    }
    Kind const kind = subject.kind;
    steps.emplace_back(
        [kind](Session& session, Entry const& entry) { LookAtResults(session, entry, kind); });
    steps.emplace_back(&LookAtSignals);
    steps.emplace_back(&LookAtLocales);
    steps.emplace_back([&arguments](Session& session, Entry const& entry) {
        LookAtMemory(session, entry, arguments.front());
    });
    steps.emplace_back([&arguments](Session& session, Entry const& entry) {
        LookAtMemory(session, entry, arguments.back());
    });
    children.RunSteps(static_cast<unsigned>(steps.size()), [&](Session& session, unsigned step) {
        Entry const& entry = session.At(index);
        if (entry.changesHost) {
            session.Notes().Examined(Rule::Changes);
        }
        steps[step](session, entry);
    });
}

void CheckEntries(Children const& children, Subject const& subject, std::uint32_t present,
                  Report& report) {
    // The parent never opens the provider: what the entries take is known without it.
    static CAMProxyClientOperationsRecord const cam = {};
    static ActiveDirectoryClientOperationsRecord const directory = {};
    auto const entries = subject.kind == Kind::CAM ? EntriesOf(cam, subject.profile)
                                                   : EntriesOf(directory, subject.profile);
    for (std::size_t i = 0; i < entries.size(); ++i) {
        bool const may = !entries[i].changesHost || subject.profile.hostMayChange;
        if ((present >> i & 1) == 0 || !may) {
            continue;
        }
        CheckEntry(children, subject, i, AllArguments(entries[i], subject.trap));
        if (!entries[i].parameters.empty()) {
            report.Examined(Rule::Injection);
        }
        if (access(subject.trap.c_str(), F_OK) == 0) {
            report.Found(Rule::Injection,
                         std::string(entries[i].name) + ": runs what an argument says");
            (void)unlink(subject.trap.c_str());
        }
    }
}

// --- opening and closing -------------------------------------------------------------------------

void CheckOpening(Children const& children, Subject const& subject) {
    Conditions const conditions = {subject.profile.seconds, Rule::Unloads, Rule::Time};
    children.Run(conditions, [](Session&) {});
    // Opened and closed within one that stays open, and alone: what was left by the one before is
    // met by the next.
    Recorder* notes = nullptr;
    children.Run(conditions, [&](Session& session) {
        notes = &session.Notes();
        for (int time = 0; time < 3; ++time) {
            for (Entry const* const entry : session.Callable(false)) {
                session.CallAndRelease(*entry, UsualArguments(*entry));
            }
            Provider const another(subject.path, subject.kind);
            notes->Examined(Rule::Unloads);
            if (!another.IsOpen()) {
                notes->Found(Rule::Unloads, "opened again: %s", another.Failure().c_str());
            }
        }
    });
}

/// What is left where nothing was looked at.
void TellWhyNot(Profile const& profile, Report& report) {
    if (!Allocator::Watches()) {
        for (Rule const rule :
             {Rule::ReleasedOnce, Rule::ReleasedOwn, Rule::ReleasedAll, Rule::Overrun}) {
            report.NotExamined(rule, "the sanitizer of this build watches the heap");
        }
    }
    report.NotExamined(Rule::Changes, profile.hostMayChange
                                          ? "it has no entry that changes the host"
                                          : "the profile does not say host-may-change");
    report.NotExamined(Rule::Joins, profile.hostMayChange && profile.HasDirectory()
                                        ? "it has no entry to join with"
                                        : "the profile names no directory that may be joined");
}

} // namespace

Report Check(std::string const& path, Profile const& profile) {
    Report report;
    TellWhyNot(profile, report);
    Recorder& recorder = Recorder::Make();
    RunInChild({profile.seconds, Rule::Loads, Rule::Loads}, recorder,
               [&path](Recorder& notes) { LookAtRecords(path, notes); });
    recorder.AddTo(report);
    auto const kind = static_cast<Kind>(recorder.kind.load());
    std::uint32_t const present = recorder.entries;
    Recorder::Destroy(recorder);
    if (kind == Kind::Unknown) {
        return report;
    }
    EmptyFolder const folder;
    Subject const subject = {path, kind, profile, folder.Trap()};
    Children const children(subject, report);
    CheckOpening(children, subject);
    CheckEntries(children, subject, present, report);
    unsigned const seconds = profile.seconds;
    children.Run({seconds + 4, Rule::Threads, Rule::Threads}, &LookAtThreads);
    children.Run({seconds + 4, Rule::Cancelled, Rule::Cancelled}, &LookAtCancelled);
    if (kind == Kind::Directory) {
        children.Run({seconds + 4, Rule::Forked, Rule::Forked}, &LookAtForked);
    } else {
        report.NotExamined(Rule::Forked, "a CAM provider is not asked for it");
    }
    if (kind == Kind::Directory && profile.hostMayChange && profile.HasDirectory()) {
        children.Run({seconds}, [&profile](Session& session) { Join(session, profile); });
        children.Run({seconds}, [&profile](Session& session) { Part(session, profile); });
    }
    return report;
}

} // namespace tessel::providercheck
