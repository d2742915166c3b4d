// SPDX-License-Identifier: Apache-2.0
#include "text/ToolFailure.h"

#include "tslauth_winbind_provider.h"

#include <base/AsciiText.h>

#include <algorithm>
#include <cstddef>

using namespace tessel::base::AsciiText;

namespace tessel::winbind {

namespace {

struct KnownText {
    std::string_view text;
    ActiveDirectoryClientErrorCode code;
};

/// The first entry whose text occurs decides, so that what says most stands first: a tool often
/// tries another way after a failure, and prints what came of both. Texts are compared without
/// regard to case, and "*" stands for the rest of a line up to what follows. Samba prints what a
/// controller said as a name (NT_STATUS_..., WERR_...) or as the sentence that belongs to it, and
/// adds the texts of LDAP and Kerberos.
constexpr KnownText KnownTexts[] = {
    // The account that asks. What is wrong with it is said only to who knows its password.
    {"account_disabled", TSLAUTH_PROVIDER_ACCOUNT_DISABLED},
    {"account is currently disabled", TSLAUTH_PROVIDER_ACCOUNT_DISABLED},
    {"account currently disabled", TSLAUTH_PROVIDER_ACCOUNT_DISABLED},
    {"credentials have been revoked", TSLAUTH_PROVIDER_ACCOUNT_DISABLED},
    // No class says "locked out": like a disabled account, it cannot be used although the password
    // may be right.
    {"account_locked_out", TSLAUTH_PROVIDER_ACCOUNT_DISABLED},
    {"account has been automatically locked", TSLAUTH_PROVIDER_ACCOUNT_DISABLED},
    {"account is currently locked out", TSLAUTH_PROVIDER_ACCOUNT_DISABLED},
    // Nor does one say that the account itself has expired.
    {"account_expired", TSLAUTH_PROVIDER_PASSWORD_EXPIRED},
    {"account has expired", TSLAUTH_PROVIDER_PASSWORD_EXPIRED},
    {"entry in database has expired", TSLAUTH_PROVIDER_PASSWORD_EXPIRED},
    {"password_must_change", TSLAUTH_PROVIDER_PASSWORD_EXPIRED},
    {"password must be changed", TSLAUTH_PROVIDER_PASSWORD_EXPIRED},
    {"password_expired", TSLAUTH_PROVIDER_PASSWORD_EXPIRED},
    {"password has expired", TSLAUTH_PROVIDER_PASSWORD_EXPIRED},
    // Kerberos looks for the service that changes passwords only then.
    {"failed: cannot determine realm for host", TSLAUTH_PROVIDER_PASSWORD_EXPIRED},

    // What it may do.
    {"insufficient access", TSLAUTH_PROVIDER_ACCESS_DENIED},
    {"access_denied", TSLAUTH_PROVIDER_ACCESS_DENIED},
    {"{access denied}", TSLAUTH_PROVIDER_ACCESS_DENIED},
    {"access is denied", TSLAUTH_PROVIDER_ACCESS_DENIED},
    {"does not have administrator privileges", TSLAUTH_PROVIDER_ACCESS_DENIED},
    {"exceeded the maximum number of computer accounts", TSLAUTH_PROVIDER_ACCESS_DENIED},
    {"machine_account_quota_exceeded", TSLAUTH_PROVIDER_ACCESS_DENIED},
    {"account_restriction", TSLAUTH_PROVIDER_ACCESS_DENIED},
    {"account restriction", TSLAUTH_PROVIDER_ACCESS_DENIED},
    {"invalid_workstation", TSLAUTH_PROVIDER_ACCESS_DENIED},
    {"log on from the source workstation", TSLAUTH_PROVIDER_ACCESS_DENIED},
    {"invalid_logon_hours", TSLAUTH_PROVIDER_ACCESS_DENIED},
    {"account has time restrictions", TSLAUTH_PROVIDER_ACCESS_DENIED},
    {"logon_type_not_granted", TSLAUTH_PROVIDER_ACCESS_DENIED},
    {"requested a type of logon", TSLAUTH_PROVIDER_ACCESS_DENIED},

    // The clocks.
    {"time_difference_at_dc", TSLAUTH_PROVIDER_TIME_SKEW},
    {"time at the primary domain controller is different", TSLAUTH_PROVIDER_TIME_SKEW},
    {"time_skew", TSLAUTH_PROVIDER_TIME_SKEW},
    {"time and/or date difference", TSLAUTH_PROVIDER_TIME_SKEW},
    {"clock skew too great", TSLAUTH_PROVIDER_TIME_SKEW},

    // The names: of the unit, the host, the domain.
    {"failed to precreate account in ou", TSLAUTH_PROVIDER_INVALID_PARAMETER},
    {"creating machine accounts in organizational units", TSLAUTH_PROVIDER_INVALID_PARAMETER},
    {"invalid dn syntax", TSLAUTH_PROVIDER_INVALID_PARAMETER},
    {"supply a valid ou path", TSLAUTH_PROVIDER_INVALID_PARAMETER},
    {"specified computer name is invalid", TSLAUTH_PROVIDER_INVALID_COMPUTER_NAME},
    {"netbios name can be at most", TSLAUTH_PROVIDER_INVALID_COMPUTER_NAME},
    {"invalid_computer", TSLAUTH_PROVIDER_INVALID_COMPUTER_NAME},
    {"\"netbios name\" set to", TSLAUTH_PROVIDER_INVALID_COMPUTER_NAME},
    {"specified domain name is invalid", TSLAUTH_PROVIDER_INVALID_DOMAIN_NAME},
    {"invalid_domainname", TSLAUTH_PROVIDER_INVALID_DOMAIN_NAME},
    {"realm must be set", TSLAUTH_PROVIDER_INVALID_DOMAIN_NAME},
    {"supply a valid domain name", TSLAUTH_PROVIDER_INVALID_DOMAIN_NAME},
    {"\"realm\" set to", TSLAUTH_PROVIDER_INVALID_DOMAIN_NAME},
    {"specified workgroup name is invalid", TSLAUTH_PROVIDER_INVALID_WORKGROUP_NAME},
    {"\"workgroup\" set to", TSLAUTH_PROVIDER_INVALID_WORKGROUP_NAME},
    {"invalid_account_name", TSLAUTH_PROVIDER_INVALID_ACCOUNT_NAME},
    {"not a properly formed account name", TSLAUTH_PROVIDER_INVALID_ACCOUNT_NAME},

    // The membership: one too many, one too few, one that the domain does not confirm.
    {"already joined to a domain", TSLAUTH_PROVIDER_SETUP_ALREADY_JOINED},
    {"setupalreadyjoined", TSLAUTH_PROVIDER_SETUP_ALREADY_JOINED},
    {"no_trust_sam_account", TSLAUTH_PROVIDER_NO_TRUST_SAM_ACCOUNT},
    {"have a computer account for this workstation", TSLAUTH_PROVIDER_NO_TRUST_SAM_ACCOUNT},
    {"computer account could not be found", TSLAUTH_PROVIDER_NO_TRUST_SAM_ACCOUNT},
    {"failed to leave realm: no such object", TSLAUTH_PROVIDER_NO_TRUST_SAM_ACCOUNT},
    {"no_trust_lsa_secret", TSLAUTH_PROVIDER_NO_TRUST_LSA_SECRET},
    {"does not have a trust secret", TSLAUTH_PROVIDER_NO_TRUST_LSA_SECRET},
    {"$@* failed: client not found",
     TSLAUTH_PROVIDER_NO_TRUST_SAM_ACCOUNT}, // of the host's account
    {"$@* failed: preauthentication failed", TSLAUTH_PROVIDER_NO_TRUST_LSA_SECRET},
    {"cant_access_domain_info", TSLAUTH_PROVIDER_NO_TRUST_LSA_SECRET},
    {"unable to fetch domain sid: are we joined", TSLAUTH_PROVIDER_NO_TRUST_LSA_SECRET},
    {"domain_trust_inconsistent", TSLAUTH_PROVIDER_DOMAIN_TRUST_INCONSISTENT},
    {"inconsistent with the trust information", TSLAUTH_PROVIDER_DOMAIN_TRUST_INCONSISTENT},

    // The password. Whether the user or the password is wrong, no controller tells.
    {"logon_failure", TSLAUTH_PROVIDER_LOGON_FAILURE},
    {"attempted logon is invalid", TSLAUTH_PROVIDER_LOGON_FAILURE},
    {"unknown user name or bad password", TSLAUTH_PROVIDER_LOGON_FAILURE},
    {"wrong_password", TSLAUTH_PROVIDER_LOGON_FAILURE},
    {"no_such_user", TSLAUTH_PROVIDER_LOGON_FAILURE},
    {"specified account does not exist", TSLAUTH_PROVIDER_LOGON_FAILURE},
    {"preauthentication failed", TSLAUTH_PROVIDER_LOGON_FAILURE},
    {"not found in kerberos database", TSLAUTH_PROVIDER_LOGON_FAILURE},
    {"invalid_credentials", TSLAUTH_PROVIDER_LOGON_FAILURE},
    {"invalid credentials", TSLAUTH_PROVIDER_LOGON_FAILURE},
    {"password_restriction", TSLAUTH_PROVIDER_PASSWORD_RESTRICTION},
    {"password update rule has been violated", TSLAUTH_PROVIDER_PASSWORD_RESTRICTION},
    {"ill_formed_password", TSLAUTH_PROVIDER_ILL_FORMED_PASSWORD},
    {"not allowed in passwords", TSLAUTH_PROVIDER_ILL_FORMED_PASSWORD},

    // An offline join: no blob at all, and one that this host cannot use.
    {"failed to read loadfile", TSLAUTH_PROVIDER_FILE_NOT_FOUND},
    {"netrequestofflinedomainjoin: dos code 0x00000a95", TSLAUTH_PROVIDER_INVALID_PARAMETER},
    {"netrequestofflinedomainjoin: dos code 0x00000a96", TSLAUTH_PROVIDER_INVALID_PARAMETER},
    {"netrequestofflinedomainjoin: cannot complete", TSLAUTH_PROVIDER_INVALID_PARAMETER},
    {"netrequestofflinedomainjoin: the parameter is incorrect", TSLAUTH_PROVIDER_INVALID_PARAMETER},

    // The network and the controllers.
    {"no_such_domain", TSLAUTH_PROVIDER_NO_SUCH_DOMAIN},
    {"specified domain did not exist", TSLAUTH_PROVIDER_NO_SUCH_DOMAIN},
    {"does not exist or could not be contacted", TSLAUTH_PROVIDER_NO_SUCH_DOMAIN},
    {"connection_refused", TSLAUTH_PROVIDER_CONNECTION_REFUSED},
    {"connection refused", TSLAUTH_PROVIDER_CONNECTION_REFUSED},
    {"connection attempt was refused", TSLAUTH_PROVIDER_CONNECTION_REFUSED},
    {"refused the network connection", TSLAUTH_PROVIDER_CONNECTION_REFUSED},
    {"network_unreachable", TSLAUTH_PROVIDER_NO_NETWORK},
    {"network is unreachable", TSLAUTH_PROVIDER_NO_NETWORK},
    {"network is not reachable", TSLAUTH_PROVIDER_NO_NETWORK},
    {"network location cannot be reached", TSLAUTH_PROVIDER_NO_NETWORK},
    {"network is not present", TSLAUTH_PROVIDER_NO_NETWORK},
    {"io_timeout", TSLAUTH_PROVIDER_TIMED_OUT},
    {"werr_timeout", TSLAUTH_PROVIDER_TIMED_OUT},
    {"time-out period expired", TSLAUTH_PROVIDER_TIMED_OUT},
    {"time-out period has expired", TSLAUTH_PROVIDER_TIMED_OUT},
    {"did not properly respond", TSLAUTH_PROVIDER_TIMED_OUT},
    {"timed out", TSLAUTH_PROVIDER_TIMED_OUT},
    {"connection_disconnected", TSLAUTH_PROVIDER_CONNECTION_INVALID},
    {"connection_reset", TSLAUTH_PROVIDER_CONNECTION_INVALID},
    {"connection_aborted", TSLAUTH_PROVIDER_CONNECTION_INVALID},
    {"connection is now disconnected", TSLAUTH_PROVIDER_CONNECTION_INVALID},
    {"connection has been reset", TSLAUTH_PROVIDER_CONNECTION_INVALID},
    {"connection was aborted", TSLAUTH_PROVIDER_CONNECTION_INVALID},
    {"domain_controller_not_found", TSLAUTH_PROVIDER_NO_LOGON_SERVERS},
    {"dcnotfound", TSLAUTH_PROVIDER_NO_LOGON_SERVERS},
    {"controller for this domain was not found", TSLAUTH_PROVIDER_NO_LOGON_SERVERS},
    {"not find the domain controller for this domain", TSLAUTH_PROVIDER_NO_LOGON_SERVERS},
    {"no_logon_servers", TSLAUTH_PROVIDER_NO_LOGON_SERVERS},
    {"logon servers are currently available", TSLAUTH_PROVIDER_NO_LOGON_SERVERS},
    {"currently no logon servers available", TSLAUTH_PROVIDER_NO_LOGON_SERVERS},
    {"host_unreachable", TSLAUTH_PROVIDER_NO_LOGON_SERVERS},
    {"remote system is not reachable", TSLAUTH_PROVIDER_NO_LOGON_SERVERS},
    {"rpc server is unavailable", TSLAUTH_PROVIDER_NO_LOGON_SERVERS},
    {"contact ldap server", TSLAUTH_PROVIDER_NO_LOGON_SERVERS},
    {"cannot contact any kdc", TSLAUTH_PROVIDER_NO_LOGON_SERVERS},
    {"cannot find kdc", TSLAUTH_PROVIDER_NO_LOGON_SERVERS},
    {"find the ldap server", TSLAUTH_PROVIDER_NO_LOGON_SERVERS},
    {"find the cldap server", TSLAUTH_PROVIDER_NO_LOGON_SERVERS},
    {"cldap query failed", TSLAUTH_PROVIDER_NO_LOGON_SERVERS},
    {"failed to find dc", TSLAUTH_PROVIDER_NO_LOGON_SERVERS},

    // The machine that this runs on, and what says least.
    {"no_memory", TSLAUTH_PROVIDER_NOT_ENOUGH_MEMORY},
    {"not enough virtual memory", TSLAUTH_PROVIDER_NOT_ENOUGH_MEMORY},
    {"not enough storage is available", TSLAUTH_PROVIDER_NOT_ENOUGH_MEMORY},
    {"nt_status_internal_error", TSLAUTH_PROVIDER_INTERNAL_ERROR},
    {"an internal error occurred", TSLAUTH_PROVIDER_INTERNAL_ERROR},
    {"invalid_parameter", TSLAUTH_PROVIDER_INVALID_PARAMETER},
    {"invalid parameter was passed", TSLAUTH_PROVIDER_INVALID_PARAMETER},
    {"the parameter is incorrect", TSLAUTH_PROVIDER_INVALID_PARAMETER},
};

/// The line that Samba puts before each message where it logs with time stamps:
/// "[2026/11/21 08:20:40.123456,  0] ../../source3/libads/kerberos.c:228(...)".
bool IsDebugHeader(std::string_view line) {
    return line.size() > 2 && line[0] == '[' && IsDigit(line[1]) &&
           line.find("../../") != std::string_view::npos;
}

bool Occurs(std::string_view pattern, std::string_view text) {
    auto const star = pattern.find('*');
    auto const first = pattern.substr(0, star);
    if (star == std::string_view::npos) {
        return text.find(first) != std::string_view::npos;
    }
    auto const second = pattern.substr(star + 1);
    for (auto found = text.find(first); found != std::string_view::npos;
         found = text.find(first, found + 1)) {
        auto rest = text.substr(found + first.size());
        if (rest.substr(0, rest.find('\n')).find(second) != std::string_view::npos) {
            return true;
        }
    }
    return false;
}

} // namespace

ActiveDirectoryClientErrorCode ToolFailureCode(std::string_view output) {
    std::string const text = Lower(output);
    for (auto const& known : KnownTexts) {
        if (Occurs(known.text, text)) {
            return known.code;
        }
    }
    return TSLAUTH_WINBIND_SEE_SYSTEM_LOG;
}

std::string ToolFailureText(std::string_view output) {
    std::string text;
    while (!output.empty()) {
        auto const line = Trimmed(TakeLine(output));
        if (!line.empty() && !IsDebugHeader(line)) {
            text += text.empty() ? "" : "; ";
            text += line;
        }
    }
    std::replace_if(text.begin(), text.end(), IsControl, ' ');
    constexpr std::size_t longest = 800; // syslogd(8) may cut a line at 1024 bytes
    if (text.size() > longest) {
        text.replace(0, text.size() - longest, "...");
    }
    return text;
}

} // namespace tessel::winbind
