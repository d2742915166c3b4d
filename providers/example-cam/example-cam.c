/* SPDX-License-Identifier: Apache-2.0 */
/*
 * The smallest complete CAM provider: it lets a host join the domain of the example provider,
 * "example.test". There is no server behind it; what one would present and decide stands in files.
 * README.md says in which. Copy the folder, and replace the part that is named "The server"; what
 * the entries promise their caller stands in tslauth_cam_provider.h.
 */
#define _DEFAULT_SOURCE /* flock; POSIX.1-2008 is in it */

#include <tslauth/tslauth_cam_provider.h>

#include <openssl/crypto.h>
#include <openssl/err.h>
#include <openssl/evp.h>
#include <openssl/pem.h>
#include <openssl/rand.h>
#include <openssl/x509.h>

#include <errno.h>
#include <fcntl.h>
#include <limits.h>
#include <stdbool.h>
#include <stdio.h>
#include <stdlib.h>
#include <string.h>
#include <sys/file.h>
#include <unistd.h>

#define SERVERS "/etc/tslauth-example/cam/"      /* "ADDRESS.pem": what that server presents */
#define ACCOUNTS "/etc/tslauth-example/accounts" /* "name:secret" lines, the example provider's */

/* Answers that the library has no class for; they reach the user as unknown, with their number. */
enum { NO_SUCH_UNIT = 2, ACCESS_DENIED = 5, INVALID_COMPUTER_NAME = 1210, INTERNAL_ERROR = 1359 };

enum { DIGEST = 20, THUMBPRINT = 3 * DIGEST, SECRET = 16, SECRET_TEXT = 256 };

/* What is handed out belongs to this library and stays as it is until the same thread asks again,
 * so that two threads may join at once. */
static __thread char secretText[SECRET_TEXT];
static char netBIOSName[] = "EXAMPLE";
static char dnsName[] = "example.test";
static char sid[] = "S-1-5-21-1004336348-1177238915-682003330";
static char nothing[] = "";

/* ---- The certificate ---------------------------------------------------------------------- */

/* Whether `certificate` is the one that was pinned. The library has brought the thumbprint into
 * this very form: upper-case pairs with colons. */
static bool IsPinned(X509 const* certificate, char const* thumbprint) {
    unsigned char digest[EVP_MAX_MD_SIZE];
    unsigned size = 0;
    char text[THUMBPRINT + 1];
    if (X509_digest(certificate, EVP_sha1(), digest, &size) <= 0 || size != DIGEST) {
        return false;
    }
    for (size_t i = 0; i < DIGEST; ++i) {
        /* Three characters fit: the last one's colon is cut off below. */
        (void)snprintf(text + 3 * i, sizeof text - 3 * i, "%02X:", digest[i]);
    }
    text[THUMBPRINT - 1] = '\0';
    return strcmp(text, thumbprint) == 0;
}

/* "Connects" to the server: SUCCESS if it is there and may be trusted. Nobody else looks at the
 * certificate again, so a server of which nothing is pinned is refused where verification is on. */
static int Connect(char const* server, int verifyCertificate, char const* thumbprint) {
    char path[PATH_MAX];
    X509* certificate;
    bool trusted;
    int const length = snprintf(path, sizeof path, SERVERS "%s.pem", server);
    FILE* file;
    /* The library hands on addresses alone; a name that leads elsewhere is no server. */
    if (length < 0 || (size_t)length >= sizeof path || strchr(server, '/') != NULL) {
        return TSLAUTH_CAM_PROVIDER_CONNECTION_INVALID;
    }
    file = fopen(path, "re");
    if (file == NULL) {
        return errno == ENOENT ? TSLAUTH_CAM_PROVIDER_CONNECTION_REFUSED
                               : TSLAUTH_CAM_PROVIDER_CONNECTION_INVALID;
    }
    (void)ERR_set_mark(); /* the process's own errors are left as they are */
    certificate = PEM_read_X509(file, NULL, NULL, NULL);
    trusted = certificate != NULL && IsPinned(certificate, thumbprint);
    X509_free(certificate);
    (void)ERR_pop_to_mark();
    (void)fclose(file); /* it was only read */
    return verifyCertificate == 0 || trusted ? TSLAUTH_CAM_PROVIDER_SUCCESS
                                             : TSLAUTH_CAM_PROVIDER_INVALID_CERTIFICATE;
}

/* ---- The server --------------------------------------------------------------------------- */

/* Looks for the account `name` from the beginning of `file`: puts its secret into `secretText`, or
 * sets `*isNew`. `*endsLine` tells whether a line may be appended as it is. */
static int FindSecret(FILE* file, char const* name, bool* isNew, bool* endsLine) {
    char* line = NULL;
    size_t size = 0;
    ssize_t length;
    size_t const nameLength = strlen(name);
    int code = TSLAUTH_CAM_PROVIDER_SUCCESS;
    *isNew = true;
    *endsLine = true;
    while (*isNew && (length = getline(&line, &size, file)) >= 0) {
        *endsLine = line[length - 1] == '\n';
        if (strncmp(line, name, nameLength) == 0 && line[nameLength] == ':') {
            char const* const secret = line + nameLength + 1;
            size_t const secretLength = strcspn(secret, "\n");
            *isNew = false;
            if (secretLength < sizeof secretText) {
                memcpy(secretText, secret, secretLength);
                secretText[secretLength] = '\0';
            } else {
                code = INTERNAL_ERROR; /* no secret of ours */
            }
        }
    }
    if (ferror(file)) {
        code = INTERNAL_ERROR;
    }
    OPENSSL_cleanse(line, size);
    free(line);
    return code;
}

/* Makes an account with a secret of its own at the end of `file`. */
static int AddAccount(FILE* file, char const* name, bool endsLine) {
    unsigned char bytes[SECRET];
    if (RAND_bytes(bytes, sizeof bytes) != 1) {
        return INTERNAL_ERROR;
    }
    for (size_t i = 0; i < SECRET; ++i) {
        (void)snprintf(secretText + 2 * i, 3, "%02x", bytes[i]); /* it always fits */
    }
    OPENSSL_cleanse(bytes, sizeof bytes);
    if (fseek(file, 0, SEEK_END) != 0 ||
        fprintf(file, "%s%s:%s\n", endsLine ? "" : "\n", name, secretText) < 0 ||
        fflush(file) != 0 || fsync(fileno(file)) != 0) {
        return INTERNAL_ERROR;
    }
    return TSLAUTH_CAM_PROVIDER_SUCCESS;
}

/* Threads and processes that join at once are kept apart by a lock of the opened file (one of
 * fcntl's would be the process's), which ends with the descriptor. An account that is there already
 * keeps its secret: a host may join again. */
static int MakeAccount(char const* name) {
    bool isNew = false;
    bool endsLine = true;
    int descriptor;
    int code;
    FILE* file;
    if (*name == '\0' || strpbrk(name, ":\n") != NULL) {
        return INVALID_COMPUTER_NAME;
    }
    descriptor = open(ACCOUNTS, O_RDWR | O_CREAT | O_CLOEXEC, 0600);
    if (descriptor < 0) {
        return ACCESS_DENIED;
    }
    file = fdopen(descriptor, "r+");
    if (file == NULL) {
        (void)close(descriptor); /* nothing was written */
        return TSLAUTH_CAM_PROVIDER_NOT_ENOUGH_MEMORY;
    }
    code = flock(descriptor, LOCK_EX) == 0 ? FindSecret(file, name, &isNew, &endsLine)
                                           : INTERNAL_ERROR;
    if (code == TSLAUTH_CAM_PROVIDER_SUCCESS && isNew) {
        code = AddAccount(file, name, endsLine);
    }
    (void)fclose(file); /* what was written has been synced */
    return code;
}

/* ---- The entries -------------------------------------------------------------------------- */

static int GetDomainInformation(char const* server, int verifyCertificate, char const* thumbprint,
                                char** netBIOSDomainName, char** dnsDomainName, char** domainSID) {
    int const code = Connect(server, verifyCertificate, thumbprint);
    if (code == TSLAUTH_CAM_PROVIDER_SUCCESS) {
        *netBIOSDomainName = netBIOSName;
        *dnsDomainName = dnsName;
        *domainSID = sid;
    }
    return code;
}

/* The example provider wants the account's secret as the first result, and no second one. */
static int CreateMachineAccount(char const* server, char const* accountName,
                                char const* organisationalUnit, int verifyCertificate,
                                char const* thumbprint, char** firstResult, char** secondResult) {
    int code = Connect(server, verifyCertificate, thumbprint);
    if (code == TSLAUTH_CAM_PROVIDER_SUCCESS && organisationalUnit != NULL) {
        code = NO_SUCH_UNIT; /* a directory in plain files has no units */
    }
    if (code == TSLAUTH_CAM_PROVIDER_SUCCESS) {
        code = MakeAccount(accountName);
    }
    if (code == TSLAUTH_CAM_PROVIDER_SUCCESS) {
        *firstResult = secretText;
        *secondResult = nothing;
    }
    return code;
}

/* ---- What is exported --------------------------------------------------------------------- */

CAMProxyClientOperationsRecord const CAMProxyClientOperations = {
    .apiVersion = 0,
    .getDomainInformation = GetDomainInformation,
    .createMachineAccount = CreateMachineAccount,
};
