// SPDX-License-Identifier: Apache-2.0
#ifndef TSLAUTH_TESTS_TIMEDWAIT_H
#define TSLAUTH_TESTS_TIMEDWAIT_H

#include <pthread.h>

// For tests that answer in the place of pthread_cond_timedwait, to which the linker sends its
// callers (--wrap). With times of 64 bits, a 32-bit process calls it by another name.
#ifdef __USE_TIME_BITS64
#define __real_pthread_cond_timedwait __real___pthread_cond_timedwait64
#define __wrap_pthread_cond_timedwait __wrap___pthread_cond_timedwait64
#endif

#endif
