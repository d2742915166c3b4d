# SPDX-License-Identifier: Apache-2.0
"""Hosts join with credentials, and users log in through what the library wrote."""
import json

from lab import LOCAL_PASSWORD, LogIn, PASSWORD, Story, at_once, expect, expect_equal

TITLE = "Joining with credentials, and logging in"

COMPUTERS = "CN=Computers,DC=corp,DC=example"
LINUX = "OU=Linux,OU=Servers,DC=corp,DC=example"
NETWORK_FILES = ("/etc/hosts", "/etc/resolv.conf")
# What winbind may add to the log-in of a local user, in seconds. libpam itself takes some
# milliseconds, and a question that waits for the network takes seconds.
LOCAL_SLACK = 0.1

# What a shell, smb.conf or another encoding than UTF-8 would make something else of.
ODD_PASSWORD = """ Aä"'#=%;$(x)\\1 """

# User, password, what is shown, and what the user is told where the answer is no.
NO = "pamtester: Authentication failure"
UNKNOWN = "pamtester: User not known to the underlying authentication module"
LOCAL_USERS = (
    ("root", LOCAL_PASSWORD, "logs in", None),
    ("root", PASSWORD, "is refused with a wrong password", NO),
    ("lena", LOCAL_PASSWORD, "logs in", None),
    ("lena", PASSWORD, "is refused with a wrong password", NO),
)
DOMAIN_USERS = (
    ("CORP\\user1", PASSWORD, "logs in", None),
    ("CORP\\user1", "Not-the-Passw0rd", "is refused with a wrong password", NO),
    ("CORP\\user1", LOCAL_PASSWORD, "is refused with the password of root and lena", NO),
    ("user1@corp.example", PASSWORD, "logs in", None),
    ("OTHER\\user2", PASSWORD, "of the trusted domain logs in", None),
    ("user2@other.example", PASSWORD, "of the trusted domain logs in", None),
    ("OTHER\\user2", "Not-the-Passw0rd", "is refused with a wrong password", NO),
    ("CORP\\disabled1", PASSWORD, "whose account is disabled is refused",
     "Your account is disabled"),
    ("CORP\\expired1", PASSWORD, "whose account has expired is refused",
     "Your account has expired"),
    ("CORP\\mustchange1", PASSWORD, "who must change the password first is refused",
     "new one required"),
    ("CORP\\nobody", PASSWORD, "whom nobody knows is refused", UNKNOWN),
)
STRANGERS = (
    ("CORP\\user1", PASSWORD, "is refused", UNKNOWN),
    ("OTHER\\user2", PASSWORD, "is refused", UNKNOWN),
)


def begin(host, users):
    """All of them log in at the same time."""
    return [(host, user, LogIn(host, user[0], user[1])) for user in users]


def finish(lab, when, attempts):
    for host, (name, _, text, told), attempt in attempts:
        with lab.step(f"{when}, {host.name}: {name} {text}") as step:
            step.took(attempt.is_let_in() if told is None else attempt.is_refused(told))


def unknown(host, user):
    """getent's code for a key that no service has."""
    host.exits(2, "getent", "passwd", user)


def fastest_log_in(host):
    return min(LogIn(host, "lena", LOCAL_PASSWORD).is_let_in() for _ in range(5))


def preview(lab, host, target, *lines):
    """What a dry run tells in joiner1's name, of an account that stays as it was."""
    host.exits(7, "tslauthctl", "join", "corp.example", "--dry-run")
    before = lab.dc1.account_of(host)
    told = host.exits(7, "tslauthctl", "join", target, "--dry-run", "--user", "joiner1",
                      "--password-stdin", text=PASSWORD + "\n").out
    for line in ("controller: dc1.corp.example", f"computer: {host.name.upper()}", *lines):
        expect(line + "\n" in told, f"no '{line}' in\n{told}")
    expect_equal(lab.dc1.account_of(host), before, "the account")


def stands_in(lab, host, folder):
    account = lab.dc1.account_of(host)
    expect(account, f"the controller has no account {host.name}$")
    expect_equal(account["dn"], f"CN={host.name.upper()},{folder}", "the account's place")


def odd_user(host):
    """Of this host's own, since an account is there once."""
    return f"odd-{host.name}"


def make_odd_user(lab, host):
    lab.dc1.samba_tool("user", "create", odd_user(host), ODD_PASSWORD)
    lab.dc1.samba_tool("group", "addmembers", "Domain Admins", odd_user(host))


def join_story(lab, host, text, join, folder, *before):
    """A host that joins, and what the controller then says of it."""
    return Story(
        *before,
        (f"{host.name}: {text}", join),
        (f"{host.name}: on the controller its account stands in {folder}",
         lambda: stands_in(lab, host, folder)),
        (f"{host.name}: the controller takes its secret (net ads testjoin)",
         lambda: host.ok("net", "ads", "testjoin")))


def joins(lab, path, short, long):
    """Three hosts whose accounts go to a unit, at the same time."""
    before = {name: long.read(name) for name in NETWORK_FILES}
    for story in (
            join_story(lab, path, "the library's JoinDomain, with the unit Servers/Linux",
                       lambda: path.join_by_library("corp.example/Servers/Linux"), LINUX),
            join_story(lab, short, "the library's JoinDomain, with the unit OU=Linux,OU=Servers",
                       lambda: short.join_by_library("corp.example/OU=Linux,OU=Servers",
                                                     "skip-hostname-check"), LINUX),
            join_story(lab, long, "tslauthctl join --skip-hostname-check, with the unit's full DN",
                       lambda: long.join(f"corp.example/{LINUX}", "--skip-hostname-check",
                                         user=odd_user(long), password=ODD_PASSWORD), LINUX,
                       (f"dc1: {odd_user(long)}, who joins it, has the password {ODD_PASSWORD!r}",
                        lambda: make_odd_user(lab, long)))):
        lab.tell(story)
    with lab.step(f"{long.name}: {' and '.join(NETWORK_FILES)} are as they were"):
        for name, text in before.items():
            expect_equal(long.read(name), text, name)


def plain_join(lab, host):
    with lab.step(f"{host.name}: a dry run tells of controller, clock, name, unit and account"):
        preview(lab, host, "corp.example/Servers", "unit: OU=Servers,DC=corp,DC=example",
                "account: there is none of this name yet", "host: can be joined")
        preview(lab, host, "corp.example/Attic",
                "unit: 'OU=Attic,DC=corp,DC=example' is not there; the join would be refused")
    lab.tell(join_story(lab, host, "tslauthctl join corp.example", host.join, COMPUTERS))
    with lab.step(f"{host.name}: its address has the name {host.name}.corp.example"):
        address = host.ok("hostname", "-I").out.strip()
        expect_equal(host.ok("getent", "hosts", address).out.split()[1:],
                     [f"{host.name}.corp.example", host.name], f"the names of {address}")


def is_activated(host):
    policy = host.read("/etc/pam.d/system-auth-generic")
    for facility in ("auth", "account"):
        expect(f"{facility}\tsufficient\t/lib/security/$ISA/pam_tslauth_winbind.so" in policy,
               policy)
    switch = host.read("/etc/nsswitch.conf")
    for database in ("passwd", "group", "shadow"):
        expect(f"{database}: tslauth_winbind files\n" in switch, switch)
    # No service of these hosts includes the policy, and status says so.
    status = json.loads(host.run("tslauthctl", "--json", "status").out)
    expect_equal([file["state"] for file in status["files"]], ["in-step", "in-step"], "the files")
    expect_equal({finding["word"] for finding in status["findings"]}, {"services-not-following"},
                 "what status finds")


def resolves(controller, host, domain, user):
    """A user of CORP has a number that is made of the last part of his identifier, so that all
    hosts agree on it; one of another domain gets a number of this host."""
    account = controller.directory(f"(sAMAccountName={user})", "objectSid")[0]
    identifier = account["objectSid"][0]
    name = f"{domain}\\{user}"
    fields = host.ok("getent", "passwd", name).out.strip().split(":")
    expect_equal(fields[0], name, "the name")
    number = int(fields[2])
    if domain == "CORP":
        expect_equal(number, 2000000 + int(identifier.rsplit("-", 1)[1]), "the number")
    else:
        expect(1000000 <= number < 2000000, f"{name} has the number {number}")
    expect_equal(host.ok("id", "-un", str(number)).out.strip(), name, "the number's name")
    expect_equal(host.ok("wbinfo", "--uid-to-sid", str(number)).out.strip(), identifier,
                 "the number's identifier, here and on the controller")


def play(lab):
    plain, path, short, long = lab.hosts(4)
    at_once(lambda host: host.make_local_users(), (plain, path))
    baseline = fastest_log_in(plain)
    attempts = begin(plain, LOCAL_USERS + STRANGERS)
    with lab.step(f"before the join, {plain.name}: getent passwd knows no CORP\\user1"):
        unknown(plain, "CORP\\user1")
    joins(lab, path, short, long)
    finish(lab, "before the join", attempts)

    plain_join(lab, plain)

    attempts = begin(plain, LOCAL_USERS + STRANGERS)
    with lab.step(f"joined only, {plain.name}: getent passwd knows no CORP\\user1"):
        unknown(plain, "CORP\\user1")
    with lab.step(f"{path.name}: the library's MakeActive"):
        path.by_library("activate")
        is_activated(path)
    more_attempts = begin(path, LOCAL_USERS + DOMAIN_USERS[:2])
    finish(lab, "joined only", attempts)
    with lab.step(f'{plain.name}: tslauthctl activate "Active Directory"'):
        plain.tslauthctl("activate", "Active Directory")
        is_activated(plain)

    odd = (f"CORP\\{odd_user(long)}", ODD_PASSWORD, "logs in", None)
    attempts = begin(plain, (*LOCAL_USERS, *DOMAIN_USERS, odd))
    for host in (plain, path):
        with lab.step(f"{host.name}: getent passwd 'CORP\\user1' and the controller agree"):
            resolves(lab.dc1, host, "CORP", "user1")
    with lab.step(f"{plain.name}: getent passwd 'OTHER\\user2' and its controller agree"):
        resolves(lab.dc2, plain, "OTHER", "user2")
    with lab.step(f"{plain.name}: id says that CORP\\user1 is in the group CORP\\domain users"):
        groups = plain.ok("id", "-Gn", "CORP\\user1").out.lower()
        expect("corp\\domain users" in groups, groups)
    with lab.step(f"{plain.name}: getent passwd knows no user1, and no CORP\\nobody"):
        unknown(plain, "user1")
        unknown(plain, "CORP\\nobody")
    finish(lab, "activated", attempts + more_attempts)
    with lab.step(f"activated, {plain.name}: lena logs in as fast as before the join") as step:
        seconds = fastest_log_in(plain)
        step.took(seconds)
        step.note(f"{1000 * baseline:.0f} ms before")
        expect(seconds < baseline + LOCAL_SLACK, f"{seconds:.3f} s, before {baseline:.3f} s")
