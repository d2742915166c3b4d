// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <tslauth/tslauth_provider.h>

#include <exception>
#include <string>

namespace tessel::winbind {

/// A failure that no number of the table names: its text is in the system log.
inline constexpr ActiveDirectoryClientErrorCode SeeSystemLog = 0xFFFF0000;
/// A join was accepted by the controller, could not be finished here, and could not be undone there:
/// the host is as it was, and the log names what may be left in the directory.
inline constexpr ActiveDirectoryClientErrorCode HalfDone = 0xFFFF0001;

/// What ends an operation of the provider: the code that its caller gets, and a text for the
/// system log, which names the object and holds no secret.
class Failure : public std::exception {
public:
    Failure(ActiveDirectoryClientErrorCode code, std::string text);
    ~Failure() override;

    ActiveDirectoryClientErrorCode Code() const noexcept {
        return _code;
    }

    char const* what() const noexcept override;

private:
    ActiveDirectoryClientErrorCode _code;
    std::string _text;
};

} // namespace tessel::winbind
