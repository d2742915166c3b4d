// SPDX-License-Identifier: Apache-2.0
#include "analysis/Failures.h"

#include <tslauth/Exceptions.h>

#include <algorithm>
#include <cstdlib>
#include <cxxabi.h>
#include <iterator>
#include <memory>
#include <typeinfo>

namespace tessel::tslauthctl {

namespace {

using namespace authentication;

template <typename Class> bool Is(std::exception const& exception) {
    return dynamic_cast<Class const*>(&exception) != nullptr;
}

struct Row {
    bool (*matches)(std::exception const&);
    ExitCode code;
    /// Only for calls that were made in somebody's name.
    bool aboutAccount;
};

constexpr ExitCode unreachable = ExitCode::unreachable;
constexpr ExitCode credentials = ExitCode::credentials;
constexpr ExitCode notJoined = ExitCode::notJoined;

constexpr Row table[] = {
    {Is<ConnectionInvalidException>, unreachable, false},
    {Is<ConnectionRefusedException>, unreachable, false},
    {Is<ConnectionUnavailableException>, unreachable, false},
    {Is<NoLogonServersException>, unreachable, false},
    {Is<NoNetworkException>, unreachable, false},
    {Is<NoSuchDomainException>, unreachable, false},
    {Is<ProviderCallTimedOutException>, unreachable, false},
    {Is<WSATimedOutException>, unreachable, false},

    {Is<AccessDeniedException>, credentials, true},
    {Is<AccountDisabledException>, credentials, true},
    {Is<InvalidAccountNameException>, credentials, true},
    {Is<InvalidCredentialsException>, credentials, true},
    {Is<InvalidPasswordException>, credentials, true},
    {Is<InvalidPasswordNameException>, credentials, true},
    {Is<LogonFailureException>, credentials, true},
    {Is<NoSuchUserException>, credentials, true},
    {Is<PasswordExpiredException>, credentials, true},

    {Is<NoTrustLSASecretException>, notJoined, false},
    {Is<NoTrustSAMAccountException>, notJoined, false},
};

} // namespace

std::string ClassName(std::exception const& exception) {
    int status = 0;
    std::unique_ptr<char, decltype(&std::free)> const name(
        abi::__cxa_demangle(typeid(exception).name(), nullptr, nullptr, &status), &std::free);
    return status == 0 ? name.get() : typeid(exception).name();
}

Failure Refused(std::exception const& exception) {
    return {ExitCode::refused, exception.what(), ClassName(exception)};
}

ExitCode ExitCodeOf(std::exception const& exception, Account account) {
    auto const* const row = std::find_if(std::begin(table), std::end(table), [&](Row const& each) {
        return each.matches(exception) && (!each.aboutAccount || account == Account::given);
    });
    return row == std::end(table) ? ExitCode::refused : row->code;
}

} // namespace tessel::tslauthctl
