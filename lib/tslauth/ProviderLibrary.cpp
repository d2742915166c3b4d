// SPDX-License-Identifier: Apache-2.0
#include "ProviderLibrary.h"

#include <tslauth/Paths.h>

#include <sys/stat.h>

namespace tessel::authentication {

namespace {

void Close(void* library) {
    // The result is ignored: nobody could do anything about a library that stays.
    (void)dlclose(library);
}

} // namespace

LibraryHandle LoadProvider(std::string const& name, int flags, char const* failure) {
    std::string const path = Paths::ProviderPrefix + name + Paths::ProviderSuffix;
    // The loader would wait for who writes to a pipe; a folder it refuses by itself.
    struct stat status = {};
    if (stat(path.c_str(), &status) == 0 && !S_ISREG(status.st_mode) && !S_ISDIR(status.st_mode)) {
        throw IOError(failure + path + ": it is not a regular file");
    }
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
