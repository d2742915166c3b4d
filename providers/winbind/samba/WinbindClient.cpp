// SPDX-License-Identifier: Apache-2.0
#include "samba/WinbindClient.h"

#include "Failure.h"

#include <cstddef>
#include <memory>
#include <new>
#include <utility>

namespace tessel::winbind {

namespace {

/// libwbclient's memory.
struct Release {
    void operator()(void* memory) const {
        wbcFreeMemory(memory);
    }
};

template <typename T> using Owned = std::unique_ptr<T, Release>;

/// A connection to winbindd, for one question.
class Connection {
public:
    explicit Connection(std::string question) : _question(std::move(question)) {
        _context.reset(wbcCtxCreate());
        if (_context == nullptr) {
            throw std::bad_alloc();
        }
    }

    wbcContext* Context() const {
        return _context.get();
    }

    Failure Failed(ActiveDirectoryClientErrorCode code, std::string const& why) const {
        return {code, _question + ": " + why};
    }

    void Check(wbcErr error) const {
        // winbindd hangs up when it has waited too long for a controller ("winbind request timeout"
        // in smb.conf(5)), which libwbclient cannot tell from a winbindd that does not run.
        if (error == WBC_ERR_WINBIND_NOT_AVAILABLE && wbcCtxPing(Context()) == WBC_ERR_SUCCESS) {
            throw Failed(TSLAUTH_PROVIDER_TIMED_OUT, "winbindd waited for a controller in vain");
        }
        if (error != WBC_ERR_SUCCESS) {
            throw Failed(CodeOfWinbind(error), wbcErrorString(error));
        }
    }

private:
    struct Close {
        void operator()(wbcContext* context) const {
            wbcCtxFree(context);
        }
    };

    std::string _question;
    std::unique_ptr<wbcContext, Close> _context;
};

/// Calls `ask` with a connection, within the bound.
template <typename Question>
auto Ask(std::string const& question, BoundedCall::Clock::time_point deadline, Question ask) {
    return BoundedCall::Run(question, deadline,
                            [question, ask] { return ask(Connection(question)); });
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
    {0xC0000193, TSLAUTH_PROVIDER_PASSWORD_EXPIRED},          // ACCOUNT_EXPIRED
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
#if WBCLIENT_MINOR_VERSION >= 16
    case WBC_ERR_NOT_MAPPED:
#endif
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
    Ask("winbindd", _deadline,
        [](Connection const& winbindd) { winbindd.Check(wbcCtxPing(winbindd.Context())); });
}

WinbindClient::Host WinbindClient::GetHost() const {
    return Ask("the host's names", _deadline, [](Connection const& winbindd) {
        struct wbcInterfaceDetails* found = nullptr;
        winbindd.Check(wbcCtxInterfaceDetails(winbindd.Context(), &found));
        Owned<struct wbcInterfaceDetails> const details(found);
        return Host{TextOrEmpty(details->netbios_name),
                    {TextOrEmpty(details->dns_domain), TextOrEmpty(details->netbios_domain)}};
    });
}

void WinbindClient::CheckTrustCredentials() const {
    Ask("the check of the host's secret", _deadline, [](Connection const& winbindd) {
        wbcAuthErrorInfo* found = nullptr;
        wbcErr const error = wbcCtxCheckTrustCredentials(winbindd.Context(), nullptr, &found);
        Owned<wbcAuthErrorInfo> const info(found);
        if (error == WBC_ERR_AUTH_ERROR && info != nullptr) {
            throw winbindd.Failed(CodeOfNTStatus(info->nt_status), TextOrEmpty(info->nt_string));
        }
        winbindd.Check(error);
    });
}

std::vector<WinbindClient::Domain> WinbindClient::ListDomains() const {
    return Ask("the list of domains", _deadline, [](Connection const& winbindd) {
        struct wbcDomainInfo* found = nullptr;
        std::size_t count = 0;
        winbindd.Check(wbcCtxListTrusts(winbindd.Context(), &found, &count));
        Owned<struct wbcDomainInfo> const infos(found);
        std::vector<Domain> domains;
        domains.reserve(count);
        for (std::size_t i = 0; i < count; ++i) {
            struct wbcDomainInfo const& info = infos.get()[i];
            domains.push_back(
                {{TextOrEmpty(info.dns_name), TextOrEmpty(info.short_name)}, info.trust_type});
        }
        return domains;
    });
}

namespace {

/// What winbindd finds out about a controller of `domain`, in `site` if that is not empty.
Owned<wbcDomainControllerInfoEx>
LookUpController(Connection const& winbindd, std::string const& domain, std::string const& site) {
    wbcDomainControllerInfoEx* found = nullptr;
    winbindd.Check(wbcCtxLookupDomainControllerEx(
        winbindd.Context(), domain.c_str(), nullptr, site.empty() ? nullptr : site.c_str(),
        WBC_LOOKUP_DC_DS_REQUIRED | WBC_LOOKUP_DC_RETURN_DNS_NAME, &found));
    return Owned<wbcDomainControllerInfoEx>(found);
}

} // namespace

std::string WinbindClient::FindDomainController(std::string const& domain,
                                                std::string const& site) const {
    return Ask(
        "a controller of '" + domain + "'", _deadline, [domain, site](Connection const& winbindd) {
            std::string const name = TextOrEmpty(LookUpController(winbindd, domain, site)->dc_unc);
            std::size_t const start = name.find_first_not_of('\\');
            if (start == std::string::npos) {
                throw winbindd.Failed(TSLAUTH_PROVIDER_NO_LOGON_SERVERS, "it has no name");
            }
            return name.substr(start);
        });
}

std::string WinbindClient::GetForest(std::string const& domain) const {
    return Ask("the forest of '" + domain + "'", _deadline, [domain](Connection const& winbindd) {
        return TextOrEmpty(LookUpController(winbindd, domain, "")->forest_name);
    });
}

std::string WinbindClient::GetUserName(std::string const& domain, std::string const& name) const {
    return Ask("the user '" + name + "' of '" + domain + "'", _deadline,
               [domain, name](Connection const& winbindd) {
                   wbcDomainSid sid = {};
                   wbcSidType type = WBC_SID_NAME_USE_NONE;
                   wbcErr const error = wbcCtxLookupName(winbindd.Context(), domain.c_str(),
                                                         name.c_str(), &sid, &type);
                   if (error == WBC_ERR_DOMAIN_NOT_FOUND ||
                       (error == WBC_ERR_SUCCESS && type != WBC_SID_NAME_USER)) {
                       throw winbindd.Failed(TSLAUTH_PROVIDER_NO_SUCH_USER, "there is none");
                   }
                   winbindd.Check(error);
                   passwd* found = nullptr;
                   winbindd.Check(wbcCtxGetpwsid(winbindd.Context(), &sid, &found));
                   Owned<passwd> const entry(found);
                   return TextOrEmpty(entry->pw_name);
               });
}

WinbindClient::Account WinbindClient::GetAccount(std::string const& name) const {
    return Ask("the account of '" + name + "'", _deadline, [name](Connection const& winbindd) {
        passwd* foundEntry = nullptr;
        wbcErr const error = wbcCtxGetpwnam(winbindd.Context(), name.c_str(), &foundEntry);
        if (error == WBC_ERR_DOMAIN_NOT_FOUND || error == WBC_ERR_UNKNOWN_USER) {
            throw winbindd.Failed(TSLAUTH_PROVIDER_NO_SUCH_USER, "there is none");
        }
        winbindd.Check(error);
        Owned<passwd> const entry(foundEntry);
        wbcDomainSid sid = {};
        winbindd.Check(wbcCtxUidToSid(winbindd.Context(), entry->pw_uid, &sid));
        char* foundDomain = nullptr;
        char* foundName = nullptr;
        wbcSidType type = WBC_SID_NAME_USE_NONE;
        winbindd.Check(wbcCtxLookupSid(winbindd.Context(), &sid, &foundDomain, &foundName, &type));
        Owned<char> const domain(foundDomain);
        Owned<char> const accountName(foundName);
        char identifier[WBC_SID_STRING_BUFLEN] = {};
        (void)wbcSidToStringBuf(&sid, identifier, sizeof identifier); // long enough for every one
        return Account{identifier, TextOrEmpty(domain.get())};
    });
}

} // namespace tessel::winbind
