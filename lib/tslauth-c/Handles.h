// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <tslauth/tslauth_c.h>

#include <exception>
#include <string>
#include <vector>

/// What the handles of the C interface that several functions share are.

struct tslauth_error {
    tslauth_error_kind kind = TSLAUTH_ERROR_OTHER;
    unsigned long code = 0;
    std::string name;
    std::string text;
};

struct tslauth_texts {
    std::vector<std::string> texts;
};

namespace tessel::tslauth_c {

/// A failure of this interface's own.
class Failure : public std::exception {
public:
    Failure(tslauth_error_kind kind, std::string text);
    ~Failure() override;
    char const* what() const noexcept override;
    tslauth_error_kind Kind() const {
        return _kind;
    }

private:
    tslauth_error_kind _kind;
    std::string _text;
};

tslauth_error ErrorOf(std::exception_ptr const& failure);

/// Puts what `failure` is into `*error`, unless that is null. @return -1
int Fail(std::exception_ptr const& failure, tslauth_error** error) noexcept;

/// Runs the body of a function. @return 0, or -1 with `*error`
template <typename Body> int Guarded(tslauth_error** error, Body&& body) noexcept {
    try {
        body();
        return 0;
    } catch (...) {
        return Fail(std::current_exception(), error);
    }
}

/// @throws Failure TSLAUTH_ERROR_USAGE
/// @{
std::string RequiredText(char const* text, char const* what);
void RequireFlags(unsigned flags, unsigned known);
/// @}

} // namespace tessel::tslauth_c
