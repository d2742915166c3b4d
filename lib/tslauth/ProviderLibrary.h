// SPDX-License-Identifier: Apache-2.0
#ifndef TSLAUTH_PROVIDERLIBRARY_H
#define TSLAUTH_PROVIDERLIBRARY_H

#include <tslauth/Exceptions.h>
#include <tslauth/LibraryHandle.h>

#include <dlfcn.h>
#include <string>

/// What the adapters of the two kinds of providers have in common: finding a library by its
/// provider's name, its record by symbol, and an entry that may be null.
namespace tessel::authentication {

/// Loads the library of the provider `name`.
/// @param flags as `dlopen` takes them
/// @param failure how the message begins where it cannot be loaded
/// @throws IOError `failure` + the loader's text
LibraryHandle LoadProvider(std::string const& name, int flags, char const* failure);

/// What the loader says about its last failure. It forgets it with the call, and with the next call
/// to it, so this is taken before anything else is done. A symbol whose address is null is missing
/// too, but no failure for the loader.
std::string LoaderError();

/// The record of that name, or null, with the reason in `LoaderError`.
template <typename Record>
Record const* FindRecord(LibraryHandle const& library, char const* symbol) {
    return static_cast<Record const*>(dlsym(library.get(), symbol));
}

/// `entry`, unless it is null.
/// @throws CallNotImplementedException if it is
template <typename Entry> Entry Implemented(Entry entry) {
    if (entry == nullptr) {
        throw CallNotImplementedException();
    }
    return entry;
}

/// An empty optional argument is passed as null.
inline char const* OptionalText(std::string const& text) {
    return text.empty() ? nullptr : text.c_str();
}

} // namespace tessel::authentication

#endif
