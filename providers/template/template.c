/* SPDX-License-Identifier: Apache-2.0 */
/*
 * A provider to begin with: it loads, answers, and knows no domain yet. Each entry says what is to
 * come into it; an entry that your directory has no answer for is left out of the record at the
 * end. What the entries promise their caller stands in tslauth/tslauth_provider.h and on the page
 * PROVIDERS.md.
 */
#include <tslauth/tslauth_provider.h>

#include <stdlib.h>
#include <string.h>

/* Joins the host in the name of an account. Undo what was begun where a step fails. */
static int JoinDomain(char const* domain, char const* organisationalUnit,
                      ActiveDirectoryClientCredentials const* credentials) {
    if (credentials->userName == NULL || credentials->password == NULL) {
        return TSLAUTH_PROVIDER_INVALID_PARAMETER;
    }
    (void)organisationalUnit; /* where the machine account is to be made; null: choose a place */
    (void)domain;
    return TSLAUTH_PROVIDER_NO_SUCH_DOMAIN;
}

/* Parts the host, also where nobody gives credentials. */
static int PartDomain(ActiveDirectoryClientCredentials const* credentials) {
    (void)credentials;
    return TSLAUTH_PROVIDER_NO_SUCH_DOMAIN; /* the host is in none */
}

/* The two names are released one by one: allocate each by itself. Both stay null where the host is
 * in no domain. */
static int GetActiveDomain(ActiveDirectoryClientDomain* domain,
                           ActiveDirectoryClientFreeFunction* release) {
    (void)domain;
    *release = free;
    return TSLAUTH_PROVIDER_SUCCESS;
}

static int GetDomainTrustState(void) {
    return TSLAUTH_PROVIDER_TRUST_NOT_JOINED;
}

/* One block for the array, the records and their names, since the array alone is released. It stays
 * null where there is none. */
static int GetTrustedDomains(ActiveDirectoryClientDomain*** domains,
                             ActiveDirectoryClientFreeFunction* release) {
    (void)domains;
    *release = free;
    return TSLAUTH_PROVIDER_SUCCESS;
}

/* How a text is handed out. */
static int ConvertCanonicalUsername(char const* name, char** canonicalName,
                                    ActiveDirectoryClientFreeFunction* release) {
    size_t const size = strlen(name) + 1;
    char* text;
    if (*name == '\0') {
        return TSLAUTH_PROVIDER_NO_SUCH_USER;
    }
    text = malloc(size);
    if (text == NULL) {
        return TSLAUTH_PROVIDER_NOT_ENOUGH_MEMORY;
    }
    memcpy(text, name, size); /* your directory's form of the name */
    *canonicalName = text;
    *release = free;
    return TSLAUTH_PROVIDER_SUCCESS;
}

ActiveDirectoryClientMetadataRecord const ActiveDirectoryClientMetadata = {
    .apiVersion = TSLAUTH_PROVIDER_API_VERSION,
    .pamModule = "pam_template.so", /* your PAM module */
    .nssModule = "template",        /* libnss_template.so.2 */
};

ActiveDirectoryClientOperationsRecord const ActiveDirectoryClientOperations = {
    .apiVersion = TSLAUTH_PROVIDER_API_VERSION,
    .joinDomain = JoinDomain,
    .partDomain = PartDomain,
    .getActiveDomain = GetActiveDomain,
    .getDomainTrustState = GetDomainTrustState,
    .getTrustedDomains = GetTrustedDomains,
    .convertCanonicalUsername = ConvertCanonicalUsername,
};
