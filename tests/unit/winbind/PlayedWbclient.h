// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "samba/WinbindClient.h"

#include <cstdint>
#include <cstdlib>
#include <cstring>
#include <functional>
#include <iterator>
#include <map>
#include <pwd.h>
#include <string>
#include <utility>
#include <vector>

/// What winbindd answers to this program, whose libwbclient is this file: its functions stand
/// before the library's. For one test file a program.
struct PlayedWinbindd {
    struct Domain {
        std::string netBIOSName;
        std::string dnsName;
        std::uint32_t trustType;
        std::string forest;
        std::string controller;
    };

    wbcErr ping = WBC_ERR_SUCCESS;
    wbcErr trust = WBC_ERR_SUCCESS;
    std::uint32_t trustStatus = 0; ///< where `trust` is WBC_ERR_AUTH_ERROR
    wbcErr list = WBC_ERR_SUCCESS;
    std::vector<Domain> domains;
    /// Users by the domain and the name that they are asked for.
    std::map<std::pair<std::string, std::string>, std::string> users;
    wbcErr lookup = WBC_ERR_SUCCESS;
    /// What becomes of the question for an account.
    std::function<wbcErr()> account = [] { return WBC_ERR_UNKNOWN_USER; };

    /// The one that is asked.
    static PlayedWinbindd& Here() {
        static PlayedWinbindd here;
        return here;
    }
};

namespace played {

/// Stays, where a leak checker sees it: these programs are short.
inline char* Copy(std::string const& text) {
    // Not destroyed: a checker looks when destructors have run.
    static auto& kept = *new std::vector<char*>;
    kept.push_back(::strdup(text.c_str()));
    return kept.back();
}

template <typename T> T* Make(std::size_t count = 1) {
    return static_cast<T*>(std::calloc(count, sizeof(T)));
}

} // namespace played

extern "C" {

wbcContext* wbcCtxCreate() {
    return reinterpret_cast<wbcContext*>(played::Make<char>());
}

void wbcCtxFree(wbcContext* context) {
    std::free(context);
}

void wbcFreeMemory(void* memory) {
    std::free(memory);
}

char const* wbcErrorString(wbcErr) {
    return "deliberate";
}

wbcErr wbcCtxPing(wbcContext*) {
    return PlayedWinbindd::Here().ping;
}

wbcErr wbcCtxInterfaceDetails(wbcContext*, struct wbcInterfaceDetails** details) {
    *details = played::Make<struct wbcInterfaceDetails>();
    (*details)->netbios_name = played::Copy("NODE");
    (*details)->netbios_domain = played::Copy("CORP");
    (*details)->dns_domain = played::Copy("corp.example");
    return WBC_ERR_SUCCESS;
}

wbcErr wbcCtxCheckTrustCredentials(wbcContext*, char const*, wbcAuthErrorInfo** error) {
    *error = played::Make<wbcAuthErrorInfo>();
    (*error)->nt_status = PlayedWinbindd::Here().trustStatus;
    (*error)->nt_string = played::Copy("NT_STATUS");
    return PlayedWinbindd::Here().trust;
}

wbcErr wbcCtxListTrusts(wbcContext*, struct wbcDomainInfo** domains, size_t* count) {
    auto const& known = PlayedWinbindd::Here().domains;
    *domains = played::Make<struct wbcDomainInfo>(known.size() + 1);
    *count = known.size();
    for (std::size_t i = 0; i < known.size(); ++i) {
        (*domains)[i].short_name = played::Copy(known[i].netBIOSName);
        (*domains)[i].dns_name = played::Copy(known[i].dnsName);
        (*domains)[i].trust_type = known[i].trustType;
    }
    return PlayedWinbindd::Here().list;
}

wbcErr wbcCtxLookupDomainControllerEx(wbcContext*, char const* domain, wbcGuid*, char const* site,
                                      uint32_t, wbcDomainControllerInfoEx** info) {
    for (auto const& known : PlayedWinbindd::Here().domains) {
        if ((known.dnsName == domain || known.netBIOSName == domain) && !known.controller.empty()) {
            *info = played::Make<wbcDomainControllerInfoEx>();
            std::string const in = site ? std::string(site) + '.' : std::string();
            (*info)->dc_unc = played::Copy("\\\\" + in + known.controller);
            (*info)->forest_name = played::Copy(known.forest);
            return WBC_ERR_SUCCESS;
        }
    }
    return WBC_ERR_DOMAIN_NOT_FOUND;
}

wbcErr wbcCtxLookupName(wbcContext*, char const* domain, char const* name, wbcDomainSid* sid,
                        wbcSidType* type) {
    auto const& here = PlayedWinbindd::Here();
    if (here.lookup != WBC_ERR_SUCCESS) {
        return here.lookup;
    }
    auto const found = here.users.find({domain, name});
    if (found == here.users.end()) {
        return WBC_ERR_DOMAIN_NOT_FOUND;
    }
    sid->num_auths = static_cast<std::uint8_t>(std::distance(here.users.begin(), found));
    *type = WBC_SID_NAME_USER;
    return WBC_ERR_SUCCESS;
}

wbcErr wbcCtxGetpwnam(wbcContext*, char const*, passwd**) {
    return PlayedWinbindd::Here().account();
}

wbcErr wbcCtxGetpwsid(wbcContext*, wbcDomainSid* sid, passwd** entry) {
    *entry = played::Make<passwd>();
    (*entry)->pw_name =
        played::Copy(std::next(PlayedWinbindd::Here().users.begin(), sid->num_auths)->second);
    return WBC_ERR_SUCCESS;
}

} // extern "C"
