/* SPDX-License-Identifier: Apache-2.0 */
#include "modules/LocalAccounts.h"

#include "modules/AccountFile.h"

#include <errno.h>
#include <fcntl.h>
#include <stdlib.h>
#include <sys/stat.h>
#include <unistd.h>

static bool HasRoom(LocalAccounts* accounts, size_t* room) {
    char* larger;
    if (accounts->length < *room) {
        return true;
    }
    *room *= 2;
    larger = realloc(accounts->text, *room);
    if (larger == NULL) {
        return false;
    }
    accounts->text = larger;
    return true;
}

/* Not mapped: a file that is cut short meanwhile would end the process. */
static bool ReadAll(int file, LocalAccounts* accounts, size_t room) {
    ssize_t count;
    accounts->text = malloc(room);
    if (accounts->text == NULL) {
        return false;
    }
    do {
        if (!HasRoom(accounts, &room)) {
            return false;
        }
        count = read(file, accounts->text + accounts->length, room - accounts->length);
        accounts->length += count > 0 ? (size_t)count : 0;
    } while (count > 0 || (count < 0 && errno == EINTR));
    return count == 0;
}

LocalAccounts ReadLocalAccounts(char const* path) {
    LocalAccounts accounts = {NULL, 0};
    struct stat status;
    int const file = open(path, O_RDONLY | O_CLOEXEC | O_NOCTTY);
    if (file < 0) {
        return accounts;
    }
    /* One byte more, so that the end is seen without more room. */
    if (fstat(file, &status) != 0 || !ReadAll(file, &accounts, (size_t)status.st_size + 1)) {
        FreeLocalAccounts(&accounts);
    }
    (void)close(file); /* it was read alone */
    return accounts;
}

void FreeLocalAccounts(LocalAccounts* accounts) {
    free(accounts->text);
    accounts->text = NULL;
    accounts->length = 0;
}

bool IsLocalName(LocalAccounts const* accounts, char const* name) {
    return AccountFileHasName(accounts->text, accounts->length, name);
}

bool IsLocalNumber(LocalAccounts const* accounts, id_t number) {
    return AccountFileHasNumber(accounts->text, accounts->length, number);
}
