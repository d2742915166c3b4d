// SPDX-License-Identifier: Apache-2.0
#include "join/LocalMembership.h"

#include "Failure.h"
#include "Paths.h"
#include "host/FolderSnapshot.h"
#include "host/Host.h"
#include "host/StagingFolder.h"
#include "host/SystemLog.h"
#include "samba/SambaTools.h"
#include "text/KerberosConfiguration.h"
#include "text/SambaInclude.h"

#include <algorithm>
#include <base/WholeFile.h>
#include <cerrno>
#include <functional>
#include <memory>
#include <unistd.h>
#include <utility>
#include <vector>

namespace tessel::winbind::LocalMembership {

namespace {

constexpr auto daemonLimit = std::chrono::seconds(20);
constexpr auto trustLimit = std::chrono::seconds(30); // of a controller that others join as well
constexpr auto stopLimit = std::chrono::seconds(10);

/// What winbindd's databases take when it starts, and as much again: without room for them it
/// starts, and answers nothing but "internal error".
constexpr unsigned long long leastRoom = 8ULL * 1024 * 1024;

using Made = Membership::Made;

std::string FolderOf(std::string const& path) {
    return path.substr(0, path.rfind('/'));
}

std::string SecretsOf(SambaFolders const& folders) {
    return folders.secrets + '/' + Paths::Secrets;
}

std::string BeforeJoinOf(SambaFolders const& folders) {
    return folders.secrets + '/' + Paths::SecretsBeforeJoin;
}

std::vector<std::string> ChangedFiles(Host const& host, SambaFolders const& folders) {
    return {host.At(Paths::Samba),       host.At(Paths::OwnSamba), host.At(Paths::Kerberos),
            host.At(Paths::OwnKerberos), SecretsOf(folders),       host.At(Paths::Keytab)};
}

void ReplaceAndKeep(std::string const& path, std::string const& text) {
    HostChanges changes;
    changes.Replace(path, text, 0644);
    changes.Keep();
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

/// Keeps the file of before for a part, and puts one with the secrets of a join in its place.
/// @param before where it is kept, in a file system of both
void ReplaceSecrets(std::string const& path, std::string const& before, std::string const& secrets,
                    HostChanges& changes) {
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
void RestoreSecrets(std::string const& path, std::string const& before) {
    if (!FileExists(before)) {
        return;
    }
    if (ReadHostFile(before).value_or("").empty()) {
        RemoveHostFile(path);
        RemoveHostFile(before);
    } else if (::rename(before.c_str(), path.c_str()) != 0) {
        ThrowSystemFailure("cannot rename '" + before + "' to '" + path + "'", errno);
    } else {
        RemoveHostFile(before); // a second name of the same file stays where it is
    }
    base::SyncFolderOf(path);
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
void RemoveKerberos(Host const& host, std::set<Made> const& made) {
    std::string const path = host.At(Paths::Kerberos);
    auto const text = ReadHostFile(path);
    if (text && HasKerberosInclude(*text, Paths::OwnKerberos)) {
        std::string const without = WithoutKerberosInclude(*text, Paths::OwnKerberos);
        if (without.empty() && made.count(Made::KerberosFile) != 0) {
            RemoveHostFile(path);
        } else {
            ReplaceAndKeep(path, without);
        }
    }
    RemoveHostFile(host.At(Paths::OwnKerberos));
    if (made.count(Made::KerberosFolder) != 0) {
        RemoveEmptyFolder(host.At(Paths::OwnKerberosFolder));
    }
}

/// Takes the include out of smb.conf, with which the host is parted.
void TakeOutOfSamba(Host const& host, std::string const& text, std::set<Made> const& made,
                    HostChanges& changes) {
    std::string const without = WithoutSambaInclude(text, Paths::OwnSamba);
    if (without.empty() && made.count(Made::SambaFile) != 0) {
        changes.Remove(host.At(Paths::Samba));
    } else {
        changes.Replace(host.At(Paths::Samba), without, 0644);
    }
}

/// Stops winbindd and takes everything away that comes after smb.conf. The own file for Samba goes
/// last: it says what is left to do.
bool RemoveRest(Host const& host, SambaFolders const& folders, Membership const& membership) {
    std::set<Made> const& made = membership.made;
    auto const daemon = host.Winbindd(folders);
    bool const runs = daemon->Runs();
    bool const isWhole = RunAll({
        [&] { daemon->Stop(Clock::now() + stopLimit); },
        [&] { RestoreSecrets(SecretsOf(folders), BeforeJoinOf(folders)); },
        [&] { RestoreSecrets(host.At(Paths::Keytab), host.At(Paths::KeytabBeforeJoin)); },
        [&] { RemoveKerberos(host, made); },
        [&] { RemoveCaches(folders, membership.domain.workgroup); },
    });
    if (runs && made.count(Made::Daemon) == 0) {
        // It ran before the join. Whether it can serve a host without a domain is its own matter.
        (void)RunAll({[&] { daemon->Restart(Clock::now() + stopLimit); }});
    }
    return isWhole && RunAll({[&] {
               for (std::string const& path :
                    {host.At(Paths::OwnSamba), host.At(Paths::OpenChange)}) {
                   RemoveHostFile(path);
                   base::SyncFolderOf(path);
               }
           }});
}

/// What a join had made, or a part was to take away, that has left a mark; as far as it was told.
std::set<Made> MadeByOpenChange(Host const& host) {
    return Membership::ReadRecord(ReadHostFile(host.At(Paths::OpenChange)).value_or(""));
}

/// What an operation that was killed has left of a membership that smb.conf does not name.
void FinishParting(Host const& host, SambaFolders const& folders, Clock::time_point deadline) {
    auto const samba = ReadHostFile(host.At(Paths::Samba));
    bool const isNamed = samba && HasSambaInclude(*samba, Paths::OwnSamba);
    auto left = Membership::ReadOwnFile(host);
    bool const isMarked = FileExists(host.At(Paths::OpenChange));
    if (!isNamed && !left && !isMarked && !FileExists(host.At(Paths::OwnSamba)) &&
        !FileExists(host.At(Paths::OwnKerberos)) && !FileExists(BeforeJoinOf(folders))) {
        return;
    }
    if (!isNamed && !isMarked && folders.isDomainMember &&
        SambaTools(host).HasMachineSecret(deadline)) {
        LogWarning(std::string("'") + Paths::Samba +
                   "' was replaced, and the host joined, by other means");
        return; // the secrets are not the provider's any more
    }
    LogWarning("cleaning up after a join or a part that did not end");
    if (!left) {
        left = Membership{{}, MadeByOpenChange(host)};
    }
    if (isNamed) {
        HostChanges changes;
        TakeOutOfSamba(host, *samba, left->made, changes);
        changes.Keep();
    }
    if (!RemoveRest(host, folders, *left)) {
        throw Failure(TSLAUTH_WINBIND_HOST_CHANGED,
                      "what a join or a part has left cannot be removed");
    }
}

/// What a join is about to make, for the record.
std::set<Made> MissingOf(Host const& host, Daemon const& daemon) {
    std::set<Made> made;
    for (auto const& [path, what] : {std::pair(Paths::Samba, Made::SambaFile),
                                     {Paths::Kerberos, Made::KerberosFile},
                                     {Paths::OwnKerberosFolder, Made::KerberosFolder}}) {
        if (!FileExists(host.At(path))) {
            made.insert(what);
        }
    }
    if (!daemon.Runs()) {
        made.insert(Made::Daemon);
    }
    return made;
}

/// The configuration of a member, smb.conf last: with it the host is joined.
void WriteConfiguration(Host const& host, Domain const& domain, std::set<Made> const& made,
                        HostChanges& changes) {
    (void)changes.MakeFolder(host.At(Paths::OwnKerberosFolder), 0755);
    changes.Replace(
        host.At(Paths::OwnKerberos),
        KerberosDomainText({domain.samba.realm, domain.dnsName, {}, domain.samba.workgroup}), 0644);
    std::string const kerberos = host.At(Paths::Kerberos);
    changes.Replace(kerberos,
                    WithKerberosInclude(ReadHostFile(kerberos).value_or(""), Paths::OwnKerberos),
                    0644);
    std::string const samba = host.At(Paths::Samba);
    std::string const text = ReadHostFile(samba).value_or("");
    changes.Replace(host.At(Paths::OwnSamba),
                    Membership::Record(made) +
                        SambaDomainText(domain.samba, AdministratorSettings(text), domain.options),
                    0644);
    changes.Replace(samba, WithSambaInclude(text, Paths::OwnSamba), 0644);
}

/// Starts winbindd in its new domain.
void StartDaemon(std::shared_ptr<Daemon const> const& daemon, SambaFolders const& folders,
                 std::string const& logs, HostChanges& changes, Clock::time_point deadline) {
    (void)changes.MakeFolder(folders.pid, 0755); // lies in /run, and may not be there yet
    // Not before: what is new of the provider's own is taken back by its own steps.
    FolderSnapshot const snapshot(
        {folders.state, folders.secrets, folders.cache, folders.lock, folders.pid, logs});
    changes.OnUndo([daemon, snapshot] {
        daemon->Stop(Clock::now() + stopLimit);
        if (daemon->IsAlone()) { // what is new may be another server's otherwise
            snapshot.RemoveNewFiles();
        }
    });
    daemon->Restart(std::min(deadline, Clock::now() + daemonLimit));
    daemon->CheckTrust(std::min(deadline, Clock::now() + trustLimit));
}

} // namespace

void RequireRoom(Host const& host, SambaFolders const& folders) {
    for (std::string const& folder :
         {folders.secrets, folders.state, folders.cache, folders.lock,
          FolderOf(host.At(Paths::Samba)), FolderOf(host.At(Paths::Kerberos))}) {
        auto const free = host.FreeBytes(folder);
        if (free < leastRoom) {
            throw Failure(TSLAUTH_WINBIND_DISK_FULL,
                          "the file system of '" + folder + "' has only " +
                              std::to_string(free / 1024) + " KiB left, and winbindd needs " +
                              std::to_string(leastRoom / 1024));
        }
    }
}

void Establish(Host const& host, SambaFolders const& folders, Domain const& domain,
               Secrets const& secrets, HostChanges& changes, Clock::time_point deadline) {
    auto const daemon = host.Winbindd(folders);
    std::set<Made> const made = MissingOf(host, *daemon);
    if (made.count(Made::Daemon) == 0) {
        // In the end, with the files of before.
        changes.OnUndo([daemon] { daemon->Restart(Clock::now() + daemonLimit); });
    }
    (void)changes.MakeFolder(FolderOf(host.At(Paths::Samba)), 0755);
    changes.Mark(host.At(Paths::OpenChange), Membership::Record(made));
    (void)changes.MakeFolder(folders.state, 0755); // Samba's packages come with them
    (void)changes.MakeFolder(folders.secrets, 0700);
    ReplaceSecrets(SecretsOf(folders), BeforeJoinOf(folders), secrets.database, changes);
    if (!secrets.keytab.empty()) {
        ReplaceSecrets(host.At(Paths::Keytab), host.At(Paths::KeytabBeforeJoin), secrets.keytab,
                       changes);
    }
    WriteConfiguration(host, domain, made, changes);
    StartDaemon(daemon, folders, host.At(Paths::SambaLogs), changes, deadline);
}

void Dissolve(Host const& host, SambaFolders const& folders, Membership const& membership) {
    std::string const samba = host.At(Paths::Samba);
    {
        HostChanges changes;
        changes.Replace(host.At(Paths::OpenChange), Membership::Record(membership.made), 0600);
        if (!FileExists(BeforeJoinOf(folders))) {
            // Somebody has taken it away. The secret must not stay for want of it.
            changes.Replace(BeforeJoinOf(folders), "", 0600);
        }
        TakeOutOfSamba(host, ReadHostFile(samba).value_or(""), membership.made, changes);
        changes.Keep(); // the mark among them: it stays until all is done
    }
    if (!RemoveRest(host, folders, membership)) {
        throw Failure(TSLAUTH_WINBIND_HOST_CHANGED,
                      "the host is parted, and keeps what the log names");
    }
}

bool CleanUp(Host const& host, SambaFolders const& folders, Clock::time_point deadline) {
    StagingFolder::RemoveLeftOvers(host.At(Paths::Staging));
    std::vector<std::string> const files = ChangedFiles(host, folders);
    std::string const before = ReadHostFile(host.At(Paths::Samba)).value_or("");
    if (!Membership::Read(host)) {
        RestoreOriginals(files);
    }
    RemoveTemporaryFiles(files); // before a folder that one of them is in is to go
    // Again: the original of smb.conf may be that of a member.
    if (!Membership::Read(host)) {
        FinishParting(host, folders, deadline);
    }
    return ReadHostFile(host.At(Paths::Samba)).value_or("") != before;
}

bool IsHalf(Host const& host) {
    return FileExists(host.At(Paths::OpenChange));
}

std::string SecretsOfMember(SambaFolders const& folders) {
    return ReadHostFile(SecretsOf(folders)).value_or("");
}

std::string SecretsBeforeJoin(Host const& host, SambaFolders const& folders) {
    return ReadHostFile(IsHalf(host) ? BeforeJoinOf(folders) : SecretsOf(folders)).value_or("");
}

std::string KeytabBeforeJoin(Host const& host) {
    std::string const before = host.At(Paths::KeytabBeforeJoin);
    return ReadHostFile(IsHalf(host) && FileExists(before) ? before : host.At(Paths::Keytab))
        .value_or("");
}

} // namespace tessel::winbind::LocalMembership
