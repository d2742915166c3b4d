// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "Failure.h"
#include "host/SystemLog.h"
#include "questions/Questions.h"
#include "tslauth_winbind_provider.h"

#include <tslauth/Domain.h>

#include <mutex>
#include <optional>
#include <string>
#include <utility>

namespace tessel::winbind {

/// Guards every last answer of the process, also across a fork.
std::mutex& LastAnswerLock();

/// What a controller has last answered to one question in this process, for as long as none
/// answers: a host that was told its trusted domains has not lost them because its network is down.
/// Any thread may ask.
template <typename Answer> class LastAnswer {
public:
    /// What `ask` returns; where it fails because no controller answers, what it returned last.
    /// @param own the host's domain: an answer about another one is forgotten
    /// @throws Failure that of `ask`, where there is no last answer or a controller has refused
    template <typename Question>
    Answer Get(authentication::Domain const& own, Question const& ask) {
        try {
            Answer answer = ask();
            std::lock_guard<std::mutex> const guard(LastAnswerLock());
            _last.emplace(own, answer);
            return answer;
        } catch (Failure const& failure) {
            if (TrustStateOf(failure.Code()) != TSLAUTH_WINBIND_TRUST_NO_CONTROLLER) {
                throw;
            }
            std::lock_guard<std::mutex> const guard(LastAnswerLock());
            if (!_last || _last->first != own) {
                throw;
            }
            LogWarning(std::string("answered from memory: ") + failure.what());
            return _last->second;
        }
    }

private:
    std::optional<std::pair<authentication::Domain, Answer>> _last;
};

} // namespace tessel::winbind
