// SPDX-License-Identifier: Apache-2.0
#ifndef TSLAUTHCTL_FAILURES_H
#define TSLAUTHCTL_FAILURES_H

#include "terminal/Console.h"

#include <tslauth/Exceptions.h>

#include <exception>
#include <new>

namespace tessel::tslauthctl {

/// The class of an exception, with its namespaces.
std::string ClassName(std::exception const& exception);

/// The library's refusal, as a failure of the command.
Failure Refused(std::exception const& exception);

/// Whether the call was made in somebody's name. "Access denied" is about that name then, and about
/// the host or the one asked for otherwise.
enum class Account { none, given };

/// The exit code for what the library has thrown. Everything that has no code of its own is
/// `refused`.
ExitCode ExitCodeOf(std::exception const& exception, Account account);

/// Runs a call of the library, and throws its failure as one of the command's, with the exit code
/// of its class.
template <typename Call> auto Explaining(Account account, Call call) {
    try {
        return call();
    } catch (Failure const&) {
        throw;
    } catch (std::bad_alloc const&) {
        throw;
    } catch (std::exception const& e) {
        throw Failure(ExitCodeOf(e, account), e.what(), ClassName(e));
    } catch (...) {
        throw Failure(ExitCode::refused, "The provider failed in a way of its own");
    }
}

/// Runs a call to the domain on this thread, and adds to its failure why the provider failed, in
/// the provider's words.
/// @param domain a store or a provider
template <typename Domain, typename Call>
auto WithCause(Domain const& domain, Account account, Call call) {
    try {
        return call();
    } catch (authentication::Exception const& e) {
        auto const cause = domain.GetLastFailure();
        if (cause.empty()) {
            throw;
        }
        throw Failure(ExitCodeOf(e, account), std::string(e.what()) + " (" + cause + ")",
                      ClassName(e));
    }
}

} // namespace tessel::tslauthctl

#endif
