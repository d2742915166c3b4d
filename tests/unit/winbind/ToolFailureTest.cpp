// SPDX-License-Identifier: Apache-2.0
#include "text/ToolFailure.h"

#include "../../MappedCodes.h"
#include "GoldenText.h"
#include "tslauth_winbind_provider.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <filesystem>
#include <iterator>
#include <string>

using namespace tessel::winbind;

namespace {

ActiveDirectoryClientErrorCode CodeIn(std::string const& name) {
    auto const stem = std::filesystem::path(name).filename().string();
    return stem.compare(0, 7, "unnamed") == 0
               ? TSLAUTH_WINBIND_SEE_SYSTEM_LOG
               : static_cast<ActiveDirectoryClientErrorCode>(std::stoul(stem));
}

/// What Samba 4.17's net printed to a real domain controller's answers: `CODE-case.txt`.
TEST(ToolFailureTest, RealOutputsGetTheCodeThatTheirFileIsNamedAfter) {
    auto const names = GoldenNames("net", ".txt");
    for (auto const& name : names) {
        EXPECT_EQ(ToolFailureCode(GoldenText(name)), CodeIn(name)) << name;
    }
    EXPECT_GE(names.size(), 40U);
}

struct Case {
    char const* output;
    ActiveDirectoryClientErrorCode code;
};

TEST(ToolFailureTest, WhatIsWrongWithTheAccountIsToldFromAWrongPassword) {
    for (auto const& [output, code] : {
             Case{"kerberos_kinit_password a@B failed: Clients credentials have been revoked\n"
                  "Failed to leave domain: failed to connect to AD: Invalid credentials\n",
                  1331},
             Case{"kerberos_kinit_password a@B failed: Preauthentication failed\n"
                  "Failed to leave domain: failed to connect to AD: Invalid credentials\n",
                  1326},
             Case{"kerberos_kinit_password HOST1$@B failed: Preauthentication failed\n", 1786},
             Case{"kerberos_kinit_password a@B failed: Password has expired\n", 1330},
             Case{"error: WERR_ACCOUNT_LOCKED_OUT\n", 1331},
         }) {
        EXPECT_EQ(ToolFailureCode(output), code) << output;
    }
}

TEST(ToolFailureTest, AFailureOnTheWayDoesNotHideTheLastOne) {
    for (auto const& [output, code] : {
             Case{"get_kdc_ip_string: get_kdc_list fail NT_STATUS_NO_LOGON_SERVERS\n"
                  "kerberos_kinit_password a@B failed: Cannot contact any KDC for requested realm\n"
                  "Failed to join domain: failed to lookup DC info for domain 'B' over rpc: The "
                  "attempted logon is invalid. This is either due to a bad username or "
                  "authentication information.\n",
                  1326},
             Case{"ads_sasl_spnego_bind: kinit succeeded but SPNEGO bind with Kerberos failed for "
                  "ldap/dc1 - user[a], realm[B]: Invalid credentials\n"
                  "Failed to join domain: failed to precreate account in ou OU=X: No such object\n",
                  87},
             Case{"Failed to join domain: failed to precreate account in ou OU=X: Insufficient "
                  "access\n",
                  5},
         }) {
        EXPECT_EQ(ToolFailureCode(output), code) << output;
    }
}

TEST(ToolFailureTest, NamesAndSentencesOfAStatusMeanTheSame) {
    for (auto const& [output, code] : {
             Case{"NT_STATUS_TIME_DIFFERENCE_AT_DC", 1398},
             Case{"The time at the primary domain controller is different from the time at the "
                  "backup domain controller or member server by too large an amount.",
                  1398},
             Case{"Clock skew too great", 1398},
             Case{"WERR_NERR_SETUPALREADYJOINED", 2691},
             Case{"This machine is already joined to a domain.", 2691},
             Case{"NT_STATUS_NO_SUCH_DOMAIN", 1355},
             Case{"The specified domain either does not exist or could not be contacted.", 1355},
             Case{"NT_STATUS_IO_TIMEOUT", 10060},
             Case{
                 "{Device Timeout} The specified I/O operation on %hs was not completed before the "
                 "time-out period expired.",
                 10060},
             Case{"NT_STATUS_CONNECTION_REFUSED", 1225},
             Case{"The transport-connection attempt was refused by the remote system.", 1225},
             Case{"NT_STATUS_CONNECTION_DISCONNECTED", 1229},
             Case{"The transport connection is now disconnected.", 1229},
             Case{"NT_STATUS_NETWORK_UNREACHABLE", 1222},
             Case{"The remote network is not reachable by the transport.", 1222},
             Case{"NT_STATUS_HOST_UNREACHABLE", 1311},
             Case{"Could not find the domain controller for this domain.", 1311},
             Case{"WERR_DS_MACHINE_ACCOUNT_QUOTA_EXCEEDED", 5},
             Case{"Logon failure: Unknown user name or bad password.", 1326},
             Case{"Logon failure: Account currently disabled.", 1331},
             Case{"The user's account has expired.", 1330},
             Case{"NT_STATUS_NO_TRUST_SAM_ACCOUNT", 1787},
             Case{"The workstation does not have a trust secret.", 1786},
             Case{"NT_STATUS_DOMAIN_TRUST_INCONSISTENT", 1810},
             Case{"NT_STATUS_PASSWORD_RESTRICTION", 1325},
             Case{"NT_STATUS_ILL_FORMED_PASSWORD", 1324},
             Case{"NT_STATUS_NO_MEMORY", 8},
             Case{"An internal error occurred.", 1359},
             Case{"NT_STATUS_INVALID_PARAMETER", 87},
             Case{"NT_STATUS_INVALID_COMPUTER_NAME", 1210},
             Case{"The name provided is not a properly formed account name.", 1315},
         }) {
        EXPECT_EQ(ToolFailureCode(output), code) << output;
    }
}

TEST(ToolFailureTest, WhatIsNotKnownIsUnnamed) {
    for (char const* const output :
         {"", "\n", "Failed to join domain: something new\n",
          "kerberos_kinit_password A$@B\nfailed: client not found", "Joined 'A' to realm 'B'\n"}) {
        EXPECT_EQ(ToolFailureCode(output), 0xFFFF0000U) << output;
    }
}

/// Every code that is used has a class; another would reach the user as an unknown exception.
TEST(ToolFailureTest, EveryCodeHasAClass) {
#define TSLAUTH_CODE(code, class, text) code,
    ActiveDirectoryClientErrorCode const mapped[] = {TSLAUTH_MAPPED_CODES(TSLAUTH_CODE)};
#undef TSLAUTH_CODE
    for (auto const& name : GoldenNames("net", ".txt")) {
        auto const code = ToolFailureCode(GoldenText(name));
        EXPECT_TRUE(code == TSLAUTH_WINBIND_SEE_SYSTEM_LOG ||
                    std::count(std::begin(mapped), std::end(mapped), code) == 1)
            << name;
    }
}

TEST(ToolFailureTest, TheTextForTheLogIsOneLine) {
    EXPECT_EQ(ToolFailureText("[2026/11/21 08:20:40.123456,  0] ../../source3/libads/kerberos.c:228"
                              "(kerberos_kinit_password)\n  a failed: b\tc\r\n\n"
                              "Failed to join domain: x\x1b[31m\n"),
              "a failed: b c; Failed to join domain: x [31m");
    EXPECT_EQ(ToolFailureText(""), "");
    EXPECT_EQ(ToolFailureText("[x] y\n"), "[x] y");
}

TEST(ToolFailureTest, TheTextForTheLogKeepsItsEnd) {
    std::string const text = ToolFailureText(std::string(5000, 'a') + " the end");
    EXPECT_EQ(text.size(), 803U);
    EXPECT_EQ(text.substr(0, 4), "...a");
    EXPECT_EQ(text.substr(text.size() - 8), " the end");
}

} // namespace
