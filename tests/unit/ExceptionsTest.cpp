// SPDX-License-Identifier: Apache-2.0
#include <tslauth/Exceptions.h>

#include <gtest/gtest.h>

#include <memory>
#include <string>
#include <type_traits>
#include <typeinfo>

using namespace tessel::authentication;

namespace {

/// What every class of the family promises, checked on one object of it.
template <typename Class>
void ExpectMember(Class const& exception, unsigned long code, std::string const& message) {
    static_assert(std::is_convertible<Class*, Exception*>::value, "derives publicly");
    static_assert(sizeof(Class) == sizeof(Exception), "adds no data");
    EXPECT_EQ(code, exception.Code());
    EXPECT_EQ(message, exception.what());

    std::unique_ptr<Exception> const clone(static_cast<Exception const&>(exception).Clone());
    EXPECT_NE(static_cast<Exception const*>(&exception), clone.get());
    Exception const& cloned = *clone;
    EXPECT_EQ(typeid(Class), typeid(cloned));
    EXPECT_EQ(code, clone->Code());
    EXPECT_EQ(message, clone->what());

    bool caught = false;
    try {
        static_cast<Exception const&>(exception).Throw();
    } catch (Class const& thrown) {
        caught = true;
        EXPECT_EQ(typeid(Class), typeid(thrown));
        EXPECT_NE(&exception, &thrown);
        EXPECT_EQ(code, thrown.Code());
        EXPECT_EQ(message, thrown.what());
    }
    EXPECT_TRUE(caught);
    EXPECT_THROW(clone->Throw(), Class);
    EXPECT_THROW(clone->Throw(), Exception);
    EXPECT_THROW(clone->Throw(), std::exception);

    Class copy(exception);
    copy = exception;
    EXPECT_EQ(message, copy.what());
}

template <typename Class> struct CodedException : testing::Test {};

typedef testing::Types<
    AccessDeniedException, AccountDisabledException, BadDLLEntryPointException,
    ConnectionInvalidException, ConnectionRefusedException, ConnectionUnavailableException,
    DirectoryException, DomainTrustInconsistentException, ExceptionInServiceException,
    FileNotFoundException, IllFormedPasswordException, InternalErrorException,
    InvalidAccountNameException, InvalidComputerNameException, InvalidDomainNameException,
    InvalidGroupNameException, InvalidMessageException, InvalidNetNameException,
    InvalidParameterException, InvalidPasswordException, InvalidPasswordNameException,
    InvalidServiceNameException, InvalidShareNameException, InvalidWorkgroupNameException,
    LogonFailureException, NoLogonServersException, NoNetworkException, NoSuchDomainException,
    NoSuchGroupException, NoSuchUserException, NoTrustLSASecretException,
    NoTrustSAMAccountException, NotEnoughMemoryException, PasswordExpiredException,
    PasswordRestrictionException, ProcessAbortedException, RPCSCallInProgressException,
    RPCSProtocolSequenceNotSupportedException, ServiceCannotAcceptControlException,
    ServiceDoesNotExistException, ServiceNotActiveException, SetupAlreadyJoinedException,
    TimeSkewException, WSATimedOutException, WkstaNotStartedException,
    InvalidCAMCertificateException>
    CodedClasses;
TYPED_TEST_SUITE(CodedException, CodedClasses, );

TYPED_TEST(CodedException, CarriesItsCodeAndPrefixedText) {
    ExpectMember(TypeParam(0x54b, "Some text."), 0x54b, "Exception 0x0000054b: Some text.");
}

template <typename Class> struct PlainException : testing::Test {};

typedef testing::Types<ConfigurationError, InvalidKeyException, IOError, FilePermissionError,
                       InvalidRemoteAuthenticationStoreException,
                       UnknownRemoteAuthenticationStoreException, InvalidIPAddressException,
                       ProviderCallTimedOutException, ThreadErrorException>
    PlainClasses;
TYPED_TEST_SUITE(PlainException, PlainClasses, );

TYPED_TEST(PlainException, CarriesTheFinishedMessageAndNoCode) {
    ExpectMember(TypeParam("Some text"), 0, "Some text");
}

} // namespace

TEST(Exception, CodedFormPrefixesEightLowerCaseHexadecimalDigits) {
    ExpectMember(Exception(8, "Not enough memory"), 8, "Exception 0x00000008: Not enough memory");
    ExpectMember(Exception(0xABCDEF01UL, "x"), 0xabcdef01UL, "Exception 0xabcdef01: x");
    ExpectMember(Exception(0, ""), 0, "Exception 0x00000000: ");
}

TEST(Exception, PlainFormKeepsTheTextAndHasNoCode) {
    ExpectMember(Exception("a text: as it stands"), 0, "a text: as it stands");
    ExpectMember(Exception(""), 0, "");
}

TEST(Exception, CodeIsTheUnsigned32BitValueWhereverLongIsWider) {
    int const negative = -2;
    Exception const exception(static_cast<unsigned long>(negative), "x");
    EXPECT_EQ(0xfffffffeUL, exception.Code());
    EXPECT_STREQ("Exception 0xfffffffe: x", exception.what());
}

TEST(Exception, TextMayHoldAnyByte) {
    std::string const text("caf\xc3\xa9\n%s", 8);
    EXPECT_EQ("Exception 0x00000001: " + text, Exception(1, text).what());
}

TEST(UnknownException, ReportsItsCodeInLowerCaseDigits) {
    ExpectMember(UnknownException(0xffff0000UL), 0xffff0000UL,
                 "Exception 0xffff0000: Unknown exception");
}

TEST(CallNotImplementedException, HasCode120) {
    ExpectMember(CallNotImplementedException(), 120,
                 "Exception 0x00000078: This function is not supported on this system.");
}

TEST(InvalidActiveDirectoryProviderException, NamesTheProviderAndTheReason) {
    ExpectMember(InvalidActiveDirectoryProviderException("(unset)"), 0,
                 "The specified Active Directory provider '(unset)' is invalid");
    ExpectMember(InvalidActiveDirectoryProviderException("example", "why"), 0,
                 "The specified Active Directory provider 'example' is invalid: why");
}

TEST(InvalidCAMProxyProviderException, NamesTheProviderAndTheReason) {
    ExpectMember(InvalidCAMProxyProviderException("(unset)"), 0,
                 "The specified CAMProxy provider '(unset)' is invalid");
    ExpectMember(InvalidCAMProxyProviderException("example", "why"), 0,
                 "The specified CAMProxy provider 'example' is invalid: why");
}

TEST(InvalidThumbprintStoreException, NamesTheStore) {
    ExpectMember(InvalidThumbprintStoreException("/a/b"), 0,
                 "The specified thumbprint store '/a/b' is invalid");
}

TEST(InvalidCertificateException, HasAFixedText) {
    ExpectMember(InvalidCertificateException(), 0,
                 "The certificate format is invalid; only PEM format is supported.");
}

TEST(InvalidVerifyCAMCertificateOptionException, GivesTheDetail) {
    ExpectMember(InvalidVerifyCAMCertificateOptionException("why"), 0,
                 "The VerifyCAMCertificate option is invalid: why");
}

TEST(InvalidHostNameException, GivesTheDetail) {
    ExpectMember(InvalidHostNameException("why"), 0, "The current hostname is invalid: why");
}

TEST(InvalidCredentialsException, GivesTheDetail) {
    ExpectMember(InvalidCredentialsException("why"), 0,
                 "The credentials that were provided were invalid: why");
}

TEST(LogonFailureException, IsCaughtAsItselfAfterClone) {
    LogonFailureException const original(1326, "x");
    std::unique_ptr<Exception> const clone(original.Clone());
    EXPECT_THROW(clone->Throw(), LogonFailureException);
    EXPECT_THROW(clone->Throw(), Exception);
}

TEST(TimeSkewException, ThrownThroughItsBaseStaysItself) {
    TimeSkewException const original(1398, "x");
    Exception const& base = original;
    EXPECT_THROW(base.Throw(), TimeSkewException);
}
