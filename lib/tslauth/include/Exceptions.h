// SPDX-License-Identifier: Apache-2.0
#ifndef TSLAUTH_EXCEPTIONS_H
#define TSLAUTH_EXCEPTIONS_H

/// The 64 failures that the library reports, each a class of its own directly below `Exception`.
/// They are grouped by what a caller can do about them.

#include "Exception.h"

namespace tessel {
namespace authentication {

/// What every class of the family has to say for itself: that it is copied and thrown as itself.
#define TSLAUTH_EXCEPTION_IDENTITY(Name)                                                           \
    Name(Name const&) = default;                                                                   \
    Name& operator=(Name const&) = default;                                                        \
    ~Name() noexcept override;                                                                     \
    Name* Clone() const override;                                                                  \
    [[noreturn]] void Throw() const override

/// A failure that a provider reported by number. Its constructor takes the code and the text that
/// follows the prefix "Exception 0x........: ".
#define TSLAUTH_CODED_EXCEPTION(Name)                                                              \
    class TSLAUTH_EXPORT Name : public Exception {                                                 \
    public:                                                                                        \
        Name(unsigned long code, std::string const& text);                                         \
        TSLAUTH_EXCEPTION_IDENTITY(Name);                                                          \
    }

/// A failure without a code. Its constructor takes the finished message.
#define TSLAUTH_PLAIN_EXCEPTION(Name)                                                              \
    class TSLAUTH_EXPORT Name : public Exception {                                                 \
    public:                                                                                        \
        explicit Name(std::string const& message);                                                 \
        TSLAUTH_EXCEPTION_IDENTITY(Name);                                                          \
    }

/// A failure without a code whose message is a fixed text around a name or a detail.
#define TSLAUTH_DETAIL_EXCEPTION(Name)                                                             \
    class TSLAUTH_EXPORT Name : public Exception {                                                 \
    public:                                                                                        \
        explicit Name(std::string const& detail);                                                  \
        TSLAUTH_EXCEPTION_IDENTITY(Name);                                                          \
    }

// The numbers below are Windows system error codes (winerror.h, lmerr.h, winsock2.h); the texts
// follow that system's wording.

/// @name The account or its password was refused: ask for other credentials, or repair the account.
/// @{

/// 5: "Access is denied."
TSLAUTH_CODED_EXCEPTION(AccessDeniedException);
/// 1331: "Logon failure: account currently disabled."
TSLAUTH_CODED_EXCEPTION(AccountDisabledException);
/// 1324: "The value provided for the new password contains values that are not allowed ..."
TSLAUTH_CODED_EXCEPTION(IllFormedPasswordException);
/// 1315: "The name provided is not a properly formed account name."
TSLAUTH_CODED_EXCEPTION(InvalidAccountNameException);
/// 86: "The specified network password is not correct."
TSLAUTH_CODED_EXCEPTION(InvalidPasswordException);
/// 1216: "The format of the specified password is invalid."
TSLAUTH_CODED_EXCEPTION(InvalidPasswordNameException);
/// 1326: "The attempted logon is invalid. This is due to either a bad user name or ..."
TSLAUTH_CODED_EXCEPTION(LogonFailureException);
/// 1575: "The specified group does not exist."
TSLAUTH_CODED_EXCEPTION(NoSuchGroupException);
/// 1317: "The specified account does not exist."
TSLAUTH_CODED_EXCEPTION(NoSuchUserException);
/// 1330: "Logon failure: the specified account password has expired."
TSLAUTH_CODED_EXCEPTION(PasswordExpiredException);
/// 1325: "The value provided for the new password does not meet the length, complexity, ..."
TSLAUTH_CODED_EXCEPTION(PasswordRestrictionException);

/// @}

/// @name The network or the directory did not answer: repair the connection, the clock or name
/// resolution, then retry.
/// @{

/// 1229: "An operation was attempted on a nonexistent network connection."
TSLAUTH_CODED_EXCEPTION(ConnectionInvalidException);
/// 1225: "The remote computer refused the network connection."
TSLAUTH_CODED_EXCEPTION(ConnectionRefusedException);
/// 1201: "The device is not currently connected but it is a remembered connection."
TSLAUTH_CODED_EXCEPTION(ConnectionUnavailableException);
/// 1311: "There are currently no logon servers available to service the logon request."
TSLAUTH_CODED_EXCEPTION(NoLogonServersException);
/// 1222: "The network is not present or not started."
TSLAUTH_CODED_EXCEPTION(NoNetworkException);
/// 1355: "The specified domain either does not exist or could not be contacted."
TSLAUTH_CODED_EXCEPTION(NoSuchDomainException);
/// 1791: "A remote procedure call is already in progress for this thread."
TSLAUTH_CODED_EXCEPTION(RPCSCallInProgressException);
/// 1398: "There is a time and/or date difference between the client and server."
TSLAUTH_CODED_EXCEPTION(TimeSkewException);
/// 10060: "A connection attempt failed because the connected party did not properly ..."
TSLAUTH_CODED_EXCEPTION(WSATimedOutException);

/// @}

/// @name The call was malformed: correct the argument.
/// @{

/// 1210: "The format of the specified computer name is invalid."
TSLAUTH_CODED_EXCEPTION(InvalidComputerNameException);
/// 1212: "The format of the specified domain name is invalid."
TSLAUTH_CODED_EXCEPTION(InvalidDomainNameException);
/// 1209: "The format of the specified group name is invalid."
TSLAUTH_CODED_EXCEPTION(InvalidGroupNameException);
/// 1002: "The window cannot act on the sent message."
TSLAUTH_CODED_EXCEPTION(InvalidMessageException);
/// 1214: "The format of the specified network name is invalid."
TSLAUTH_CODED_EXCEPTION(InvalidNetNameException);
/// 87: "The parameter is incorrect."
TSLAUTH_CODED_EXCEPTION(InvalidParameterException);
/// 1213: "The format of the specified service name is invalid."
TSLAUTH_CODED_EXCEPTION(InvalidServiceNameException);
/// 1215: "The format of the specified share name is invalid."
TSLAUTH_CODED_EXCEPTION(InvalidShareNameException);
/// 2695: "The specified workgroup name is invalid."
TSLAUTH_CODED_EXCEPTION(InvalidWorkgroupNameException);

/// @}

/// @name The host does not stand with its domain as the call expects: join it, part it, or join it
/// anew.
/// @{

/// 1810: "The name or security ID (SID) of the domain specified is inconsistent with ..."
TSLAUTH_CODED_EXCEPTION(DomainTrustInconsistentException);
/// 1786: "The workstation does not have a trust secret."
TSLAUTH_CODED_EXCEPTION(NoTrustLSASecretException);
/// 1787: "The domain controller does not have an account for this workstation."
TSLAUTH_CODED_EXCEPTION(NoTrustSAMAccountException);
/// 2691: "This machine is already joined to a domain."
TSLAUTH_CODED_EXCEPTION(SetupAlreadyJoinedException);

/// @}

/// @name Something on the host that the provider needs is missing or broken: repair the host.
/// @{

/// 267: "The directory name is invalid."
TSLAUTH_CODED_EXCEPTION(DirectoryException);
/// 2: "The system cannot find the file specified."
TSLAUTH_CODED_EXCEPTION(FileNotFoundException);
/// 8: "Not enough memory"
TSLAUTH_CODED_EXCEPTION(NotEnoughMemoryException);
/// 1061: "The service cannot accept control messages at this time."
TSLAUTH_CODED_EXCEPTION(ServiceCannotAcceptControlException);
/// 1060: "The specified service does not exist as an installed service."
TSLAUTH_CODED_EXCEPTION(ServiceDoesNotExistException);
/// 1062: "The service has not been started."
TSLAUTH_CODED_EXCEPTION(ServiceNotActiveException);
/// 2138: "The Workstation service has not been started."
TSLAUTH_CODED_EXCEPTION(WkstaNotStartedException);

/// @}

/// @name The provider failed within: report it to the provider's author.
/// @{

/// 609: "Bad DLL entry point."
TSLAUTH_CODED_EXCEPTION(BadDLLEntryPointException);
/// 1064: "An exception occurred in the service when handling the control request."
TSLAUTH_CODED_EXCEPTION(ExceptionInServiceException);
/// 1359: "An internal error occurred."
TSLAUTH_CODED_EXCEPTION(InternalErrorException);
/// 1067: "The process terminated unexpectedly."
TSLAUTH_CODED_EXCEPTION(ProcessAbortedException);
/// 1703: "The RPC protocol sequence is not supported."
TSLAUTH_CODED_EXCEPTION(RPCSProtocolSequenceNotSupportedException);

/// @}

/// @name The loaded provider does not offer the call, or answered with a number of its own.
/// @{

/// 120: "This function is not supported on this system." A store's questions are answered with a
/// neutral value instead; joining and parting pass it on.
class TSLAUTH_EXPORT CallNotImplementedException : public Exception {
public:
    CallNotImplementedException();
    TSLAUTH_EXCEPTION_IDENTITY(CallNotImplementedException);
};

/// Any code without a class of its own: "Unknown exception" behind the coded prefix, so that the
/// number can still be shown.
class TSLAUTH_EXPORT UnknownException : public Exception {
public:
    explicit UnknownException(unsigned long code);
    TSLAUTH_EXCEPTION_IDENTITY(UnknownException);
};

/// @}

/// @name The host's configuration is wrong: repair the file or the setting that the message names.
/// @{

/// "The specified Active Directory provider '" + name + "' is invalid", with ": " + reason where a
/// reason is known. The name "(unset)" means that `provider.conf` chooses none, "(none installed)"
/// that there is no such file.
class TSLAUTH_EXPORT InvalidActiveDirectoryProviderException : public Exception {
public:
    explicit InvalidActiveDirectoryProviderException(std::string const& name);
    InvalidActiveDirectoryProviderException(std::string const& name, std::string const& reason);
    TSLAUTH_EXCEPTION_IDENTITY(InvalidActiveDirectoryProviderException);
};

/// "The specified CAMProxy provider '" + name + "' is invalid", with ": " + reason where a reason
/// is known.
class TSLAUTH_EXPORT InvalidCAMProxyProviderException : public Exception {
public:
    explicit InvalidCAMProxyProviderException(std::string const& name);
    InvalidCAMProxyProviderException(std::string const& name, std::string const& reason);
    TSLAUTH_EXCEPTION_IDENTITY(InvalidCAMProxyProviderException);
};

/// "The specified thumbprint store '" + path + "' is invalid"
TSLAUTH_DETAIL_EXCEPTION(InvalidThumbprintStoreException);
/// "The VerifyCAMCertificate option is invalid: " + detail
TSLAUTH_DETAIL_EXCEPTION(InvalidVerifyCAMCertificateOptionException);
/// "The current hostname is invalid: " + detail
TSLAUTH_DETAIL_EXCEPTION(InvalidHostNameException);
/// A line of a key-value file that is no assignment, or whose quoting is broken; the message gives
/// the line's number, counted from 1.
TSLAUTH_PLAIN_EXCEPTION(ConfigurationError);
/// "The specified key '" + key + "' was not found in this configuration"
TSLAUTH_PLAIN_EXCEPTION(InvalidKeyException);
/// A file that cannot be opened, written or moved into place, or a provider library that cannot be
/// loaded; the message names the file and gives the system's text.
TSLAUTH_PLAIN_EXCEPTION(IOError);
/// A file was replaced, but its old permissions could not be read or set:
/// "Failed to save file permissions, file permissions may be incorrect: " + reason
TSLAUTH_PLAIN_EXCEPTION(FilePermissionError);
/// "The specified store '" + name + "' is invalid": the recorded store cannot be withdrawn.
TSLAUTH_PLAIN_EXCEPTION(InvalidRemoteAuthenticationStoreException);
/// "The specified store '" + name + "' is unknown": the factory has no store of the recorded name.
TSLAUTH_PLAIN_EXCEPTION(UnknownRemoteAuthenticationStoreException);

/// @}

/// @name The caller's input was refused before anything was done: correct it.
/// @{

/// "The credentials that were provided were invalid: " + detail
TSLAUTH_DETAIL_EXCEPTION(InvalidCredentialsException);
/// "The IP Address is invalid: " + detail
TSLAUTH_PLAIN_EXCEPTION(InvalidIPAddressException);

/// "The certificate format is invalid; only PEM format is supported."
class TSLAUTH_EXPORT InvalidCertificateException : public Exception {
public:
    InvalidCertificateException();
    TSLAUTH_EXCEPTION_IDENTITY(InvalidCertificateException);
};

/// 0x80090325 (SEC_E_UNTRUSTED_ROOT): "The CAM server's certificate cannot be verified."
TSLAUTH_CODED_EXCEPTION(InvalidCAMCertificateException);

/// @}

/// @name The answer did not come in time, or no thread could be had: retry later.
/// @{

/// "Provider call timed out."
TSLAUTH_PLAIN_EXCEPTION(ProviderCallTimedOutException);
/// "Thread Error: " + detail
TSLAUTH_PLAIN_EXCEPTION(ThreadErrorException);

/// @}

#undef TSLAUTH_EXCEPTION_IDENTITY
#undef TSLAUTH_CODED_EXCEPTION
#undef TSLAUTH_PLAIN_EXCEPTION
#undef TSLAUTH_DETAIL_EXCEPTION

} // namespace authentication
} // namespace tessel

#endif
