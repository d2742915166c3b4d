// SPDX-License-Identifier: Apache-2.0
// Each entry answers, fails or throws, as a test has told it.
#include "Scripted.h"

#include <cstdio>
#include <new>
#include <stdexcept>

Scripted scripted = {PTHREAD_MUTEX_INITIALIZER, {}, 0, 0, 0, {}, {}, {}};

namespace {

// Plain constants: there is nothing to give back.
void Keep(void*) {}

char const* TextOf(char const* argument) {
    return argument == nullptr ? "(null)" : argument;
}

/// Writes down a call and does as told; returns the code.
int Act(ScriptedEntry entry) {
    (void)pthread_mutex_lock(&scripted.lock); // a plain mutex
    if (scripted.count < sizeof scripted.calls / sizeof *scripted.calls) {
        scripted.calls[scripted.count] = entry;
    }
    ++scripted.count;
    scripted.thread = pthread_self();
    ScriptedAct const act = scripted.acts[entry];
    int const code = scripted.code;
    (void)pthread_mutex_unlock(&scripted.lock);
    switch (act) {
    case ScriptedAnswers:
        return TSLAUTH_PROVIDER_SUCCESS;
    case ScriptedFails:
        return code;
    case ScriptedThrowsStandard:
        throw std::runtime_error("thrown by the provider");
    case ScriptedThrowsBadAlloc:
        throw std::bad_alloc();
    case ScriptedThrowsNumber:
        throw 42;
    }
    return TSLAUTH_PROVIDER_SUCCESS;
}

int ActOn(ScriptedEntry entry, char const* first, char const* second) {
    (void)pthread_mutex_lock(&scripted.lock);
    (void)std::snprintf(scripted.arguments, sizeof scripted.arguments, "%s, %s", TextOf(first),
                        TextOf(second)); // a test's texts fit
    (void)pthread_mutex_unlock(&scripted.lock);
    return Act(entry);
}

int Value() {
    (void)pthread_mutex_lock(&scripted.lock);
    int const value = scripted.value;
    (void)pthread_mutex_unlock(&scripted.lock);
    return value;
}

int Hand(char const* text, char** slot, ActiveDirectoryClientFreeFunction* release, int code) {
    *slot = code == TSLAUTH_PROVIDER_SUCCESS ? const_cast<char*>(text) : nullptr;
    *release = Keep;
    return code;
}

extern "C" {

int GetActiveDomain(ActiveDirectoryClientDomain* domain,
                    ActiveDirectoryClientFreeFunction* release) {
    *domain = {"corp.example", "CORP"};
    *release = Keep;
    return Act(ScriptedActiveDomain);
}

int SetPreferredDomainControllers(char const** controllers) {
    return ActOn(ScriptedSetPreferredDomainControllers, controllers[0],
                 controllers[0] == nullptr ? nullptr : controllers[1]);
}

int GetPreferredDomainControllers(char*** controllers, ActiveDirectoryClientFreeFunction* release) {
    static char first[] = "dc1.corp.example";
    static char second[] = "dc2.corp.example";
    static char* names[] = {first, second, nullptr};
    *controllers = names;
    *release = Keep;
    return Act(ScriptedPreferredDomainControllers);
}

int GetDomainTrustState() {
    (void)Act(ScriptedTrustState); // has no code
    return Value();
}

int GetTrustedDomains(ActiveDirectoryClientDomain*** domains,
                      ActiveDirectoryClientFreeFunction* release) {
    static ActiveDirectoryClientDomain other = {"other.example", "OTHER"};
    static ActiveDirectoryClientDomain* list[] = {&other, nullptr};
    *domains = list;
    *release = Keep;
    return Act(ScriptedTrustedDomains);
}

int GetMachineAccountDN(char** name, ActiveDirectoryClientFreeFunction* release) {
    return Hand("CN=NODE", name, release, Act(ScriptedMachineAccountDN));
}

int GetAnyDomainController(char const* first, char const* domain, char** name,
                           ActiveDirectoryClientFreeFunction* release) {
    return Hand("dc3.corp.example", name, release,
                ActOn(ScriptedAnyDomainController, first, domain));
}

int ConvertCanonicalUsername(char const* canonical, char** name,
                             ActiveDirectoryClientFreeFunction* release) {
    return Hand("CORP\\converted", name, release,
                ActOn(ScriptedCanonicalUsername, canonical, nullptr));
}

int GetHostPrincipalForDomain(char const* domain, char** name,
                              ActiveDirectoryClientFreeFunction* release) {
    return Hand("host/node@CORP.EXAMPLE", name, release,
                ActOn(ScriptedHostPrincipal, domain, nullptr));
}

int GetDomainTrustRelationship(char const* domain) {
    (void)ActOn(ScriptedTrustRelationship, domain, nullptr); // has no code
    return Value();
}
}

} // namespace

ActiveDirectoryClientMetadataRecord const ActiveDirectoryClientMetadata = {
    2, "pam_scripted.so", nullptr, "scripted", nullptr};

ActiveDirectoryClientOperationsRecord const ActiveDirectoryClientOperations = {
    2,
    nullptr, // no joining
    nullptr, // no parting
    GetActiveDomain,
    SetPreferredDomainControllers,
    GetPreferredDomainControllers,
    nullptr, // unused
    GetDomainTrustState,
    GetTrustedDomains,
    GetMachineAccountDN,
    GetAnyDomainController,
    ConvertCanonicalUsername,
    nullptr, // no joining with a machine account
    GetHostPrincipalForDomain,
    GetDomainTrustRelationship};
