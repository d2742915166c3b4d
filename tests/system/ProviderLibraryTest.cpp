// SPDX-License-Identifier: Apache-2.0
#include "Failure.h"
#include "LoadedProvider.h"
#include "Node.h"

#include <tslauth/ActiveDirectoryProvider.h>
#include <tslauth/CAMProxy.h>

#include <cstddef>
#include <cstdlib>
#include <cstring>
#include <dlfcn.h>
#include <iterator>
#include <memory>
#include <new>
#include <string>
#include <sys/stat.h>
#include <unistd.h>

using namespace tessel::authentication;

namespace {

/// What happens to a provider's library and to the memory that holds one text, in order. Nothing
/// here allocates: it is asked from inside `new` and `delete`.
struct Watch {
    char const* text = nullptr; ///< null while nobody watches
    void* blocks[64] = {};      ///< new ones that are long enough for it
    std::size_t count = 0;
    char events[16] = {};

    void Add(char event) {
        std::size_t const length = std::strlen(events);
        if (length + 1 < sizeof events) {
            events[length] = event;
        }
    }
    bool Holds(void const* block) const {
        return std::memcmp(block, text, std::strlen(text) + 1) == 0;
    }
    bool IsHeld() const {
        for (std::size_t i = 0; i < count; ++i) {
            if (blocks[i] != nullptr && Holds(blocks[i])) {
                return true;
            }
        }
        return false;
    }
} watch;

void Start(std::string const& text) {
    watch = Watch();
    watch.text = text.c_str();
}

/// "h" before "l": the text is held when the library is loaded. "u", "f": it is unloaded, the
/// text's memory freed.
std::string Stop() {
    watch.text = nullptr;
    return watch.events;
}

void Forget(void* memory) {
    for (std::size_t i = 0; watch.text != nullptr && i < watch.count; ++i) {
        if (watch.blocks[i] == memory) {
            if (watch.Holds(memory)) {
                watch.Add('f');
            }
            watch.blocks[i] = nullptr;
        }
    }
}

template <typename Function> Function Next(char const* name) {
    return reinterpret_cast<Function>(dlsym(RTLD_NEXT, name));
}

} // namespace

// In place of the C and C++ libraries', for the libraries as well.
void* operator new(std::size_t size) {
    void* const memory = std::malloc(size != 0 ? size : 1);
    if (memory == nullptr) {
        throw std::bad_alloc();
    }
    if (watch.text != nullptr && size > std::strlen(watch.text) &&
        watch.count < std::size(watch.blocks)) {
        watch.blocks[watch.count++] = memory;
    }
    return memory;
}
void operator delete(void* memory) noexcept {
    Forget(memory);
    std::free(memory);
}
void operator delete(void* memory, std::size_t /*size*/) noexcept {
    Forget(memory);
    std::free(memory);
}

extern "C" {
__attribute__((visibility("default"))) void* dlopen(char const* path, int flags) noexcept {
    if (watch.text != nullptr) {
        if (watch.IsHeld()) {
            watch.Add('h');
        }
        watch.Add('l');
    }
    return Next<void* (*)(char const*, int)>("dlopen")(path, flags);
}
__attribute__((visibility("default"))) int dlclose(void* library) noexcept {
    if (watch.text != nullptr) {
        watch.Add('u');
    }
    return Next<int (*)(void*)>("dlclose")(library);
}
}

TEST(ProviderLibraryTest, ActiveDirectoryProviderIsUnloadedBeforeItsTextsGo) {
    std::string const module = "pam_of_a_provider_with_a_long_name.so";
    Start(module);
    auto provider = std::make_unique<ActiveDirectoryProvider>("long-names");
    ASSERT_EQ(module, provider->PAMModule());
    provider.reset();
    EXPECT_EQ("luf", Stop());
}

TEST(ProviderLibraryTest, CAMProxyHoldsItsTextsBeforeItLoadsAndAfterItUnloads) {
    std::string const thumbprint = "0A:1B:2C:3D:4E:5F:60:71:82:93:A4:B5:C6:D7:E8:F9:0A:1B:2C:3D";
    Start(thumbprint);
    auto proxy = std::make_unique<CAMProxy>("cam-null-entries", "192.0.2.1", true, thumbprint);
    proxy.reset();
    EXPECT_EQ("hluf", Stop());
}

TEST(ProviderLibraryTest, APipeInTheLibrarysPlaceIsNotWaitedFor) {
    std::string const path = LoadedProvider::PathOf("pipe");
    ASSERT_EQ(0, mkfifo(path.c_str(), 0755));
    EXPECT_EQ(Plain<IOError>("Unable to open provider: " + path + ": it is not a regular file"),
              FailureOf([] { ActiveDirectoryProvider const provider("pipe"); }));
    EXPECT_EQ(Plain<IOError>("Unable to open CAM provider: " + path + ": it is not a regular file"),
              FailureOf([] { CAMProxy const proxy("pipe", "192.0.2.1", true, ""); }));
    ASSERT_EQ(0, unlink(path.c_str()));
}
