# SPDX-License-Identifier: Apache-2.0
"""Our packages come and go; nobody's log-in changes by it."""
from lab import differences, expect, expect_equal
from stock import POLICY, StockHost

TITLE = "Debian 12: packages alone change nobody's log-in"

# What packages of others write when they come, and take away or leave: accounts that systemd and
# Samba need, and what is made anew whenever something is installed.
OF_OTHERS = ("/etc/group", "/etc/group-", "/etc/gshadow", "/etc/gshadow-", "/etc/passwd-",
             "/etc/shadow-")


def unexpected(before, after):
    """Changes to files that were there before, but for other packages' own."""
    return {path: what for path, what in differences(before, after).items()
            if what != "new" and path not in OF_OTHERS and not before[path].startswith("d")}


def play(lab):
    host = StockHost("packages")
    host.keep_etc("before")
    before = host.etc()
    with lab.step("lena by ssh, root on the console, su: in with their passwords"):
        host.locals_are_well()
    with lab.step("and with no other"):
        host.wrong_passwords_are_refused()
    with lab.step("the packages are installed from files, Samba's from Debian"):
        host.install()
    installed = host.etc()
    with lab.step("no file of /etc that was there has changed"):
        changed = unexpected(before, installed)
        expect(not changed, f"{changed}\n" + host.difference("before", *changed))
    with lab.step("Debian's own winbind profile is off, and stays so when others come"):
        host.ok("pam-auth-update", "--package")
        expect("pam_winbind" not in host.read("/etc/pam.d/common-auth"), "pam_winbind is on")
    with lab.step("our profile is there, and off"):
        host.ok("test", "-s", "/usr/share/pam-configs/tslauth")
        host.follows_no_longer()
        expect(host.run("test", "-e", POLICY).code == 1, f"{POLICY} was made")
    with lab.step("local users log in as before"):
        host.locals_are_well()
        host.wrong_passwords_are_refused()
    with lab.step("what keeps the policy is enabled and waits"):
        host.ok("systemctl", "is-enabled", "tslauth-policy.service", "tslauth-policy.path")
        host.ok("systemctl", "is-active", "tslauth-policy.path")
    with lab.step("dpkg --verify finds nothing"):
        host.verifies()
    with lab.step("the folder of the policy's module paths leads to libpam's modules"):
        host.ok("test", "-e", "/lib/security/lib/security/pam_access.so")
    with lab.step("the tool answers, the provider loads"):
        expect("tslauthctl" in host.tslauthctl("--help").out, "no help")
        missing = host.shell("ldd /usr/libexec/tslauth/libwinbind.so /usr/sbin/tslauthctl").out
        expect("not found" not in missing, missing)
    with lab.step("manual pages are there for what is in sbin"):
        host.ok("man", "-w", "8", "tslauthctl")
    with lab.step("bash completes commands and options by the tool's own help"):
        words = host.shell("""
            source /usr/share/bash-completion/completions/tslauthctl
            COMP_WORDS=(tslauthctl sta) COMP_CWORD=1
            _tslauthctl tslauthctl sta; echo "${COMPREPLY[*]}"
            COMP_WORDS=(tslauthctl join --pass) COMP_CWORD=2; _tslauthctl tslauthctl --pass
            echo "${COMPREPLY[*]}"
            """).out
        expect_equal(words, "status\n--password-stdin --password-file --password-fd\n", "words")
    with lab.step("zsh has its completions as well"):
        host.ok("grep", "-qx", "#compdef tslauthctl",
                "/usr/share/zsh/vendor-completions/_tslauthctl")
    with lab.step("the libraries for 32-bit programs are installed beside them"):
        host.ok("dpkg", "--add-architecture", "i386")
        host.apt("update")
        host.apt("install", *host.files("libtslauth1", "libstrandctl1", architecture="i386"))
        expect(host.installed("libtslauth1:i386") and host.installed("libtslauth1:amd64"),
               "they are not both installed")
        host.ok("test", "-e", "/usr/lib/i386-linux-gnu/libtslauth.so.1")
        missing = host.shell("readelf -d /usr/lib/i386-linux-gnu/libtslauth.so.1 2>/dev/null ||"
                             " /lib/ld-linux.so.2 --list"
                              " /usr/lib/i386-linux-gnu/libtslauth.so.1").out
        expect("not found" not in missing, missing)
    with lab.step("they go again"):
        host.apt("purge", "--autoremove", "libtslauth1:i386", "libstrandctl1:i386")
        expect(host.installed("libtslauth1:amd64"), "the others went as well")
    with lab.step("the packages are removed: local users log in as before"):
        host.apt("remove", "tslauth", "tslauthctl", "tslauth-provider-winbind", "libtslauth1")
        host.locals_are_well()
    with lab.step("they come back"):
        host.install()
        host.locals_are_well()
    with lab.step("all is purged: local users log in as before"):
        host.purge()
        host.locals_are_well()
    with lab.step("every file of /etc that was there is byte for byte what it was"):
        changed = unexpected(before, host.etc())
        expect(not changed, f"{changed}\n" + host.difference("before", *changed))
    with lab.step("nothing of ours is left anywhere"):
        left = host.shell("find / -xdev \\( -path /srv -o -path /proc -o -path /var/log"
                          " -o -path /var/lib/apt \\) -prune"
                           " -o -name '*tslauth*' -print -o -name 'tessel*'"
                          " -print").out
        expect(left in ("",), left)
    host.down()
