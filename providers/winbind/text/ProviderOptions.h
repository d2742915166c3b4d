// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <map>
#include <string>

namespace tessel::winbind {

/// What an administrator may choose in the provider's own file, `Paths::State`, before a join: each
/// counts from the next one on. README.md of the provider says what each of them does.
struct ProviderOptions {
    /// `computer-name`; empty: the host's name
    std::string computerName;
    /// `short-names`
    bool shortNames = false;
    /// `login-shell`
    std::string loginShell = "/bin/bash";
    /// `home-folder`, in which %D stands for the domain and %U for the user
    std::string homeFolder = "/home/%D/%U";
    /// `offline-log-in`
    bool offlineLogIn = false;
    /// `keytab`
    bool keytab = false;
    /// `register-in-dns`
    bool registerInDNS = false;
};

/// The options among the keys of the file; others are somebody else's.
/// @throws Failure TSLAUTH_PROVIDER_INVALID_PARAMETER for a value that is none, with the key, the
///     value and what it could be
ProviderOptions OptionsIn(std::map<std::string, std::string> const& file);

} // namespace tessel::winbind
