// SPDX-License-Identifier: Apache-2.0
#ifndef TSLAUTH_MUTEXLOCK_H
#define TSLAUTH_MUTEXLOCK_H

#include <pthread.h>

namespace tessel::authentication {

/// Holds a mutex for a scope, so that no exception leaves with it held. The mutexes are those of
/// the class layouts, plain POSIX ones; locking them cannot fail.
class MutexLock {
public:
    explicit MutexLock(pthread_mutex_t& mutex) : _mutex(mutex) {
        pthread_mutex_lock(&_mutex);
    }
    MutexLock(MutexLock const&) = delete;
    MutexLock& operator=(MutexLock const&) = delete;
    ~MutexLock() {
        pthread_mutex_unlock(&_mutex);
    }

private:
    pthread_mutex_t& _mutex;
};

} // namespace tessel::authentication

#endif
