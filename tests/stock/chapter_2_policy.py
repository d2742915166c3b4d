# SPDX-License-Identifier: Apache-2.0
"""The services follow the policy, whatever is installed, and a lost policy locks nobody out."""
import time

from lab import LOCAL_PASSWORD, expect, until
from stock import POLICY, StockHost

TITLE = "Debian 12: the services follow the policy, and it cannot get lost"

# Whose packages write what a log-in depends on.
LOGIN_PACKAGES = ("openssh-server", "login", "sudo", "libpam-runtime", "libpam-winbind",
                  "libnss-winbind", "winbind", "cron")


def is_whole(host):
    """Still set up, and local users log in with their passwords alone."""
    host.follows()
    host.locals_are_well()
    host.wrong_password_is_refused()


def unknown_is_refused(host):
    result = host.ssh("nobody-knows", LOCAL_PASSWORD)
    expect(result.code == 255 and "Permission denied" in result.err, str(result))


def changes_password(host, old, new):
    """lena changes her own password, as passwd(1) asks for it."""
    terminal = host.terminal("runuser", "-u", "lena", "--", "passwd")
    for answer in (old, new, new):
        expect(terminal.expect([r"(?i)password: ?$", "\n.*(failure|error)"]) == 0,
               f"passwd: {terminal.before}")
        terminal.sendline(answer)
    expect(terminal.expect(["updated successfully", "(?i)error"]) == 0, terminal.before)


def lose_policy(host, watched):
    if not watched:
        host.ok("systemctl", "stop", "tslauth-policy.path")
    host.ok("rm", POLICY)


def policy_is_back(host):
    until("the policy is there again", lambda: host.run("test", "-s", POLICY).code == 0)
    expect("pam_access.so" in host.read(POLICY), "it is another one")


def begin_job(host):
    """A cron job of a local user; its next minute may be almost one away."""
    host.shell("""
        echo '* * * * * lena touch /tmp/ran' >/etc/cron.d/lena
        chmod 0644 /etc/cron.d/lena""")


def job_has_run(host):
    until("lena's job has run", lambda: host.run("test", "-e", "/tmp/ran").code == 0, seconds=70)
    host.ok("rm", "/etc/cron.d/lena", "/tmp/ran")


def play(lab):
    host = StockHost("policy")
    host.install()
    host.keep_etc("before")
    before = host.etc()
    with lab.step("the host is set up: every service of common-* follows the policy") as step:
        start = time.monotonic()
        host.set_up()
        step.took(time.monotonic() - start)
        host.follows()
    begin_job(host)
    with lab.step("lena by ssh, root on the console, su: in"):
        host.locals_are_well()
    with lab.step("wrong passwords are refused"):
        host.wrong_passwords_are_refused()
    with lab.step("somebody unknown is refused"):
        unknown_is_refused(host)
    with lab.step("sudo takes lena's password, and no other"):
        let_in, seen = host.sudoes("lena", LOCAL_PASSWORD)
        expect(let_in, seen)
        let_in, seen = host.sudoes("lena", "wrong")
        expect(not let_in, seen)
    with lab.step("lena logs in with a key"):
        host.shell("""
            ssh-keygen -q -t ed25519 -N '' -f /root/lena
            install -d -o lena -m 0700 /home/lena/.ssh
            install -o lena -m 0600 /root/lena.pub /home/lena/.ssh/authorized_keys""")
        result = host.ssh("lena", key="/root/lena")
        expect(result.out == "lena\n", str(result))
    with lab.step("lena changes her password, and logs in with it alone"):
        changes_password(host, LOCAL_PASSWORD, "Other secret 17")
        expect(host.ssh("lena", "Other secret 17").code == 0, "the new one is refused")
        expect(host.ssh("lena", LOCAL_PASSWORD).code == 255, "the old one is taken")
        host.ok("chpasswd", text=f"lena:{LOCAL_PASSWORD}\n")
    with lab.step("dpkg --verify finds nothing"):
        host.verifies()

    with lab.step("the policy is deleted: it is back within seconds"):
        lose_policy(host, watched=True)
        policy_is_back(host)
    with lab.step("the system log says so"):
        until("a line of it",
              lambda: "was missing" in host.ok("journalctl", "-q", "-t", "tslauth").out)
    with lab.step("a job of lena's has run from cron"):
        job_has_run(host)
    lose_policy(host, watched=False)
    with lab.step("while it is missing, with nothing that watches: local users log in as ever"):
        host.locals_are_well()
        host.wrong_passwords_are_refused()
    with lab.step("and somebody unknown is refused"):
        unknown_is_refused(host)
    with lab.step("the next dpkg that touches log-ins brings it back"):
        host.apt("install", "--reinstall", "libpam-runtime")
        policy_is_back(host)
    with lab.step("an emptied policy counts as missing"):
        host.shell(': >"$1"; /usr/libexec/tslauth/keep-policy', POLICY)
        policy_is_back(host)
    with lab.step("a policy that is there is left alone"):
        host.shell('echo "# mine" >>"$1"; /usr/libexec/tslauth/keep-policy', POLICY)
        expect(host.read(POLICY).endswith("# mine\n"), "it was replaced")
        host.shell('sed -i "/# mine/d" "$1"', POLICY)
    with lab.step("lost before a start, it is there after it"):
        lose_policy(host, watched=False)
        host.reboot()
        policy_is_back(host)
        is_whole(host)

    for name in LOGIN_PACKAGES:
        with lab.step(f"{name} is reinstalled: nothing changes"):
            host.apt("install", "--reinstall", name)
            is_whole(host)
    for name in ("openssh-server", "login", "sudo", "libpam-runtime", "libpam-winbind"):
        with lab.step(f"{name} is upgraded: nothing changes"):
            host.dpkg("-i", host.newer(name))
            is_whole(host)
    with lab.step("another package's profile comes: the services still follow"):
        host.apt("install", "libpam-pwquality")
        is_whole(host)
    with lab.step("pam-auth-update --package by anybody: they still follow"):
        host.ok("pam-auth-update", "--package")
        is_whole(host)
    with lab.step("Debian's winbind profile is switched on by hand: ours keeps it off"):
        host.ok("pam-auth-update", "--enable", "winbind")
        is_whole(host)
    with lab.step("it goes again: they still follow"):
        host.apt("purge", "--autoremove", "libpam-pwquality")
        is_whole(host)

    with lab.step("all is purged: the services follow no policy, and local users log in"):
        host.purge()
        host.follows_no_longer()
        host.locals_are_well()
        host.wrong_passwords_are_refused()
    with lab.step("the policy is gone, and common-* are byte for byte what they were"):
        expect(host.run("test", "-e", POLICY).code == 1, "it is there")
        for kind in ("auth", "account", "password", "session", "session-noninteractive"):
            path = f"/etc/pam.d/common-{kind}"
            expect(before[path] == host.etc()[path], host.difference("before", path))
    host.down()
