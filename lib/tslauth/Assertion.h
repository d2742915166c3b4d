// SPDX-License-Identifier: Apache-2.0
#ifndef TSLAUTH_ASSERTION_H
#define TSLAUTH_ASSERTION_H

// <cassert> declares this function only while assertions are on.
extern "C" void __assert_fail(char const* expression, char const* source, unsigned line,
                              char const* function) noexcept __attribute__((__noreturn__));

namespace tessel::authentication {

/// Ends the process with the C library's own assertion report, in every build type. For bugs of the
/// program only; bad input from outside is an exception.
///
/// The texts are arguments and not taken from the compiler, because a host's logs are searched for
/// them: they must not change with the compiler, the build folder or the build type.
/// @param source the source file below the project's root, without its extension
[[noreturn]] inline void FailAssertion(char const* expression, char const* source, unsigned line,
                                       char const* function) {
    __assert_fail(expression, source, line, function);
}

} // namespace tessel::authentication

#endif
