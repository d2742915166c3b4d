// SPDX-License-Identifier: Apache-2.0
#include <tslauth/Exceptions.h>

// The destructors stand here and not in the header: the first out-of-line virtual function decides
// where a class's type information lives, and a handler in the caller only matches an exception of
// the library when there is one copy of it.

namespace tessel::authentication {

#define TSLAUTH_EXCEPTION_IDENTITY(Name)                                                           \
    Name::~Name() noexcept = default;                                                              \
    Name* Name::Clone() const {                                                                    \
        return new Name(*this);                                                                    \
    }                                                                                              \
    void Name::Throw() const {                                                                     \
        throw Name(*this);                                                                         \
    }

#define TSLAUTH_CODED_EXCEPTION(Name)                                                              \
    Name::Name(unsigned long code, std::string const& text) : Exception(code, text) {}             \
    TSLAUTH_EXCEPTION_IDENTITY(Name)

#define TSLAUTH_PLAIN_EXCEPTION(Name)                                                              \
    Name::Name(std::string const& message) : Exception(message) {}                                 \
    TSLAUTH_EXCEPTION_IDENTITY(Name)

#define TSLAUTH_DETAIL_EXCEPTION(Name, message)                                                    \
    Name::Name(std::string const& detail) : Exception(message) {}                                  \
    TSLAUTH_EXCEPTION_IDENTITY(Name)

TSLAUTH_CODED_EXCEPTION(AccessDeniedException)
TSLAUTH_CODED_EXCEPTION(AccountDisabledException)
TSLAUTH_CODED_EXCEPTION(BadDLLEntryPointException)
TSLAUTH_CODED_EXCEPTION(ConnectionInvalidException)
TSLAUTH_CODED_EXCEPTION(ConnectionRefusedException)
TSLAUTH_CODED_EXCEPTION(ConnectionUnavailableException)
TSLAUTH_CODED_EXCEPTION(DirectoryException)
TSLAUTH_CODED_EXCEPTION(DomainTrustInconsistentException)
TSLAUTH_CODED_EXCEPTION(ExceptionInServiceException)
TSLAUTH_CODED_EXCEPTION(FileNotFoundException)
TSLAUTH_CODED_EXCEPTION(IllFormedPasswordException)
TSLAUTH_CODED_EXCEPTION(InternalErrorException)
TSLAUTH_CODED_EXCEPTION(InvalidAccountNameException)
TSLAUTH_CODED_EXCEPTION(InvalidComputerNameException)
TSLAUTH_CODED_EXCEPTION(InvalidDomainNameException)
TSLAUTH_CODED_EXCEPTION(InvalidGroupNameException)
TSLAUTH_CODED_EXCEPTION(InvalidMessageException)
TSLAUTH_CODED_EXCEPTION(InvalidNetNameException)
TSLAUTH_CODED_EXCEPTION(InvalidParameterException)
TSLAUTH_CODED_EXCEPTION(InvalidPasswordException)
TSLAUTH_CODED_EXCEPTION(InvalidPasswordNameException)
TSLAUTH_CODED_EXCEPTION(InvalidServiceNameException)
TSLAUTH_CODED_EXCEPTION(InvalidShareNameException)
TSLAUTH_CODED_EXCEPTION(InvalidWorkgroupNameException)
TSLAUTH_CODED_EXCEPTION(LogonFailureException)
TSLAUTH_CODED_EXCEPTION(NoLogonServersException)
TSLAUTH_CODED_EXCEPTION(NoNetworkException)
TSLAUTH_CODED_EXCEPTION(NoSuchDomainException)
TSLAUTH_CODED_EXCEPTION(NoSuchGroupException)
TSLAUTH_CODED_EXCEPTION(NoSuchUserException)
TSLAUTH_CODED_EXCEPTION(NoTrustLSASecretException)
TSLAUTH_CODED_EXCEPTION(NoTrustSAMAccountException)
TSLAUTH_CODED_EXCEPTION(NotEnoughMemoryException)
TSLAUTH_CODED_EXCEPTION(PasswordExpiredException)
TSLAUTH_CODED_EXCEPTION(PasswordRestrictionException)
TSLAUTH_CODED_EXCEPTION(ProcessAbortedException)
TSLAUTH_CODED_EXCEPTION(RPCSCallInProgressException)
TSLAUTH_CODED_EXCEPTION(RPCSProtocolSequenceNotSupportedException)
TSLAUTH_CODED_EXCEPTION(ServiceCannotAcceptControlException)
TSLAUTH_CODED_EXCEPTION(ServiceDoesNotExistException)
TSLAUTH_CODED_EXCEPTION(ServiceNotActiveException)
TSLAUTH_CODED_EXCEPTION(SetupAlreadyJoinedException)
TSLAUTH_CODED_EXCEPTION(TimeSkewException)
TSLAUTH_CODED_EXCEPTION(WSATimedOutException)
TSLAUTH_CODED_EXCEPTION(WkstaNotStartedException)
TSLAUTH_CODED_EXCEPTION(InvalidCAMCertificateException)

TSLAUTH_PLAIN_EXCEPTION(ConfigurationError)
TSLAUTH_PLAIN_EXCEPTION(InvalidKeyException)
TSLAUTH_PLAIN_EXCEPTION(IOError)
TSLAUTH_PLAIN_EXCEPTION(FilePermissionError)
TSLAUTH_PLAIN_EXCEPTION(InvalidRemoteAuthenticationStoreException)
TSLAUTH_PLAIN_EXCEPTION(UnknownRemoteAuthenticationStoreException)
TSLAUTH_PLAIN_EXCEPTION(InvalidIPAddressException)
TSLAUTH_PLAIN_EXCEPTION(ProviderCallTimedOutException)
TSLAUTH_PLAIN_EXCEPTION(ThreadErrorException)

TSLAUTH_DETAIL_EXCEPTION(InvalidThumbprintStoreException,
                         "The specified thumbprint store '" + detail + "' is invalid")
TSLAUTH_DETAIL_EXCEPTION(InvalidVerifyCAMCertificateOptionException,
                         "The VerifyCAMCertificate option is invalid: " + detail)
TSLAUTH_DETAIL_EXCEPTION(InvalidHostNameException, "The current hostname is invalid: " + detail)
TSLAUTH_DETAIL_EXCEPTION(InvalidCredentialsException,
                         "The credentials that were provided were invalid: " + detail)

CallNotImplementedException::CallNotImplementedException()
    : Exception(120, "This function is not supported on this system.") {}
TSLAUTH_EXCEPTION_IDENTITY(CallNotImplementedException)

UnknownException::UnknownException(unsigned long code) : Exception(code, "Unknown exception") {}
TSLAUTH_EXCEPTION_IDENTITY(UnknownException)

InvalidCertificateException::InvalidCertificateException()
    : Exception("The certificate format is invalid; only PEM format is supported.") {}
TSLAUTH_EXCEPTION_IDENTITY(InvalidCertificateException)

InvalidActiveDirectoryProviderException::InvalidActiveDirectoryProviderException(
    std::string const& name)
    : Exception("The specified Active Directory provider '" + name + "' is invalid") {}
InvalidActiveDirectoryProviderException::InvalidActiveDirectoryProviderException(
    std::string const& name, std::string const& reason)
    : Exception("The specified Active Directory provider '" + name + "' is invalid: " + reason) {}
TSLAUTH_EXCEPTION_IDENTITY(InvalidActiveDirectoryProviderException)

InvalidCAMProxyProviderException::InvalidCAMProxyProviderException(std::string const& name)
    : Exception("The specified CAMProxy provider '" + name + "' is invalid") {}
InvalidCAMProxyProviderException::InvalidCAMProxyProviderException(std::string const& name,
                                                                   std::string const& reason)
    : Exception("The specified CAMProxy provider '" + name + "' is invalid: " + reason) {}
TSLAUTH_EXCEPTION_IDENTITY(InvalidCAMProxyProviderException)

} // namespace tessel::authentication
