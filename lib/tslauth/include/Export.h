// SPDX-License-Identifier: Apache-2.0
#ifndef TSLAUTH_EXPORT_H
#define TSLAUTH_EXPORT_H

/// Marks what callers of the library may link against. Everything else is compiled with hidden
/// visibility, and the version script repeats the rule for the linker.
#define TSLAUTH_EXPORT __attribute__((visibility("default")))

/// `std::auto_ptr` is part of the library's stable interface although C++11 deprecated it. The two
/// marks silence that one warning around a declaration that has to name it.
#define TSLAUTH_AUTO_PTR_BEGIN                                                                     \
    _Pragma("GCC diagnostic push") _Pragma("GCC diagnostic ignored \"-Wdeprecated-declarations\"")
#define TSLAUTH_AUTO_PTR_END _Pragma("GCC diagnostic pop")

#endif
