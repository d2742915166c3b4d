// SPDX-License-Identifier: Apache-2.0
#include "samba/Account.h"

#include "Failure.h"

#include <base/AsciiText.h>
#include <string>
#include <string_view>

namespace tessel::winbind {

namespace {

/// Samba reads a password file in a buffer of 128 bytes, and takes what fits.
constexpr std::size_t longestInFile = 127;

bool IsBlank(char c) {
    return c == ' ' || c == '\t';
}

void CheckName(std::string_view name) {
    if (name.empty() || IsBlank(name.front()) || IsBlank(name.back())) {
        throw Failure(TSLAUTH_PROVIDER_INVALID_ACCOUNT_NAME,
                      "the user name is empty, or has a blank at an end");
    }
    for (char const c : name) {
        if (base::AsciiText::IsControl(c)) {
            throw Failure(TSLAUTH_PROVIDER_INVALID_ACCOUNT_NAME,
                          "the user name holds a control character");
        }
    }
}

} // namespace

Account::Account(ActiveDirectoryClientCredentials const& credentials) {
    if (!credentials.userName || !credentials.password) {
        throw Failure(TSLAUTH_PROVIDER_INVALID_PARAMETER, "no user name or no password was given");
    }
    std::string_view const name = credentials.userName;
    std::string_view const password = credentials.password;
    CheckName(name);
    if (password.empty()) {
        throw Failure(TSLAUTH_PROVIDER_INVALID_PASSWORD, "the password is empty");
    }
    if (password.find('\n') != std::string_view::npos) {
        throw Failure(TSLAUTH_PROVIDER_INVALID_PASSWORD_NAME, "the password holds a line end");
    }
    if (password.size() <= longestInFile) {
        _names.reset(new SecretFile({"username = ", name, "\n"}));
        _password.reset(new SecretFile({password}));
    } else if (!IsBlank(password.front())) {
        _names.reset(new SecretFile({"username = ", name, "\npassword = ", password, "\n"}));
    } else {
        throw Failure(TSLAUTH_PROVIDER_INVALID_PASSWORD_NAME,
                      "the password is longer than 127 bytes and begins with a blank");
    }
}

void Account::AddTo(ChildProcess::Task& task) const {
    auto const add = [&](SecretFile const& file) {
        // The program sees the first as its descriptor 3.
        task.secrets.push_back(&file);
        return "/proc/self/fd/" + std::to_string(2 + task.secrets.size());
    };
    task.arguments.push_back("-A");
    task.arguments.push_back(add(*_names));
    if (_password) {
        task.environment.push_back("PASSWD_FILE=" + add(*_password));
    }
}

} // namespace tessel::winbind
