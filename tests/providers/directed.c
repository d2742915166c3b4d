/* SPDX-License-Identifier: Apache-2.0 */
/* Does what files say, so that another process is the director. An entry reads
 * /run/directed/ENTRY whenever it is called:
 *   "hang"     it stays inside as long as the file says so
 *   "code N"   it fails with that code
 *   otherwise  the text is its answer
 * Without the file it succeeds, and has nothing to tell. */
#define _POSIX_C_SOURCE 200809L

#include <tslauth/tslauth_provider.h>

#include <stdio.h>
#include <stdlib.h>
#include <string.h>
#include <time.h>

static void Pause(void) {
    struct timespec const pause = {0, 5000000};
    (void)nanosleep(&pause, NULL); /* sooner does no harm */
}

/* The text of the entry's file, for free(); null if there is none. */
static char* Script(char const* entry) {
    char path[128];
    char* text = NULL;
    size_t size = 0;
    FILE* file;
    (void)snprintf(path, sizeof path, "/run/directed/%s", entry); /* it always fits */
    file = fopen(path, "re");
    if (file == NULL) {
        return NULL;
    }
    if (getdelim(&text, &size, '\0', file) < 0) {
        free(text);
        text = NULL;
    }
    (void)fclose(file); /* it was only read */
    return text;
}

/* @return the code; `*answer` is the text, if there is one */
static int Play(char const* entry, char** answer) {
    int code = TSLAUTH_PROVIDER_SUCCESS;
    char* text;
    while ((text = Script(entry)) != NULL && strncmp(text, "hang", 4) == 0) {
        free(text);
        Pause();
    }
    if (text != NULL && strncmp(text, "code ", 5) == 0) {
        code = (int)strtol(text + 5, NULL, 10);
        free(text);
        text = NULL;
    }
    *answer = text;
    return code;
}

static int PlayText(char const* entry, char** answer, ActiveDirectoryClientFreeFunction* release) {
    *release = free;
    return Play(entry, answer);
}

/* For entries that answer with a code alone. */
static int PlayCode(char const* entry) {
    char* text;
    int const code = Play(entry, &text);
    free(text);
    return code;
}

char const* ActiveDirectoryClientLastFailure(void) {
    static char text[128];
    char* const script = Script("last-failure");
    (void)snprintf(text, sizeof text, "%s", script == NULL ? "" : script); /* it may be cut */
    free(script);
    return text;
}

int ActiveDirectoryClientPreviewJoin(char const* domain, char const* organisationalUnit,
                                     ActiveDirectoryClientCredentials const* credentials,
                                     char** text, ActiveDirectoryClientFreeFunction* release) {
    (void)domain;
    (void)organisationalUnit;
    (void)credentials;
    return PlayText("preview-join", text, release);
}

static int JoinDomain(char const* domain, char const* organisationalUnit,
                      ActiveDirectoryClientCredentials const* credentials) {
    (void)domain, (void)organisationalUnit, (void)credentials;
    return PlayCode("join");
}

static int PartDomain(ActiveDirectoryClientCredentials const* credentials) {
    (void)credentials;
    return PlayCode("part");
}

static int GetActiveDomain(ActiveDirectoryClientDomain* domain,
                           ActiveDirectoryClientFreeFunction* release) {
    char* text;
    int const code = PlayText("domain", &text, release);
    domain->dnsName = text;
    return code;
}

static int SetPreferredDomainControllers(char const** controllers) {
    (void)controllers;
    return PlayCode("set-controllers");
}

/* The array and its name are one block, so that free() on the array releases both. */
static int GetPreferredDomainControllers(char*** controllers,
                                         ActiveDirectoryClientFreeFunction* release) {
    char* text;
    int const code = PlayText("controllers", &text, release);
    if (text != NULL) {
        size_t const size = strlen(text) + 1;
        char** const array = malloc(2 * sizeof *array + size);
        if (array == NULL) {
            free(text);
            return TSLAUTH_PROVIDER_NOT_ENOUGH_MEMORY;
        }
        array[0] = memcpy(array + 2, text, size);
        array[1] = NULL;
        free(text);
        *controllers = array;
    }
    return code;
}

static int GetDomainTrustState(void) {
    char* text;
    int value;
    (void)Play("trust", &text); /* the entry has no code */
    value = text == NULL ? 0 : (int)strtol(text, NULL, 10);
    free(text);
    return value;
}

static int GetTrustedDomains(ActiveDirectoryClientDomain*** domains,
                             ActiveDirectoryClientFreeFunction* release) {
    struct {
        ActiveDirectoryClientDomain* array[2];
        ActiveDirectoryClientDomain one;
        char name[];
    } * block;
    char* text;
    int const code = PlayText("trusted", &text, release);
    if (text != NULL) {
        size_t const size = strlen(text) + 1;
        block = malloc(sizeof *block + size);
        if (block == NULL) {
            free(text);
            return TSLAUTH_PROVIDER_NOT_ENOUGH_MEMORY;
        }
        block->array[0] = &block->one;
        block->array[1] = NULL;
        block->one.dnsName = memcpy(block->name, text, size);
        block->one.netBIOSName = "";
        free(text);
        *domains = block->array;
    }
    return code;
}

static int GetMachineAccountDN(char** name, ActiveDirectoryClientFreeFunction* release) {
    return PlayText("machine", name, release);
}

static int GetAnyDomainController(char const* first, char const* domain, char** controller,
                                  ActiveDirectoryClientFreeFunction* release) {
    (void)first, (void)domain;
    return PlayText("dc", controller, release);
}

static int ConvertCanonicalUsername(char const* name, char** canonicalName,
                                    ActiveDirectoryClientFreeFunction* release) {
    (void)name;
    return PlayText("canonical", canonicalName, release);
}

static int GetHostPrincipalForDomain(char const* domain, char** principal,
                                     ActiveDirectoryClientFreeFunction* release) {
    (void)domain;
    return PlayText("principal", principal, release);
}

ActiveDirectoryClientMetadataRecord const ActiveDirectoryClientMetadata = {2, "pam_directed.so",
                                                                           NULL, "directed", NULL};

ActiveDirectoryClientOperationsRecord const ActiveDirectoryClientOperations = {
    .apiVersion = 2,
    .joinDomain = JoinDomain,
    .partDomain = PartDomain,
    .getActiveDomain = GetActiveDomain,
    .setPreferredDomainControllers = SetPreferredDomainControllers,
    .getPreferredDomainControllers = GetPreferredDomainControllers,
    .getDomainTrustState = GetDomainTrustState,
    .getTrustedDomains = GetTrustedDomains,
    .getMachineAccountDN = GetMachineAccountDN,
    .getAnyDomainController = GetAnyDomainController,
    .convertCanonicalUsername = ConvertCanonicalUsername,
    .getHostPrincipalForDomain = GetHostPrincipalForDomain,
};
