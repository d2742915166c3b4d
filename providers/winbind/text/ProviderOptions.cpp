// SPDX-License-Identifier: Apache-2.0
#include "text/ProviderOptions.h"

#include "Failure.h"

#include <base/AsciiText.h>

namespace tessel::winbind {

namespace {

typedef std::map<std::string, std::string> File;

[[noreturn]] void Refuse(File::value_type const& line, std::string const& possible) {
    throw Failure(TSLAUTH_PROVIDER_INVALID_PARAMETER, "the option '" + line.first + "' is '" +
                                                          line.second + "' and must be " +
                                                          possible);
}

void Take(File const& file, char const* key, bool& option) {
    auto const found = file.find(key);
    if (found == file.end()) {
        return;
    }
    option = found->second == "yes";
    if (!option && found->second != "no") {
        Refuse(*found, "'yes' or 'no'");
    }
}

void TakePath(File const& file, char const* key, std::string& option) {
    auto const found = file.find(key);
    if (found == file.end()) {
        return;
    }
    option = found->second;
    if (option.empty() || option.front() != '/' || base::AsciiText::HasControlCharacters(option)) {
        Refuse(*found, "a path that begins with '/'");
    }
}

} // namespace

ProviderOptions OptionsIn(File const& file) {
    ProviderOptions options;
    auto const name = file.find("computer-name");
    if (name != file.end()) {
        options.computerName = name->second; // checked where it is used, as the host's own name is
    }
    Take(file, "short-names", options.shortNames);
    TakePath(file, "login-shell", options.loginShell);
    TakePath(file, "home-folder", options.homeFolder);
    Take(file, "offline-log-in", options.offlineLogIn);
    Take(file, "keytab", options.keytab);
    Take(file, "register-in-dns", options.registerInDNS);
    return options;
}

} // namespace tessel::winbind
