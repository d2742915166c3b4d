// SPDX-License-Identifier: Apache-2.0
#include "WinbindClient.h"

#include "Failure.h"

#include <cstddef>
#include <cstdio>
#include <memory>
#include <new>

namespace tessel::winbind {

namespace {

/// libwbclient's memory.
struct Release {
    void operator()(void* memory) const {
        wbcFreeMemory(memory);
    }
};

template <typename T> using Owned = std::unique_ptr<T, Release>;

struct CloseContext {
    void operator()(wbcContext* context) const {
        wbcCtxFree(context);
    }
};

typedef std::unique_ptr<wbcContext, CloseContext> Context;

Context NewContext() {
    Context context(wbcCtxCreate());
    if (context == nullptr) {
        throw std::bad_alloc();
    }
    return context;
}

void Check(char const* question, wbcErr error) {
    if (error != WBC_ERR_SUCCESS) {
        throw Failure(CodeOfWinbind(error), std::string(question) + ": " + wbcErrorString(error));
    }
}

std::string TextOrEmpty(char const* text) {
    return text == nullptr ? std::string() : std::string(text);
}

struct CodeOfStatus {
    std::uint32_t status;
    ActiveDirectoryClientErrorCode code;
};

/// NT status numbers (MS-ERREF 2.3.1).
constexpr CodeOfStatus codes[] = {
    {0xC0000017, TSLAUTH_PROVIDER_NOT_ENOUGH_MEMORY},         // NO_MEMORY
    {0xC0000022, TSLAUTH_PROVIDER_ACCESS_DENIED},             // ACCESS_DENIED
    {0xC000005E, TSLAUTH_PROVIDER_NO_LOGON_SERVERS},          // NO_LOGON_SERVERS
    {0xC0000064, TSLAUTH_PROVIDER_NO_SUCH_USER},              // NO_SUCH_USER
    {0xC000006A, TSLAUTH_PROVIDER_LOGON_FAILURE},             // WRONG_PASSWORD
    {0xC000006C, TSLAUTH_PROVIDER_PASSWORD_RESTRICTION},      // PASSWORD_RESTRICTION
    {0xC000006D, TSLAUTH_PROVIDER_LOGON_FAILURE},             // LOGON_FAILURE
    {0xC0000071, TSLAUTH_PROVIDER_PASSWORD_EXPIRED},          // PASSWORD_EXPIRED
    {0xC0000072, TSLAUTH_PROVIDER_ACCOUNT_DISABLED},          // ACCOUNT_DISABLED
    {0xC0000073, TSLAUTH_PROVIDER_NO_SUCH_USER},              // NONE_MAPPED
    {0xC00000B5, TSLAUTH_PROVIDER_TIMED_OUT},                 // IO_TIMEOUT
    {0xC00000BE, TSLAUTH_PROVIDER_NO_LOGON_SERVERS},          // BAD_NETWORK_PATH
    {0xC00000C4, TSLAUTH_PROVIDER_CONNECTION_INVALID},        // UNEXPECTED_NETWORK_ERROR
    {0xC00000C9, TSLAUTH_PROVIDER_CONNECTION_INVALID},        // NETWORK_NAME_DELETED
    {0xC00000DA, TSLAUTH_PROVIDER_NO_TRUST_LSA_SECRET},       // CANT_ACCESS_DOMAIN_INFO
    {0xC00000DF, TSLAUTH_PROVIDER_NO_SUCH_DOMAIN},            // NO_SUCH_DOMAIN
    {0xC00000E5, TSLAUTH_PROVIDER_INTERNAL_ERROR},            // INTERNAL_ERROR
    {0xC0000122, TSLAUTH_PROVIDER_INVALID_COMPUTER_NAME},     // INVALID_COMPUTER_NAME
    {0xC0000133, TSLAUTH_PROVIDER_TIME_SKEW},                 // TIME_DIFFERENCE_AT_DC
    {0xC000018A, TSLAUTH_PROVIDER_NO_TRUST_LSA_SECRET},       // NO_TRUST_LSA_SECRET
    {0xC000018B, TSLAUTH_PROVIDER_NO_TRUST_SAM_ACCOUNT},      // NO_TRUST_SAM_ACCOUNT
    {0xC000018C, TSLAUTH_PROVIDER_DOMAIN_TRUST_INCONSISTENT}, // TRUSTED_DOMAIN_FAILURE
    {0xC000018D, TSLAUTH_PROVIDER_DOMAIN_TRUST_INCONSISTENT}, // TRUSTED_RELATIONSHIP_FAILURE
    {0xC0000193, TSLAUTH_PROVIDER_ACCOUNT_DISABLED},          // ACCOUNT_EXPIRED
    {0xC000019B, TSLAUTH_PROVIDER_DOMAIN_TRUST_INCONSISTENT}, // DOMAIN_TRUST_INCONSISTENT
    {0xC000020C, TSLAUTH_PROVIDER_CONNECTION_INVALID},        // CONNECTION_DISCONNECTED
    {0xC000020D, TSLAUTH_PROVIDER_CONNECTION_INVALID},        // CONNECTION_RESET
    {0xC0000224, TSLAUTH_PROVIDER_PASSWORD_EXPIRED},          // PASSWORD_MUST_CHANGE
    {0xC0000233, TSLAUTH_PROVIDER_NO_LOGON_SERVERS},          // DOMAIN_CONTROLLER_NOT_FOUND
    {0xC0000234, TSLAUTH_PROVIDER_ACCOUNT_DISABLED},          // ACCOUNT_LOCKED_OUT
    {0xC0000236, TSLAUTH_PROVIDER_CONNECTION_REFUSED},        // CONNECTION_REFUSED
    {0xC000023C, TSLAUTH_PROVIDER_NO_NETWORK},                // NETWORK_UNREACHABLE
    {0xC000023D, TSLAUTH_PROVIDER_NO_LOGON_SERVERS},          // HOST_UNREACHABLE
    {0xC0000241, TSLAUTH_PROVIDER_CONNECTION_INVALID},        // CONNECTION_ABORTED
};

} // namespace

ActiveDirectoryClientErrorCode CodeOfWinbind(wbcErr error) {
    switch (error) {
    case WBC_ERR_SUCCESS:
        return TSLAUTH_PROVIDER_SUCCESS;
    case WBC_ERR_NO_MEMORY:
        return TSLAUTH_PROVIDER_NOT_ENOUGH_MEMORY;
    case WBC_ERR_INVALID_PARAM:
        return TSLAUTH_PROVIDER_INVALID_PARAMETER;
    case WBC_ERR_WINBIND_NOT_AVAILABLE:
        return TSLAUTH_PROVIDER_SERVICE_NOT_ACTIVE;
    case WBC_ERR_DOMAIN_NOT_FOUND: // its answer to whatever it cannot do
        return TSLAUTH_PROVIDER_NO_SUCH_DOMAIN;
    case WBC_ERR_INVALID_RESPONSE:
        return TSLAUTH_PROVIDER_EXCEPTION_IN_SERVICE;
    case WBC_ERR_AUTH_ERROR:
        return TSLAUTH_PROVIDER_LOGON_FAILURE;
    case WBC_ERR_UNKNOWN_USER:
        return TSLAUTH_PROVIDER_NO_SUCH_USER;
    case WBC_ERR_UNKNOWN_GROUP:
        return TSLAUTH_PROVIDER_NO_SUCH_GROUP;
    case WBC_ERR_PWD_CHANGE_FAILED:
        return TSLAUTH_PROVIDER_PASSWORD_RESTRICTION;
    case WBC_ERR_NOT_IMPLEMENTED: // the library would take 120 for an entry that is missing
    case WBC_ERR_UNKNOWN_FAILURE:
    case WBC_ERR_INVALID_SID:
    case WBC_ERR_NSS_ERROR:
        return TSLAUTH_PROVIDER_INTERNAL_ERROR;
    }
    return TSLAUTH_PROVIDER_INTERNAL_ERROR; // a number of a later libwbclient
}

ActiveDirectoryClientErrorCode CodeOfNTStatus(std::uint32_t status) {
    for (CodeOfStatus const& entry : codes) {
        if (entry.status == status) {
            return entry.code;
        }
    }
    return TSLAUTH_PROVIDER_INTERNAL_ERROR;
}

WinbindClient::WinbindClient(BoundedCall::Clock::time_point deadline) : _deadline(deadline) {}

void WinbindClient::Ping() const {
    BoundedCall::Run("winbindd", _deadline,
                     [] { Check("winbindd", wbcCtxPing(NewContext().get())); });
}

WinbindClient::Host WinbindClient::GetHost() const {
    return BoundedCall::Run("the host's names", _deadline, [] {
        struct wbcInterfaceDetails* found = nullptr;
        Check("the host's names", wbcCtxInterfaceDetails(NewContext().get(), &found));
        Owned<struct wbcInterfaceDetails> const details(found);
        return Host{TextOrEmpty(details->netbios_name),
                    {TextOrEmpty(details->dns_domain), TextOrEmpty(details->netbios_domain)}};
    });
}

void WinbindClient::CheckTrustCredentials() const {
    BoundedCall::Run("the check of the host's secret", _deadline, [] {
        wbcAuthErrorInfo* found = nullptr;
        wbcErr const error = wbcCtxCheckTrustCredentials(NewContext().get(), nullptr, &found);
        Owned<wbcAuthErrorInfo> const info(found);
        if (error == WBC_ERR_AUTH_ERROR && info != nullptr) {
            throw Failure(CodeOfNTStatus(info->nt_status),
                          "the check of the host's secret: " + TextOrEmpty(info->nt_string));
        }
        Check("the check of the host's secret", error);
    });
}

std::vector<WinbindClient::Domain> WinbindClient::ListDomains() const {
    return BoundedCall::Run("the list of domains", _deadline, [] {
        struct wbcDomainInfo* found = nullptr;
        std::size_t count = 0;
        Check("the list of domains", wbcCtxListTrusts(NewContext().get(), &found, &count));
        Owned<struct wbcDomainInfo> const infos(found);
        std::vector<Domain> domains;
        domains.reserve(count);
        for (std::size_t i = 0; i < count; ++i) {
            struct wbcDomainInfo const& info = infos.get()[i];
            domains.push_back({{TextOrEmpty(info.dns_name), TextOrEmpty(info.short_name)},
                               info.trust_flags,
                               info.trust_type});
        }
        return domains;
    });
}

namespace {

/// What winbindd finds out about a controller of `domain`, in `site` if that is not empty.
Owned<wbcDomainControllerInfoEx> LookUpController(std::string const& domain,
                                                  std::string const& site) {
    wbcDomainControllerInfoEx* found = nullptr;
    std::string const question = "a controller of '" + domain + "'";
    Check(question.c_str(),
          wbcCtxLookupDomainControllerEx(
              NewContext().get(), domain.c_str(), nullptr, site.empty() ? nullptr : site.c_str(),
              WBC_LOOKUP_DC_DS_REQUIRED | WBC_LOOKUP_DC_RETURN_DNS_NAME, &found));
    return Owned<wbcDomainControllerInfoEx>(found);
}

} // namespace

std::string WinbindClient::FindDomainController(std::string const& domain,
                                                std::string const& site) const {
    return BoundedCall::Run("a controller of '" + domain + "'", _deadline, [domain, site] {
        std::string const name = TextOrEmpty(LookUpController(domain, site)->dc_unc);
        std::size_t const start = name.find_first_not_of('\\');
        if (start == std::string::npos) {
            throw Failure(TSLAUTH_PROVIDER_NO_LOGON_SERVERS,
                          "a controller of '" + domain + "': the one found has no name");
        }
        return name.substr(start);
    });
}

std::string WinbindClient::GetForest(std::string const& domain) const {
    return BoundedCall::Run("the forest of '" + domain + "'", _deadline, [domain] {
        return TextOrEmpty(LookUpController(domain, "")->forest_name);
    });
}

std::string WinbindClient::GetUserName(std::string const& domain, std::string const& name) const {
    std::string const question = "the user '" + domain + "\\" + name + "'";
    return BoundedCall::Run(question, _deadline, [domain, name, question] {
        Context const context = NewContext();
        wbcDomainSid sid = {};
        wbcSidType type = WBC_SID_NAME_USE_NONE;
        wbcErr const error =
            wbcCtxLookupName(context.get(), domain.c_str(), name.c_str(), &sid, &type);
        if (error == WBC_ERR_DOMAIN_NOT_FOUND ||
            (error == WBC_ERR_SUCCESS && type != WBC_SID_NAME_USER)) {
            throw Failure(TSLAUTH_PROVIDER_NO_SUCH_USER, question + ": there is none");
        }
        Check(question.c_str(), error);
        passwd* found = nullptr;
        Check(question.c_str(), wbcCtxGetpwsid(context.get(), &sid, &found));
        Owned<passwd> const entry(found);
        return TextOrEmpty(entry->pw_name);
    });
}

} // namespace tessel::winbind
