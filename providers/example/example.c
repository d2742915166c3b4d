/* SPDX-License-Identifier: Apache-2.0 */
/*
 * The smallest complete provider: one domain, "example.test", whose directory is a few text files
 * that two modules of Debian read. README.md says which. Copy the folder, and replace what the
 * entries do; what they promise their caller stands in tslauth_provider.h.
 *
 * It keeps no state in memory, so that its entries may run at the same time. Two processes that
 * join at once are told apart by the file system: link(2) makes a name only once.
 */
#define _POSIX_C_SOURCE 200809L

#include <tslauth/tslauth_provider.h>

#include <errno.h>
#include <fcntl.h>
#include <limits.h>
#include <stdbool.h>
#include <stdio.h>
#include <stdlib.h>
#include <string.h>
#include <strings.h>
#include <sys/stat.h>
#include <unistd.h>

#define DNS_NAME "example.test"
#define NETBIOS_NAME "EXAMPLE"
#define REALM "EXAMPLE.TEST"

#define USERS "/etc/tslauth-example/passwords"   /* "user:hash" lines: who can log in */
#define ACCOUNTS "/etc/tslauth-example/accounts" /* "name:secret" lines: who can join hosts */
#define STATE "/var/lib/tslauth-example"         /* made by the first join */
#define JOINED STATE "/joined"                   /* this host's distinguished name; if joined */
#define CONTROLLERS STATE "/controllers"         /* preferred controllers, one a line */

/* What getDomainTrustRelationship returns; 0 means "nothing to report". */
enum { NO_RELATIONSHIP = 0, OWN_DOMAIN = 1 };

/* ---- Files -------------------------------------------------------------------------------- */

static int CodeOf(int error) {
    switch (error) {
    case EACCES:
    case EPERM:
    case EROFS:
        return TSLAUTH_PROVIDER_ACCESS_DENIED;
    case ENOENT:
        return TSLAUTH_PROVIDER_FILE_NOT_FOUND;
    case ENOMEM:
        return TSLAUTH_PROVIDER_NOT_ENOUGH_MEMORY;
    case EEXIST: /* only a second join finds its file there */
        return TSLAUTH_PROVIDER_SETUP_ALREADY_JOINED;
    default:
        return TSLAUTH_PROVIDER_INTERNAL_ERROR;
    }
}

/* The whole text of a file, for free(); null with errno set if it cannot be read. */
static char* ReadText(char const* path) {
    char* text = NULL;
    size_t size = 0;
    int error = 0;
    FILE* file = fopen(path, "re");
    if (file == NULL) {
        return NULL;
    }
    if (getdelim(&text, &size, '\0', file) < 0) {
        error = feof(file) ? 0 : errno;
        free(text);
        text = error == 0 ? strdup("") : NULL; /* an empty file is an empty text */
        error = error == 0 && text == NULL ? ENOMEM : error;
    }
    (void)fclose(file); /* it was only read */
    errno = error;
    return text;
}

/* Puts a complete file at `path`: over an older one, or, if `first`, only where there is none. */
static int WriteText(char const* path, char const* text, bool first) {
    char temporary[] = STATE "/.new-XXXXXX";
    size_t const size = strlen(text);
    int error = 0;
    int file;
    if (mkdir(STATE, 0755) != 0 && errno != EEXIST) {
        return CodeOf(errno);
    }
    file = mkstemp(temporary);
    if (file < 0) {
        return CodeOf(errno);
    }
    if (fchmod(file, 0644) != 0) {
        error = errno;
    } else {
        ssize_t const written = write(file, text, size);
        if (written < 0 || fsync(file) != 0) {
            error = errno;
        } else if ((size_t)written != size) {
            error = ENOSPC;
        }
    }
    if (close(file) != 0 && error == 0) {
        error = errno;
    }
    if (error == 0 && (first ? link(temporary, path) : rename(temporary, path)) != 0) {
        error = errno;
    }
    if (error != 0 || first) {
        (void)unlink(temporary); /* a leftover does no harm */
    }
    return error == 0 ? TSLAUTH_PROVIDER_SUCCESS : CodeOf(error);
}

/* The rest of the line of `text` that begins with `name` and a colon, up to `*length`; null if
 * there is none. */
static char const* FindLine(char const* text, char const* name, size_t* length) {
    size_t const nameLength = strlen(name);
    while (*text != '\0') {
        size_t const lineLength = strcspn(text, "\n");
        if (lineLength > nameLength && memcmp(text, name, nameLength) == 0 &&
            text[nameLength] == ':') {
            *length = lineLength - nameLength - 1;
            return text + nameLength + 1;
        }
        text += lineLength + (text[lineLength] == '\n');
    }
    return NULL;
}

/* ---- Questions that several entries ask --------------------------------------------------- */

static bool IsOurDomain(char const* domain) {
    return strcasecmp(domain, DNS_NAME) == 0 || strcasecmp(domain, NETBIOS_NAME) == 0;
}

static bool IsJoined(void) {
    return access(JOINED, F_OK) == 0;
}

/* SUCCESS if an account of that name and secret may join and part hosts. */
static int CheckAccount(char const* name, char const* secret) {
    size_t length = 0;
    char* accounts;
    char const* expected;
    bool known;
    if (name == NULL || secret == NULL) {
        return TSLAUTH_PROVIDER_INVALID_PARAMETER;
    }
    accounts = ReadText(ACCOUNTS);
    if (accounts == NULL) {
        /* Without the file nobody may; a file that cannot be read says nothing about anybody. */
        return errno == ENOENT ? TSLAUTH_PROVIDER_LOGON_FAILURE : CodeOf(errno);
    }
    expected = FindLine(accounts, name, &length);
    known = expected != NULL && length > 0 && strlen(secret) == length &&
            memcmp(expected, secret, length) == 0;
    free(accounts);
    return known ? TSLAUTH_PROVIDER_SUCCESS : TSLAUTH_PROVIDER_LOGON_FAILURE;
}

/* This host's name without its domain. */
static int HostName(char name[HOST_NAME_MAX + 1]) {
    if (gethostname(name, HOST_NAME_MAX + 1) != 0) {
        return CodeOf(errno);
    }
    name[HOST_NAME_MAX] = '\0';
    name[strcspn(name, ".")] = '\0';
    return TSLAUTH_PROVIDER_SUCCESS;
}

/* Hands out `text`, which was allocated, or the lack of memory for it. */
static int HandOut(char* text, char** out, ActiveDirectoryClientFreeFunction* release) {
    if (text == NULL) {
        return TSLAUTH_PROVIDER_NOT_ENOUGH_MEMORY;
    }
    *out = text;
    *release = free;
    return TSLAUTH_PROVIDER_SUCCESS;
}

static int RememberJoin(void) {
    char host[HOST_NAME_MAX + 1];
    char distinguishedName[HOST_NAME_MAX + 64];
    int const code = HostName(host);
    if (code != TSLAUTH_PROVIDER_SUCCESS) {
        return code;
    }
    (void)snprintf(distinguishedName, sizeof distinguishedName,
                   "CN=%s,CN=Computers,DC=example,DC=test", host); /* it always fits */
    return WriteText(JOINED, distinguishedName, true);
}

/* ---- The entries -------------------------------------------------------------------------- */

static int JoinDomain(char const* domain, char const* organisationalUnit,
                      ActiveDirectoryClientCredentials const* credentials) {
    int code;
    if (!IsOurDomain(domain)) {
        return TSLAUTH_PROVIDER_NO_SUCH_DOMAIN;
    }
    if (organisationalUnit != NULL) {
        return TSLAUTH_PROVIDER_FILE_NOT_FOUND; /* a directory in plain files has no units */
    }
    code = CheckAccount(credentials->userName, credentials->password);
    return code == TSLAUTH_PROVIDER_SUCCESS ? RememberJoin() : code;
}

/* A CAM server for this directory would hand out the account's secret as its first result. */
static int JoinDomainWithMachineAccount(ActiveDirectoryClientDomainInformation const* domain,
                                        ActiveDirectoryClientMachineAccount const* account) {
    int code;
    if (!IsOurDomain(domain->dnsDomainName)) {
        return TSLAUTH_PROVIDER_NO_SUCH_DOMAIN;
    }
    code = CheckAccount(account->accountName, account->firstResult);
    return code == TSLAUTH_PROVIDER_SUCCESS ? RememberJoin() : code;
}

/* Without credentials the host alone decides: whoever may write its state may part it. */
static int PartDomain(ActiveDirectoryClientCredentials const* credentials) {
    if (credentials != NULL) {
        int const code = CheckAccount(credentials->userName, credentials->password);
        if (code != TSLAUTH_PROVIDER_SUCCESS) {
            return code;
        }
    }
    if (unlink(JOINED) != 0) {
        return errno == ENOENT ? TSLAUTH_PROVIDER_NO_SUCH_DOMAIN : CodeOf(errno);
    }
    return TSLAUTH_PROVIDER_SUCCESS;
}

static int GetActiveDomain(ActiveDirectoryClientDomain* domain,
                           ActiveDirectoryClientFreeFunction* release) {
    char* dnsName;
    char* netBIOSName;
    if (!IsJoined()) {
        return TSLAUTH_PROVIDER_SUCCESS; /* both names stay null: there is no active domain */
    }
    dnsName = strdup(DNS_NAME);
    netBIOSName = strdup(NETBIOS_NAME);
    if (dnsName == NULL || netBIOSName == NULL) {
        free(dnsName);
        free(netBIOSName);
        return TSLAUTH_PROVIDER_NOT_ENOUGH_MEMORY;
    }
    domain->dnsName = dnsName;
    domain->netBIOSName = netBIOSName;
    *release = free;
    return TSLAUTH_PROVIDER_SUCCESS;
}

static int SetPreferredDomainControllers(char const** controllers) {
    size_t size = 1;
    char* text;
    char* end;
    int code;
    for (char const** name = controllers; *name != NULL; ++name) {
        if (**name == '\0' || strchr(*name, '\n') != NULL) {
            return TSLAUTH_PROVIDER_INVALID_COMPUTER_NAME;
        }
        size += strlen(*name) + 1;
    }
    text = malloc(size);
    if (text == NULL) {
        return TSLAUTH_PROVIDER_NOT_ENOUGH_MEMORY;
    }
    end = text;
    for (char const** name = controllers; *name != NULL; ++name) {
        size_t const length = strlen(*name);
        memcpy(end, *name, length);
        end[length] = '\n';
        end += length + 1;
    }
    *end = '\0';
    code = WriteText(CONTROLLERS, text, false);
    free(text);
    return code;
}

/* The array and its names are one block, so that free() on the array releases all of it. */
static int GetPreferredDomainControllers(char*** controllers,
                                         ActiveDirectoryClientFreeFunction* release) {
    char* const text = ReadText(CONTROLLERS);
    size_t count = 0;
    size_t size;
    char** array;
    if (text == NULL) {
        return errno == ENOENT ? TSLAUTH_PROVIDER_SUCCESS : CodeOf(errno); /* never set: none */
    }
    for (char const* character = text; *character != '\0'; ++character) {
        count += *character == '\n';
    }
    size = strlen(text) + 1;
    array = malloc((count + 1) * sizeof *array + size);
    if (array != NULL) {
        char* name = memcpy(array + count + 1, text, size);
        for (size_t i = 0; i < count; ++i) {
            size_t const length = strcspn(name, "\n");
            name[length] = '\0';
            array[i] = name;
            name += length + 1;
        }
        array[count] = NULL;
    }
    free(text);
    if (array == NULL) {
        return TSLAUTH_PROVIDER_NOT_ENOUGH_MEMORY;
    }
    *controllers = array;
    *release = free;
    return TSLAUTH_PROVIDER_SUCCESS;
}

static int GetDomainTrustState(void) {
    if (!IsJoined()) {
        return TSLAUTH_PROVIDER_TRUST_NOT_JOINED;
    }
    return access(USERS, R_OK) == 0 ? TSLAUTH_PROVIDER_TRUST_IN_ORDER
                                    : TSLAUTH_PROVIDER_TRUST_NO_CONTROLLER;
}

/* The one domain, in one block again; its names are constants and need no releasing. */
static int GetTrustedDomains(ActiveDirectoryClientDomain*** domains,
                             ActiveDirectoryClientFreeFunction* release) {
    struct {
        ActiveDirectoryClientDomain* array[2];
        ActiveDirectoryClientDomain own;
    } * block;
    if (!IsJoined()) {
        return TSLAUTH_PROVIDER_SUCCESS;
    }
    block = malloc(sizeof *block);
    if (block == NULL) {
        return TSLAUTH_PROVIDER_NOT_ENOUGH_MEMORY;
    }
    block->own.dnsName = DNS_NAME;
    block->own.netBIOSName = NETBIOS_NAME;
    block->array[0] = &block->own;
    block->array[1] = NULL;
    *domains = block->array;
    *release = free;
    return TSLAUTH_PROVIDER_SUCCESS;
}

static int GetMachineAccountDN(char** name, ActiveDirectoryClientFreeFunction* release) {
    char* const text = ReadText(JOINED);
    if (text == NULL) {
        return errno == ENOENT ? TSLAUTH_PROVIDER_SUCCESS : CodeOf(errno); /* not joined: none */
    }
    return HandOut(text, name, release);
}

/* The first preferred controller; without one, this host, whose files are the directory. There is
 * nothing to choose from, so `first` narrows nothing. */
static int GetAnyDomainController(char const* first, char const* domain, char** controller,
                                  ActiveDirectoryClientFreeFunction* release) {
    char host[HOST_NAME_MAX + 1];
    char* controllers;
    int code;
    (void)first; /* see above */
    if (!IsOurDomain(domain)) {
        return TSLAUTH_PROVIDER_NO_SUCH_DOMAIN;
    }
    controllers = ReadText(CONTROLLERS);
    if (controllers == NULL && errno != ENOENT) {
        return CodeOf(errno);
    }
    if (controllers != NULL && *controllers != '\0') {
        controllers[strcspn(controllers, "\n")] = '\0';
        return HandOut(controllers, controller, release);
    }
    free(controllers);
    code = HostName(host);
    return code == TSLAUTH_PROVIDER_SUCCESS ? HandOut(strdup(host), controller, release) : code;
}

/* "EXAMPLE\user" and "user@example.test" are "user" to this host, if the directory knows it. */
static int ConvertCanonicalUsername(char const* name, char** canonicalName,
                                    ActiveDirectoryClientFreeFunction* release) {
    char const* const backslash = strchr(name, '\\');
    char const* const at = backslash == NULL ? strrchr(name, '@') : NULL;
    char const* const user = backslash == NULL ? name : backslash + 1;
    char* const domain = backslash == NULL ? strdup(at == NULL ? DNS_NAME : at + 1)
                                           : strndup(name, (size_t)(backslash - name));
    char* const canonical = at == NULL ? strdup(user) : strndup(user, (size_t)(at - user));
    char* users = NULL;
    size_t length = 0;
    int code = TSLAUTH_PROVIDER_NO_SUCH_USER;
    if (domain == NULL || canonical == NULL) {
        code = TSLAUTH_PROVIDER_NOT_ENOUGH_MEMORY;
    } else if (!IsOurDomain(domain)) {
        code = TSLAUTH_PROVIDER_NO_SUCH_DOMAIN;
    } else if ((users = ReadText(USERS)) == NULL) {
        code = CodeOf(errno);
    } else if (FindLine(users, canonical, &length) != NULL) {
        code = TSLAUTH_PROVIDER_SUCCESS;
    }
    free(users);
    free(domain);
    if (code != TSLAUTH_PROVIDER_SUCCESS) {
        free(canonical);
        return code;
    }
    return HandOut(canonical, canonicalName, release);
}

static int GetHostPrincipalForDomain(char const* domain, char** principal,
                                     ActiveDirectoryClientFreeFunction* release) {
    char host[HOST_NAME_MAX + 1];
    char text[HOST_NAME_MAX + sizeof "host/@" REALM];
    int code;
    if (!IsOurDomain(domain) || !IsJoined()) {
        return TSLAUTH_PROVIDER_NO_SUCH_DOMAIN;
    }
    code = HostName(host);
    if (code != TSLAUTH_PROVIDER_SUCCESS) {
        return code;
    }
    (void)snprintf(text, sizeof text, "host/%s@" REALM, host); /* it always fits */
    return HandOut(strdup(text), principal, release);
}

static int GetDomainTrustRelationship(char const* domain) {
    return IsJoined() && IsOurDomain(domain) ? OWN_DOMAIN : NO_RELATIONSHIP;
}

/* ---- What is exported --------------------------------------------------------------------- */

ActiveDirectoryClientMetadataRecord const ActiveDirectoryClientMetadata = {
    .apiVersion = TSLAUTH_PROVIDER_API_VERSION,
    .pamModule = "pam_pwdfile.so",
    .pamModuleParameters = "pwdfile=" USERS,
    .nssModule = "extrausers",
    .nssModuleParameters = NULL,
};

ActiveDirectoryClientOperationsRecord const ActiveDirectoryClientOperations = {
    .apiVersion = TSLAUTH_PROVIDER_API_VERSION,
    .joinDomain = JoinDomain,
    .partDomain = PartDomain,
    .getActiveDomain = GetActiveDomain,
    .setPreferredDomainControllers = SetPreferredDomainControllers,
    .getPreferredDomainControllers = GetPreferredDomainControllers,
    .unused = NULL,
    .getDomainTrustState = GetDomainTrustState,
    .getTrustedDomains = GetTrustedDomains,
    .getMachineAccountDN = GetMachineAccountDN,
    .getAnyDomainController = GetAnyDomainController,
    .convertCanonicalUsername = ConvertCanonicalUsername,
    .joinDomainWithMachineAccount = JoinDomainWithMachineAccount,
    .getHostPrincipalForDomain = GetHostPrincipalForDomain,
    .getDomainTrustRelationship = GetDomainTrustRelationship,
};
