// SPDX-License-Identifier: Apache-2.0
#include "ProviderLibrary.h"

#include "Paths.h"

namespace tessel::authentication {

namespace {

void Close(void* library) {
    // The result is ignored: nobody could do anything about a library that stays.
    (void)dlclose(library);
}

} // namespace

LibraryHandle LoadProvider(std::string const& name, int flags, char const* failure) {
    std::string const path = Paths::ProviderPrefix + name + Paths::ProviderSuffix;
    // An error that somebody else has left behind must not pass for this library's.
    (void)dlerror();
    LibraryHandle library(dlopen(path.c_str(), flags), &Close);
    if (library == nullptr) {
        throw IOError(failure + LoaderError());
    }
    return library;
}

std::string LoaderError() {
    char const* const text = dlerror();
    return text == nullptr ? std::string("the symbol has no address") : std::string(text);
}

} // namespace tessel::authentication
