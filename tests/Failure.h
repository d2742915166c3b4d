// SPDX-License-Identifier: Apache-2.0
#ifndef TSLAUTH_TESTS_FAILURE_H
#define TSLAUTH_TESTS_FAILURE_H

#include <tslauth/Exceptions.h>

#include <cstdio>
#include <ostream>
#include <string>
#include <typeindex>
#include <typeinfo>

/// A failure as a whole, for one comparison: class, code and message.
struct Failure {
    std::type_index type;
    unsigned long code;
    std::string message;

    bool operator==(Failure const& other) const {
        return type == other.type && code == other.code && message == other.message;
    }
};

inline std::ostream& operator<<(std::ostream& stream, Failure const& failure) {
    return stream << failure.type.name() << ' ' << failure.code << " \"" << failure.message << '"';
}

inline Failure NoFailure() {
    return {typeid(void), 0, "(none)"};
}

template <typename Call> Failure FailureOf(Call call) {
    try {
        call();
    } catch (tessel::authentication::Exception const& failure) {
        return {typeid(failure), failure.Code(), failure.what()};
    } catch (std::exception const& failure) {
        return {typeid(failure), 0, failure.what()};
    }
    return NoFailure();
}

template <typename Class> Failure Plain(std::string const& message) {
    return {typeid(Class), 0, message};
}

/// Of the coded form: `text` follows the prefix.
inline Failure Coded(std::type_index type, unsigned long code, std::string const& text) {
    char digits[9];
    (void)std::snprintf(digits, sizeof digits, "%08lx", code); // the code has 32 bits
    return {type, code, std::string("Exception 0x") + digits + ": " + text};
}

inline Failure NotImplemented() {
    return Coded(typeid(tessel::authentication::CallNotImplementedException), 120,
                 "This function is not supported on this system.");
}

#endif
