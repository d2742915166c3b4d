/* SPDX-License-Identifier: Apache-2.0 */
/*
 * A daemon with an event loop: says on its standard output how the host's trust in its domain is,
 * each time that it changes, and never blocks for an answer. SIGTERM ends it.
 *
 *   cc -std=c99 trust-watch.c $(pkg-config --cflags --libs tslauth-c)
 */
#define _GNU_SOURCE /* signalfd */

#include <tslauth/tslauth_c.h>

#include <poll.h>
#include <signal.h>
#include <stdio.h>
#include <stdlib.h>
#include <sys/signalfd.h>
#include <unistd.h>

enum { PAUSE_MILLISECONDS = 1000, ANSWER_SECONDS = 10 };

static void Complain(tslauth_error* error) {
    (void)fprintf(stderr, "trust-watch: %s\n", tslauth_error_get_text(error));
    tslauth_error_free(error);
}

/* What has come of a question; `*last` is the state that was told last. */
static void Take(tslauth_job* job, int* last) {
    tslauth_answer* answer = NULL;
    tslauth_error* error = NULL;
    int state;
    if (tslauth_job_finish(job, &answer, &error) != 0) {
        Complain(error);
        return;
    }
    state = tslauth_answer_trust_state(answer);
    if (state != *last) {
        (void)printf("trust state %d, %.0f s old\n", state, tslauth_answer_get_age(answer));
        (void)fflush(stdout); /* a reader that is gone ends us with SIGPIPE */
        *last = state;
    }
    tslauth_answer_free(answer);
}

int main(void) {
    tslauth_directory* directory = NULL;
    tslauth_error* error = NULL;
    tslauth_job* job = NULL;
    int last = -1;
    struct pollfd events[2] = {{-1, POLLIN, 0}, {-1, POLLIN, 0}};
    sigset_t ends;
    (void)sigemptyset(&ends);
    (void)sigaddset(&ends, SIGTERM);
    (void)sigprocmask(SIG_BLOCK, &ends, NULL);
    events[0].fd = signalfd(-1, &ends, SFD_CLOEXEC);
    if (events[0].fd < 0) {
        perror("trust-watch: signalfd");
        return EXIT_FAILURE;
    }
    if (tslauth_directory_open(ANSWER_SECONDS, &directory, &error) != 0) {
        Complain(error);
        return EXIT_FAILURE;
    }
    for (;;) {
        if (job == NULL) {
            if (tslauth_job_ask(directory, TSLAUTH_QUESTION_TRUST_STATE, &job, &error) != 0) {
                Complain(error);
                job = NULL;
            }
        }
        events[1].fd = job == NULL ? -1 : tslauth_job_descriptor(job);
        if (poll(events, 2, job == NULL ? PAUSE_MILLISECONDS : -1) < 0) {
            continue;
        }
        if (events[0].revents != 0) {
            break;
        }
        if (job != NULL && events[1].revents != 0) {
            Take(job, &last);
            job = NULL;
            if (poll(events, 1, PAUSE_MILLISECONDS) > 0) {
                break;
            }
        }
    }
    if (job != NULL) {
        tslauth_job_abandon(job);
    }
    tslauth_directory_free(directory);
    (void)close(events[0].fd);
    return EXIT_SUCCESS;
}
