// SPDX-License-Identifier: Apache-2.0
#ifndef TSLAUTHCTL_PASSWORD_H
#define TSLAUTHCTL_PASSWORD_H

#include "terminal/Secret.h"

#include <string>

namespace tessel::tslauthctl {

/// Where a password is to be read from; the terminal where nothing else is said. There is no way to
/// give one as an argument or in the environment: both can be read by others.
struct PasswordSource {
    bool standardInput = false;
    /// A path; empty for none.
    std::string file;
    /// -1 for none.
    int descriptor = -1;

    bool IsGiven() const noexcept {
        return standardInput || !file.empty() || descriptor >= 0;
    }
};

/// Makes sure that the process leaves no core behind and that no other process of the same user can
/// look into it. To be called before a secret is read and before a provider's code is loaded.
/// @throws Failure
void ProtectMemory();

/// Reads the password: the first line of what `source` names, without its line end (LF or CRLF).
/// Blocks until it is there. The rest of a line's source is not looked at.
///
/// On a terminal it is asked for with `prompt`, with the echo off. However the process is ended or
/// stopped meanwhile, the terminal is put back first; where it is continued, it asks again.
///
/// @throws Failure where there is nothing to read it from; where a file is not a regular one of the
///     user's or root's that nobody else may read; where the password is longer than
///     `Secret::MaxLength` or holds a zero byte
void ReadPassword(PasswordSource const& source, std::string const& prompt, Secret& secret);

} // namespace tessel::tslauthctl

#endif
