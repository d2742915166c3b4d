/* SPDX-License-Identifier: Apache-2.0 */
/*
 * The name service `tslauth_winbind`, which is the first of its database: users and groups of the
 * domain, from winbindd, and never one whose name or number the host's own files hold. Asked for
 * one of those it says NOTFOUND at once, without winbindd; an answer of winbindd that holds one is
 * none.
 *
 * libwbclient is loaded with the first question about somebody else: most processes ask none, and
 * each of them would pay for it. Nothing is kept from one question to the next, so that any thread
 * may ask, also in a child of a process with threads.
 *
 * There are no functions that list all users or groups: winbindd lists none, as it is set up here.
 */
#include "modules/LocalAccounts.h"

#include <dlfcn.h>
#include <errno.h>
#include <grp.h>
#include <nss.h>
#include <pwd.h>
#include <stdint.h>
#include <stdlib.h>
#include <string.h>
#include <wbclient.h>

#define EXPORT __attribute__((visibility("default")))

/* --- winbindd -------------------------------------------------------------------------------- */

typedef struct {
    struct wbcContext* (*create)(void);
    void (*release)(struct wbcContext*);
    void (*freeMemory)(void*);
    wbcErr (*userByName)(struct wbcContext*, char const*, struct passwd**);
    wbcErr (*userByNumber)(struct wbcContext*, uid_t, struct passwd**);
    wbcErr (*groupByName)(struct wbcContext*, char const*, struct group**);
    wbcErr (*groupByNumber)(struct wbcContext*, gid_t, struct group**);
    wbcErr (*groupsOf)(struct wbcContext*, char const*, uint32_t*, gid_t**);
    struct wbcContext* context;
    void* library;
} Winbindd;

static bool Find(void* library, char const* name, void* function, size_t size) {
    void* const found = dlsym(library, name);
    memcpy(function, &found, size); /* ISO C has no cast between the two kinds of pointers */
    return found != NULL;
}

#define FIND(member, name) Find(winbindd->library, name, &winbindd->member, sizeof winbindd->member)

static void Disconnect(Winbindd* winbindd) {
    if (winbindd->context != NULL) {
        winbindd->release(winbindd->context);
    }
    if (winbindd->library != NULL) {
        (void)dlclose(winbindd->library); /* what is counted is this use alone */
    }
}

/* A connection of its own, which is made with the question. Ends with Disconnect in any case. */
static bool Connect(Winbindd* winbindd) {
    memset(winbindd, 0, sizeof *winbindd);
    /* Never unloaded: a process that asks once will ask again. */
    winbindd->library = dlopen("libwbclient.so.0", RTLD_NOW | RTLD_LOCAL | RTLD_NODELETE);
    if (winbindd->library == NULL || !FIND(create, "wbcCtxCreate") ||
        !FIND(release, "wbcCtxFree") || !FIND(freeMemory, "wbcFreeMemory") ||
        !FIND(userByName, "wbcCtxGetpwnam") || !FIND(userByNumber, "wbcCtxGetpwuid") ||
        !FIND(groupByName, "wbcCtxGetgrnam") || !FIND(groupByNumber, "wbcCtxGetgrgid") ||
        !FIND(groupsOf, "wbcCtxGetGroups")) {
        return false;
    }
    winbindd->context = winbindd->create();
    return winbindd->context != NULL;
}

static enum nss_status StatusOf(wbcErr error, int* errnop) {
    if (error == WBC_ERR_SUCCESS) {
        return NSS_STATUS_SUCCESS;
    }
    *errnop = ENOENT;
    return error == WBC_ERR_UNKNOWN_USER || error == WBC_ERR_UNKNOWN_GROUP ||
                   error == WBC_ERR_DOMAIN_NOT_FOUND
               ? NSS_STATUS_NOTFOUND
               : NSS_STATUS_UNAVAIL;
}

/* --- the caller's buffer --------------------------------------------------------------------- */

typedef struct {
    char* next;
    size_t room;
} Buffer;

/* Null where there is no room left. */
static void* Take(Buffer* buffer, size_t size) {
    char* const taken = buffer->next;
    if (size > buffer->room) {
        return NULL;
    }
    buffer->next += size;
    buffer->room -= size;
    return taken;
}

static char* Copy(Buffer* buffer, char const* text) {
    char const* const source = text == NULL ? "" : text;
    size_t const size = strlen(source) + 1;
    char* const copy = Take(buffer, size);
    return copy == NULL ? NULL : memcpy(copy, source, size);
}

/* The C library comes again with a larger buffer. */
static enum nss_status NoRoom(int* errnop) {
    *errnop = ERANGE;
    return NSS_STATUS_TRYAGAIN;
}

static enum nss_status NotFound(int* errnop) {
    *errnop = ENOENT;
    return NSS_STATUS_NOTFOUND;
}

/* Without them nobody can say who is local, and then nobody of the domain is anybody here. */
static enum nss_status FilesUnreadable(int* errnop) {
    *errnop = ENOENT;
    return NSS_STATUS_UNAVAIL;
}

/* --- users ----------------------------------------------------------------------------------- */

static enum nss_status CopyUser(struct passwd const* user, struct passwd* result, Buffer buffer,
                                int* errnop) {
    result->pw_uid = user->pw_uid;
    result->pw_gid = user->pw_gid;
    result->pw_name = Copy(&buffer, user->pw_name);
    result->pw_passwd = Copy(&buffer, user->pw_passwd);
    result->pw_gecos = Copy(&buffer, user->pw_gecos);
    result->pw_dir = Copy(&buffer, user->pw_dir);
    result->pw_shell = Copy(&buffer, user->pw_shell);
    /* What is shorter may still have had room behind it. */
    return result->pw_name == NULL || result->pw_passwd == NULL || result->pw_gecos == NULL ||
                   result->pw_dir == NULL || result->pw_shell == NULL
               ? NoRoom(errnop)
               : NSS_STATUS_SUCCESS;
}

/* @param name null: `number` is asked for */
static enum nss_status AskUser(LocalAccounts const* users, LocalAccounts const* groups,
                               char const* name, uid_t number, struct passwd* result, Buffer buffer,
                               int* errnop) {
    Winbindd winbindd;
    struct passwd* user = NULL;
    enum nss_status status = NSS_STATUS_UNAVAIL;
    if (Connect(&winbindd)) {
        status = StatusOf(name != NULL ? winbindd.userByName(winbindd.context, name, &user)
                                       : winbindd.userByNumber(winbindd.context, number, &user),
                          errnop);
    }
    if (status == NSS_STATUS_SUCCESS) {
        /* Another spelling of the question may lead to a name that is local. Whose primary group
           is a local one would have what that group has. */
        status = IsLocalName(users, user->pw_name) || IsLocalNumber(users, user->pw_uid) ||
                         IsLocalNumber(groups, user->pw_gid)
                     ? NotFound(errnop)
                     : CopyUser(user, result, buffer, errnop);
        winbindd.freeMemory(user);
    }
    Disconnect(&winbindd);
    return status;
}

static enum nss_status FindUser(char const* name, uid_t number, struct passwd* result,
                                Buffer buffer, int* errnop) {
    LocalAccounts users = ReadLocalAccounts(LOCAL_USERS_FILE);
    enum nss_status status;
    if (users.text == NULL) {
        status = FilesUnreadable(errnop);
    } else if (name != NULL ? IsLocalName(&users, name) : IsLocalNumber(&users, number)) {
        status = NotFound(errnop);
    } else {
        LocalAccounts groups = ReadLocalAccounts(LOCAL_GROUPS_FILE);
        status = groups.text == NULL
                     ? FilesUnreadable(errnop)
                     : AskUser(&users, &groups, name, number, result, buffer, errnop);
        FreeLocalAccounts(&groups);
    }
    FreeLocalAccounts(&users);
    return status;
}

EXPORT enum nss_status _nss_tslauth_winbind_getpwnam_r(char const* name, struct passwd* result,
                                                       char* buffer, size_t size, int* errnop);
EXPORT enum nss_status _nss_tslauth_winbind_getpwuid_r(uid_t number, struct passwd* result,
                                                       char* buffer, size_t size, int* errnop);

enum nss_status _nss_tslauth_winbind_getpwnam_r(char const* name, struct passwd* result,
                                                char* buffer, size_t size, int* errnop) {
    Buffer const room = {buffer, size};
    return FindUser(name, 0, result, room, errnop);
}

enum nss_status _nss_tslauth_winbind_getpwuid_r(uid_t number, struct passwd* result, char* buffer,
                                                size_t size, int* errnop) {
    Buffer const room = {buffer, size};
    return FindUser(NULL, number, result, room, errnop);
}

/* --- groups ---------------------------------------------------------------------------------- */

/* A place for a list of pointers. */
static char** TakeList(Buffer* buffer, size_t count) {
    size_t const beyond = (uintptr_t)buffer->next % sizeof(char*);
    if (beyond != 0 && Take(buffer, sizeof(char*) - beyond) == NULL) {
        return NULL;
    }
    return Take(buffer, count * sizeof(char*));
}

/* A member with a local name is somebody else, and would let the local user pass for him. */
static bool CopyMembers(char* const* members, LocalAccounts const* users, char** list,
                        Buffer* buffer) {
    for (; *members != NULL; ++members) {
        if (!IsLocalName(users, *members)) {
            *list = Copy(buffer, *members);
            if (*list == NULL) {
                return false;
            }
            ++list;
        }
    }
    *list = NULL;
    return true;
}

static enum nss_status CopyGroup(struct group const* group, LocalAccounts const* users,
                                 struct group* result, Buffer buffer, int* errnop) {
    static char* const none[] = {NULL};
    char* const* const members = group->gr_mem == NULL ? none : group->gr_mem;
    size_t count = 1; /* the null behind them */
    while (members[count - 1] != NULL) {
        ++count;
    }
    result->gr_gid = group->gr_gid;
    result->gr_mem = TakeList(&buffer, count);
    result->gr_name = Copy(&buffer, group->gr_name);
    result->gr_passwd = Copy(&buffer, group->gr_passwd);
    return result->gr_mem == NULL || result->gr_name == NULL || result->gr_passwd == NULL ||
                   !CopyMembers(members, users, result->gr_mem, &buffer)
               ? NoRoom(errnop)
               : NSS_STATUS_SUCCESS;
}

/* @param name null: `number` is asked for */
static enum nss_status AskGroup(LocalAccounts const* groups, LocalAccounts const* users,
                                char const* name, gid_t number, struct group* result, Buffer buffer,
                                int* errnop) {
    Winbindd winbindd;
    struct group* group = NULL;
    enum nss_status status = NSS_STATUS_UNAVAIL;
    if (Connect(&winbindd)) {
        status = StatusOf(name != NULL ? winbindd.groupByName(winbindd.context, name, &group)
                                       : winbindd.groupByNumber(winbindd.context, number, &group),
                          errnop);
    }
    if (status == NSS_STATUS_SUCCESS) {
        status = IsLocalName(groups, group->gr_name) || IsLocalNumber(groups, group->gr_gid)
                     ? NotFound(errnop)
                     : CopyGroup(group, users, result, buffer, errnop);
        winbindd.freeMemory(group);
    }
    Disconnect(&winbindd);
    return status;
}

static enum nss_status FindGroup(char const* name, gid_t number, struct group* result,
                                 Buffer buffer, int* errnop) {
    LocalAccounts groups = ReadLocalAccounts(LOCAL_GROUPS_FILE);
    enum nss_status status;
    if (groups.text == NULL) {
        status = FilesUnreadable(errnop);
    } else if (name != NULL ? IsLocalName(&groups, name) : IsLocalNumber(&groups, number)) {
        status = NotFound(errnop);
    } else {
        LocalAccounts users = ReadLocalAccounts(LOCAL_USERS_FILE);
        status = users.text == NULL
                     ? FilesUnreadable(errnop)
                     : AskGroup(&groups, &users, name, number, result, buffer, errnop);
        FreeLocalAccounts(&users);
    }
    FreeLocalAccounts(&groups);
    return status;
}

EXPORT enum nss_status _nss_tslauth_winbind_getgrnam_r(char const* name, struct group* result,
                                                       char* buffer, size_t size, int* errnop);
EXPORT enum nss_status _nss_tslauth_winbind_getgrgid_r(gid_t number, struct group* result,
                                                       char* buffer, size_t size, int* errnop);

enum nss_status _nss_tslauth_winbind_getgrnam_r(char const* name, struct group* result,
                                                char* buffer, size_t size, int* errnop) {
    Buffer const room = {buffer, size};
    return FindGroup(name, 0, result, room, errnop);
}

enum nss_status _nss_tslauth_winbind_getgrgid_r(gid_t number, struct group* result, char* buffer,
                                                size_t size, int* errnop) {
    Buffer const room = {buffer, size};
    return FindGroup(NULL, number, result, room, errnop);
}

/* --- the groups of a user --------------------------------------------------------------------- */

/* The C library's list of numbers: `*start` of them, room for `*size`. */
typedef struct {
    long* start;
    long* size;
    gid_t** numbers;
    long limit; /* 0: none */
} GroupList;

static bool Contains(GroupList const* list, gid_t number) {
    long i;
    for (i = 0; i < *list->start; ++i) {
        if ((*list->numbers)[i] == number) {
            return true;
        }
    }
    return false;
}

static bool IsFull(GroupList const* list) {
    return list->limit > 0 && *list->start >= list->limit;
}

static bool MakeRoom(GroupList const* list) {
    long const larger = *list->size > 0 ? 2 * *list->size : 16;
    long const size = list->limit > 0 && larger > list->limit ? list->limit : larger;
    gid_t* numbers;
    if (*list->start < *list->size) {
        return true;
    }
    numbers = realloc(*list->numbers, (size_t)size * sizeof **list->numbers);
    if (numbers == NULL) {
        return false;
    }
    *list->numbers = numbers;
    *list->size = size;
    return true;
}

/* The primary group of the user is in nobody's list here: the C library has put it first. */
static enum nss_status AddGroups(gid_t const* numbers, uint32_t count, gid_t primary,
                                 LocalAccounts const* groups, GroupList const* list, int* errnop) {
    uint32_t i;
    for (i = 0; i < count && !IsFull(list); ++i) {
        if (numbers[i] == primary || Contains(list, numbers[i]) ||
            IsLocalNumber(groups, numbers[i])) {
            continue;
        }
        if (!MakeRoom(list)) {
            *errnop = ENOMEM;
            return NSS_STATUS_TRYAGAIN;
        }
        (*list->numbers)[(*list->start)++] = numbers[i];
    }
    return NSS_STATUS_SUCCESS;
}

static enum nss_status AskGroupsOf(char const* user, gid_t primary, LocalAccounts const* groups,
                                   GroupList const* list, int* errnop) {
    Winbindd winbindd;
    gid_t* numbers = NULL;
    uint32_t count = 0;
    enum nss_status status = NSS_STATUS_UNAVAIL;
    if (Connect(&winbindd)) {
        status = StatusOf(winbindd.groupsOf(winbindd.context, user, &count, &numbers), errnop);
    }
    if (status == NSS_STATUS_SUCCESS) {
        status = AddGroups(numbers, count, primary, groups, list, errnop);
        winbindd.freeMemory(numbers);
    }
    Disconnect(&winbindd);
    return status;
}

EXPORT enum nss_status _nss_tslauth_winbind_initgroups_dyn(char const* user, gid_t primary,
                                                           long* start, long* size, gid_t** numbers,
                                                           long limit, int* errnop);

enum nss_status _nss_tslauth_winbind_initgroups_dyn(char const* user, gid_t primary, long* start,
                                                    long* size, gid_t** numbers, long limit,
                                                    int* errnop) {
    GroupList const list = {start, size, numbers, limit};
    LocalAccounts users = ReadLocalAccounts(LOCAL_USERS_FILE);
    enum nss_status status;
    if (users.text == NULL) {
        status = FilesUnreadable(errnop);
    } else if (IsLocalName(&users, user)) {
        status = NotFound(errnop);
    } else {
        LocalAccounts groups = ReadLocalAccounts(LOCAL_GROUPS_FILE);
        status = groups.text == NULL ? FilesUnreadable(errnop)
                                     : AskGroupsOf(user, primary, &groups, &list, errnop);
        FreeLocalAccounts(&groups);
    }
    FreeLocalAccounts(&users);
    return status;
}
