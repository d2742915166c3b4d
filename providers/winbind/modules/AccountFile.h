/* SPDX-License-Identifier: Apache-2.0 */
#ifndef TSLAUTH_WINBIND_ACCOUNT_FILE_H
#define TSLAUTH_WINBIND_ACCOUNT_FILE_H

/*
 * The names and numbers in the text of passwd(5) or group(5), of which both have the name in the
 * first field and the number in the third. The C library reads such a file likewise: blanks before
 * a line and lines that begin with "#" do not count.
 */

#include <stdbool.h>
#include <stddef.h>
#include <sys/types.h>

#ifdef __cplusplus
extern "C" {
#endif

/*
 * Whether a line has that name. Of a line that is cut short the name counts all the same: it is an
 * account that somebody is about to finish.
 */
bool AccountFileHasName(char const* text, size_t length, char const* name);

/* Whether a line has that number. */
bool AccountFileHasNumber(char const* text, size_t length, id_t number);

#ifdef __cplusplus
}
#endif

#endif
