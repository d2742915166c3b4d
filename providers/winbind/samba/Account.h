// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "host/ChildProcess.h"
#include "host/SecretFile.h"

#include <memory>
#include <tslauth/tslauth_provider.h>

namespace tessel::winbind {

/// Who asks the directory, in the form in which Samba's tools read it without seeing it in an
/// argument or in the environment.
class Account {
public:
    /// @throws Failure 87 for a missing text, 1315 for a user name that the tools cannot read, 86
    ///         for an empty password and 1216 for one that they cannot read: with a line end, or
    ///         longer than 127 bytes with a leading blank
    explicit Account(ActiveDirectoryClientCredentials const& credentials);

    /// Lets a task act as this account, which must outlive it.
    void AddTo(ChildProcess::Task& task) const;

private:
    std::unique_ptr<SecretFile> _names; ///< Samba's "authentication file"
    std::unique_ptr<SecretFile> _password;
};

} // namespace tessel::winbind
