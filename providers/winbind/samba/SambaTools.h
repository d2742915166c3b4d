// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "host/ChildProcess.h"
#include "host/SambaFolders.h"
#include "samba/Account.h"
#include "samba/DirectorySearch.h"
#include "text/ControllerAnswer.h"

#include <chrono>
#include <optional>
#include <string>
#include <vector>

namespace tessel::winbind {

class StagingFolder;

class Host;

/// The folders and the role of a host, as Samba itself resolves them from the host's smb.conf, or
/// without it where there is none.
/// @throws Failure also where Samba cannot read its file
SambaFolders ReadSambaFolders(Host const& host, Clock::time_point deadline);

/// Samba's `net`, with the configuration of a staging folder or the host's own. Every call runs it
/// once, ends it at the deadline (`Failure` 10060), and throws a `Failure` with the code that its
/// text stands for. A value, for any number of threads.
class SambaTools {
public:
    /// With the host's own configuration.
    /// @param host which must outlive it
    explicit SambaTools(Host const& host);

    SambaTools(Host const& host, StagingFolder const& staging);

    /// What a controller says of itself; one datagram each way, and no account.
    ControllerAnswer Lookup(std::string const& controller, Clock::time_point deadline) const;

    /// How far the controller's clock is ahead; nothing where it does not say. No account.
    std::optional<std::chrono::seconds> ClockOffset(std::string const& controller,
                                                    Clock::time_point deadline) const;

    /// @param unit a distinguished name, or empty: where the domain puts new computers
    /// @param dnsHostName the host's full name; empty: the computer's name in the domain
    void Join(std::string const& controller, Account const& account, std::string const& unit,
              std::string const& dnsHostName, Clock::time_point deadline) const;

    /// Takes the membership from the text of an offline join. Asks nobody.
    void JoinOffline(SecretFile const& blob, Clock::time_point deadline) const;

    /// Adds the keys of the host's account to a keytab, which may not be there yet. They are those
    /// of the secrets, which the account must have been made with.
    void WriteKeytab(std::string const& controller, std::string const& path,
                     Clock::time_point deadline) const;

    /// Tells the domain's DNS the host's addresses, as the host's account.
    void RegisterInDNS(std::string const& controller, std::string const& name,
                       Clock::time_point deadline) const;

    /// Deletes the host's account and its secrets.
    /// @param account null: the host's own
    void Leave(std::string const& controller, Account const* account,
               Clock::time_point deadline) const;

    /// Deletes a computer's account, also where there is no secret of it.
    void DeleteAccount(std::string const& controller, std::string const& computer,
                       Account const& account, Clock::time_point deadline) const;

    /// The first value of an attribute of a computer; empty where it has none, or does not exist.
    std::string ComputerAttribute(std::string const& controller, std::string const& computer,
                                  std::string const& attribute, Account const& account,
                                  Clock::time_point deadline) const;

    /// Whether there is an object of this distinguished name.
    bool Exists(std::string const& controller, std::string const& distinguishedName,
                Account const& account, Clock::time_point deadline) const;

    /// Whether the secrets hold those of a domain's member. Asks nobody.
    bool HasMachineSecret(Clock::time_point deadline) const;

private:
    ChildProcess::Task Task() const;
    std::vector<DirectoryEntry> Search(std::string const& controller, std::string const& filter,
                                       std::string const& attribute, Account const& account,
                                       Clock::time_point deadline) const;

    Host const* _host;
    std::string _configuration; ///< empty: the host's, here and below
    std::string _kerberosConfiguration;
};

} // namespace tessel::winbind
