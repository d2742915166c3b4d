// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "Arguments.h"
#include "Entries.h"
#include "ProcessState.h"
#include "Provider.h"

#include <string>
#include <vector>

namespace tessel::providercheck {

/// What every check is told.
struct Subject {
    std::string path;
    Kind kind;
    Profile profile;
    std::string trap; ///< a path that no call may make
};

/// A provider in a child, from its opening to its closing: whatever it does there is written down.
/// One at a time in a process.
class Session {
public:
    Session(Subject const& subject, Recorder& recorder);
    Session(Session const&) = delete;
    Session& operator=(Session const&) = delete;
    /// Closes the provider, and looks for what it leaves behind.
    ~Session();

    Entry const& At(std::size_t index) const {
        return _entries[index];
    }
    /// Those that are there and may be called here; without `changes`, those that only ask.
    std::vector<Entry const*> Callable(bool changes) const;

    /// Calls an entry and judges its answer, which the caller releases. An answer without a code
    /// and texts where an exception came.
    Answer Call(Entry const& entry, Arguments const& arguments);
    /// The same, and releases it.
    Answer CallAndRelease(Entry const& entry, Arguments const& arguments);
    void Release(Entry const& entry, Answer const& answer);

    /// Calls it on a thread that has company: writes down what must never be, and nothing of what
    /// it is called with. Does not tell when it begins.
    void CallAmongOthers(Entry const& entry, std::vector<char const*> const& texts);

    /// What calls have left behind is not looked for: they were not let come to their end.
    void ForgiveLeftovers() {
        _leavesNothing = false;
    }

    Recorder& Notes() {
        return _recorder;
    }

private:
    void Judge(Entry const& entry, Arguments const& arguments, Answer const& answer);
    void LookAtLastFailure(Arguments const& arguments, Entry const& entry);

    Subject const& _subject;
    Recorder& _recorder;
    ProcessState const _before;
    Provider _provider;
    std::vector<Entry> _entries;
    bool _leavesNothing = true;
};

} // namespace tessel::providercheck
