// SPDX-License-Identifier: Apache-2.0
#include "../winbind/Failure.h"
#include "Codes.h"
#include "HttpsClient.h"
#include "OneTimeCode.h"
#include "Paths.h"
#include "Protocol.h"
#include "join/DomainJoin.h"
#include "record/Uncancelled.h"
#include "samba/ThisHost.h"

#include <tslauth/tslauth_cam_provider.h>

#include <chrono>
#include <fstream>
#include <new>
#include <random>
#include <string>
#include <string_view>
#include <syslog.h>

namespace tessel::winbind::cam {

namespace {

/// How long a server may take in all. An account is made by the domain's controller meanwhile, for
/// which the service allows 20 s.
constexpr std::chrono::seconds DomainLimit(15);
constexpr std::chrono::seconds AccountLimit(30);

/// What this thread was handed last, with zero bytes at the ends. It is the thread's until it asks
/// again, and wiped then.
thread_local SecretText results[3];

char* HandOut(SecretText& slot, std::string_view text) {
    slot.reserve(text.size() + 1); // what grows leaves copies, though wiped ones
    slot.assign(text.begin(), text.end());
    slot.push_back('\0');
    return slot.data();
}

void ForgetResults() {
    for (SecretText& result : results) {
        SecretText().swap(result); // which wipes; clear would not
    }
}

/// What the machine is known by to itself. Where it is known by nothing, another text each time:
/// the service then cannot find an account again.
std::string Machine() {
    std::string machine;
    std::getline(std::ifstream(Paths::Machine), machine);
    if (machine.empty()) {
        std::random_device random;
        for (int i = 0; i < 4; ++i) {
            machine += std::to_string(random()) + "-";
        }
    }
    return machine;
}

/// A code that stays behind is worth nothing any more: no reason to fail for.
void Spend(OneTimeCode const& code) {
    try {
        code.Spend();
    } catch (Failure const& failure) {
        syslog(LOG_WARNING, "winbind-cam: %s, ignoring: it is used", failure.what());
    }
}

/// The service waits for it, for a while: nothing is lost where it does not arrive.
void TellThatItCame(HttpsClient& client, MachineAccount const& account) {
    try {
        (void)client.Post(ReceivedPath, ReceivedRequest(account.claim)); // an empty answer
    } catch (Failure const& failure) {
        syslog(LOG_WARNING, "winbind-cam: %s, ignoring: the account has come", failure.what());
    }
}

void CreateAccount(char const* server, Trust const& trust, char const* accountName,
                   char const* organisationalUnit, char** firstResult, char** secondResult) {
    if (!trust.IsKnown()) {
        // Anybody could be at that address, take the code and hand out a domain of his own.
        throw Failure(Codes::InvalidCertificate,
                      std::string("nothing is pinned for ") + server +
                          " and certificates are not verified: it gets no one-time code");
    }
    RequireHostName(accountName);
    // The provider `winbind` would refuse later, with the code spent and the account made anew:
    // that of a host that is joined would be broken by it.
    DomainJoin::RequireJoinable(ThisHost());
    OneTimeCode const code(Paths::OneTimeCode);
    SecretText const text = code.Read();
    SecretText const request =
        AccountRequest(accountName, organisationalUnit, View(text), HostKey(Machine(), View(text)));
    HttpsClient client(server, Paths::Port, trust, Deadline::clock::now() + AccountLimit);
    MachineAccount const account = ReadAccountAnswer(View(client.Post(AccountPath, request)));
    Spend(code);
    TellThatItCame(client, account);
    *firstResult = HandOut(results[0], View(account.blob));
    *secondResult = HandOut(results[1], account.controller);
}

/// Runs an entry; nothing but a code leaves it.
template <typename Entry> int Guarded(char const* name, Entry entry) noexcept {
    Uncancelled const call;
    try {
        ForgetResults();
        entry();
        return TSLAUTH_CAM_PROVIDER_SUCCESS;
    } catch (Failure const& failure) {
        syslog(LOG_WARNING, "winbind-cam: %s: %s", name, failure.what());
        return static_cast<int>(failure.Code());
    } catch (std::bad_alloc const&) {
        return TSLAUTH_CAM_PROVIDER_NOT_ENOUGH_MEMORY;
    } catch (std::exception const& error) {
        syslog(LOG_WARNING, "winbind-cam: %s: %s", name, error.what());
        return static_cast<int>(Codes::Unknown);
    }
}

int GetDomainInformation(char const* server, int verifyCertificate, char const* thumbprint,
                         char** netBIOSDomainName, char** dnsDomainName, char** domainSID) {
    return Guarded("get domain information", [&] {
        // Which domain a server claims to serve is asked before it is trusted, too.
        Trust const trust = {verifyCertificate != 0, thumbprint, Paths::Authorities};
        HttpsClient client(server, Paths::Port, trust, Deadline::clock::now() + DomainLimit);
        DomainInformation const information = ReadDomainAnswer(View(client.Get(DomainPath)));
        *netBIOSDomainName = HandOut(results[0], information.netBIOSName);
        *dnsDomainName = HandOut(results[1], information.dnsName);
        *domainSID = HandOut(results[2], information.sid);
    });
}

int CreateMachineAccount(char const* server, char const* accountName,
                         char const* organisationalUnit, int verifyCertificate,
                         char const* thumbprint, char** firstResult, char** secondResult) {
    return Guarded("create machine account", [&] {
        CreateAccount(server, {verifyCertificate != 0, thumbprint, Paths::Authorities}, accountName,
                      organisationalUnit, firstResult, secondResult);
    });
}

} // namespace

} // namespace tessel::winbind::cam

CAMProxyClientOperationsRecord const CAMProxyClientOperations = {
    1,
    tessel::winbind::cam::GetDomainInformation,
    tessel::winbind::cam::CreateMachineAccount,
};
