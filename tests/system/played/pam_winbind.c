/* SPDX-License-Identifier: Apache-2.0 */
/*
 * Plays Samba's PAM module. It keeps what it was called with in the variable CALLS of the log-in's
 * environment. Parameters: `become=NAME` puts that name in place of the user's, as Samba's does;
 * `answer=N` is what it returns.
 */
#include <security/pam_ext.h>
#include <security/pam_modules.h>
#include <stdio.h>
#include <stdlib.h>
#include <string.h>

static int Play(pam_handle_t* handle, char const* function, int count, char const** arguments) {
    char calls[1024];
    char const* const before = pam_getenv(handle, "CALLS");
    int answer = PAM_SUCCESS;
    int i;
    (void)snprintf(calls, sizeof calls, "CALLS=%s%s", before == NULL ? "" : before, function);
    for (i = 0; i < count; ++i) {
        (void)strncat(calls, " ", sizeof calls - strlen(calls) - 1);
        (void)strncat(calls, arguments[i], sizeof calls - strlen(calls) - 1);
        if (strncmp(arguments[i], "become=", 7) == 0) {
            (void)pam_set_item(handle, PAM_USER, arguments[i] + 7);
        } else if (strncmp(arguments[i], "answer=", 7) == 0) {
            answer = atoi(arguments[i] + 7);
        }
    }
    (void)strncat(calls, ";", sizeof calls - strlen(calls) - 1);
    (void)pam_putenv(handle, calls);
    return answer;
}

#define ENTRY(name)                                                                                \
    int __attribute__((visibility("default")))                                                     \
    name(pam_handle_t* handle, int flags, int count, char const** arguments) {                     \
        (void)flags;                                                                               \
        return Play(handle, #name, count, arguments);                                              \
    }

ENTRY(pam_sm_authenticate)
ENTRY(pam_sm_setcred)
ENTRY(pam_sm_acct_mgmt)
ENTRY(pam_sm_open_session)
ENTRY(pam_sm_close_session)
ENTRY(pam_sm_chauthtok)
