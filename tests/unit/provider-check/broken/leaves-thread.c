/* SPDX-License-Identifier: Apache-2.0 */
/* Starts a thread as soon as it is opened. */
#define _POSIX_C_SOURCE 200809L
#include "Converting.h"

#include <pthread.h>
#include <unistd.h>

/* It waits in the C library, so that it stays when the code of this one is gone. */
__attribute__((constructor)) static void Begin(void) {
    int (*const wait)(void) = pause;
    void* (*routine)(void*);
    pthread_t thread;
    memcpy(&routine, &wait, sizeof routine);
    if (pthread_create(&thread, NULL, routine, NULL) == 0) {
        (void)pthread_detach(thread);
    }
}

static int Convert(char const* name, char** canonicalName,
                   ActiveDirectoryClientFreeFunction* release) {
    (void)name;
    return HandOut("checked", canonicalName, release);
}
