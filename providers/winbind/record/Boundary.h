// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "record/Uncancelled.h"

#include <tslauth/Domain.h>
#include <tslauth/tslauth_provider.h>

#include <exception>
#include <string>
#include <vector>

/// Where C++ ends: what the entries of the provider's record hand to their caller. Its failures are
/// codes, and its memory comes from malloc(3), so that `free` is what releases it.
namespace tessel::winbind {

/// The code of a failure that left an entry, which is logged under the entry's name. Never 0.
ActiveDirectoryClientErrorCode ReportFailure(char const* entry,
                                             std::exception_ptr const& failure) noexcept;

/// The words of the last failure that this thread has reported; empty where there was none.
char const* LastFailure() noexcept;

/// Runs an entry that returns a code: 0, or what its failure means.
template <typename Body> int CodeOf(char const* entry, Body&& body) noexcept {
    Uncancelled const call;
    try {
        body();
        return TSLAUTH_PROVIDER_SUCCESS;
    } catch (...) {
        return static_cast<int>(ReportFailure(entry, std::current_exception()));
    }
}

/// Runs an entry that returns a value: the value, or `otherwise` where it fails.
template <typename Body> int ValueOf(char const* entry, int otherwise, Body&& body) noexcept {
    Uncancelled const call;
    try {
        return body();
    } catch (...) {
        (void)ReportFailure(entry, std::current_exception()); // there is no room for a code
        return otherwise;
    }
}

/// Each hands out a copy, and the function that releases it. Where memory is short
/// (std::bad_alloc), the slots stay as they are.
/// @{
void HandOut(std::string const& text, char** slot, ActiveDirectoryClientFreeFunction* release);
/// Two pieces of memory, since the caller releases each name by itself. An empty name stays null.
void HandOut(authentication::Domain const& domain, ActiveDirectoryClientDomain* slot,
             ActiveDirectoryClientFreeFunction* release);
/// One piece of memory, since the caller releases the array alone.
void HandOut(std::vector<std::string> const& texts, char*** slot,
             ActiveDirectoryClientFreeFunction* release);
/// As above, with the records.
void HandOut(std::vector<authentication::Domain> const& domains,
             ActiveDirectoryClientDomain*** slot, ActiveDirectoryClientFreeFunction* release);
/// @}

} // namespace tessel::winbind
