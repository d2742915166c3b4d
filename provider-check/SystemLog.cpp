// SPDX-License-Identifier: Apache-2.0
#include "SystemLog.h"

#include <cstdarg>
#include <cstdio>
#include <cstring>
#include <utility>

namespace tessel::providercheck::SystemLog {

namespace {

Recorder* notes = nullptr;
std::vector<std::string> watched;

void Take(char const* format, std::va_list arguments) {
    char text[8192];
    // NOLINTNEXTLINE(clang-analyzer-valist.Uninitialized): it is not
    (void)std::vsnprintf(text, sizeof text, format, arguments); // the rest is cut
    LookAt(text);
}

} // namespace

void Watch(Recorder* recorder, std::vector<std::string> secrets) {
    notes = recorder;
    watched = std::move(secrets);
}

void LookAt(char const* text) {
    if (notes == nullptr) {
        return;
    }
    notes->Examined(Rule::Secrets);
    for (std::string const& secret : watched) {
        if (!secret.empty() && std::strstr(text, secret.c_str()) != nullptr) {
            notes->Found(Rule::Secrets, "%s: a text has the password in it", notes->Doing());
        }
    }
}

} // namespace tessel::providercheck::SystemLog

using tessel::providercheck::SystemLog::Take;

// The C library's headers declare them with attributes of their own, and are not included here. The
// two with a flag are what a provider that is compiled with _FORTIFY_SOURCE calls.
extern "C" {

__attribute__((visibility("default"), format(printf, 2, 3))) void syslog(int, char const* format,
                                                                         ...) {
    std::va_list arguments;
    va_start(arguments, format);
    Take(format, arguments);
    va_end(arguments);
}

__attribute__((visibility("default"))) void vsyslog(int, char const* format,
                                                    std::va_list arguments) {
    Take(format, arguments);
}

__attribute__((visibility("default"))) void __syslog_chk(int, int, char const* format, ...) {
    std::va_list arguments;
    va_start(arguments, format);
    Take(format, arguments);
    va_end(arguments);
}

__attribute__((visibility("default"))) void __vsyslog_chk(int, int, char const* format,
                                                          std::va_list arguments) {
    Take(format, arguments);
}
}
