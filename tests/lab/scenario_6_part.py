# SPDX-License-Identifier: Apache-2.0
"""Hosts part and go back to local users, and every file is compared with what it was."""
import os
import re

from lab import LOCAL_PASSWORD, LogIn, PASSWORD, TREE, at_once, differences, expect, expect_equal

TITLE = "Parting, going back to \"None\", and what is left"

# Everything that a program may have written: /usr and /var are overlays whose upper folders lie
# below /run/node.
FOLDERS = ("/etc", "/run", "/home", "/var/lib/samba", "/var/cache/samba", "/var/log/samba")

# What differs from the original, by stage; a pattern stands for at least one path, and every path
# has to have its pattern.
JOIN = {
    "/etc/samba/smb.conf": "changed",
    "/etc/samba/tslauth.conf": "new",
    "/etc/krb5.conf": "new",
    "/etc/krb5.conf.d": "new",
    "/etc/krb5.conf.d/tslauth.conf": "new",
    "/var/lib/samba/private/secrets.tdb": "new",
    "/var/lib/samba/private/tslauth-before-join.tdb": "new",
    "/var/lib/samba/private/netlogon_creds_cli.tdb": "new",
    "/var/lib/samba/winbindd_cache.tdb": "new",
    "/var/cache/samba/netsamlogon_cache.tdb": "new",
}
ACTIVATION = {
    "/etc/pam.d/system-auth-generic": "changed",
    "/etc/nsswitch.conf": "changed",
    "/etc/tessel/tslauth/authentication.conf": "changed",
    # What tslauthctl has put into the files, so that it can take that out again.
    "/var/lib/tslauth/inserted": "new",
}
# What tslauthctl remembers of its changes.
HISTORY = "/var/lib/tslauth/history"
# The entry of the management address stays in /etc/hosts.
KEPT_BY_US = {
    "/var/lib/tslauth": "new",
    "/etc/hosts": "changed",
    "/run/tslauthctl.lock": "new",
}
# What Samba's programs keep: the numbers of users (so that a later join finds them again), local
# databases without a secret of the domain, sockets and logs.
KEPT_BY_SAMBA = {
    "/var/lib/samba/winbindd_idmap.tdb": "new",
    "/var/lib/samba/account_policy.tdb": "new",
    "/var/lib/samba/group_mapping.tdb": "new",
    "/var/lib/samba/private/passdb.tdb": "new",
    "/var/lib/samba/winbindd_privileged**": "new",
    "/run/samba/**": "new",
    "/var/log/samba/**": "new",
}

# An administrator's own files, which hold more than a domain; the policy and the switch are in the
# form in which the library writes them.
SMB_CONF = """# The file server of the workshop
[global]
\tserver string = workshop
\ttemplate shell = /bin/dash
   idmap config * : range = 3000000-3999999
   idmap config * : backend = tdb

[data]
\tpath = /srv/data ; and nothing else
\tread only = no
"""
KRB5_CONF = """[libdefaults]
\tdefault_realm = WORKSHOP.EXAMPLE

[realms]
\tWORKSHOP.EXAMPLE = {
\t\tkdc = 192.0.2.7
\t}"""


def snapshot(host):
    found = {}
    for path, state in host.snapshot(*FOLDERS).items():
        if path.startswith("/run/node"):
            path = path[len("/run/node"):]
            if not path.startswith(("/usr/", "/var/")):
                continue
        if path.startswith(HISTORY):
            continue
        found[path] = state
    return found


def matches(path, pattern):
    """In a pattern "*" stands for a name or part of one, and "**" for folders as well."""
    parts = re.split(r"(\*+)", pattern)
    expression = "".join({"*": "[^/]*", "**": ".*"}.get(part) or re.escape(part) for part in parts)
    return re.fullmatch(expression, path)


def expect_differences(lab, before, after, *expected):
    """Lists what differs, Samba's own files by their patterns, and compares it with the lists."""
    patterns = {pattern: kind for each in expected for pattern, kind in each.items()}
    seen, stray = {}, []
    for path, kind in differences(before, after).items():
        for pattern, kind_of_pattern in patterns.items():
            if matches(path, pattern) and kind == kind_of_pattern:
                seen.setdefault(pattern, []).append(path)
                break
        else:
            stray.append(f"{kind} {path}")
    for pattern, paths in sorted(seen.items()):
        number = f" ({len(paths)} files)" if "*" in pattern else ""
        lab.say(f"{patterns[pattern]:8} {pattern}{number}")
    missing = [f"{kind} {pattern}" for pattern, kind in patterns.items() if pattern not in seen]
    expect(not stray and not missing,
           "differs without a word: " + ", ".join(sorted(stray)) +
           "\nsaid to differ and does not: " + ", ".join(sorted(missing)))


def begin_log_ins(lab, when, host):
    """Only local users are let in."""
    with lab.step(f"{host.name}, {when}: getent passwd knows no CORP\\user1"):
        host.exits(2, "getent", "passwd", "CORP\\user1")
    root, lena = (LogIn(host, user, LOCAL_PASSWORD) for user in ("root", "lena"))
    stranger = LogIn(host, "CORP\\user1", PASSWORD)
    return [(f"{host.name}, {when}: root logs in", root.is_let_in),
            (f"{host.name}, {when}: lena logs in", lena.is_let_in),
            (f"{host.name}, {when}: CORP\\user1 is refused",
             lambda: stranger.is_refused("pamtester: User not known"))]


def finish_log_ins(lab, attempts):
    for text, outcome in attempts:
        with lab.step(text) as step:
            step.took(outcome())


def log_in_as_both(lab, host):
    for user in ("CORP\\user1", "OTHER\\user2"):
        with lab.step(f"{host.name}: {user} logs in") as step:
            step.took(LogIn(host, user, PASSWORD).is_let_in())


def knows_nothing(lab, host):
    with lab.step(f"{host.name}: winbindd has ended, and the host keeps no secret of the domain"):
        host.exits(1, "pgrep", "-x", "winbindd")
        files = host.shell("ls /var/lib/samba/private/*.tdb || true").out.split()
        databases = host.shell('for file; do tdbdump -- "$file"; done', *files)
        kept = "\n".join(line for line in databases.out.splitlines() if line.startswith("key"))
        expect("MACHINE" not in kept and "CORP" not in kept, kept)
    with lab.step(f"{host.name}: tslauthctl info says that it is not joined (exit code 10)"):
        host.exits(10, "tslauthctl", "info")


def part_with_account(lab, host):
    """A host as Debian leaves it."""
    original = snapshot(host)
    policy = host.read("/etc/pam.d/system-auth-generic")
    joined = {**KEPT_BY_SAMBA, **KEPT_BY_US, **JOIN}
    with lab.step(f"{host.name}: join, and what differs from the original:"):
        host.join()
        # Numbers of users, whose file winbindd makes when it is asked.
        for user in ("CORP\\user1", "OTHER\\user2"):
            host.ok("wbinfo", "--user-info", user)
        expect_differences(lab, original, snapshot(host), joined)
    with lab.step(f"{host.name}: activate, and what differs from the original:"):
        host.tslauthctl("activate", "Active Directory")
        expect_differences(lab, original, snapshot(host), joined, ACTIVATION)
    log_in_as_both(lab, host)
    with lab.step(f"{host.name}: part with a wrong password is refused, and the host is joined"):
        before = host.snapshot("/etc", "/var/lib/samba/private")
        host.exits(9, "tslauthctl", "part", "--user", "joiner1", "--password-stdin",
                   text="Not-the-Passw0rd\n")
        expect_equal(differences(before, host.snapshot("/etc", "/var/lib/samba/private")), {},
                     "what the refused part changed")
        expect(lab.dc1.account_of(host), "the account is gone")
        host.tslauthctl("info")
    with lab.step(f"{host.name}: part with an account, and what differs from the original:"):
        host.part()
        expect_differences(lab, original, snapshot(host), ACTIVATION, KEPT_BY_US,
                           KEPT_BY_SAMBA)
    with lab.step(f"{host.name}: the controller has deleted its account"):
        expect_equal(lab.dc1.account_of(host), None, "the account")
    knows_nothing(lab, host)
    attempts = begin_log_ins(lab, "parted", host)
    yield
    finish_log_ins(lab, attempts)
    with lab.step(f"{host.name}: activate \"None\", and what differs from the original:"):
        host.tslauthctl("activate", "None")
        expect_differences(lab, original, snapshot(host), KEPT_BY_US, KEPT_BY_SAMBA)
    with lab.step(f"{host.name}: the policy is what it was, byte for byte"):
        expect_equal(host.read("/etc/pam.d/system-auth-generic"), policy, "the policy")
    attempts = begin_log_ins(lab, "\"None\"", host)
    yield
    finish_log_ins(lab, attempts)
    with lab.step(f"{host.name}: it can join again, and part, and then differs no more:"):
        host.join()
        host.tslauthctl("info")
        host.part()
        expect_differences(lab, original, snapshot(host), KEPT_BY_US, KEPT_BY_SAMBA)
    yield


def part_without_account(lab, host):
    """A host whose administrator has settings of his own, and where the store is active first."""
    host.write("/etc/samba/smb.conf", SMB_CONF, "0640")
    host.write("/etc/krb5.conf", KRB5_CONF)
    host.tslauthctl("preferred-dcs", "set", "dc1.corp.example")
    host.tslauthctl("activate", "Active Directory")
    host.tslauthctl("activate", "None")
    original = snapshot(host)
    with lab.step(f"{host.name}, with settings of its administrator: activate, then join"):
        host.tslauthctl("activate", "Active Directory")
        host.join("corp.example", "--skip-hostname-check")
    log_in_as_both(lab, host)
    with lab.step(f"{host.name}: the administrator's settings hold"):
        for user in ("CORP\\user1", "OTHER\\user2"):
            expect_equal(host.ok("getent", "passwd", user).out.strip().split(":")[6], "/bin/dash",
                         f"the shell of {user}")
        expect(SMB_CONF.partition("[data]")[2] in host.read("/etc/samba/smb.conf"), "no [data]")
        number = int(host.ok("id", "-u", "OTHER\\user2").out)
        expect(3000000 <= number < 4000000, f"OTHER\\user2 has the number {number}")
    with lab.step(f"{host.name}: the library's PartDomain, without an account"):
        host.by_library("part")
    knows_nothing(lab, host)
    attempts = begin_log_ins(lab, "parted", host)
    yield
    finish_log_ins(lab, attempts)
    with lab.step(f"{host.name}: activate \"None\": every file of /etc is as it was"):
        host.tslauthctl("activate", "None")
        expect_differences(lab, original, snapshot(host), KEPT_BY_SAMBA)
    with lab.step(f"{host.name}: it still prefers dc1.corp.example"):
        expect_equal(host.tslauthctl("preferred-dcs").out, "dc1.corp.example\n", "the list")
    with lab.step(f"{host.name}: its account stands on the controller"):
        expect(lab.dc1.account_of(host), "the account is gone")
    attempts = begin_log_ins(lab, "\"None\"", host)
    yield
    finish_log_ins(lab, attempts)
    yield


def documented_as_left():
    """The paths of the table in the provider's README.md."""
    with open(os.path.join(TREE, "providers/winbind/README.md"), encoding="utf-8") as file:
        table = file.read().partition("What is left of a membership")[2].partition("\n\nOn ")[0]
    return sorted(re.findall(r"`(/[^`]+)`", table))


def play(lab):
    debian, workshop = lab.hosts(2)
    at_once(lambda host: host.make_local_users(), (debian, workshop))
    # By turns, so that who is refused on one host is not waited for.
    for _ in zip(part_with_account(lab, debian), part_without_account(lab, workshop)):
        pass
    with lab.step("providers/winbind/README.md says that these paths are left, and no other"):
        expect_equal(documented_as_left(), sorted(
            re.sub(r"/?\*+$", "", path) for path in (*KEPT_BY_US, *KEPT_BY_SAMBA)), "the table")
