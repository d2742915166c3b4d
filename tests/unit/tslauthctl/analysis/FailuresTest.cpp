// SPDX-License-Identifier: Apache-2.0
#include "analysis/Failures.h"

#include <tslauth/Exceptions.h>

#include <gmock/gmock.h>

#include <memory>
#include <new>
#include <stdexcept>
#include <string>
#include <type_traits>
#include <vector>

namespace tessel::tslauthctl {
namespace {

using namespace authentication;

struct Row {
    std::shared_ptr<std::exception> exception;
    ExitCode withAccount;
    ExitCode without;
};

template <typename Class> std::shared_ptr<std::exception> Make() {
    if constexpr (std::is_constructible_v<Class, unsigned long, std::string>) {
        return std::make_shared<Class>(1UL, "text");
    } else if constexpr (std::is_constructible_v<Class, std::string>) {
        return std::make_shared<Class>("text");
    } else if constexpr (std::is_constructible_v<Class, unsigned long>) {
        return std::make_shared<Class>(1UL);
    } else {
        return std::make_shared<Class>();
    }
}

template <typename Class> Row With(ExitCode withAccount, ExitCode without) {
    return {Make<Class>(), withAccount, without};
}

template <typename Class> Row Always(ExitCode code) {
    return With<Class>(code, code);
}

/// Every class of the library.
std::vector<Row> Rows() {
    constexpr auto refused = ExitCode::refused;
    constexpr auto unreachable = ExitCode::unreachable;
    constexpr auto credentials = ExitCode::credentials;
    constexpr auto notJoined = ExitCode::notJoined;
    return {
        With<AccessDeniedException>(credentials, refused),
        With<AccountDisabledException>(credentials, refused),
        With<InvalidAccountNameException>(credentials, refused),
        With<InvalidCredentialsException>(credentials, refused),
        With<InvalidPasswordException>(credentials, refused),
        With<InvalidPasswordNameException>(credentials, refused),
        With<LogonFailureException>(credentials, refused),
        With<NoSuchUserException>(credentials, refused),
        With<PasswordExpiredException>(credentials, refused),

        Always<ConnectionInvalidException>(unreachable),
        Always<ConnectionRefusedException>(unreachable),
        Always<ConnectionUnavailableException>(unreachable),
        Always<NoLogonServersException>(unreachable),
        Always<NoNetworkException>(unreachable),
        Always<NoSuchDomainException>(unreachable),
        Always<ProviderCallTimedOutException>(unreachable),
        Always<WSATimedOutException>(unreachable),

        Always<NoTrustLSASecretException>(notJoined),
        Always<NoTrustSAMAccountException>(notJoined),

        Always<IllFormedPasswordException>(refused),
        Always<NoSuchGroupException>(refused),
        Always<PasswordRestrictionException>(refused),
        Always<RPCSCallInProgressException>(refused),
        Always<TimeSkewException>(refused),
        Always<InvalidComputerNameException>(refused),
        Always<InvalidDomainNameException>(refused),
        Always<InvalidGroupNameException>(refused),
        Always<InvalidMessageException>(refused),
        Always<InvalidNetNameException>(refused),
        Always<InvalidParameterException>(refused),
        Always<InvalidServiceNameException>(refused),
        Always<InvalidShareNameException>(refused),
        Always<InvalidWorkgroupNameException>(refused),
        Always<DomainTrustInconsistentException>(refused),
        Always<SetupAlreadyJoinedException>(refused),
        Always<DirectoryException>(refused),
        Always<FileNotFoundException>(refused),
        Always<NotEnoughMemoryException>(refused),
        Always<ServiceCannotAcceptControlException>(refused),
        Always<ServiceDoesNotExistException>(refused),
        Always<ServiceNotActiveException>(refused),
        Always<WkstaNotStartedException>(refused),
        Always<BadDLLEntryPointException>(refused),
        Always<ExceptionInServiceException>(refused),
        Always<InternalErrorException>(refused),
        Always<ProcessAbortedException>(refused),
        Always<RPCSProtocolSequenceNotSupportedException>(refused),
        Always<CallNotImplementedException>(refused),
        Always<UnknownException>(refused),
        Always<InvalidActiveDirectoryProviderException>(refused),
        Always<InvalidCAMProxyProviderException>(refused),
        Always<InvalidThumbprintStoreException>(refused),
        Always<InvalidVerifyCAMCertificateOptionException>(refused),
        Always<InvalidHostNameException>(refused),
        Always<ConfigurationError>(refused),
        Always<InvalidKeyException>(refused),
        Always<IOError>(refused),
        Always<FilePermissionError>(refused),
        Always<InvalidRemoteAuthenticationStoreException>(refused),
        Always<UnknownRemoteAuthenticationStoreException>(refused),
        Always<InvalidIPAddressException>(refused),
        Always<InvalidCertificateException>(refused),
        Always<InvalidCAMCertificateException>(refused),
        Always<ThreadErrorException>(refused),
        Always<std::runtime_error>(refused),
    };
}

TEST(FailuresTest, EveryClassHasItsExitCode) {
    auto const rows = Rows();
    for (auto const& row : rows) {
        EXPECT_EQ(row.withAccount, ExitCodeOf(*row.exception, Account::given))
            << ClassName(*row.exception);
        EXPECT_EQ(row.without, ExitCodeOf(*row.exception, Account::none))
            << ClassName(*row.exception);
    }
    EXPECT_EQ(65U, rows.size());
}

TEST(FailuresTest, AFailureCarriesMessageClassAndCode) {
    try {
        Explaining(Account::given, [] { throw LogonFailureException(1326, "text"); });
        FAIL() << "nothing was thrown";
    } catch (Failure const& e) {
        EXPECT_EQ(ExitCode::credentials, e.Code());
        EXPECT_EQ("tessel::authentication::LogonFailureException", e.ExceptionClass());
        EXPECT_STREQ("Exception 0x0000052e: text", e.what());
    }
}

TEST(FailuresTest, AFailureOfTheCommandIsNotExplainedAgain) {
    try {
        Explaining(Account::given, [] { throw Failure(ExitCode::usage, "text"); });
        FAIL() << "nothing was thrown";
    } catch (Failure const& e) {
        EXPECT_EQ(ExitCode::usage, e.Code());
        EXPECT_STREQ("text", e.what());
    }
}

TEST(FailuresTest, LackOfMemoryPasses) {
    EXPECT_THROW(Explaining(Account::none, [] { throw std::bad_alloc(); }), std::bad_alloc);
}

TEST(FailuresTest, WhatIsNoExceptionIsTheProviders) {
    try {
        Explaining(Account::none, [] { throw 7; });
        FAIL() << "nothing was thrown";
    } catch (Failure const& e) {
        EXPECT_EQ(ExitCode::refused, e.Code());
    }
}

TEST(FailuresTest, AnAnswerComesThrough) {
    EXPECT_EQ(7, Explaining(Account::none, [] { return 7; }));
}

TEST(FailuresTest, TheClassOfAnExceptionIsNamedInFull) {
    EXPECT_EQ("std::out_of_range", ClassName(std::out_of_range("x")));
}

} // namespace
} // namespace tessel::tslauthctl
