// SPDX-License-Identifier: Apache-2.0
#ifndef TSLAUTH_SINGLETON_H
#define TSLAUTH_SINGLETON_H

#include "Export.h"

#include <cstdlib>
#include <cxxabi.h>
#include <string>
#include <typeinfo>

// <cassert> declares this function only while assertions are on.
extern "C" void __assert_fail(char const* expression, char const* source, unsigned line,
                              char const* function) noexcept // NOLINT(bugprone-reserved-identifier)
    __attribute__((__noreturn__));

namespace tessel {
namespace authentication {

/// Base of a class of which at most one object may live at a time.
///
/// A second live object is a bug of the program, and ends the process through the C library's
/// assertion report in every build type. Not for sharing between threads: the object is made before
/// and destroyed after the threads that use it.
template <typename T> class Singleton {
public:
    Singleton(Singleton const&) = delete;
    Singleton& operator=(Singleton const&) = delete;

    /// The one object, or null while there is none. It is not created here, and stays its
    /// creator's.
    static T* Instance() noexcept {
        return _instance;
    }

protected:
    Singleton() {
        if (_instance) {
            Fail("! _instance", 23, "Singleton");
        }
        _instance = static_cast<T*>(this);
    }

    ~Singleton() {
        if (!_instance) {
            Fail("_instance", 29, "~Singleton");
        }
        _instance = nullptr;
    }

    /// Defined once, in the library.
    static T* _instance;

private:
    /// Spelled out instead of `assert`, which NDEBUG turns off and whose function text differs
    /// between compilers: who searches a host's logs for the report finds one text.
    [[noreturn]] static void Fail(char const* expression, unsigned line, char const* member) {
        std::string type = typeid(T).name();
        if (char* readable = abi::__cxa_demangle(typeid(T).name(), nullptr, nullptr, nullptr)) {
            type = readable;
            std::free(readable);
        }
        std::string const function =
            "tessel::authentication::Singleton<T>::" + std::string(member) +
            "() [with T = " + type + "]";
        __assert_fail(expression, "lib/tslauth/include/Singleton", line, function.c_str());
    }
};

} // namespace authentication
} // namespace tessel

#endif
