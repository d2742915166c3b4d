/* SPDX-License-Identifier: Apache-2.0 */
/* Holds a lock while it waits, and cannot be cancelled then; the process forks all the same. */
#define _POSIX_C_SOURCE 200809L
#include "Converting.h"

#include <pthread.h>
#include <time.h>

static pthread_mutex_t lock = PTHREAD_MUTEX_INITIALIZER;

static int Convert(char const* name, char** canonicalName,
                   ActiveDirectoryClientFreeFunction* release) {
    struct timespec const time = {0, 1000000};
    int before;
    (void)pthread_setcancelstate(PTHREAD_CANCEL_DISABLE, &before);
    (void)pthread_mutex_lock(&lock);
    (void)nanosleep(&time, NULL); /* how long does not matter */
    (void)pthread_mutex_unlock(&lock);
    (void)pthread_setcancelstate(before, NULL);
    (void)name;
    return HandOut("checked", canonicalName, release);
}
