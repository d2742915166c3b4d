/* SPDX-License-Identifier: Apache-2.0 */
#ifndef TSLAUTH_WINBIND_LOCAL_ACCOUNTS_H
#define TSLAUTH_WINBIND_LOCAL_ACCOUNTS_H

/*
 * The users and groups of the host's own files, read anew each time, so that an account counts from
 * the moment in which it is made. Asks no name service. Any thread may call; no state is kept, and
 * errno is as the last call of the system left it.
 */

#include <stdbool.h>
#include <stddef.h>
#include <sys/types.h>

#ifdef __cplusplus
extern "C" {
#endif

#define LOCAL_USERS_FILE "/etc/passwd"
#define LOCAL_GROUPS_FILE "/etc/group"

/* The text of one of these files. */
typedef struct {
    char* text; /* null: it cannot be read, and nobody can say who is local */
    size_t length;
} LocalAccounts;

/* The caller gives it to FreeLocalAccounts. */
LocalAccounts ReadLocalAccounts(char const* path);
void FreeLocalAccounts(LocalAccounts* accounts);

bool IsLocalName(LocalAccounts const* accounts, char const* name);
bool IsLocalNumber(LocalAccounts const* accounts, id_t number);

#ifdef __cplusplus
}
#endif

#endif
