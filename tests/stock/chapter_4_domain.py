# SPDX-License-Identifier: Apache-2.0
"""The main path: from a stock host to a domain user's session, and back."""
import outage
from lab import LOCAL_PASSWORD, PASSWORD, differences, expect, expect_equal, until
from scenario_8_accounts import make_anew
from stock import POLICY, StockHost

TITLE = "Debian 12: from a stock host to a domain user's session, and back"
USER = "CORP\\user1"


def refused(host, user, password=None, key=None, told=""):
    """What ssh says to somebody who must not get in, of which something may be wanted."""
    result = host.ssh(user, password, key)
    expect(result.code == 255 and not result.out, f"{user} was let in: {result}")
    expect("Permission denied" in result.err or "Connection closed" in result.err,
           f"{user} was not refused, but never asked: {result}")
    expect(told in result.err, f"{user} was not told '{told}': {result}")
    return result.err


def let_in(host, user, password=None, key=None):
    result = host.ssh(user, password, key)
    expect_equal((result.code, result.out.strip().lower()), (0, user.lower()), str(result))
    return result


def give_key(host, user):
    """A key of a user of the domain, who may have no home yet."""
    host.shell("""
        key=/root/domain
        if [ ! -e "$key" ]; then
            ssh-keygen -q -t ed25519 -N '' -f "$key"
            install -d -m 0755 /etc/ssh/keys
            echo 'AuthorizedKeysFile .ssh/authorized_keys /etc/ssh/keys/%u' \\
                >/etc/ssh/sshd_config.d/keys.conf
            systemctl restart ssh
        fi
        install -m 0644 "$key.pub" "/etc/ssh/keys/$1"
        """, user)
    return "/root/domain"


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


def lock(lab, host, name):
    """Three wrong passwords; the domain's other users have as many as they want."""
    make_anew(lab.dc1, "user", name, PASSWORD)
    lab.dc1.run("/usr/bin/python3", "/usr/bin/samba-tool", "domain", "passwordsettings", "pso",
                "delete", "strict")
    lab.dc1.samba_tool("domain", "passwordsettings", "pso", "create", "strict", "1",
                       "--account-lockout-threshold=3")
    lab.dc1.samba_tool("domain", "passwordsettings", "pso", "apply", "strict", name)
    for _ in range(3):
        host.run("wbinfo", "--authenticate", f"CORP\\{name}%wrong")


def closed_accounts(lab, host):
    lock(lab, host, "locked1")
    for name, told in (("disabled1", "Your account is disabled"),
                       ("expired1", "Your account has expired"),
                       ("locked1", "Your account has been locked")):
        user = f"CORP\\{name}"
        with lab.step(f"{user} is refused with the password"):
            refused(host, user, PASSWORD)
        with lab.step(f"{user} is refused with a key, and told why"):
            refused(host, user, key=give_key(host, user), told=told)
    make_anew(lab.dc1, "user", "change1", PASSWORD, "--must-change-at-next-login")
    with lab.step("CORP\\change1, who must, changes the password on the console, and logs in"):
        changes_at_log_in(host, "CORP\\change1", PASSWORD, "Another-Passw0rd")
        let_in(host, "CORP\\change1", "Another-Passw0rd")
    with lab.step("CORP\\change1 changes it again with passwd(1)"):
        lab.dc1.samba_tool("domain", "passwordsettings", "set", "--min-pwd-age=0")
        changes_with_passwd(host, "CORP\\change1", "Another-Passw0rd", "Yet-Another-Passw0rd")
        let_in(host, "CORP\\change1", "Yet-Another-Passw0rd")
        refused(host, "CORP\\change1", "Another-Passw0rd")


def changes_at_log_in(host, user, old, new):
    """login(1) demands a new password."""
    terminal = host.console(user)
    for asked, answer in ((r"assword: ?$", old), (r"(?i)new.*password: ?$", new),
                          (r"(?i)(again|retype|repeat|new).*: ?$", new)):
        found = terminal.expect([asked, r"(?i)incorrect", r"(?i)current.*: ?$"])
        if found == 2:
            terminal.sendline(old)
            found = terminal.expect([asked, r"(?i)incorrect"])
        expect(found == 0, f"{user}: {terminal.before}{terminal.after}")
        terminal.sendline(answer)
    expect(terminal.expect([r"[#$] ?$", "(?i)incorrect|failure|error"]) == 0, terminal.before)
    terminal.close(force=True)


def changes_with_passwd(host, user, old, new):
    terminal = host.terminal("runuser", "-u", user, "--", "passwd")
    for answer in (old, new, new):
        expect(terminal.expect([r"(?i)password: ?$", "(?i)\n.*(failure|error)"]) == 0,
               f"passwd: {terminal.before}")
        terminal.sendline(answer)
    expect(terminal.expect(["updated successfully", "(?i)error|fail|unchanged"]) == 0,
           terminal.before)
    terminal.close(force=True)


def who_may_log_in(lab, host):
    """permit and deny, by password and by key."""
    plain = "CORP\\plain1"
    key = give_key(host, plain)
    with lab.step("deny --all takes every permission back, keys included"):
        host.tslauthctl("deny", "--all")
        refused(host, USER, PASSWORD)
        refused(host, USER, key="/root/domain")
    with lab.step("plan permit shows the rule and writes nothing"):
        host.exits(7, "tslauthctl", "plan", "permit", USER)
        refused(host, USER, key="/root/domain")
    with lab.step("one user is permitted, and no other"):
        host.tslauthctl("permit", USER)
        let_in(host, USER, PASSWORD)
        let_in(host, USER, key="/root/domain")
        refused(host, plain, PASSWORD)
        refused(host, plain, key=key)
    with lab.step("a second time nothing has to be changed"):
        expect("Nothing had to be changed" in host.tslauthctl("permit", USER).out, "it changed")
    with lab.step("a group whose name has a blank is permitted"):
        make_anew(lab.dc1, "group", "door keepers")
        lab.dc1.samba_tool("group", "addmembers", "door keepers", "plain1")
        host.run("wbinfo", "--authenticate", f"{plain}%{PASSWORD}")
        host.tslauthctl("permit", "CORP\\door keepers")
        let_in(host, plain, PASSWORD)
        let_in(host, plain, key=key)
    with lab.step("who is denied stays out, whatever group he is in"):
        host.tslauthctl("deny", plain)
        refused(host, plain, PASSWORD)
        refused(host, plain, key=key)
    with lab.step("permit --list tells all of it in the order that counts"):
        listed = host.tslauthctl("permit", "--list").out.lower()
        denied, user, group = (listed.find(text.lower()) for text in (
            f"denied     {plain}", f"permitted  {USER}", "(CORP\\door keepers)"))
        expect(0 <= denied < group and user >= 0, listed)
    with lab.step("a name that nobody knows is refused, unless forced"):
        host.exits(4, "tslauthctl", "permit", "CORP\\nobody-knows")
        host.tslauthctl("permit", "--force", "CORP\\nobody-knows")
    with lab.step("a local user is none of its business"):
        host.exits(4, "tslauthctl", "permit", "lena")
    with lab.step("everybody again: of the host's own domain, and not of a trusted one"):
        host.tslauthctl("deny", "--all")
        host.tslauthctl("permit", "--all")
        let_in(host, USER, PASSWORD)
        refused(host, "OTHER\\user2", PASSWORD)
    with lab.step("of a trusted domain when asked for"):
        host.tslauthctl("permit", "--all", "--trusted")
        let_in(host, "OTHER\\user2", PASSWORD)
    host.tslauthctl("permit", plain)


def membership(lab, host):
    with lab.step("status finds nothing, and nothing with --deep"):
        for arguments in (["status"], ["status", "--deep"]):
            result, document = host.ask(*arguments, code=0)
            expect_equal(document["findings"], [], str(result))
    with lab.step("joined already: exit code 0; to another domain: 11 and both names"):
        expect("already joined" in host.join().out, "it does not say so")
        result = host.run("tslauthctl", "join", "other.example", "--user", "joiner1",
                          "--password-stdin", text=PASSWORD + "\n")
        expect(result.code == 11 and "corp.example" in result.err.lower()
               and "other.example" in result.err, str(result))
    with lab.step("the domain disables the host's account: status --deep says so, exit code 12"):
        account = f"{host.name}$"
        lab.dc1.samba_tool("user", "disable", account)
        try:
            result, document = host.ask("status", "--deep", code=12)
            expect_equal([finding["word"] for finding in document["findings"]], ["trust"],
                         str(result))
        finally:
            lab.dc1.samba_tool("user", "enable", account)
    with lab.step("a job of CORP\\user1 has run from cron"):
        until("the job has run", lambda: host.run("test", "-s", "/tmp/job").code == 0, seconds=90)
        expect_equal(host.read("/tmp/job").strip().lower(), USER.lower(), "who ran it")
        host.ok("rm", "/etc/cron.d/domain")


def play(lab):
    host = StockHost("domain")
    before = host.etc()
    host.keep_etc("before")
    host.install()
    main_path(lab, host)
    with lab.step("CORP\\user1 logs in with a key"):
        let_in(host, USER, key=give_key(host, USER))
    host.write("/etc/cron.d/domain", "* * * * * CORP\\user1 id -un >/tmp/job\n")
    with lab.step("on the console"):
        entered, seen = host.logs_in(USER, PASSWORD)
        expect(entered, seen)
    with lab.step("by su from a local user, and not with a wrong password"):
        entered, seen = host.becomes("lena", USER, PASSWORD)
        expect(entered, seen)
        entered, seen = host.becomes("lena", USER, "wrong")
        expect(not entered, seen)
    with lab.step("CORP\\user1 may use sudo where sudoers says so, with the domain's password"):
        host.write("/etc/sudoers.d/user1", "CORP\\\\user1 ALL=(ALL) ALL\n", mode="0440")
        entered, seen = host.sudoes(USER, PASSWORD)
        expect(entered, seen)
        entered, seen = host.sudoes(USER, "wrong")
        expect(not entered, seen)
        host.ok("rm", "/etc/sudoers.d/user1")
    closed_accounts(lab, host)
    who_may_log_in(lab, host)
    membership(lab, host)
    for name in ("root", "lena"):
        with lab.step(f"the domain has a user {name} too: he never becomes the host's {name}"):
            make_anew(lab.dc1, "user", name, PASSWORD)
            entered, seen = host.becomes("lena", name, PASSWORD)
            expect(not entered, seen)
            entered, seen = host.logs_in(name, PASSWORD)
            expect(not entered, seen)
            refused(host, name, PASSWORD)
    with lab.step("nor after a reinstall of libpam-winbind"):
        host.apt("install", "--reinstall", "libpam-winbind")
        host.follows()
        entered, seen = host.becomes("lena", "root", PASSWORD)
        expect(not entered, seen)
    with lab.step("every package that a log-in needs is reinstalled: CORP\\user1 logs in"):
        host.apt("install", "--reinstall", "openssh-server", "login", "sudo", "libpam-runtime",
                 "winbind")
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
    with lab.step("nothing reaches the controller: lena logs in within 5 s") as step:
        outage.lose(host, lab.dc1)
        try:
            result = host.ssh("lena", LOCAL_PASSWORD)
            step.took(result.seconds)
            expect(result.code == 0 and result.seconds < 5, str(result))
        finally:
            outage.find(host, lab.dc1)
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
    with lab.step("every file that says who may log in is byte for byte what it was"):
        left = {path: what for path, what in differences(before, host.etc()).items()
                if path.startswith(("/etc/pam.d/", "/etc/nsswitch", "/etc/tessel", "/etc/security",
                                    "/etc/resolv.conf", "/etc/krb5"))}
        expect(not left, f"{left}\n" + host.difference("before", *left))
    with lab.step("of the hosts file a line is left, for the address by which the host joined"):
        left = [line for line in host.difference("before", "/etc/hosts").splitlines()[2:]
                if line[0] in "+-"]
        expect(len(left) == 1 and left[0].endswith("domain.corp.example domain"), str(left))
    host.down()
