// SPDX-License-Identifier: Apache-2.0
#include "analysis/ChangeLog.h"

#include "analysis/HostFile.h"
#include "terminal/EscapedText.h"

#include <base/AsciiText.h>

#include <cstdlib>
#include <exception>
#include <syslog.h>
#include <unistd.h>
#include <utility>

namespace tessel::tslauthctl::ChangeLog {

namespace {

/// What the kernel gives where a process belongs to no log-in.
constexpr char NoLogin[] = "4294967295";

std::vector<std::string>& Command() {
    static std::vector<std::string> command;
    return command;
}

bool begun = false;

/// In quotes, so that nothing in it passes for another field.
std::string Quoted(std::string const& text) {
    std::string quoted = "\"";
    for (char const c : Escaped(text)) {
        quoted += c == '"' || c == '\\' ? std::string("\\") + c : std::string(1, c);
    }
    return quoted + "\"";
}

/// The arguments as they may be shown. Who is used to other tools may have written a password
/// behind the account's name, as in "--user joiner%secret".
std::vector<std::string> WithoutPasswords(std::vector<std::string> arguments) {
    std::string const option = "--user";
    bool isAccount = false;
    for (auto& argument : arguments) {
        bool const both = argument.compare(0, option.size() + 1, option + "=") == 0;
        if (auto const at = argument.find('%'); (isAccount || both) && at != std::string::npos) {
            argument.replace(at, std::string::npos, "%...");
        }
        isAccount = argument == option;
    }
    return arguments;
}

} // namespace

Caller ThisCaller() {
    Caller caller;
    caller.uid = getuid();
    auto const login = HostFileOrNothing("/proc/self/loginuid").value_or("");
    caller.loginUid = std::string(base::AsciiText::Trimmed(login));
    if (caller.loginUid == NoLogin) {
        caller.loginUid.clear();
    }
    if (char const* const user = std::getenv("SUDO_USER")) {
        caller.sudoUser = user;
    }
    return caller;
}

std::string Shown(std::vector<std::string> const& arguments) {
    std::string command;
    for (auto const& argument : WithoutPasswords(arguments)) {
        bool const plain = !argument.empty() && argument.find_first_of(" \t'") == std::string::npos;
        command += (command.empty() ? "" : " ") + (plain ? argument : "'" + argument + "'");
    }
    return command;
}

std::string ShownCommand() {
    return Shown(Command());
}

std::string LineFor(std::vector<std::string> const& arguments, std::string const& outcome,
                    Caller const& caller) {
    auto line = "change=" + Quoted(Shown(arguments)) + " outcome=" + outcome +
                " uid=" + std::to_string(caller.uid) +
                " login_uid=" + (caller.loginUid.empty() ? "none" : caller.loginUid);
    if (!caller.sudoUser.empty()) {
        line += " sudo_user=" + Quoted(caller.sudoUser);
    }
    return line;
}

void SetCommand(std::vector<std::string> arguments) {
    Command() = std::move(arguments);
}

void Begin() noexcept {
    begun = true;
}

void End(std::string const& outcome) noexcept {
    if (!std::exchange(begun, false)) {
        return;
    }
    try {
        auto const line = LineFor(Command(), outcome, ThisCaller());
        openlog("tslauthctl", LOG_PID, LOG_AUTHPRIV);
        syslog(LOG_NOTICE, "%s", line.c_str());
        closelog();
    } catch (std::exception const&) {
        // Out of memory: what the command says of itself is all there is.
    }
}

} // namespace tessel::tslauthctl::ChangeLog
