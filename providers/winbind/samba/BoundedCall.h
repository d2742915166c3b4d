// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <chrono>
#include <functional>
#include <memory>
#include <optional>
#include <string>
#include <type_traits>
#include <utility>

namespace tessel::winbind {

/// Ends the wait for a call that may hang, where the call itself cannot be ended: it runs on a
/// thread of its own, which is left alone at the deadline. Not for what needs to be undone, nor for
/// calls that refer to their caller's objects: an abandoned call goes on, with what it holds.
///
/// A process never has more than `MaximumThreads` of these threads, so that a winbindd that hangs
/// for hours does not fill it with them.
///
/// Any thread may call, and a host may fork (its child starts without threads), close the library
/// (which stays loaded) or exit while threads run: what they touch is never destroyed.
class BoundedCall {
public:
    typedef std::chrono::steady_clock Clock;

    static constexpr unsigned MaximumThreads = 8;

    /// The result of `call`, which is copied. An exception that leaves it is passed on.
    /// @param what names the call in the text of a failure
    /// @throws Failure `TSLAUTH_PROVIDER_TIMED_OUT` where the call has not ended, or not begun, by
    ///     `deadline`; at once where every thread waits for an abandoned call.
    ///     `TSLAUTH_PROVIDER_NOT_ENOUGH_MEMORY` where no thread can be made
    template <typename Call>
    static auto Run(std::string const& what, Clock::time_point deadline, Call call)
        -> std::invoke_result_t<Call&> {
        typedef std::invoke_result_t<Call&> Result;
        if constexpr (std::is_void_v<Result>) {
            Wait(what, deadline, std::move(call));
        } else {
            auto const result = std::make_shared<std::optional<Result>>();
            Wait(what, deadline,
                 [result, call = std::move(call)]() mutable { result->emplace(call()); });
            return std::move(**result); // the thread has let go of it
        }
    }

    /// How many calls nobody waits for any longer. For tests.
    static unsigned Abandoned();

private:
    static void Wait(std::string const& what, Clock::time_point deadline,
                     std::function<void()> call);
};

} // namespace tessel::winbind
