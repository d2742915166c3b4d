// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "tslauth_winbind_provider.h"

#include <tslauth/tslauth_provider.h>

#include <exception>
#include <string>

namespace tessel::winbind {

/// What ends an operation of the provider: the code that its caller gets, one of
/// tslauth_provider.h or TSLAUTH_WINBIND_..., and a text for the
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
