# SPDX-License-Identifier: Apache-2.0
"""The main path: from a stock host to a domain user's session, and back."""
from lab import LOCAL_PASSWORD, PASSWORD, differences, expect, expect_equal, until
from stock import POLICY, StockHost

TITLE = "Debian 12: from a stock host to a domain user's session, and back"
USER = "CORP\\user1"


def refused(host, user, password=None, key=None):
    """What ssh says to somebody who must not get in."""
    result = host.ssh(user, password, key)
    expect(result.code == 255, f"{user} was let in: {result}")
    expect("Permission denied" in result.err or "Connection closed" in result.err,
           f"{user} was not refused, but never asked: {result}")
    return result.err


def give_key(host, user):
    """A key of a user of the domain, who may have no home yet."""
    host.shell("""
        key=/root/domain
        [ -e "$key" ] || ssh-keygen -q -t ed25519 -N '' -f "$key"
        echo 'AuthorizedKeysFile .ssh/authorized_keys /etc/ssh/keys/%u' \\
            >/etc/ssh/sshd_config.d/keys.conf
        install -d -m 0755 /etc/ssh/keys
        install -m 0644 "$key.pub" "/etc/ssh/keys/$1"
        systemctl reload ssh
        until { : </dev/tcp/localhost/22; } 2>/dev/null; do sleep 0.1; done""", user)
    return "/root/domain"


def make_double(lab, name):
    """A user of the domain who is called like a local one."""
    lab.dc1.samba_tool("user", "create", name, PASSWORD)


def main_path(lab, host):
    """What Debian 12 and 13 have in common: to a session with a home, and out again."""
    host.set_up()
    with lab.step("the host is joined") as step:
        step.took(host.join().seconds)
        expect("corp.example" in host.tslauthctl("info").out, "info does not name the domain")
    with lab.step("joined and not active: users of the domain are refused"):
        refused(host, USER, PASSWORD)
    with lab.step("\"Active Directory\" is active") as step:
        step.took(host.tslauthctl("activate", "Active Directory").seconds)
        until("user1 resolves", lambda: host.run("getent", "passwd", USER).code == 0)
    with lab.step("nobody of the domain is permitted yet: CORP\\user1 is refused"):
        refused(host, USER, PASSWORD)
    with lab.step("everybody of the domain is permitted"):
        host.tslauthctl("permit", "--all")
    with lab.step("CORP\\user1 logs in by ssh with the password, at home") as step:
        result = host.ssh(USER, PASSWORD, command="id -un; pwd; ls -d ~")
        expect_equal(result.code, 0, str(result))
        user, folder, home = result.out.splitlines()
        expect_equal((user.lower(), folder), (USER.lower(), home), str(result))
        step.took(result.seconds)
    with lab.step("the home is the user's alone"):
        state = host.shell('stat -c "%U %a" "$(getent passwd "$1" | cut -d: -f6)"', USER).out
        expect_equal(state.lower(), f"{USER.lower()} 700\n", "owner and mode")
    with lab.step("a wrong password is refused"):
        expect("Permission denied" in refused(host, USER, "wrong"), "it says something else")
    with lab.step("local users log in, with their passwords alone"):
        host.locals_are_well()
        host.wrong_passwords_are_refused()


def play(lab):
    host = StockHost("domain")
    host.install()
    before = host.etc()
    host.keep_etc("before")
    main_path(lab, host)
    with lab.step("CORP\\user1 logs in with a key"):
        result = host.ssh(USER, key=give_key(host, USER))
        expect_equal(result.out.strip().lower(), USER.lower(), str(result))
    with lab.step("on the console"):
        let_in, seen = host.logs_in(USER, PASSWORD)
        expect(let_in, seen)
    with lab.step("by su from a local user, and not with a wrong password"):
        let_in, seen = host.becomes("lena", USER, PASSWORD)
        expect(let_in, seen)
        let_in, seen = host.becomes("lena", USER, "wrong")
        expect(not let_in, seen)
    with lab.step("CORP\\user1 may use sudo where sudoers says so, with the domain's password"):
        host.write("/etc/sudoers.d/user1", "CORP\\\\user1 ALL=(ALL) ALL\n", mode="0440")
        let_in, seen = host.sudoes(USER, PASSWORD)
        expect(let_in, seen)
        let_in, seen = host.sudoes(USER, "wrong")
        expect(not let_in, seen)
        host.ok("rm", "/etc/sudoers.d/user1")
    for name in ("disabled1", "expired1"):
        with lab.step(f"CORP\\{name} is refused with the password"):
            refused(host, f"CORP\\{name}", PASSWORD)
        with lab.step(f"CORP\\{name} is refused with a key"):
            refused(host, f"CORP\\{name}", key=give_key(host, f"CORP\\{name}"))
    for name in ("root", "lena"):
        with lab.step(f"the domain has a user {name} too: he never becomes the host's {name}"):
            make_double(lab, name)
            let_in, seen = host.becomes("lena", name, PASSWORD)
            expect(not let_in, seen)
            let_in, seen = host.logs_in(name, PASSWORD)
            expect(not let_in, seen)
            refused(host, name, PASSWORD)
    with lab.step("nor after a reinstall of libpam-winbind"):
        host.apt("install", "--reinstall", "libpam-winbind")
        host.follows()
        let_in, seen = host.becomes("lena", "root", PASSWORD)
        expect(not let_in, seen)
    with lab.step("every package that a log-in needs is reinstalled: CORP\\user1 logs in"):
        host.apt("install", "--reinstall", "openssh-server", "login", "sudo", "libpam-runtime",
                 "libnss-winbind", "winbind")
        until("user1 resolves", lambda: host.run("getent", "passwd", USER).code == 0)
        expect_equal(host.ssh(USER, PASSWORD).code, 0, "ssh")
        host.follows()
    with lab.step("ours are reinstalled: CORP\\user1 logs in"):
        host.dpkg("-i", *host.files("libtslauth1", "tslauthctl", "tslauth-provider-winbind"))
        expect_equal(host.ssh(USER, PASSWORD).code, 0, "ssh")
    with lab.step("the host starts again: CORP\\user1 logs in, and lena"):
        host.reboot()
        until("user1 resolves", lambda: host.run("getent", "passwd", USER).code == 0, seconds=30)
        expect_equal(host.ssh(USER, PASSWORD).code, 0, "ssh")
        host.locals_are_well()
    with lab.step("the policy is lost while active: domain users are refused, local ones not"):
        host.shell('systemctl stop tslauth-policy.path; mv "$1" /srv/policy', POLICY)
        refused(host, USER, PASSWORD)
        host.locals_are_well()
        host.shell('mv /srv/policy "$1"; systemctl start tslauth-policy.path', POLICY)
        expect_equal(host.ssh(USER, PASSWORD).code, 0, "user1 afterwards")
    with lab.step("the controller is frozen: lena logs in within 5 s") as step:
        lab.dc1.run("pkill", "-STOP", "-f", "samba|smbd|winbindd")
        try:
            result = host.ssh("lena", LOCAL_PASSWORD)
            step.took(result.seconds)
            expect(result.code == 0 and result.seconds < 5, str(result))
        finally:
            lab.dc1.run("pkill", "-CONT", "-f", "samba|smbd|winbindd")
    with lab.step("back to \"None\": CORP\\user1 is refused, with the password and with the key"):
        host.activate("None")
        refused(host, USER, PASSWORD)
        refused(host, USER, key="/root/domain")
        host.locals_are_well()
    with lab.step("active again: nothing else is needed"):
        host.activate()
        expect_equal(host.ssh(USER, PASSWORD).code, 0, "ssh")
    with lab.step("parted and purged while active: local users log in, CORP\\user1 does not"):
        host.part()
        host.purge()
        host.locals_are_well()
        refused(host, USER, PASSWORD)
    with lab.step("policies, name-service switch and services are byte for byte what they were"):
        left = {path: what for path, what in differences(before, host.etc()).items()
                if path.startswith(("/etc/pam.d", "/etc/nsswitch", "/etc/tessel", "/etc/security"))
                and not before.get(path, "").startswith("d")}
        expect(not left, f"{left}\n" + host.difference("before", *left))
    host.down()
