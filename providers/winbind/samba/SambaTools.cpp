// SPDX-License-Identifier: Apache-2.0
#include "samba/SambaTools.h"

#include "Failure.h"
#include "Paths.h"
#include "host/Host.h"
#include "host/HostFile.h"
#include "host/StagingFolder.h"
#include "samba/DirectorySearch.h"
#include "text/DirectoryNames.h"
#include "text/ToolFailure.h"

#include <algorithm>
#include <cstring>
#include <initializer_list>
#include <string_view>
#include <utility>

namespace tessel::winbind {

namespace {

std::string CommandOf(ChildProcess::Task const& task) {
    std::string command = task.arguments.front();
    for (std::size_t i = 1; i < task.arguments.size(); ++i) {
        command += ' ' + task.arguments[i]; // a secret is never among them
    }
    return command;
}

void Append(ChildProcess::Task& task, std::initializer_list<char const*> arguments) {
    task.arguments.insert(task.arguments.end(), arguments.begin(), arguments.end());
}

[[noreturn]] void ThrowTimedOut(ChildProcess::Task const& task) {
    throw Failure(TSLAUTH_PROVIDER_TIMED_OUT, "'" + CommandOf(task) + "' did not end in time");
}

[[noreturn]] void ThrowToolFailure(ChildProcess::Task const& task,
                                   ChildProcess::Outcome const& outcome) {
    std::string const ended = outcome.signal == 0
                                  ? ""
                                  : "ended by signal " + std::to_string(outcome.signal) + " (" +
                                        ::sigdescr_np(outcome.signal) + "); ";
    // What one that was ended had said by then need not be why.
    throw Failure(outcome.signal == 0 ? ToolFailureCode(outcome.output)
                                      : TSLAUTH_WINBIND_SEE_SYSTEM_LOG,
                  "'" + CommandOf(task) + "': " + ended + ToolFailureText(outcome.output));
}

/// The output of a task that succeeds.
std::string RunToSuccess(Host const& host, ChildProcess::Task const& task,
                         Clock::time_point deadline) {
    ChildProcess::Outcome outcome = host.Run(task, deadline);
    if (outcome.timedOut) {
        ThrowTimedOut(task);
    }
    if (outcome.code != 0) {
        ThrowToolFailure(task, outcome);
    }
    return std::move(outcome.output);
}

/// The rest of the line that begins with `start`, or empty.
std::string AfterLineStart(std::string_view text, std::string const& start) {
    while (!text.empty()) {
        std::string_view const line = text.substr(0, text.find('\n'));
        if (line.substr(0, start.size()) == start) {
            return std::string(line.substr(start.size()));
        }
        text.remove_prefix(std::min(text.size(), line.size() + 1));
    }
    return {};
}

} // namespace

SambaFolders ReadSambaFolders(Host const& host, Clock::time_point deadline) {
    std::string const own = host.At(Paths::Samba);
    ChildProcess::Task task;
    Append(task, {"testparm", "-s", "-v", FileExists(own) ? own.c_str() : "/dev/null"});
    std::string const text = '\n' + RunToSuccess(host, task, deadline);
    auto const value = [&](char const* name) {
        std::string found = AfterLineStart(text, std::string("\t") + name + " = ");
        if (found.empty()) {
            throw Failure(TSLAUTH_WINBIND_SEE_SYSTEM_LOG,
                          std::string("testparm does not print '") + name + "'");
        }
        return found;
    };
    SambaFolders folders;
    folders.secrets = value("private dir");
    folders.state = value("state directory");
    folders.cache = value("cache directory");
    folders.lock = value("lock directory");
    folders.pid = value("pid directory");
    std::string const security = value("security");
    std::string const role = value("server role");
    folders.isDomainController = role.find("domain controller") != std::string::npos;
    folders.isDomainMember = security == "ADS" || security == "DOMAIN" || role == "member server";
    return folders;
}

SambaTools::SambaTools(Host const& host) : _host(&host) {}

SambaTools::SambaTools(Host const& host, StagingFolder const& staging)
    : _host(&host), _configuration(staging.Configuration()),
      _kerberosConfiguration(staging.KerberosConfiguration()) {}

ChildProcess::Task SambaTools::Task() const {
    ChildProcess::Task task;
    Append(task, {"net"});
    if (!_configuration.empty()) {
        Append(task, {"-s", _configuration.c_str()});
    }
    // Tickets are the child's alone, and go with it.
    task.environment = {"KRB5CCNAME=MEMORY:tslauth"};
    if (!_kerberosConfiguration.empty()) {
        // Without a word in it of where a host belongs, Kerberos asks DNS, domain by domain
        // upwards.
        task.environment.push_back("KRB5_CONFIG=" + _kerberosConfiguration);
    }
    return task;
}

ControllerAnswer SambaTools::Lookup(std::string const& controller,
                                    Clock::time_point deadline) const {
    ChildProcess::Task task = Task();
    Append(task, {"ads", "lookup", "-S", controller.c_str()});
    return ReadControllerAnswer(RunToSuccess(*_host, task, deadline));
}

std::optional<std::chrono::seconds> SambaTools::ClockOffset(std::string const& controller,
                                                            Clock::time_point deadline) const {
    ChildProcess::Task task = Task();
    Append(task, {"ads", "info", "-S", controller.c_str()});
    return ReadServerTimeOffset(RunToSuccess(*_host, task, deadline));
}

void SambaTools::Join(std::string const& controller, Account const& account,
                      std::string const& unit, std::string const& dnsHostName,
                      Clock::time_point deadline) const {
    ChildProcess::Task task = Task();
    Append(task, {"ads", "join", "--no-dns-updates", "-S", controller.c_str()});
    account.AddTo(task);
    if (!dnsHostName.empty()) {
        task.arguments.push_back("dnshostname=" + dnsHostName);
    }
    if (!unit.empty()) {
        task.arguments.push_back("createcomputer=" + unit);
    }
    (void)RunToSuccess(*_host, task, deadline); // it prints what the caller knows
}

void SambaTools::JoinOffline(SecretFile const& blob, Clock::time_point deadline) const {
    ChildProcess::Task task = Task();
    Append(task, {"offlinejoin", "requestodj", "loadfile=/proc/self/fd/3"});
    task.secrets = {&blob};
    (void)RunToSuccess(*_host, task, deadline);
}

void SambaTools::WriteKeytab(std::string const& controller, std::string const& path,
                             Clock::time_point deadline) const {
    ChildProcess::Task task = Task();
    // Only here: an offline join crashes where it is to write a keytab.
    Append(task, {"ads", "keytab", "create", "-P", "-S", controller.c_str(),
                  "--option=kerberos method=secrets and keytab"});
    task.environment.push_back("KRB5_KTNAME=FILE:" + path);
    (void)RunToSuccess(*_host, task, deadline);
}

void SambaTools::RegisterInDNS(std::string const& controller, std::string const& name,
                               Clock::time_point deadline) const {
    ChildProcess::Task task = Task();
    Append(task, {"ads", "dns", "register", "-P", "-S", controller.c_str(), name.c_str()});
    (void)RunToSuccess(*_host, task, deadline);
}

void SambaTools::Leave(std::string const& controller, Account const* account,
                       Clock::time_point deadline) const {
    ChildProcess::Task task = Task();
    Append(task, {"ads", "leave", "-S", controller.c_str()});
    if (account) {
        account->AddTo(task);
    } else {
        Append(task, {"-P"});
    }
    (void)RunToSuccess(*_host, task, deadline);
}

void SambaTools::DeleteAccount(std::string const& controller, std::string const& computer,
                               Account const& account, Clock::time_point deadline) const {
    ChildProcess::Task task = Task();
    Append(task, {"ads", "user", "delete", "-S", controller.c_str()});
    account.AddTo(task);
    task.arguments.push_back(computer + '$');
    (void)RunToSuccess(*_host, task, deadline);
}

std::string SambaTools::ComputerAttribute(std::string const& controller,
                                          std::string const& computer, std::string const& attribute,
                                          Account const& account,
                                          Clock::time_point deadline) const {
    auto const entries = Search(controller, "(sAMAccountName=" + EscapedForFilter(computer) + "$)",
                                attribute, account, deadline);
    return entries.empty() ? std::string() : ValueIn(entries.front(), attribute);
}

bool SambaTools::Exists(std::string const& controller, std::string const& distinguishedName,
                        Account const& account, Clock::time_point deadline) const {
    return !Search(controller, "(distinguishedName=" + EscapedForFilter(distinguishedName) + ")",
                   "distinguishedName", account, deadline)
                .empty();
}

std::vector<DirectoryEntry> SambaTools::Search(std::string const& controller,
                                               std::string const& filter,
                                               std::string const& attribute, Account const& account,
                                               Clock::time_point deadline) const {
    ChildProcess::Task task = Task();
    Append(task, {"ads", "search", "-S", controller.c_str()});
    account.AddTo(task);
    task.arguments.push_back(filter);
    task.arguments.push_back(attribute);
    return ReadDirectoryEntries(RunToSuccess(*_host, task, deadline));
}

bool SambaTools::HasMachineSecret(Clock::time_point deadline) const {
    ChildProcess::Task task = Task();
    // Prints no password, unless it is asked to.
    Append(task, {"primarytrust", "dumpinfo"});
    ChildProcess::Outcome const outcome = _host->Run(task, deadline);
    if (outcome.timedOut) {
        ThrowTimedOut(task);
    }
    return outcome.code == 0;
}

} // namespace tessel::winbind
