// SPDX-License-Identifier: Apache-2.0
// The questions of the store that are answered by the provider or not at all.
#include <tslauth/ActiveDirectoryStore.h>

#include "WorkerFailure.h"

#include <tslauth/Exceptions.h>
#include <tslauth/TslauthThreadUtil.h>

#include <boost/make_shared.hpp>

#include <algorithm>
#include <atomic>
#include <chrono>
#include <thread>
#include <unistd.h>
#include <utility>

namespace tessel::authentication {

namespace {

using Clock = std::chrono::steady_clock;

/// Lets one worker at a time ask a question. It holds the process's number while one does: the
/// child of a fork has no workers, and finds that of its parent.
using Turn = std::atomic<pid_t>;

/// @return false where it is not the caller's turn by `deadline`
bool Take(Turn& turn, Clock::time_point deadline) {
    pid_t const own = getpid();
    for (;;) {
        pid_t holder = turn.load();
        if (holder != own && turn.compare_exchange_strong(holder, own)) {
            return true;
        }
        if (Clock::now() >= deadline) {
            return false;
        }
        std::this_thread::sleep_for(std::chrono::milliseconds(10));
    }
}

/// The work of a worker. It gives its turn back before it reports, so that whoever was waiting for
/// the answer may ask again at once.
template <typename Answer, typename Question>
void AskInWorker(Turn& turn, RequestState& state, Answer& answer, Question const& question) {
    try {
        answer = question();
        turn = 0;
        state.Done(nullptr);
    } catch (Exception const& failure) {
        turn = 0;
        state.Done(&failure);
    } catch (...) {
        turn = 0;
        state.Done(&WorkerFailure);
    }
}

/// @param question gives the answer, on a worker; owns all that it needs
template <typename Answer, typename Question>
Answer AskNow(Turn& turn, int timeout, Question question) {
    auto const deadline = Clock::now() + std::chrono::seconds(timeout);
    if (!Take(turn, deadline)) {
        throw ProviderCallTimedOutException("Provider call timed out.");
    }
    auto const answer = boost::make_shared<Answer>();
    auto const state = boost::make_shared<RequestState>();
    try {
        TslauthThreadUtil::ScheduleThread(
            [&turn, state, answer, question] { AskInWorker(turn, *state, *answer, question); });
    } catch (...) {
        turn = 0;
        throw;
    }
    auto const left = std::chrono::ceil<std::chrono::seconds>(deadline - Clock::now());
    state->WaitResult(static_cast<int>(std::max<std::chrono::seconds::rep>(left.count(), 0)));
    return std::move(*answer);
}

/// The provider's answer, or an empty one where it does not offer the call.
template <typename Call> auto AnswerIfOffered(Call call) -> decltype(call()) {
    try {
        return call();
    } catch (CallNotImplementedException const&) {
        return {};
    }
}

Turn configurationTurn{0};
Turn trustedDomainsTurn{0};
Turn trustStateTurn{0};

} // namespace

ActiveDirectoryStoreConfiguration ActiveDirectoryStore::AskStoreConfiguration(int timeout) const {
    return AskNow<ActiveDirectoryStoreConfiguration>(
        configurationTurn, timeout, [provider = _provider] {
            ActiveDirectoryStoreConfiguration answer;
            answer.activeDomain = AnswerIfOffered([&] { return provider->GetActiveDomain(); });
            answer.preferredDomainControllers =
                AnswerIfOffered([&] { return provider->GetPreferredDomainControllers(); });
            answer.machineAccountDN =
                AnswerIfOffered([&] { return provider->GetMachineAccountDN(); });
            return answer;
        });
}

std::deque<Domain> ActiveDirectoryStore::AskTrustedDomains(int timeout) const {
    return AskNow<std::deque<Domain>>(trustedDomainsTurn, timeout, [provider = _provider] {
        return provider->GetTrustedDomains();
    });
}

int ActiveDirectoryStore::AskDomainTrustState(int timeout) const {
    return AskNow<int>(trustStateTurn, timeout,
                       [provider = _provider] { return provider->GetDomainTrustState(); });
}

} // namespace tessel::authentication
