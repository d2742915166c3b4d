// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "Handles.h"

#include <tslauth/ActiveDirectoryStore.h>

#include <array>
#include <chrono>
#include <memory>
#include <mutex>
#include <optional>

struct tslauth_answer {
    double age = 0;
    std::vector<std::pair<std::string, std::string>> domains; ///< DNS name, NetBIOS name
    tslauth_texts controllers;
    std::string machineAccount;
    int trustState = 0;
};

namespace tessel::tslauth_c {

/// A text that nobody else may read: wiped when it goes.
class Secret {
public:
    /// @param text may be null
    explicit Secret(char const* text);
    Secret(Secret const&) = delete;
    Secret& operator=(Secret const&) = delete;
    ~Secret();
    char const* Get() const {
        return _isNull ? nullptr : _text.c_str();
    }

private:
    bool _isNull;
    std::string _text;
};

/// The store behind a handle, and what it was last told. Jobs own it as well. Any thread may call.
class Directory {
public:
    explicit Directory(int seconds);

    void Join(std::string const& domain, char const* user, char const* password, unsigned flags);
    void JoinThroughCAM(std::string const& server, std::string const& unit, unsigned flags);
    void Part(char const* user, char const* password);
    tslauth_answer Ask(tslauth_question question);

private:
    typedef std::chrono::steady_clock Clock;
    struct Remembered {
        tslauth_answer answer;
        Clock::time_point given;
    };

    tslauth_answer AskNow(tslauth_question question) const;

    authentication::ActiveDirectoryStore _store;
    int const _seconds;
    std::mutex _lock; // guards what is remembered
    std::array<std::optional<Remembered>, 3> _last;
};

} // namespace tessel::tslauth_c

struct tslauth_directory {
    std::shared_ptr<tessel::tslauth_c::Directory> directory;
};
