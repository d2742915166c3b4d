// SPDX-License-Identifier: Apache-2.0
#pragma once

/// Every fixed path and key of the provider, in one table. The administrator's documents name them.
namespace tessel::winbind::Paths {

/// The administrator's; a join adds an include, and a part takes it out again.
inline constexpr char Samba[] = "/etc/samba/smb.conf";
inline constexpr char Kerberos[] = "/etc/krb5.conf";

/// The provider's own, there as long as the host is joined.
inline constexpr char OwnSamba[] = "/etc/samba/tslauth.conf";
inline constexpr char OwnKerberosFolder[] = "/etc/krb5.conf.d";
inline constexpr char OwnKerberos[] = "/etc/krb5.conf.d/tslauth.conf";

/// There while a join or a part changes the host: who finds it knows of one that did not end.
inline constexpr char OpenChange[] = "/etc/samba/tslauth.changing";

/// What stays over joins and parts: `PreferredControllersKey`, the names with blanks between them.
inline constexpr char State[] = "/etc/tessel/tslauth/winbind.conf";
inline constexpr char PreferredControllersKey[] = "preferred-domain-controllers";

/// In Samba's private folder: the machine's secrets, and the same file as it was before the join
/// (empty where there was none), which a part puts back.
inline constexpr char Secrets[] = "secrets.tdb";
inline constexpr char SecretsBeforeJoin[] = "tslauth-before-join.tdb";

/// The host's keytab, and the same file as it was before the join, likewise.
inline constexpr char Keytab[] = "/etc/krb5.keytab";
inline constexpr char KeytabBeforeJoin[] = "/etc/krb5.keytab.tslauth-before-join";

/// Where Samba logs, unless its configuration says otherwise.
inline constexpr char SambaLogs[] = "/var/log/samba";

/// Held by every operation that changes the host; goes with its holder.
inline constexpr char Lock[] = "/run/tslauth-winbind.lock";
/// A folder of each join and part, with six more characters. Its owner alone can look into it.
inline constexpr char Staging[] = "/run/tslauth-winbind.XXXXXX";

/// Names of files that are kept until it is sure that they are not needed again end so; they begin
/// like those of files that are on their way to their place.
inline constexpr char OriginalSuffix[] = ".original";

/// There while winbindd has been told that no controller can be reached; as old as that is.
inline constexpr char OffLine[] = "/run/tslauth-winbind.offline";

/// Tells the PAM module whether the domain lets a user log in; installed beside the provider.
inline constexpr char AccountProgram[] = "/usr/libexec/tslauth/winbind-account";
/// Samba's PAM module, in the folder of the provider's own.
inline constexpr char SambaPAMModule[] = "pam_winbind.so";

inline constexpr char SystemdRunning[] = "/run/systemd/system";

} // namespace tessel::winbind::Paths
