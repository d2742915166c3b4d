// SPDX-License-Identifier: Apache-2.0
#include "join/LocalMembership.h"

#include "Failure.h"
#include "Paths.h"
#include "host/FolderSnapshot.h"
#include "host/SystemLog.h"
#include "samba/StagingFolder.h"
#include "samba/WinbindDaemon.h"
#include "text/KerberosConfiguration.h"
#include "text/SambaInclude.h"

#include <algorithm>
#include <cerrno>
#include <functional>
#include <unistd.h>
#include <vector>

namespace tessel::winbind::LocalMembership {

namespace {

constexpr auto daemonLimit = std::chrono::seconds(20);
constexpr auto trustLimit = std::chrono::seconds(30); // of a controller that others join as well
constexpr auto stopLimit = std::chrono::seconds(10);

using Made = Membership::Made;

std::string FolderOf(char const* path) {
    std::string const text = path;
    return text.substr(0, text.rfind('/'));
}

std::string SecretsOf(SambaFolders const& folders) {
    return folders.secrets + '/' + Paths::Secrets;
}

std::string BeforeJoinOf(SambaFolders const& folders) {
    return folders.secrets + '/' + Paths::SecretsBeforeJoin;
}

std::vector<std::string> ChangedFiles(SambaFolders const& folders) {
    return {Paths::Samba, Paths::OwnSamba, Paths::Kerberos, Paths::OwnKerberos, SecretsOf(folders)};
}

/// Settings of the administrator's that the own file must respect.
SambaSettings AdministratorSettings(std::string const& text) {
    SambaSettings settings(text);
    // A copy: reading one file adds what that one includes.
    auto const includes = settings.Includes();
    for (std::string const& path : includes) {
        if (path == Paths::OwnSamba) {
            continue;
        }
        if (auto const included = ReadHostFile(path)) { // a name with macros is nobody's
            settings.Read(*included);
        }
    }
    return settings;
}

/// Keeps the secrets of before for a part, and puts the new ones in their place.
void ReplaceSecrets(SambaFolders const& folders, std::string const& secrets, HostChanges& changes) {
    std::string const path = SecretsOf(folders);
    std::string const before = BeforeJoinOf(folders);
    (void)changes.MakeFolder(folders.state, 0755); // Samba's packages come with them
    (void)changes.MakeFolder(folders.secrets, 0700);
    RemoveHostFile(before);
    changes.OnUndo([before] { RemoveHostFile(before); });
    if (!FileExists(path)) {
        changes.Replace(before, "", 0600);
    } else if (::link(path.c_str(), before.c_str()) != 0) {
        ThrowSystemFailure("cannot set '" + path + "' aside", errno);
    }
    changes.Replace(path, secrets, 0600);
}

/// The reverse, for a part: of the secret of the host's account, nothing stays.
void RestoreSecrets(SambaFolders const& folders) {
    std::string const path = SecretsOf(folders);
    std::string const before = BeforeJoinOf(folders);
    if (ReadHostFile(before).value_or("").empty()) {
        RemoveHostFile(path);
        RemoveHostFile(before);
    } else if (::rename(before.c_str(), path.c_str()) != 0) {
        ThrowSystemFailure("cannot rename '" + before + "' to '" + path + "'", errno);
    } else {
        RemoveHostFile(before); // a second name of the same file stays where it is
    }
    SyncFolderOf(path);
}

/// What winbindd and `net` know of the domain, and can find out again.
void RemoveCaches(SambaFolders const& folders, std::string const& workgroup) {
    for (std::string const& file :
         {folders.cache + "/winbindd_cache.tdb", folders.state + "/winbindd_cache.tdb",
          folders.cache + "/netsamlogon_cache.tdb", folders.state + "/netsamlogon_cache.tdb",
          folders.cache + "/gencache.tdb", folders.lock + "/gencache.tdb",
          folders.secrets + "/netlogon_creds_cli.tdb",
          folders.lock + "/smb_krb5/krb5.conf." + workgroup}) {
        RemoveHostFile(file);
    }
}

/// Runs steps that do not depend on each other.
bool RunAll(std::vector<std::function<void()>> const& steps) {
    bool whole = true;
    for (auto const& step : steps) {
        try {
            step();
        } catch (std::exception const& e) {
            whole = false;
            LogWarning(std::string("parting goes on without a step: ") + e.what());
        }
    }
    return whole;
}

/// Takes the include out of krb5.conf, before the file that it names goes.
void RemoveKerberos(bool fileIsMade, bool folderIsMade) {
    auto const text = ReadHostFile(Paths::Kerberos);
    if (text && HasKerberosInclude(*text, Paths::OwnKerberos)) {
        std::string const without = WithoutKerberosInclude(*text, Paths::OwnKerberos);
        if (without.empty() && fileIsMade) {
            RemoveHostFile(Paths::Kerberos);
        } else {
            HostChanges changes;
            changes.Replace(Paths::Kerberos, without, 0644);
            changes.Keep();
        }
    }
    RemoveHostFile(Paths::OwnKerberos);
    if (folderIsMade) {
        (void)::rmdir(Paths::OwnKerberosFolder); // stays where others use it
    }
}

/// Stops winbindd and takes everything away that comes after smb.conf. The own file for Samba goes
/// last: it says what is left to do.
bool RemoveRest(SambaFolders const& folders, Membership const& membership) {
    std::set<Made> const& made = membership.made;
    WinbindDaemon const daemon(folders);
    bool const runs = daemon.Runs();
    bool const isWhole = RunAll({
        [&] { daemon.Stop(Clock::now() + stopLimit); },
        [&] {
            if (FileExists(BeforeJoinOf(folders))) {
                RestoreSecrets(folders);
            }
        },
        [&] {
            RemoveKerberos(made.count(Made::KerberosFile) != 0,
                           made.count(Made::KerberosFolder) != 0);
        },
        [&] { RemoveCaches(folders, membership.domain.workgroup); },
    });
    if (runs && made.count(Made::Daemon) == 0) {
        // It ran before the join. Whether it can serve a host without a domain is its own matter.
        (void)RunAll({[&] { daemon.Restart(Clock::now() + stopLimit); }});
    }
    return isWhole && RunAll({[] { RemoveHostFile(Paths::OwnSamba); },
                              [] { RemoveHostFile(Paths::OpenChange); }});
}

/// What an operation that was killed has left of a membership that smb.conf does not name.
void FinishParting(SambaFolders const& folders, Clock::time_point deadline) {
    auto const samba = ReadHostFile(Paths::Samba);
    bool const isNamed = samba && HasSambaInclude(*samba, Paths::OwnSamba);
    auto const left = Membership::ReadOwnFile();
    if (!isNamed && !left && !FileExists(Paths::OwnSamba) && !FileExists(Paths::OwnKerberos) &&
        !FileExists(BeforeJoinOf(folders))) {
        return;
    }
    if (!isNamed && !FileExists(Paths::OpenChange) && folders.isDomainMember &&
        SambaTools().HasMachineSecret(deadline)) {
        LogWarning(std::string("'") + Paths::Samba +
                   "' was replaced, and the host joined, by other means");
        return; // the secrets are not the provider's any more
    }
    LogWarning("cleaning up after a join or a part that did not end");
    if (isNamed) {
        HostChanges changes;
        changes.Replace(Paths::Samba, WithoutSambaInclude(*samba, Paths::OwnSamba), 0644);
        changes.Keep();
    }
    // A join that was killed early has left no record of what it made.
    Membership const guess = {{}, {Made::KerberosFile, Made::KerberosFolder}};
    if (!RemoveRest(folders, left ? *left : guess)) {
        throw Failure(SeeSystemLog, "what a join or a part has left cannot be removed");
    }
}

} // namespace

void Establish(Domain const& domain, std::string const& secrets, HostChanges& changes,
               Clock::time_point deadline) {
    SambaFolders const folders = SambaFolders::Read(deadline);
    WinbindDaemon const daemon(folders);
    bool const daemonRan = daemon.Runs();
    std::set<Made> made;
    if (daemonRan) {
        // In the end, with the files of before.
        changes.OnUndo([daemon] { daemon.Restart(Clock::now() + daemonLimit); });
    } else {
        made.insert(Made::Daemon);
    }
    (void)changes.MakeFolder(FolderOf(Paths::Samba), 0755);
    changes.Mark(Paths::OpenChange);
    ReplaceSecrets(folders, secrets, changes);

    if (changes.MakeFolder(Paths::OwnKerberosFolder, 0755)) {
        made.insert(Made::KerberosFolder);
    }
    changes.Replace(Paths::OwnKerberos, KerberosDomainText({domain.samba.realm, domain.dnsName}),
                    0644);
    auto const kerberos = ReadHostFile(Paths::Kerberos);
    if (!kerberos) {
        made.insert(Made::KerberosFile);
    }
    changes.Replace(Paths::Kerberos, WithKerberosInclude(kerberos.value_or(""), Paths::OwnKerberos),
                    0644);
    auto const samba = ReadHostFile(Paths::Samba);
    if (!samba) {
        made.insert(Made::SambaFile);
    }
    changes.Replace(Paths::OwnSamba,
                    Membership::Record(made) +
                        SambaDomainText(domain.samba, AdministratorSettings(samba.value_or(""))),
                    0644);
    changes.Replace(Paths::Samba, WithSambaInclude(samba.value_or(""), Paths::OwnSamba), 0644);

    (void)changes.MakeFolder(folders.pid, 0755); // lies in /run, and may not be there yet
    // Not before: what is new of the provider's own is taken back by its own steps.
    FolderSnapshot const snapshot({folders.state, folders.secrets, folders.cache, folders.lock,
                                   folders.pid, Paths::SambaLogs});
    changes.OnUndo([daemon, snapshot] {
        daemon.Stop(Clock::now() + stopLimit);
        if (daemon.IsAlone()) { // what is new may be another server's otherwise
            snapshot.RemoveNewFiles();
        }
    });
    daemon.Restart(std::min(deadline, Clock::now() + daemonLimit));
    WinbindDaemon::CheckTrust(std::min(deadline, Clock::now() + trustLimit));
}

void Dissolve(Membership const& membership, Clock::time_point deadline) {
    SambaFolders const folders = SambaFolders::Read(deadline);
    {
        HostChanges mark;
        mark.Replace(Paths::OpenChange, "", 0600);
        mark.Keep(); // it stays until all is done
    }
    {
        HostChanges changes;
        if (!FileExists(BeforeJoinOf(folders))) {
            // Somebody has taken it away. The secret must not stay for want of it.
            changes.Replace(BeforeJoinOf(folders), "", 0600);
        }
        std::string const without =
            WithoutSambaInclude(ReadHostFile(Paths::Samba).value_or(""), Paths::OwnSamba);
        if (without.empty() && membership.made.count(Made::SambaFile) != 0) {
            changes.Remove(Paths::Samba);
        } else {
            changes.Replace(Paths::Samba, without, 0644);
        }
        changes.Keep();
    }
    if (!RemoveRest(folders, membership)) {
        throw Failure(SeeSystemLog, "the host is parted, and keeps what the log names");
    }
}

void CleanUp(Clock::time_point deadline) {
    StagingFolder::RemoveLeftOvers();
    SambaFolders const folders = SambaFolders::Read(deadline);
    std::vector<std::string> const files = ChangedFiles(folders);
    if (!Membership::Read()) {
        RestoreOriginals(files);
    }
    // Again: the original of smb.conf may be that of a member.
    if (!Membership::Read()) {
        FinishParting(folders, deadline);
        RemoveHostFile(Paths::OpenChange);
    }
    RemoveTemporaryFiles(files);
}

void FinishOpenChange(Clock::time_point deadline) {
    if (!FileExists(Paths::OpenChange)) {
        return;
    }
    if (auto const membership = Membership::Read()) {
        LogWarning(
            "parting from a domain that a join or a part which did not end has left in half; "
            "an account that is there stays in the directory");
        Dissolve(*membership, deadline);
    }
}

} // namespace tessel::winbind::LocalMembership
