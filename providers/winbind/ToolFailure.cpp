// SPDX-License-Identifier: Apache-2.0
#include "ToolFailure.h"

#include "TextPieces.h"

#include <algorithm>
#include <vector>

using namespace tessel::winbind::TextPieces;

namespace tessel::winbind {

namespace {

struct KnownText {
    std::string_view text;
    ActiveDirectoryClientErrorCode code;
};

/// The first entry whose text occurs decides, so that what says most stands first: a tool often
/// goes on after its first failure and adds what came of it. Texts are compared without regard to
/// case. Samba prints a failure of a controller as its name (NT_STATUS_..., WERR_...), as the
/// sentence that belongs to it, or as the text of LDAP or of Kerberos.
constexpr KnownText KnownTexts[] = {
    // Sentences that hold the words of another entry.
    {"a duplicate name exists", TSLAUTH_PROVIDER_INVALID_COMPUTER_NAME},

    // Who asks, and with which password. What is wrong with the account is said only to who knows
    // its password, so that it stands before the password.
    {"account_disabled", TSLAUTH_PROVIDER_ACCOUNT_DISABLED},
    {"account is currently disabled", TSLAUTH_PROVIDER_ACCOUNT_DISABLED},
    {"account currently disabled", TSLAUTH_PROVIDER_ACCOUNT_DISABLED},
    {"credentials have been revoked", TSLAUTH_PROVIDER_ACCOUNT_DISABLED},
    {"password_must_change", TSLAUTH_PROVIDER_PASSWORD_EXPIRED},
    {"password must be changed", TSLAUTH_PROVIDER_PASSWORD_EXPIRED},
    {"must change password", TSLAUTH_PROVIDER_PASSWORD_EXPIRED},
    {"password_expired", TSLAUTH_PROVIDER_PASSWORD_EXPIRED},
    {"password has expired", TSLAUTH_PROVIDER_PASSWORD_EXPIRED},
    {"password expired", TSLAUTH_PROVIDER_PASSWORD_EXPIRED},
    {"account_expired", TSLAUTH_PROVIDER_PASSWORD_EXPIRED},
    {"account has expired", TSLAUTH_PROVIDER_PASSWORD_EXPIRED},
    {"entry in database has expired", TSLAUTH_PROVIDER_PASSWORD_EXPIRED},
    // No row says "locked out": who is, cannot log on for now.
    {"account_locked_out", TSLAUTH_PROVIDER_ACCOUNT_DISABLED},
    {"locked out", TSLAUTH_PROVIDER_ACCOUNT_DISABLED},
    {"automatically locked", TSLAUTH_PROVIDER_ACCOUNT_DISABLED},
    {"invalid_workstation", TSLAUTH_PROVIDER_ACCESS_DENIED},
    {"invalid_logon_hours", TSLAUTH_PROVIDER_ACCESS_DENIED},
    {"account_restriction", TSLAUTH_PROVIDER_ACCESS_DENIED},
    {"logon_type_not_granted", TSLAUTH_PROVIDER_ACCESS_DENIED},
    {"logon_failure", TSLAUTH_PROVIDER_LOGON_FAILURE},
    {"wrong_password", TSLAUTH_PROVIDER_LOGON_FAILURE},
    {"attempted logon is invalid", TSLAUTH_PROVIDER_LOGON_FAILURE},
    {"user name or password is incorrect", TSLAUTH_PROVIDER_LOGON_FAILURE},
    {"unknown user name or bad password", TSLAUTH_PROVIDER_LOGON_FAILURE},
    {"preauthentication failed", TSLAUTH_PROVIDER_LOGON_FAILURE},
    {"client not found in kerberos database", TSLAUTH_PROVIDER_LOGON_FAILURE},
    {"' not found in kerberos database", TSLAUTH_PROVIDER_LOGON_FAILURE},
    {"no_such_user", TSLAUTH_PROVIDER_LOGON_FAILURE},
    {"specified account does not exist", TSLAUTH_PROVIDER_LOGON_FAILURE},
    {"invalid credentials", TSLAUTH_PROVIDER_LOGON_FAILURE},

    // The clock.
    {"time_difference_at_dc", TSLAUTH_PROVIDER_TIME_SKEW},
    {"time_skew", TSLAUTH_PROVIDER_TIME_SKEW},
    {"clock skew", TSLAUTH_PROVIDER_TIME_SKEW},
    {"time at the primary domain controller is different", TSLAUTH_PROVIDER_TIME_SKEW},
    {"time and/or date difference", TSLAUTH_PROVIDER_TIME_SKEW},

    // What was asked for.
    {"failed to pre-create account in ou", TSLAUTH_PROVIDER_INVALID_PARAMETER}, // below: its cause
    {"ds_invalid_dn_syntax", TSLAUTH_PROVIDER_INVALID_PARAMETER},
};

} // namespace

ActiveDirectoryClientErrorCode ToolFailureCode(std::string_view output) {
    std::string const text = Lower(output);
    for (auto const& known : KnownTexts) {
        if (text.find(known.text) != std::string::npos) {
            return known.code;
        }
    }
    return UnnamedFailure;
}

std::string ToolFailureText(std::string_view output) {
    return std::string(output);
}

} // namespace tessel::winbind
