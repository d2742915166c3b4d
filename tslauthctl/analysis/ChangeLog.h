// SPDX-License-Identifier: Apache-2.0
#ifndef TSLAUTHCTL_CHANGELOG_H
#define TSLAUTHCTL_CHANGELOG_H

#include <string>
#include <vector>

/// One line in the system log, facility authpriv, for each command that set out to change the host:
/// who ran it, what it was, how it ended. Never a secret: no command takes one as an argument.
namespace tessel::tslauthctl::ChangeLog {

/// Who a line names, by what the kernel and sudo say.
struct Caller {
    unsigned uid = 0;
    /// Of the log-in that the process belongs to; empty where it belongs to none.
    std::string loginUid;
    std::string sudoUser;
};

/// `change="join corp.example --user joiner" outcome=done uid=0 login_uid=1000 sudo_user="alice"`
std::string LineFor(std::vector<std::string> const& arguments, std::string const& outcome,
                    Caller const& caller);

/// Keeps the command's arguments for the line.
void SetCommand(std::vector<std::string> arguments);

/// The arguments as they may be shown, with quotes where one has blanks.
std::string Shown(std::vector<std::string> const& arguments);
/// The same for those that are kept.
std::string ShownCommand();

Caller ThisCaller();

/// From now on the command changes the host, or is about to.
void Begin() noexcept;

/// Writes the line, once, if the command has set out to change the host.
void End(std::string const& outcome) noexcept;

} // namespace tessel::tslauthctl::ChangeLog

#endif
