# SPDX-License-Identifier: Apache-2.0
"""A stock Debian host for the statements: commands in it, log-ins as a person makes them, apt."""
import json
import os
import re
import subprocess
import sys

import pexpect

from lab import ENVIRONMENT, LOCAL_PASSWORD, TREE, Mismatch, Node, expect

STATE = os.environ.get("STOCK_STATE") or os.path.join(TREE, "build/stock")
STOCK_HOST = os.path.join(TREE, "tools/stock-host")
# Ours, in the order in which a person would name them.
PACKAGES = ("tslauth", "tslauthctl", "tslauth-provider-winbind", "libtslauth1", "libstrandctl1")
POLICY = "/etc/pam.d/system-auth-generic"
SSH_OPTIONS = ("-o", "StrictHostKeyChecking=no", "-o", "UserKnownHostsFile=/dev/null",
               "-o", "ConnectTimeout=20", "-o", "NumberOfPasswordPrompts=1")


class StockHost(Node):
    """A machine that was booted with tools/stock-host."""

    def __init__(self, name, release=12):  # pylint: disable=super-init-not-called
        self.name = name
        self.release = release
        self.down()  # of a run that was interrupted
        subprocess.run([STOCK_HOST, "up", "--release", str(release), name], check=True,
                       stdout=sys.stderr)
        with open(f"{STATE}/{name}/pid", encoding="ascii") as file:
            self.holder = file.read().strip()

    def reboot(self):
        """Starts again, as after `systemctl reboot`."""
        subprocess.run([STOCK_HOST, "reboot", self.name], check=True)
        with open(f"{STATE}/{self.name}/pid", encoding="ascii") as file:
            self.holder = file.read().strip()

    def down(self):
        subprocess.run([STOCK_HOST, "down", self.name], check=True)

    def command(self, *command):
        return ["nsenter", "--target", self.holder, "--mount", "--uts", "--ipc", "--net", "--pid",
                "--root", "--wdns=/", "--", "env", "DEBIAN_FRONTEND=noninteractive", *command]

    # --- packages ---------------------------------------------------------------------------------

    def apt(self, *arguments):
        """An apt-get that must succeed; what it printed."""
        return self.ok("apt-get", "-q", "-y", "-o", "Dpkg::Use-Pty=0", "--no-install-recommends",
                       *arguments, timeout=300).out

    def dpkg(self, *arguments):
        return self.ok("dpkg", *arguments, timeout=300).out

    def files(self, *names, architecture="amd64"):
        """The files of our packages."""
        return self.shell('cd "$1"; shift; for name; do ls "$PWD/$name"_*.deb; done',
                          f"/srv/packages/{architecture}", *names).out.split()

    def install(self, *names):
        """Our packages from files, as the README says."""
        return self.apt("install", *self.files(*(names or PACKAGES)))

    def purge(self):
        """All of ours and what came with them."""
        self.apt("purge", "--autoremove", *PACKAGES)

    def newer(self, name):
        """A file with the same package of a higher version, of ours or of Debian's."""
        return self.shell(r"""
            mkdir -p /srv/newer; cd /srv/newer; rm -rf root
            if ls /srv/packages/amd64/"$1"_*.deb >/dev/null 2>&1; then
                file=$(ls /srv/packages/amd64/"$1"_*.deb)
            else
                apt-get -q download "$1" >/dev/null 2>&1; file=$(ls "$PWD/$1"_*.deb | head -n 1)
            fi
            dpkg-deb -R "$file" root
            sed -i 's/^Version: .*/&+later/' root/DEBIAN/control
            # Ours ask for each other's very version.
            case $1 in
                *tslauth* | libstrandctl1)
                    sed -i 's/(= \([^)]*\))/(= \1+later)/' root/DEBIAN/control ;;
            esac
            dpkg-deb -b -Znone root "/srv/newer/later-$1.deb" >/dev/null
            echo "/srv/newer/later-$1.deb"
            """, name).out.strip()

    def installed(self, name):
        return self.run("dpkg-query", "-W", "-f", "${db:Status-Abbrev}", name).out.startswith("ii")

    # --- who may log in ---------------------------------------------------------------------------

    def ssh(self, user, password=None, key=None, command="id -un", ask="localhost"):
        """The result of a log-in through the real sshd, with a password or a key."""
        options = [*SSH_OPTIONS, "-l", user]
        script = "/srv/askpass"
        if key:
            options += ["-i", key, "-o", "PreferredAuthentications=publickey"]
        else:
            options += ["-o", "PreferredAuthentications=password,keyboard-interactive",
                        "-o", "PubkeyAuthentication=no"]
            self.write(script, "#!/bin/sh\nprintf '%s\\n' \"$STOCK_PASSWORD\"\n", mode="0755")
        return self.run("env", f"STOCK_PASSWORD={password or ''}", f"SSH_ASKPASS={script}",
                        "SSH_ASKPASS_REQUIRE=force", "ssh", *options, ask, command, timeout=150)

    def terminal(self, *command, timeout=60):
        """A command on a terminal of the host's own."""
        quoted = " ".join("'" + word.replace("'", "'\\''") + "'" for word in command)
        return pexpect.spawn(self.command("script", "-qec", quoted, "/dev/null")[0],
                             self.command("script", "-qec", quoted, "/dev/null")[1:],
                             env={**ENVIRONMENT, "TERM": "dumb"}, encoding="utf-8",
                             codec_errors="replace", timeout=timeout)

    def console(self, user):
        """login(1) on a terminal that it has for itself: Debian 13's asks on no other."""
        return self.terminal("setsid", "--ctty", "--wait", "login", user)

    def _asks(self, terminal, answers, wanted):
        """Answers what is asked for; whether the wanted text came before the end."""
        seen = ""
        answers = list(answers)
        while True:
            found = terminal.expect([wanted, r"(?i)password( for \S+)?: ?$",
                                     pexpect.EOF, pexpect.TIMEOUT,
                                     r"login: ?$"])
            seen += terminal.before or ""
            if found in (2, 3, 4):
                terminal.close(force=True)
                return False, seen
            if found == 0:
                terminal.close(force=True)
                return True, seen
            terminal.sendline(answers.pop(0) if answers else "")

    def logs_in(self, user, password):
        """Whether login(1) lets somebody in on a terminal, and what it said."""
        terminal = self.console(user)
        found = terminal.expect([r"(?i)password: ?$", pexpect.EOF, pexpect.TIMEOUT])
        if found != 0:
            terminal.close(force=True)
            return False, terminal.before
        terminal.sendline(password)
        found = terminal.expect([r"[#$] ?$", "incorrect", pexpect.EOF, pexpect.TIMEOUT,
                                 "Permission denied"])
        seen = terminal.before or ""
        terminal.close(force=True)
        return found == 0, seen

    def becomes(self, user, target, password):
        """Whether su lets a user become another one with a password, and what it said."""
        return self._asks(self.terminal("runuser", "-u", user, "--", "su", target,
                                        "-c", "echo now=$(id -un)"),
                          [password], re.escape(f"now={target}"))

    def sudoes(self, user, password):
        """Whether sudo lets a user be root with a password, and what it said."""
        return self._asks(self.terminal("runuser", "-u", user, "--", "sudo", "-k", "sh", "-c",
                                        "echo now=$(id -un)"), [password], "now=root")

    def locals_are_well(self):
        """Local users log in in every way, and with their passwords only."""
        result = self.ssh("lena", LOCAL_PASSWORD)
        expect(result.code == 0 and result.out == "lena\n", f"lena by ssh: {result}")
        let_in, seen = self.logs_in("root", LOCAL_PASSWORD)
        expect(let_in, f"root on the console: {seen}")
        let_in, seen = self.becomes("lena", "root", LOCAL_PASSWORD)
        expect(let_in, f"lena by su: {seen}")

    def wrong_password_is_refused(self):
        result = self.ssh("lena", "wrong")
        expect(result.code == 255 and "Permission denied" in result.err, f"lena by ssh: {result}")

    def wrong_passwords_are_refused(self):
        self.wrong_password_is_refused()
        let_in, seen = self.becomes("lena", "root", "wrong")
        expect(not let_in, f"lena by su: {seen}")

    # --- files ------------------------------------------------------------------------------------

    def etc(self):
        """Every file of /etc, but those that change by themselves."""
        found = self.snapshot("/etc")
        return {path: state for path, state in found.items()
                if path not in ("/etc/.pwd.lock", "/etc/ld.so.cache", "/etc/mtab")}

    def keep_etc(self, name):
        """A copy of /etc, to show what differs."""
        self.shell('rm -rf "/srv/$1"; cp -a /etc "/srv/$1"', name)

    def difference(self, name, *files):
        """What has become of files since a copy was kept, as a diff."""
        return "".join(self.run("diff", "-u", f"/srv/{name}{file.removeprefix('/etc')}", file).out
                       for file in files)

    def verifies(self):
        """dpkg finds every file as it was installed."""
        found = [line for line in self.run("dpkg", "--verify", timeout=120).out.splitlines()]
        expect(not found, "dpkg --verify: " + "\n".join(found))

    # --- set up -----------------------------------------------------------------------------------

    def set_up(self):
        """Ready for the first activation."""
        self.tslauthctl("setup", "--provider", "winbind")

    def ask(self, *arguments, code=None, user="root"):
        """What the tool does, and its document; with a code, it must end with that."""
        result = self.run("runuser", "-u", user, "--", "tslauthctl", "--json", *arguments)
        expect(result.out.startswith("{") and code in (None, result.code), str(result))
        return result, json.loads(result.out)

    def follows(self):
        """The services ask the policy, and Debian's own winbind profile is off."""
        for kind in ("auth", "account", "password", "session", "session-noninteractive"):
            text = self.read(f"/etc/pam.d/common-{kind}")
            expect("substack\tsystem-auth-generic" in text,
                   f"common-{kind} does not follow:\n{text}")
            expect("pam_winbind" not in text, f"Debian's winbind profile is on:\n{text}")
        expect(self.read(POLICY) != "", "the policy is empty")

    def follows_no_longer(self):
        for kind in ("auth", "account", "password", "session", "session-noninteractive"):
            text = self.read(f"/etc/pam.d/common-{kind}")
            expect("system-auth-generic" not in text, f"common-{kind} follows:\n{text}")

    def activate(self, store="Active Directory"):
        self.tslauthctl("activate", store)

    def store(self):
        """What is recorded."""
        return self.ask("status")[1]["recorded"]

    def is_active(self):
        """The provider's entries are in the policy and in the name-service switch."""
        return ("pam_tslauth_winbind.so" in self.read(POLICY)
                and "tslauth_winbind" in self.read("/etc/nsswitch.conf"))
