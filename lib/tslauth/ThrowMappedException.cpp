// SPDX-License-Identifier: Apache-2.0
#include "ThrowMappedException.h"

#include "Assertion.h"

#include <tslauth/Exceptions.h>

#include <algorithm>
#include <cstddef>
#include <iterator>

namespace tessel::authentication {

namespace {

template <typename Class>
[[noreturn]] void Throw(ActiveDirectoryClientErrorCode code, char const* text) {
    throw Class(code, text);
}

template <>
[[noreturn]] void Throw<CallNotImplementedException>(ActiveDirectoryClientErrorCode /*code*/,
                                                     char const* /*text*/) {
    throw CallNotImplementedException();
}

template <>
[[noreturn]] void Throw<UnknownException>(ActiveDirectoryClientErrorCode code,
                                          char const* /*text*/) {
    throw UnknownException(code);
}

/// The table, in order of code.
constexpr MappedException mappedExceptions[] = {
    {TSLAUTH_PROVIDER_FILE_NOT_FOUND, &Throw<FileNotFoundException>,
     "The system cannot find the file specified."},
    {TSLAUTH_PROVIDER_ACCESS_DENIED, &Throw<AccessDeniedException>, "Access is denied."},
    {TSLAUTH_PROVIDER_NOT_ENOUGH_MEMORY, &Throw<NotEnoughMemoryException>, "Not enough memory"},
    {TSLAUTH_PROVIDER_INVALID_PASSWORD, &Throw<InvalidPasswordException>,
     "The specified network password is not correct."},
    {TSLAUTH_PROVIDER_INVALID_PARAMETER, &Throw<InvalidParameterException>,
     "The parameter is incorrect."},
    {TSLAUTH_PROVIDER_CALL_NOT_IMPLEMENTED, &Throw<CallNotImplementedException>, nullptr},
    {TSLAUTH_PROVIDER_DIRECTORY, &Throw<DirectoryException>, "The directory name is invalid."},
    {TSLAUTH_PROVIDER_BAD_DLL_ENTRY_POINT, &Throw<BadDLLEntryPointException>,
     "Bad DLL entry point."},
    {TSLAUTH_PROVIDER_INVALID_MESSAGE, &Throw<InvalidMessageException>,
     "The window cannot act on the sent message."},
    {TSLAUTH_PROVIDER_SERVICE_DOES_NOT_EXIST, &Throw<ServiceDoesNotExistException>,
     "The specified service does not exist as an installed service."},
    {TSLAUTH_PROVIDER_SERVICE_CANNOT_ACCEPT_CONTROL, &Throw<ServiceCannotAcceptControlException>,
     "The service cannot accept control messages at this time."},
    {TSLAUTH_PROVIDER_SERVICE_NOT_ACTIVE, &Throw<ServiceNotActiveException>,
     "The service has not been started."},
    {TSLAUTH_PROVIDER_EXCEPTION_IN_SERVICE, &Throw<ExceptionInServiceException>,
     "An exception occurred in the service when handling the control request."},
    {TSLAUTH_PROVIDER_PROCESS_ABORTED, &Throw<ProcessAbortedException>,
     "The process terminated unexpectedly."},
    {TSLAUTH_PROVIDER_CONNECTION_UNAVAILABLE, &Throw<ConnectionUnavailableException>,
     "The device is not currently connected but it is a remembered connection."},
    {TSLAUTH_PROVIDER_INVALID_GROUP_NAME, &Throw<InvalidGroupNameException>,
     "The format of the specified group name is invalid."},
    {TSLAUTH_PROVIDER_INVALID_COMPUTER_NAME, &Throw<InvalidComputerNameException>,
     "The format of the specified computer name is invalid."},
    {TSLAUTH_PROVIDER_INVALID_DOMAIN_NAME, &Throw<InvalidDomainNameException>,
     "The format of the specified domain name is invalid."},
    {TSLAUTH_PROVIDER_INVALID_SERVICE_NAME, &Throw<InvalidServiceNameException>,
     "The format of the specified service name is invalid."},
    {TSLAUTH_PROVIDER_INVALID_NET_NAME, &Throw<InvalidNetNameException>,
     "The format of the specified network name is invalid."},
    {TSLAUTH_PROVIDER_INVALID_SHARE_NAME, &Throw<InvalidShareNameException>,
     "The format of the specified share name is invalid."},
    {TSLAUTH_PROVIDER_INVALID_PASSWORD_NAME, &Throw<InvalidPasswordNameException>,
     "The format of the specified password is invalid."},
    {TSLAUTH_PROVIDER_NO_NETWORK, &Throw<NoNetworkException>,
     "The network is not present or not started."},
    {TSLAUTH_PROVIDER_CONNECTION_REFUSED, &Throw<ConnectionRefusedException>,
     "The remote computer refused the network connection."},
    {TSLAUTH_PROVIDER_CONNECTION_INVALID, &Throw<ConnectionInvalidException>,
     "An operation was attempted on a nonexistent network connection."},
    {TSLAUTH_PROVIDER_NO_LOGON_SERVERS, &Throw<NoLogonServersException>,
     "There are currently no logon servers available to service the logon request."},
    {TSLAUTH_PROVIDER_INVALID_ACCOUNT_NAME, &Throw<InvalidAccountNameException>,
     "The name provided is not a properly formed account name."},
    {TSLAUTH_PROVIDER_NO_SUCH_USER, &Throw<NoSuchUserException>,
     "The specified account does not exist."},
    {TSLAUTH_PROVIDER_ILL_FORMED_PASSWORD, &Throw<IllFormedPasswordException>,
     "The value provided for the new password contains values that are not allowed in passwords."},
    {TSLAUTH_PROVIDER_PASSWORD_RESTRICTION, &Throw<PasswordRestrictionException>,
     "The value provided for the new password does not meet the length, complexity, or history "
     "requirements of the domain."},
    {TSLAUTH_PROVIDER_LOGON_FAILURE, &Throw<LogonFailureException>,
     "The attempted logon is invalid. This is due to either a bad user name or authentication "
     "information."},
    {TSLAUTH_PROVIDER_PASSWORD_EXPIRED, &Throw<PasswordExpiredException>,
     "Logon failure: the specified account password has expired."},
    {TSLAUTH_PROVIDER_ACCOUNT_DISABLED, &Throw<AccountDisabledException>,
     "Logon failure: account currently disabled."},
    {TSLAUTH_PROVIDER_NO_SUCH_DOMAIN, &Throw<NoSuchDomainException>,
     "The specified domain either does not exist or could not be contacted."},
    {TSLAUTH_PROVIDER_INTERNAL_ERROR, &Throw<InternalErrorException>,
     "An internal error occurred."},
    {TSLAUTH_PROVIDER_TIME_SKEW, &Throw<TimeSkewException>,
     "There is a time and/or date difference between the client and server."},
    {TSLAUTH_PROVIDER_NO_SUCH_GROUP, &Throw<NoSuchGroupException>,
     "The specified group does not exist."},
    {TSLAUTH_PROVIDER_RPC_PROTOCOL_SEQUENCE_NOT_SUPPORTED,
     &Throw<RPCSProtocolSequenceNotSupportedException>,
     "The RPC protocol sequence is not supported."},
    {TSLAUTH_PROVIDER_NO_TRUST_LSA_SECRET, &Throw<NoTrustLSASecretException>,
     "The workstation does not have a trust secret."},
    {TSLAUTH_PROVIDER_NO_TRUST_SAM_ACCOUNT, &Throw<NoTrustSAMAccountException>,
     "The domain controller does not have an account for this workstation."},
    {TSLAUTH_PROVIDER_RPC_CALL_IN_PROGRESS, &Throw<RPCSCallInProgressException>,
     "A remote procedure call is already in progress for this thread."},
    {TSLAUTH_PROVIDER_DOMAIN_TRUST_INCONSISTENT, &Throw<DomainTrustInconsistentException>,
     "The name or security ID (SID) of the domain specified is inconsistent with the trust "
     "information for that domain."},
    {TSLAUTH_PROVIDER_WKSTA_NOT_STARTED, &Throw<WkstaNotStartedException>,
     "The Workstation service has not been started."},
    {TSLAUTH_PROVIDER_SETUP_ALREADY_JOINED, &Throw<SetupAlreadyJoinedException>,
     "This machine is already joined to a domain."},
    {TSLAUTH_PROVIDER_INVALID_WORKGROUP_NAME, &Throw<InvalidWorkgroupNameException>,
     "The specified workgroup name is invalid."},
    {TSLAUTH_PROVIDER_TIMED_OUT, &Throw<WSATimedOutException>,
     "A connection attempt failed because the connected party did not properly respond after a "
     "period of time, or established connection failed because connected host has failed to "
     "respond."},
    // Outside the Windows numbering, and two rows of their own although they say what the default
    // says: providers return them on purpose.
    {0xffff0000U, &Throw<UnknownException>, nullptr},
    {0xffff0001U, &Throw<UnknownException>, nullptr},
};

/// What every other code throws.
constexpr MappedException unknownException = {0, &Throw<UnknownException>, nullptr};

constexpr bool InOrderOfCode() {
    for (std::size_t row = 1; row < std::size(mappedExceptions); ++row) {
        if (mappedExceptions[row - 1].code >= mappedExceptions[row].code) {
            return false;
        }
    }
    return true;
}
static_assert(InOrderOfCode(), "the search below needs it, and a code must not stand there twice");
static_assert(std::size(mappedExceptions) == 48);

} // namespace

MappedException const& FindMappedException(ActiveDirectoryClientErrorCode code) {
    if (code == TSLAUTH_PROVIDER_SUCCESS) {
        FailAssertion("0", "lib/tslauth/ActiveDirectoryProvider", __LINE__,
                      "void ThrowMappedException(ActiveDirectoryClientErrorCode)");
    }
    auto const row =
        std::lower_bound(std::begin(mappedExceptions), std::end(mappedExceptions), code,
                         [](MappedException const& left, ActiveDirectoryClientErrorCode right) {
                             return left.code < right;
                         });
    bool const found = row != std::end(mappedExceptions) && row->code == code;
    return found ? *row : unknownException;
}

} // namespace tessel::authentication
