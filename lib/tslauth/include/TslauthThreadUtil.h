// SPDX-License-Identifier: Apache-2.0
#ifndef TSLAUTH_TSLAUTHTHREADUTIL_H
#define TSLAUTH_TSLAUTHTHREADUTIL_H

#include "Export.h"

#include <boost/function.hpp>

namespace tessel {
namespace authentication {

/// Starts the library's worker threads.
class TSLAUTH_EXPORT TslauthThreadUtil {
public:
    /// Runs a copy of `call` once on a new, detached thread, and returns as soon as the thread is
    /// started. What `call` holds is released when it has run.
    ///
    /// An exception that leaves `call` ends the process: it has to report its own failures.
    /// @throws ThreadErrorException where no thread can be created; then the copy has been
    ///     released. Its message is "Thread Error: " + "pthread_create failed. RC=" without as many
    ///     leading characters as the error number (pthread_create(3)) says; support tools know the
    ///     texts.
    static void ScheduleThread(boost::function<void()> call);
};

} // namespace authentication
} // namespace tessel

#endif
