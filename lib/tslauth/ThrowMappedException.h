// SPDX-License-Identifier: Apache-2.0
#ifndef TSLAUTH_THROWMAPPEDEXCEPTION_H
#define TSLAUTH_THROWMAPPEDEXCEPTION_H

#include <tslauth/tslauth_provider.h>

namespace tessel::authentication {

/// One row of the table of provider errors: a code, what it throws, and the text that follows the
/// prefix of the message; null where the class fixes its text itself.
struct MappedException {
    ActiveDirectoryClientErrorCode code;
    void (*raise)(ActiveDirectoryClientErrorCode code, char const* text);
    char const* text;
};

/// The row of `code`, or the default row. 0 has none, and ends the process.
MappedException const& FindMappedException(ActiveDirectoryClientErrorCode code);

/// Throws the exception that stands for a provider's error `code`: its own class and text for each
/// code that `tslauth_provider.h` names, `UnknownException` for every other, so that no failure
/// goes unreported. 0 is success and ends the process: it is the adapter's mistake to ask.
///
/// Inline, because each function between a throw and its handler costs the unwinder a tenth of
/// what a failing call may cost.
[[noreturn]] __attribute__((always_inline)) inline void
ThrowMappedException(ActiveDirectoryClientErrorCode code) {
    MappedException const& row = FindMappedException(code);
    row.raise(code, row.text);
    __builtin_unreachable();
}

} // namespace tessel::authentication

#endif
