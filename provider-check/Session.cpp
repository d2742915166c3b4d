// SPDX-License-Identifier: Apache-2.0
#include "Session.h"

#include "Allocator.h"
#include "GuardedText.h"
#include "ProcessState.h"
#include "SystemLog.h"

#include <ThrowMappedException.h>

#include <csignal>
#include <cstdio>
#include <cstring>
#include <cxxabi.h>
#include <exception>
#include <memory>
#include <unistd.h>

namespace tessel::providercheck {

namespace {

/// For what has no other way to it.
Recorder* notes = nullptr;

void TellFault(Allocator::Fault fault, void const* /*memory*/, std::size_t size) {
    switch (fault) {
    case Allocator::Fault::ReleasedTwice:
        notes->Found(Rule::ReleasedOnce, "%s: %zu bytes are released twice", notes->Doing(), size);
        return;
    case Allocator::Fault::NeverAllocated:
        notes->Found(Rule::ReleasedOwn, "%s: what is released was never allocated", notes->Doing());
        return;
    case Allocator::Fault::Overrun:
        notes->Found(Rule::Overrun, "%s: something stands behind a piece of %zu bytes",
                     notes->Doing(), size);
        return;
    case Allocator::Fault::WrittenAfterRelease:
        notes->Found(Rule::Overrun, "%s: %zu bytes were written to after their release",
                     notes->Doing(), size);
        return;
    }
}

/// Tells arguments from other memory; anything else ends the process as it would without it.
void TellAccess(int signal, siginfo_t* information, void* /*context*/) {
    if (GuardedText::IsGuarded(information->si_addr)) {
        notes->Found(Rule::Arguments,
                     "%s: an argument is written to, read beyond its end, or read after the call",
                     notes->Doing());
        notes->explained = true;
        _exit(0);
    }
    struct sigaction plain = {};
    plain.sa_handler = SIG_DFL;
    (void)sigaction(signal, &plain, nullptr); // the access is made again, and ends the process
}

void WatchAccess() {
    struct sigaction action = {};
    action.sa_sigaction = &TellAccess;
    action.sa_flags = SA_SIGINFO;
    (void)sigaction(SIGSEGV, &action, nullptr);
    (void)sigaction(SIGBUS, &action, nullptr);
}

ProcessState StateBeforeOpening(Recorder& recorder) {
    notes = &recorder;
    if (Allocator::Watches()) {
        WatchAccess(); // a sanitizer has its own handlers
    }
    Allocator::Watch(&TellFault);
    return ProcessState::Now();
}

bool IsInTable(Kind kind, unsigned code) {
    if (kind == Kind::Directory) {
        return authentication::FindMappedException(code).code == code;
    }
    switch (static_cast<int>(code)) {
    case TSLAUTH_CAM_PROVIDER_NOT_ENOUGH_MEMORY:
    case TSLAUTH_CAM_PROVIDER_CONNECTION_REFUSED:
    case TSLAUTH_CAM_PROVIDER_CONNECTION_INVALID:
    case TSLAUTH_CAM_PROVIDER_TIMED_OUT:
    case TSLAUTH_CAM_PROVIDER_INVALID_CERTIFICATE:
        return true;
    default:
        return false;
    }
}

/// An answer of `entry`, or what left it.
Answer Guarded(Entry const& entry, std::vector<char const*> const& texts, Recorder& recorder) {
    recorder.Examined(Rule::Exception);
    try {
        return entry.call(texts);
    } catch (abi::__forced_unwind const&) {
        throw; // the thread is being cancelled
    } catch (std::exception const& exception) {
        recorder.Found(Rule::Exception, "%s: %s", recorder.Doing(), exception.what());
    } catch (...) {
        recorder.Found(Rule::Exception, "%s: one that is no std::exception", recorder.Doing());
    }
    return {};
}

} // namespace

Session::Session(Subject const& subject, Recorder& recorder)
    : _subject(subject), _recorder(recorder), _before(StateBeforeOpening(recorder)),
      _provider(subject.path, subject.kind),
      _entries(EntriesOf(_provider, subject.kind, subject.profile)) {
    SystemLog::Watch(&recorder, {CheckedSecret, subject.profile.password});
}

Session::~Session() {
    _recorder.Begin("closing it");
    _entries.clear();
    _provider.Close();
    _recorder.End();
    _recorder.Examined(Rule::Unloads);
    if (Allocator::Watches()) {
        _recorder.Examined(Rule::Overrun);
        Allocator::LookAtReleased();
    }
    if (_leavesNothing) {
        _before.LookForChanges(_recorder);
    }
}

std::vector<Entry const*> Session::Callable(bool changes) const {
    std::vector<Entry const*> callable;
    for (Entry const& entry : _entries) {
        bool const may = !entry.changesHost || (changes && _subject.profile.hostMayChange);
        if (entry.call && may) {
            callable.push_back(&entry);
        }
    }
    return callable;
}

Answer Session::Call(Entry const& entry, Arguments const& arguments) {
    std::vector<std::unique_ptr<GuardedText>> texts;
    std::vector<char const*> pointers;
    for (std::optional<std::string> const& text : arguments.texts) {
        if (text) {
            texts.push_back(std::make_unique<GuardedText>(*text));
        }
        pointers.push_back(text ? texts.back()->Get() : nullptr);
    }
    _recorder.Begin("%s, %s", entry.name, arguments.words.c_str());
    Answer answer = Guarded(entry, pointers, _recorder);
    _recorder.End();
    if (!texts.empty()) {
        _recorder.Examined(Rule::Arguments);
    }
    Judge(entry, arguments, answer);
    return answer;
}

Answer Session::CallAndRelease(Entry const& entry, Arguments const& arguments) {
    Answer answer = Call(entry, arguments);
    Release(entry, answer);
    return answer;
}

void Session::Release(Entry const& entry, Answer const& answer) {
    if (!answer.release) {
        return;
    }
    if (Allocator::Watches()) {
        _recorder.Examined(Rule::ReleasedOnce);
        _recorder.Examined(Rule::ReleasedOwn);
    }
    _recorder.Begin("releasing what %s handed out", entry.name);
    answer.release();
    _recorder.End();
}

void Session::CallAmongOthers(Entry const& entry, std::vector<char const*> const& texts) {
    Answer const answer = Guarded(entry, texts, _recorder);
    if (!answer.flaw.empty()) {
        _recorder.Found(Rule::Results, "%s: %s", entry.name, answer.flaw.c_str());
    }
    if (answer.release) {
        answer.release();
    }
}

void Session::Judge(Entry const& entry, Arguments const& arguments, Answer const& answer) {
    _recorder.Examined(Rule::Results);
    if (!answer.flaw.empty()) {
        _recorder.Found(Rule::Results, "%s, %s: %s", entry.name, arguments.words.c_str(),
                        answer.flaw.c_str());
    }
    if (!answer.code) {
        return;
    }
    auto const code = static_cast<unsigned>(*answer.code);
    _recorder.Examined(Rule::Code);
    if (code == 0) {
        return;
    }
    if (!IsInTable(_subject.kind, code) && _subject.profile.codes.count(code) == 0) {
        _recorder.Found(Rule::Code, "%s: %u (0x%08x), with %s", entry.name, code, code,
                        arguments.words.c_str());
    }
    _recorder.Examined(Rule::Slots);
    if (answer.handedOutOnFailure) {
        _recorder.Found(Rule::Slots, "%s, %s: fails with %u, and hands something out", entry.name,
                        arguments.words.c_str(), code);
    }
    LookAtLastFailure(arguments, entry);
}

void Session::LookAtLastFailure(Arguments const& arguments, Entry const& entry) {
    auto const lastFailure = _provider.LastFailure();
    if (lastFailure == nullptr) {
        return;
    }
    _recorder.Begin("ActiveDirectoryClientLastFailure after %s, %s", entry.name,
                    arguments.words.c_str());
    char const* const text = lastFailure();
    if (text != nullptr) {
        SystemLog::LookAt(text);
    }
    _recorder.End();
}

} // namespace tessel::providercheck
