// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "host/SecretFile.h"

#include <chrono>
#include <string>
#include <vector>

namespace tessel::winbind {

using Clock = std::chrono::steady_clock;

/// One of Samba's programs, run to its end or to a deadline.
///
/// No shell is involved. The program starts with an environment of PATH, LC_ALL=C and what its
/// caller adds, in the root folder, in a session of its own without a terminal, with the default
/// signal handling, without core dumps, with /dev/null for its input, and with no descriptor of the
/// host process's but the secrets: the first is its descriptor 3, the second 4, and so on.
///
/// It works in any host process: with many threads, with SIGCHLD ignored or handled by somebody who
/// waits for every child, with 0, 1 and 2 closed. Between the host and the program stands a process
/// that the host's own waiting cannot see and that sends the host no signal; it ends the program's
/// group at the deadline, and also when the host dies. A program that makes itself a daemon is left
/// alone once its first process has ended.
class ChildProcess {
public:
    struct Task {
        /// The program's name, found in the system's folders, and its arguments.
        std::vector<std::string> arguments;
        /// "NAME=value"
        std::vector<std::string> environment = {};
        std::vector<SecretFile const*> secrets = {};
    };

    struct Outcome {
        /// The exit code; 128 and the signal's number where a signal ended the program.
        int code;
        /// The number of that signal, or 0.
        int signal;
        /// The deadline ended it; `code` then is 137.
        bool timedOut;
        /// Its output and its messages, as they came; of a long one the first mebibyte.
        std::string output;
    };

    /// Blocks until the program has ended, `deadline` at the latest. What a daemon writes later is
    /// not waited for.
    /// @throws Failure 1060 if there is no such program, `TSLAUTH_WINBIND_SEE_SYSTEM_LOG` where
    ///         none can be started
    static Outcome Run(Task const& task, Clock::time_point deadline);

    /// The program's path, or empty where it is not installed.
    static std::string Find(std::string const& program);
};

} // namespace tessel::winbind
