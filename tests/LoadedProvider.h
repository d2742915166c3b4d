// SPDX-License-Identifier: Apache-2.0
#ifndef TSLAUTH_TESTS_LOADEDPROVIDER_H
#define TSLAUTH_TESTS_LOADEDPROVIDER_H

#include <gtest/gtest.h>

#include <dlfcn.h>
#include <string>

/// A provider at the fixed path, held beside whoever else loads it: what it writes down outlives
/// them, and the next holder finds it empty.
class LoadedProvider {
public:
    explicit LoadedProvider(std::string const& name)
        : _library(dlopen(PathOf(name).c_str(), RTLD_LAZY)) {
        EXPECT_NE(nullptr, _library) << name;
    }
    LoadedProvider(LoadedProvider const&) = delete;
    LoadedProvider& operator=(LoadedProvider const&) = delete;
    ~LoadedProvider() {
        (void)dlclose(_library); // nobody could do anything about a library that stays
    }

    /// The object that the provider exports by that name.
    template <typename Object> Object& Find(char const* symbol) const {
        return *static_cast<Object*>(dlsym(_library, symbol));
    }

    static std::string PathOf(std::string const& name) {
        return "/usr/libexec/tslauth/lib" + name + ".so";
    }

    /// Whether anybody has it loaded now.
    static bool IsLoaded(std::string const& name) {
        void* const library = dlopen(PathOf(name).c_str(), RTLD_LAZY | RTLD_NOLOAD);
        if (library == nullptr) {
            return false;
        }
        (void)dlclose(library); // the count that the question itself added
        return true;
    }

private:
    void* _library;
};

#endif
