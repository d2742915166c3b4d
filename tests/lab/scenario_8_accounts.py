# SPDX-License-Identifier: Apache-2.0
"""Who is let in: by key and by password, under names that the host has itself, and when nobody of
the domain can be asked."""
import time

import outage
from lab import LOCAL_PASSWORD, LOGIN_SERVICE, LogIn, PASSWORD, expect, expect_equal, until

TITLE = "Local names, keys, and accounts that the domain has closed"

# As providers/winbind/README.md has it.
POLICY = r"""account required /lib/security/$ISA/pam_tslauth_winbind.so check_only
account required /lib/security/$ISA/pam_access.so
account required /lib/security/$ISA/pam_unix.so
auth required /lib/security/$ISA/pam_access.so
auth sufficient /lib/security/$ISA/pam_unix.so
auth required /lib/security/$ISA/pam_deny.so
password sufficient /lib/security/$ISA/pam_tslauth_winbind.so
password sufficient /lib/security/$ISA/pam_unix.so use_authtok
password required /lib/security/$ISA/pam_deny.so
session required /lib/security/$ISA/pam_unix.so
session optional /lib/security/$ISA/pam_mkhomedir.so umask=0077
session optional /lib/security/$ISA/pam_tslauth_winbind.so
"""
KEY = "/run/lab-key"
# Seconds. What a local user may wait for: libpam, ssh and a busy machine, but no network.
AT_ONCE = 2.0
# What a log-in waits for the domain's word, and what passes besides.
BOUND, SLACK = 5, 5

CLOSED = {
    "disabled1": "Your account is disabled. Please see your system administrator.",
    "expired1": "Your account has expired. Please see your system administrator.",
    "locked1": "Your account has been locked. Please see your system administrator.",
}
SILENT = "The domain does not answer whether you may log in. Please try again later."


def make_anew(controller, kind, name, *arguments):
    """As if no scenario had been played before."""
    controller.run("/usr/bin/python3", "/usr/bin/samba-tool", kind, "delete", name)
    controller.samba_tool(kind, "add", name, *arguments)


def make_accounts(lab):
    """In the domain: accounts with the names of local users, and one that is locked."""
    for name in ("root", "lena", "locked1"):
        make_anew(lab.dc1, "user", name, PASSWORD)
    make_anew(lab.dc1, "user", "change1", PASSWORD, "--must-change-at-next-login")
    make_anew(lab.dc1, "group", "sudo")
    lab.dc1.samba_tool("group", "addmembers", "sudo", "user1,lena")
    lab.dc1.samba_tool("domain", "passwordsettings", "set", "--account-lockout-threshold=3")
    make_anew(lab.dc2, "user", "disabled2", PASSWORD)
    lab.dc2.samba_tool("user", "disable", "disabled2")


def make_server(host):
    """sshd takes this one key for every user."""
    host.write("/etc/pam.d/system-auth-generic", POLICY)
    host.shell("""
        mkdir -p /run/sshd
        ssh-keygen -q -t ed25519 -N '' -f "$1"
        mkdir -p /etc/ssh/keys
        cp "$1.pub" /etc/ssh/keys/everybody
        chmod 0644 /etc/ssh/keys/everybody
        ssh-keygen -q -A
        getent passwd sshd >/dev/null || useradd --system --no-create-home --home /run/sshd sshd
        printf '%s\\n' 'UsePAM yes' 'AuthorizedKeysFile /etc/ssh/keys/everybody' 'StrictModes no' \
            'PermitRootLogin yes' 'KbdInteractiveAuthentication yes' 'PasswordAuthentication no' \
            >/etc/ssh/sshd_config
        for service in sshd su sudo login passwd; do
            printf '%s include system-auth-generic\\n' auth account password session \
                >"/etc/pam.d/$service"
        done
        sed -i '1i auth sufficient pam_rootok.so' /etc/pam.d/su
        /usr/sbin/sshd
        """, KEY)


def by_key(host, user, *command):
    return host.run("ssh", "-i", KEY, "-o", "BatchMode=yes", "-o", "StrictHostKeyChecking=no",
                    "-o", "UserKnownHostsFile=/dev/null", "-l", user, "127.0.0.1",
                     *(command or ("id", "-un")), timeout=90)


def is_let_in(host, user, name=None):
    result = by_key(host, user)
    expect(result.code == 0 and result.out.strip() == (name or user), str(result))
    return result


def is_refused(host, user, told=""):
    result = by_key(host, user)
    expect(result.code == 255 and not result.out, f"{user} was let in\n{result}")
    expect(told in result.err, f"{user} was not told '{told}'\n{result}")
    return result


def set_up(lab):
    host = lab.host()
    with lab.step("accounts with local names, and closed ones, in the domain"):
        make_accounts(lab)
    with lab.step(f"{host.name} joins, with local users, sshd and the policy"):
        host.make_local_users()
        make_server(host)
        host.join()
        host.tslauthctl("activate", "Active Directory")
    with lab.step("CORP\\locked1 is locked out after three wrong passwords"):
        for _ in range(3):
            host.run("wbinfo", "--authenticate", "CORP\\locked1%wrong")
        told = host.run("wbinfo", "--authenticate", f"CORP\\locked1%{PASSWORD}")
        expect("NT_STATUS_ACCOUNT_LOCKED_OUT" in told.out + told.err, str(told))
    return host


def keys_and_closed_accounts(lab, host):
    for user in ("CORP\\user1", "OTHER\\user2", "root", "lena"):
        with lab.step(f"by key: {user} is let in") as step:
            step.took(is_let_in(host, user).seconds)
    for user, told in CLOSED.items():
        with lab.step(f"by key: CORP\\{user} is refused, and told why") as step:
            step.took(is_refused(host, f"CORP\\{user}", told).seconds)
    with lab.step("by key: OTHER\\disabled2, trusted, is refused, and told why") as step:
        step.took(is_refused(host, "OTHER\\disabled2", CLOSED["disabled1"]).seconds)
    with lab.step("by key: whom the domain disables is refused from then on, until enabled"):
        lab.dc1.samba_tool("user", "disable", "user1")
        is_refused(host, "CORP\\user1", CLOSED["disabled1"])
        lab.dc1.samba_tool("user", "enable", "user1")
        is_let_in(host, "CORP\\user1")
    with lab.step("su by root asks the domain as well"):
        told = host.run("su", "-", "CORP\\disabled1", "-c", "true")
        expect(CLOSED["disabled1"] in told.err + told.out, str(told))


def home_is_made(lab, host):
    with lab.step("CORP\\user1 has a home folder of his own since he logged in"):
        expect_equal(by_key(host, "CORP\\user1", "stat -c '%U %a' .").out,
                     "CORP\\user1 700\n", "owner and mode")


def password_must_change(lab, host):
    new = "Another-Passw0rd"
    with lab.step("CORP\\change1 logs in and changes the password that must be changed"):
        result = host.run("pamtester", LOGIN_SERVICE, "CORP\\change1", "authenticate",
                          "acct_mgmt", text=PASSWORD + "\n")
        expect("new one required" in result.err + result.out, str(result))
        result = host.run("pamtester", "passwd", "CORP\\change1", "chauthtok",
                          text=f"{PASSWORD}\n{new}\n{new}\n")
        expect(result.code == 0, str(result))
        LogIn(host, "CORP\\change1", new).is_let_in()


def local_names(lab, host, how, spellings):
    """The domain has a root and a lena as well, with another password."""
    for user in ("root", "lena"):
        with lab.step(f"{how}: getent and id know the local {user} alone"):
            number = host.ok("id", "-u", user).out.strip()
            expect(int(number) < 1000000, number)
            expect_equal(host.ok("getent", "passwd", number).out.split(":")[0], user, "the name")
        with lab.step(f"{how}: {user} is let in with the local password, not with the domain's"):
            right, wrong = LogIn(host, user, LOCAL_PASSWORD), LogIn(host, user, PASSWORD)
            right.is_let_in()
            wrong.is_refused()
    for user in spellings:
        with lab.step(f"{how}: {user} is nobody: not by getent, id, password, key, su or sudo"):
            host.exits(2, "getent", "passwd", user)
            host.exits(1, "id", user)
            LogIn(host, user, PASSWORD).is_refused("")
            is_refused(host, user)
            host.exits(1, "su", user, "-c", "true")
            host.exits(1, "sudo", "-n", "-u", user, "true")
    with lab.step(f"{how}: no number of the domain's has a local name"):
        for name in ("root", "lena"):
            sid = host.ok("wbinfo", "-n", f"CORP\\{name}").out.split()[0]
            number = str(2000000 + int(sid.rsplit("-", 1)[1]))
            listed = host.run("getent", "passwd", number).out
            expect(not listed.startswith(name + ":"), listed)


def long_names(lab, host):
    local_names(lab, host, "names with their domain", ("ROOT", "LENA", "Root"))
    with lab.step("names with their domain: CORP\\root is the domain's, and is not root"):
        expect_equal(by_key(host, "CORP\\root", "id", "-u").out, host.ok(
            "id", "-u", "CORP\\root").out, "the number")
        LogIn(host, "CORP\\root", PASSWORD).is_let_in()
        LogIn(host, "CORP\\root", LOCAL_PASSWORD).is_refused()


def short_names(lab, host):
    with lab.step("winbindd gives short names from now on"):
        host.shell("""
            sed -i 's/winbind use default domain = no/winbind use default domain = yes/' \
                /etc/samba/tslauth.conf
            pkill -x winbindd
            while pgrep -x winbindd; do sleep 0.05; done
            winbindd -D
            """)
        until("a short name", lambda: host.run("getent", "passwd", "user1").code == 0)
    with lab.step("short names: user1 is let in by password and by key"):
        LogIn(host, "user1", PASSWORD).is_let_in()
        is_let_in(host, "user1")
    with lab.step("short names: disabled1 is refused by key, and told why"):
        is_refused(host, "disabled1", CLOSED["disabled1"])
    local_names(lab, host, "short names",
                ("ROOT", "LENA", "CORP\\root", "CORP\\lena", "root@corp.example"))
    with lab.step("short names: the domain's group sudo is not the host's"):
        local = host.read("/etc/group")
        line = next(line for line in local.splitlines() if line.startswith("sudo:"))
        expect_equal(host.ok("getent", "group", "sudo").out.strip(), line, "the group")
        groups = host.run("id", "-Gn", "user1").out.split()
        expect("user1" in groups and "sudo" not in groups, f"user1 is in {groups}")


def without_anybody(lab, host):
    """winbindd stopped, then the controller."""
    host.shell("pkill -STOP -x winbindd")
    for user in ("root", "lena"):
        with lab.step(f"winbindd stopped: {user} is let in at once, by key or password") as step:
            step.took(is_let_in(host, user).seconds)
            seconds = LogIn(host, user, LOCAL_PASSWORD).is_let_in()
            expect(seconds < AT_ONCE, f"{seconds:.2f} s, more than {AT_ONCE} s")
        with lab.step(f"winbindd stopped: getent passwd {user} answers at once") as step:
            result = host.ok("getent", "passwd", user)
            step.took(result.seconds)
            expect(result.seconds < 0.5, f"{result.seconds:.2f} s")
    host.shell("pkill -CONT -x winbindd")
    with lab.step("winbindd goes on: user1 is let in by key"):
        is_let_in(host, "user1")
    outage.freeze(lab.dc1)
    try:
        with lab.step(f"controller frozen: user1 is refused by key within {BOUND} s") as step:
            result = is_refused(host, "user1", SILENT)
            step.took(result.seconds)
            expect(result.seconds < BOUND + SLACK, f"{result.seconds:.1f} s")
        with lab.step("controller frozen: lena is let in at once by key") as step:
            result = is_let_in(host, "lena")
            step.took(result.seconds)
            expect(result.seconds < AT_ONCE, f"{result.seconds:.2f} s")
    finally:
        outage.thaw(lab.dc1)
    with lab.step("controller back: user1 is let in by key, within 30 s") as step:
        start = time.monotonic()
        until("a log-in", lambda: by_key(host, "user1").code == 0, 30)
        step.took(time.monotonic() - start)


def play(lab):
    host = set_up(lab)
    if lab.failed:
        return  # on such a host everybody is nobody
    keys_and_closed_accounts(lab, host)
    home_is_made(lab, host)
    password_must_change(lab, host)
    long_names(lab, host)
    short_names(lab, host)
    without_anybody(lab, host)
