/* SPDX-License-Identifier: Apache-2.0 */
#ifndef TSLAUTH_C_H
#define TSLAUTH_C_H

/*
 * libtslauth for C, and for languages that speak C: libtslauth-c.so. What a call does and when it
 * fails stands at the C++ class that it names (<tslauth/...>); this file says what is different.
 *
 * Handles are opaque. Whoever gets one frees it with its own function, which takes null as well;
 * a text that an accessor returns is the handle's, and lives as long.
 *
 * Failures. A function that can fail returns 0, or -1 and stores what has happened in `*error`,
 * which its caller frees; `error` may be null. No C++ exception leaves a call. Result slots stay as
 * they were where a call fails.
 *
 * Threads. Any function may be called on any thread at any time. One plan, answer, error, list or
 * job is for one thread at a time; a directory may be used by many at once. The children of a
 * process that forked use directories that they have opened themselves.
 *
 * Changes hold the host's lock (`HostLock`), so that they wait for tslauthctl and it for them, and
 * edit files without loss (`EditForm::Lossless`). They need root.
 *
 * Texts are bytes, ended by a zero byte; no encoding is assumed or converted.
 *
 * Versions. Functions and enumerators are added and never changed or removed within a SONAME;
 * TSLAUTH_C_VERSION grows with them, and tslauth_c_version() tells what is loaded.
 *
 * The file is C99, and C++11 or later.
 */

#include <stddef.h>

#ifdef __cplusplus
extern "C" {
#endif

#define TSLAUTH_C_VERSION 1
#define TSLAUTH_C_EXPORT __attribute__((visibility("default")))

TSLAUTH_C_EXPORT unsigned tslauth_c_version(void);

/* ---- Failures ---- */

typedef struct tslauth_error tslauth_error;

/* What a caller can do about one. Others may come: take them for TSLAUTH_ERROR_OTHER. */
typedef enum tslauth_error_kind {
    TSLAUTH_ERROR_OTHER = 0,
    TSLAUTH_ERROR_USAGE = 1,         /* correct the call: a null text, a store that is none */
    TSLAUTH_ERROR_DOMAIN = 2,        /* the provider or a server says so; see the code */
    TSLAUTH_ERROR_TIMED_OUT = 3,     /* ask again later */
    TSLAUTH_ERROR_CREDENTIALS = 4,   /* ask for others */
    TSLAUTH_ERROR_CONFIGURATION = 5, /* repair a configuration of the library's */
    TSLAUTH_ERROR_SYSTEM = 6,        /* a file cannot be read or written as it is */
    TSLAUTH_ERROR_LOSS = 7,          /* a change would lose what is named; nothing was done */
    TSLAUTH_ERROR_LOCKED = 8,        /* another change runs; nothing was done */
    TSLAUTH_ERROR_NO_MEMORY = 9
} tslauth_error_kind;

TSLAUTH_C_EXPORT tslauth_error_kind tslauth_error_get_kind(tslauth_error const* error);
/* The provider's number; 0 where there is none. */
TSLAUTH_C_EXPORT unsigned long tslauth_error_get_code(tslauth_error const* error);
/* The class of <tslauth/Exceptions.h>, without its namespace: "LogonFailureException". */
TSLAUTH_C_EXPORT char const* tslauth_error_get_class(tslauth_error const* error);
TSLAUTH_C_EXPORT char const* tslauth_error_get_text(tslauth_error const* error);
TSLAUTH_C_EXPORT void tslauth_error_free(tslauth_error* error);

/* ---- Stores ---- */

/* A list of texts. */
typedef struct tslauth_texts tslauth_texts;
TSLAUTH_C_EXPORT size_t tslauth_texts_count(tslauth_texts const* texts);
/* Null behind the last. */
TSLAUTH_C_EXPORT char const* tslauth_texts_get(tslauth_texts const* texts, size_t index);
TSLAUTH_C_EXPORT void tslauth_texts_free(tslauth_texts* texts);

/* The names of all stores, in ascending order. */
TSLAUTH_C_EXPORT int tslauth_stores(tslauth_texts** stores, tslauth_error** error);
/* The name of the store that is recorded as active: a list of one text. */
TSLAUTH_C_EXPORT int tslauth_recorded_store(tslauth_texts** store, tslauth_error** error);

/* What activating a store would do (`ActivationPlan::Preview`). */
typedef struct tslauth_plan tslauth_plan;
TSLAUTH_C_EXPORT int tslauth_plan_make(char const* store, tslauth_plan** plan,
                                       tslauth_error** error);
/* The files that would be written, in order; null behind the last. */
TSLAUTH_C_EXPORT size_t tslauth_plan_file_count(tslauth_plan const* plan);
TSLAUTH_C_EXPORT char const* tslauth_plan_file_path(tslauth_plan const* plan, size_t file);
TSLAUTH_C_EXPORT char const* tslauth_plan_file_before(tslauth_plan const* plan, size_t file);
TSLAUTH_C_EXPORT char const* tslauth_plan_file_after(tslauth_plan const* plan, size_t file);
/* What would be lost, a sentence each, behind the file's path and ": ". The plan's own. */
TSLAUTH_C_EXPORT tslauth_texts const* tslauth_plan_losses(tslauth_plan const* plan);
/* What would fail after those files had been written; null where nothing would. The plan's own. */
TSLAUTH_C_EXPORT tslauth_error const* tslauth_plan_refusal(tslauth_plan const* plan);
TSLAUTH_C_EXPORT void tslauth_plan_free(tslauth_plan* plan);

/* For the functions below, or-ed. Others are refused as TSLAUTH_ERROR_USAGE. */
enum {
    TSLAUTH_ACCEPT_LOSS = 1,        /* activate also where something is lost */
    TSLAUTH_SKIP_HOSTNAME_CHECK = 2 /* join without looking at the host's name */
};

/* Makes `store` the host's: looks at a plan made anew under the lock, refuses where it would fail
 * or lose something, and carries it out. Unlike tslauthctl(8) it keeps nothing for an undo, and
 * does not look whether a change of the tool's waits to be confirmed, which is undone then.
 * `seconds`: to wait for the lock. */
TSLAUTH_C_EXPORT int tslauth_activate(char const* store, unsigned flags, int seconds,
                                      tslauth_error** error);

/* ---- The domain ---- */

/* An `ActiveDirectoryStore`, and what it was last told. Loads the provider. */
typedef struct tslauth_directory tslauth_directory;
/* `seconds`: to wait for an answer or for the lock. */
TSLAUTH_C_EXPORT int tslauth_directory_open(int seconds, tslauth_directory** directory,
                                            tslauth_error** error);
/* Calls and jobs that run go on, with what they need. */
TSLAUTH_C_EXPORT void tslauth_directory_free(tslauth_directory* directory);

/* `JoinDomain`, `JoinDomainWithCAM`, `PartDomain`. Each blocks as long as the provider does. A unit
 * may be null. For a part, user and password may both be null; else neither may. */
TSLAUTH_C_EXPORT int tslauth_directory_join(tslauth_directory* directory, char const* domain,
                                            char const* user, char const* password, unsigned flags,
                                            tslauth_error** error);
TSLAUTH_C_EXPORT int tslauth_directory_join_through_cam(tslauth_directory* directory,
                                                        char const* server, char const* unit,
                                                        unsigned flags, tslauth_error** error);
TSLAUTH_C_EXPORT int tslauth_directory_part(tslauth_directory* directory, char const* user,
                                            char const* password, tslauth_error** error);

typedef enum tslauth_question {
    TSLAUTH_QUESTION_MEMBERSHIP = 0,      /* `AskStoreConfiguration` */
    TSLAUTH_QUESTION_TRUSTED_DOMAINS = 1, /* `AskTrustedDomains` */
    TSLAUTH_QUESTION_TRUST_STATE = 2      /* `AskDomainTrustState` */
} tslauth_question;

typedef struct tslauth_answer tslauth_answer;

/* Blocks for the directory's seconds at most. Where no answer comes in time, the last one that this
 * directory was given; its age says so. Where there is none, TSLAUTH_ERROR_TIMED_OUT. Any other
 * failure is reported, and never an old answer instead. */
TSLAUTH_C_EXPORT int tslauth_directory_ask(tslauth_directory* directory, tslauth_question question,
                                           tslauth_answer** answer, tslauth_error** error);
/* Seconds since the provider gave it; 0 where it has just done so. */
TSLAUTH_C_EXPORT double tslauth_answer_get_age(tslauth_answer const* answer);
/* Domains: of a membership the active one alone, or none. Null behind the last. */
TSLAUTH_C_EXPORT size_t tslauth_answer_domain_count(tslauth_answer const* answer);
TSLAUTH_C_EXPORT char const* tslauth_answer_dns_name(tslauth_answer const* answer, size_t domain);
TSLAUTH_C_EXPORT char const* tslauth_answer_netbios_name(tslauth_answer const* answer,
                                                         size_t domain);
/* Of a membership, else empty: the preferred controllers, and the machine account's name. */
TSLAUTH_C_EXPORT tslauth_texts const* tslauth_answer_controllers(tslauth_answer const* answer);
TSLAUTH_C_EXPORT char const* tslauth_answer_machine_account(tslauth_answer const* answer);
/* The trust state, as <tslauth/tslauth_provider.h> numbers it; of another question 0. */
TSLAUTH_C_EXPORT int tslauth_answer_trust_state(tslauth_answer const* answer);
TSLAUTH_C_EXPORT void tslauth_answer_free(tslauth_answer* answer);

/* ---- Without blocking ---- */

/* A call that runs on a thread of its own. Its texts are copied, and the copy of a password is
 * wiped when it is no longer needed. */
typedef struct tslauth_job tslauth_job;
TSLAUTH_C_EXPORT int tslauth_job_ask(tslauth_directory* directory, tslauth_question question,
                                     tslauth_job** job, tslauth_error** error);
TSLAUTH_C_EXPORT int tslauth_job_join(tslauth_directory* directory, char const* domain,
                                      char const* user, char const* password, unsigned flags,
                                      tslauth_job** job, tslauth_error** error);
TSLAUTH_C_EXPORT int tslauth_job_part(tslauth_directory* directory, char const* user,
                                      char const* password, tslauth_job** job,
                                      tslauth_error** error);
/* A descriptor that poll(2) finds readable once the call has ended. The job's own: do not read it,
 * do not close it. */
TSLAUTH_C_EXPORT int tslauth_job_descriptor(tslauth_job const* job);
/* Waits for the call, returns as it does, and frees the job. `answer` may be null. */
TSLAUTH_C_EXPORT int tslauth_job_finish(tslauth_job* job, tslauth_answer** answer,
                                        tslauth_error** error);
/* Frees the job; the call goes on, and nobody hears of it. */
TSLAUTH_C_EXPORT void tslauth_job_abandon(tslauth_job* job);

#ifdef __cplusplus
}
#endif

#endif
