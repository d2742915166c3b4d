// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "SecretText.h"

#include <string>

namespace tessel::winbind::cam {

/// The file with the code by which this host is known to a service once. It is the host's until the
/// service has taken the code, and is worth nothing afterwards.
class OneTimeCode {
public:
    explicit OneTimeCode(std::string path);
    ~OneTimeCode();

    /// @return the code, without the white space around it
    /// @throws Failure NoCodeOnThisHost where the file is missing or empty, CodeNotProtected where
    ///         it is no regular file or others than its owner, who is the caller's user, may read
    ///         or write it, InvalidParameter where it holds no code, Unknown where it cannot be
    ///         read
    SecretText Read() const;

    /// Overwrites the file with zeros and removes it. What a journal, a snapshot or the spare
    /// blocks of a flash disk keep of it is out of reach; the service takes no code twice.
    /// @throws Failure Unknown where the file is still there afterwards
    void Spend() const;

private:
    std::string const _path;
};

} // namespace tessel::winbind::cam
