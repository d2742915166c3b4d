// SPDX-License-Identifier: Apache-2.0
#ifndef TSLAUTHCTL_AWAIT_H
#define TSLAUTHCTL_AWAIT_H

#include <functional>
#include <memory>
#include <optional>
#include <string>
#include <utility>

/// Calls that may take long: each runs on a worker, so that the main thread can show on a terminal
/// what is waited for, can be interrupted, and can give up.
namespace tessel::tslauthctl {

class Console;
class Work;

/// How long a question's answer is waited for at most, and the name of that limit for those who may
/// want another.
struct Limit {
    static constexpr char Name[] = "--timeout";
    int seconds;
};

/// A call that has been started.
struct Pending {
    std::shared_ptr<Work> work;
    /// What completes "waiting for ...", such as "the provider to name its domain".
    std::string what;
    std::optional<Limit> limit;
};

/// Starts `work`. It may outlive whoever waits for it, so that with a limit nothing that it needs
/// may be a reference.
/// @throws Failure where no thread can be had
Pending Start(std::string what, std::optional<Limit> limit, std::function<void()> work);

/// Waits until the work has ended, and throws what it has thrown. With a limit, which counts from
/// the start, gives up when that has passed.
///
/// A signal that ends the process does so at once, after the terminal has been put in order and it
/// has been told what was interrupted.
///
/// @throws Failure (unreachable) that names the limit, where it has passed; it is listed under
///     "expired" in the JSON document as well
void Wait(Console& console, Pending const& pending);

/// A call whose answer is wanted.
template <typename Answer> struct Question {
    Pending pending;
    std::shared_ptr<std::optional<Answer>> answer;
};

template <typename Call> auto StartAsking(std::string what, Limit limit, Call call) {
    using Answer = decltype(call());
    auto const answer = std::make_shared<std::optional<Answer>>();
    return Question<Answer>{
        Start(std::move(what), limit, [answer, call] { answer->emplace(call()); }), answer};
}

template <typename Answer> Answer AnswerTo(Console& console, Question<Answer> const& question) {
    Wait(console, question.pending);
    return std::move(**question.answer);
}

/// Starts and waits.
template <typename Call> auto Ask(Console& console, std::string what, Limit limit, Call call) {
    return AnswerTo(console, StartAsking(std::move(what), limit, std::move(call)));
}

/// Runs `act` right before a signal ends the process in `Wait`.
void BeforeInterruption(std::function<void()> act);

/// Whether a call was given up and may still run: the process must then end without running
/// destructors, which would pull the provider away from under it.
bool HasAbandonedCalls() noexcept;

} // namespace tessel::tslauthctl

#endif
