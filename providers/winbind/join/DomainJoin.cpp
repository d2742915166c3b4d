// SPDX-License-Identifier: Apache-2.0
#include "join/DomainJoin.h"

#include "Failure.h"
#include "Paths.h"
#include "host/HostFile.h"
#include "host/Membership.h"
#include "host/OperationLock.h"
#include "host/PreferredControllers.h"
#include "host/SystemLog.h"
#include "join/LocalMembership.h"
#include "samba/DomainDiscovery.h"
#include "samba/SambaTools.h"
#include "samba/StagingFolder.h"
#include "text/DirectoryNames.h"
#include "tslauth_winbind_provider.h"
#include <base/AsciiText.h>

#include <algorithm>
#include <array>
#include <ctime>
#include <optional>
#include <strings.h>

namespace tessel::winbind::DomainJoin {

namespace {

using base::AsciiText::Upper;

/// Of the time for a join, what is kept for undoing it: winbindd is stopped and started again, each
/// of which may have to wait, and the account is deleted.
constexpr auto undoTime = std::chrono::seconds(55);
constexpr auto accountUndoTime = std::chrono::seconds(12);
constexpr auto answerLimit = std::chrono::seconds(3);
constexpr auto toolLimit = std::chrono::seconds(45);
/// How much earlier than this join an account must have been made to be somebody else's work.
constexpr auto clockTolerance = std::chrono::seconds(3);
constexpr std::size_t longestBlob = std::size_t(1024) * 1024;
constexpr std::size_t longestNetBIOSName = 15;

Clock::time_point WorkDeadline() {
    return Clock::now() + std::chrono::seconds(TSLAUTH_WINBIND_JOIN_SECONDS) - undoTime;
}

/// What the tools need to know before a controller has told the rest.
SambaDomain Guess(std::string const& domain, std::string const& computer) {
    return {Upper(domain),
            Upper(domain.substr(0, domain.find('.')).substr(0, longestNetBIOSName)),
            computer,
            {}};
}

/// A join could not be finished without it.
void RequireWinbindd() {
    if (ChildProcess::Find("winbindd").empty()) {
        throw Failure(TSLAUTH_PROVIDER_SERVICE_DOES_NOT_EXIST,
                      "the program 'winbindd' is not installed");
    }
}

void RequireNotJoined(Clock::time_point deadline) {
    if (auto const membership = Membership::Read()) {
        throw Failure(TSLAUTH_PROVIDER_SETUP_ALREADY_JOINED,
                      "this host is joined to '" + membership->DNSName() + "'");
    }
    SambaFolders const folders = SambaFolders::Read(deadline);
    if (folders.isDomainController) {
        throw Failure(TSLAUTH_PROVIDER_SETUP_ALREADY_JOINED, "this host is a domain controller");
    }
    // An administrator may have written the settings of a member and never joined.
    if (folders.isDomainMember && SambaTools().HasMachineSecret(deadline)) {
        throw Failure(TSLAUTH_PROVIDER_SETUP_ALREADY_JOINED,
                      std::string("this host is joined by other means; '") + Paths::Samba +
                          "' says to which domain");
    }
}

/// As a directory writes it, so that texts compare as times do.
std::string GeneralizedTime(std::chrono::system_clock::time_point time) {
    std::time_t const seconds = std::chrono::system_clock::to_time_t(time);
    std::tm parts = {};
    std::array<char, 32> text = {};
    (void)::gmtime_r(&seconds, &parts); // fails for years that no clock shows
    (void)std::strftime(text.data(), text.size(), "%Y%m%d%H%M%S", &parts);
    return text.data();
}

/// Whether `net` may fail with this after the controller has made the account. What it says of
/// names, rights and passwords comes before.
bool MayComeFromTheMiddle(ActiveDirectoryClientErrorCode code) {
    return code == SeeSystemLog || code == TSLAUTH_PROVIDER_TIMED_OUT ||
           code == TSLAUTH_PROVIDER_NO_LOGON_SERVERS || code == TSLAUTH_PROVIDER_NO_NETWORK ||
           code == TSLAUTH_PROVIDER_CONNECTION_INVALID ||
           code == TSLAUTH_PROVIDER_CONNECTION_REFUSED;
}

/// A membership in the making, with what its undoing needs.
class Join {
public:
    Join(std::string domain, std::string computer)
        : _deadline(WorkDeadline()), _domain(std::move(domain)), _computer(std::move(computer)),
          _lock(_deadline) {
        RequireWinbindd();
        LocalMembership::CleanUp(_deadline);
        LocalMembership::FinishOpenChange(_deadline);
        RequireNotJoined(_deadline);
        _staging.emplace();
        _staging->Configure(Guess(_domain, _computer), _domain, {});
        _tools = SambaTools(*_staging);
    }

    /// @param first asked before the preferred controllers; may be empty
    void FindController(std::string const& first) {
        std::vector<std::string> preferred = PreferredControllers(Paths::State).Read();
        if (!first.empty()) {
            preferred.insert(preferred.begin(), first);
        }
        _controller = DomainDiscovery::FindController(_tools, _domain, preferred, _deadline);
        DomainDiscovery::CheckHostName(_computer, _controller, _domain);
        auto const ahead = DomainDiscovery::CheckClock(_tools, _controller.controller, _deadline);
        _begin = GeneralizedTime(std::chrono::system_clock::now() + ahead - clockTolerance);
        _staging->Configure({_controller.Realm(), _controller.netBIOSDomain, _computer, {}},
                            _domain, {_controller.controller});
        // So that what others keep there comes along.
        SambaFolders const folders = SambaFolders::Read(_deadline);
        if (auto const secrets = ReadHostFile(folders.secrets + '/' + Paths::Secrets)) {
            _staging->SetSecrets(*secrets);
        }
    }

    void MakeSecrets(Account const& account, std::string const& unit) {
        try {
            _tools.Join(_controller.controller, account, unit, ToolDeadline());
        } catch (Failure const& e) {
            if (MayComeFromTheMiddle(e.Code())) {
                ThrowInterrupted(e, account);
            }
            throw;
        }
    }

    void MakeSecrets(SecretFile const& blob) {
        _tools.JoinOffline(blob, ToolDeadline());
    }

    /// @param controllers for the host's configuration
    /// @param account who can undo the join; null: the account was not made by it
    void Finish(std::vector<std::string> const& controllers, Account const* account) {
        HostChanges changes;
        try {
            std::string const secrets = _staging->Secrets();
            if (secrets.empty()) {
                throw Failure(SeeSystemLog, "the join has made no secrets");
            }
            LocalMembership::Establish(
                {{_controller.Realm(), _controller.netBIOSDomain, _computer, controllers}, _domain},
                secrets, changes, _deadline);
        } catch (Failure const& e) {
            bool const isWhole = changes.Undo();
            std::string text =
                "'" + _controller.controller +
                "' accepted the join, and it could not be finished here: " + e.what();
            std::string left;
            if (account) {
                left = LeftInDirectory(*account);
                text += left.empty() ? "; the account was deleted again" : "; " + left;
            } else {
                // Whoever made the account knows of it, and this join has changed nothing of it.
                text += "; the account that was made for it stays in the directory";
            }
            if (!isWhole) {
                text += "; the host is not as it was";
            }
            throw Failure(isWhole && left.empty() ? e.Code() : HalfDone, text);
        }
        changes.Keep();
    }

    /// An account that exists already stays where it is; whoever asked for a unit should know.
    void TellOfUnit(std::string const& unit, Account const& account) {
        try {
            std::string const name = _tools.ComputerAttribute(
                _controller.controller, _computer, "distinguishedName", account, ToolDeadline());
            std::string const parent = name.substr(std::min(name.size(), name.find(',') + 1));
            if (::strcasecmp(parent.c_str(), unit.c_str()) != 0) {
                LogWarning("the account existed already, and stays at '" + name + "'");
            }
        } catch (Failure const& e) {
            LogWarning(std::string("where the account is could not be found out: ") + e.what());
        }
    }

private:
    bool Answers() const {
        try {
            (void)_tools.Lookup(_controller.controller, Clock::now() + answerLimit);
            return true;
        } catch (Failure const&) {
            return false;
        }
    }

    Clock::time_point ToolDeadline() const {
        return std::min(_deadline, Clock::now() + toolLimit);
    }

    /// The controller fell silent, or `net` failed for a reason without a name: it may have made the
    /// account by then.
    [[noreturn]] void ThrowInterrupted(Failure const& failure, Account const& account) {
        if (!Answers()) {
            throw Failure(TSLAUTH_PROVIDER_NO_LOGON_SERVERS,
                          "'" + _controller.controller +
                              "' has fallen silent, and may have made the account '" + _computer +
                              "$': " + failure.what());
        }
        std::string const left = LeftInDirectory(account);
        if (!left.empty()) {
            throw Failure(HalfDone, left + ": " + failure.what());
        }
        throw Failure(failure);
    }

    /// Deletes the account that this join has made.
    /// @return what stays there, or empty
    std::string LeftInDirectory(Account const& account) {
        std::string const name = "the account '" + _computer + "$'";
        auto const deadline = Clock::now() + accountUndoTime;
        try {
            std::string const made = _tools.ComputerAttribute(_controller.controller, _computer,
                                                              "whenCreated", account, deadline);
            if (made.empty()) {
                return {}; // there is none
            }
            if (made < _begin) {
                return name + " was there before, and stays, with another password";
            }
            _tools.Leave(_controller.controller, &account, deadline);
            return {};
        } catch (Failure const& e) {
            return name + " could not be deleted: " + e.what();
        }
    }

    Clock::time_point const _deadline;
    std::string const _domain;
    std::string const _computer;
    OperationLock const _lock;
    std::optional<StagingFolder> _staging; ///< made after those of before are removed
    SambaTools _tools;
    ControllerAnswer _controller;
    std::string _begin;
};

void CheckBlob(std::string_view blob) {
    static constexpr std::string_view allowed = "ABCDEFGHIJKLMNOPQRSTUVWXYZ"
                                                "abcdefghijklmnopqrstuvwxyz"
                                                "0123456789+/=\r\n";
    if (blob.empty() || blob.size() > longestBlob ||
        blob.find_first_not_of(allowed) != std::string_view::npos) {
        throw Failure(TSLAUTH_PROVIDER_INVALID_PARAMETER,
                      "the machine account's first result is no text of an offline join");
    }
}

} // namespace

void WithCredentials(std::string const& domain, std::string const& unit,
                     ActiveDirectoryClientCredentials const& credentials) {
    std::string const name = DomainName(domain);
    std::string const place =
        unit.empty() ? unit : ReadOrganisationalUnit(unit, name).distinguishedName;
    std::string const computer = HostComputerName();
    Account const account(credentials);
    Join join(name, computer);
    join.FindController("");
    join.MakeSecrets(account, place);
    join.Finish(PreferredControllers(Paths::State).Read(), &account);
    if (!place.empty()) {
        join.TellOfUnit(place, account);
    }
}

void WithMachineAccount(ActiveDirectoryClientDomainInformation const& information,
                        ActiveDirectoryClientMachineAccount const& account) {
    std::string const name = DomainName(information.dnsDomainName);
    std::string const computer = HostComputerName();
    if (ComputerName(account.accountName) != computer) {
        throw Failure(TSLAUTH_PROVIDER_INVALID_COMPUTER_NAME,
                      "the machine account is for '" + std::string(account.accountName) +
                          "', and this host is '" + computer + "'");
    }
    CheckBlob(account.firstResult);
    std::string const controller = account.secondResult;
    if (!controller.empty() && !IsControllerName(controller)) {
        throw Failure(TSLAUTH_PROVIDER_INVALID_PARAMETER,
                      "the machine account's second result is no controller's name");
    }
    SecretFile const blob({account.firstResult});
    Join join(name, computer);
    join.FindController(controller);
    join.MakeSecrets(blob);
    std::vector<std::string> controllers = PreferredControllers(Paths::State).Read();
    if (controllers.empty() && !controller.empty()) {
        // The others may not have heard of the account yet.
        controllers.push_back(controller);
    }
    join.Finish(controllers, nullptr);
}

} // namespace tessel::winbind::DomainJoin
