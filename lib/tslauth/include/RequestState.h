// SPDX-License-Identifier: Apache-2.0
#ifndef TSLAUTH_REQUESTSTATE_H
#define TSLAUTH_REQUESTSTATE_H

#include "Exception.h"
#include "Export.h"

#include <memory>
#include <pthread.h>

namespace tessel {
namespace authentication {

/// Where a worker thread and the thread that waits for it meet. Both hold it through a
/// `boost::shared_ptr`, so that the waiter may give up and leave while the worker runs on.
///
/// It carries the end of the work and its failure, not its result: the worker stores that, under
/// the result's own lock, before it calls `Done`.
class TSLAUTH_EXPORT RequestState {
public:
    RequestState();
    RequestState(RequestState const&) = delete;
    RequestState& operator=(RequestState const&) = delete;
    ~RequestState();

    /// Called by the worker, once, when its work has ended. `failure` is null on success; otherwise
    /// a copy of it is kept, and the object stays the caller's. Never throws: where the copy cannot
    /// be made, the waiter is told of an internal error.
    void Done(Exception const* failure) noexcept;

    /// Waits until the work has ended. May be called again, and after `Done`; it then answers at
    /// once and in the same way.
    /// @param timeoutSeconds how long to wait at most, on the system's wall clock; 0 or less does
    ///     not wait. A limit beyond what the clock can count waits as long as it can count.
    /// @throws the worker's failure, as its own class
    /// @throws ProviderCallTimedOutException where the time has passed first
    /// @throws ThreadErrorException where the wait itself fails. Its message is "Thread Error: " +
    ///     "pthread_cond_timedwait failed. RC=" without as many leading characters as the error
    ///     number (pthread_cond_timedwait(3)) says; support tools know the texts.
    /// @throws InternalErrorException where the worker's failure could not be kept
    void WaitResult(int timeoutSeconds);

private:
    bool _done;
    std::unique_ptr<Exception> _failure;
    pthread_mutex_t _mutex;
    pthread_cond_t _condition;
    bool _failureLost; // for lack of memory
};

} // namespace authentication
} // namespace tessel

#endif
