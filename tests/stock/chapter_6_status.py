# SPDX-License-Identifier: Apache-2.0
"""What status says of a host that is not as it should be, and what mends it."""
from lab import differences, expect, expect_equal
from stock import POLICY, StockHost

TITLE = "Debian 12: status is the truth, activate and setup mend, unsetup gives all back"

DONE, REFUSED, LOSS, DRIFT, CHANGES, NOT_JOINED = 0, 4, 5, 6, 7, 10
SERVICES = "/etc/nsswitch.conf"


def found(host, code, *words, store="Active Directory"):
    """Status ends with this code and finds exactly these words."""
    result, document = host.ask("status")
    expect_equal(document["recorded"], store, str(result))
    expect_equal([finding["word"] for finding in document["findings"]], list(words), str(result))
    expect_equal(result.code, code, str(result))


def is_mended(host, *command):
    """What is left afterwards is that this host is joined to nothing."""
    host.tslauthctl(*command)
    found(host, NOT_JOINED, "not-joined")


def spoil(host, script, *arguments):
    host.shell(script, *arguments)


def unchanged(host, before):
    changed = differences(before, host.etc())
    expect(not changed, f"{changed}")


def set_up(lab, host):
    before = host.etc()
    with lab.step("plan setup shows every change as a diff, and makes none"):
        result, document = host.ask("plan", "setup", "--provider", "winbind", code=CHANGES)
        expect(any(POLICY == file["path"] and "+auth" in file["diff"].replace("\t", " ")
                   for file in document["files"]), str(result))
        unchanged(host, before)
    with lab.step("set up"):
        host.set_up()
        host.follows()
    after = host.etc()
    with lab.step("a second time nothing has to be changed"):
        host.exits(DONE, "tslauthctl", "plan", "setup", "--provider", "winbind")
        expect("nothing had to be changed" in host.tslauthctl("setup", "--provider", "winbind").out,
               "it changed something")
        unchanged(host, after)
    with lab.step("status finds nothing"):
        found(host, DONE, store="None")


def make_desktop(lab, host):
    """As a desktop has it, with a file of its own."""
    host.apt("install", "libnss-mdns")
    host.shell("""
        sed -i '1i # Kept by hand.' "$1"
        printf 'subid: files # of whom\\n' >>"$1"
        """, SERVICES)
    before = host.read(SERVICES)
    policy = host.read(POLICY)
    with lab.step("a desktop's nsswitch.conf is carried through an activation and back"):
        expect("[NOTFOUND=return]" in before and "gshadow:" in before, before)
        host.activate()
        active = host.read(SERVICES)
        expect(active != before and "[NOTFOUND=return]" in active, active)
        host.activate("None")
        expect_equal(host.read(SERVICES), before, SERVICES)
        expect_equal(host.read(POLICY), policy, POLICY)


def every_word(lab, host):
    host.activate()
    with lab.step("not-joined: exit code 10"):
        found(host, NOT_JOINED, "not-joined")
    with lab.step("not-looked-at, by others than root: nothing is called wrong"):
        result, document = host.ask("status", user="lena")
        expect_equal([finding["word"] for finding in document["findings"]],
                     ["not-joined", "not-looked-at"], str(result))
    with lab.step("services-not-following, where the profile was switched off; setup mends it"):
        spoil(host, "pam-auth-update --package --remove tslauth")
        found(host, DRIFT, *["services-not-following"] * 4, "not-joined")
        is_mended(host, "setup", "--provider", "winbind")
    with lab.step("samba-profile, where a service asks its module; nothing else is called wrong"):
        spoil(host, "cp -p /etc/pam.d/sshd /srv/sshd; sed -i '2i auth sufficient pam_winbind.so'"
                    " /etc/pam.d/sshd")
        found(host, DRIFT, "samba-profile", "not-joined")
        spoil(host, "mv /srv/sshd /etc/pam.d/sshd")
        found(host, NOT_JOINED, "not-joined")
    with lab.step("samba-service, where libnss-winbind has put it in; setup takes it out"):
        host.apt("install", "libnss-winbind")
        found(host, DRIFT, "samba-service", "not-joined")
        is_mended(host, "setup", "--provider", "winbind")
        host.apt("purge", "libnss-winbind")
    with lab.step("module-missing, where the name service's is gone; plan says it as well"):
        spoil(host, "mv /usr/lib/*/libnss_tslauth_winbind.so.2 /srv/")
        found(host, DRIFT, "module-missing", "not-joined")
        planned = host.run("tslauthctl", "plan", "Active Directory")
        expect("libnss_tslauth_winbind" in planned.out + planned.err, str(planned))
        spoil(host, "mv /srv/libnss_tslauth_winbind.so.2 /usr/lib/x86_64-linux-gnu/")
        found(host, NOT_JOINED, "not-joined")
    with lab.step("out of step, where a file was edited; activate finishes it"):
        spoil(host, "sed -i '/^passwd/ s/tslauth_winbind //' \"$1\"", SERVICES)
        result, document = host.ask("status")
        expect_equal((result.code, document["files"][1]["state"]), (DRIFT, "partly"), str(result))
        is_mended(host, "activate", "Active Directory")
    with lab.step("entries-left, after going back by hand; a second activate None finishes it"):
        host.shell('cp -p "$1" "$2" /srv/', POLICY, SERVICES)
        host.activate("None")
        host.shell('cp -p /srv/system-auth-generic "$1"; cp -p /srv/nsswitch.conf "$2"',
                   POLICY, SERVICES)
        found(host, DRIFT, "entries-left", "entries-left", store="None")
        host.activate("None")
        found(host, DONE, store="None")
    with lab.step("entries of a provider that is configured no longer: activate None takes them"):
        host.activate()
        host.shell("echo 'provider = \"gone\"' >/etc/tessel/tslauth/provider.conf")
        result, document = host.ask("status")
        expect_equal(result.code, REFUSED, str(result))
        host.tslauthctl("activate", "None", "--accept-loss")
        text = host.read(SERVICES) + host.read(POLICY)
        expect("tslauth_winbind " not in text.replace("pam_tslauth_winbind.so", ""), text)
        host.set_up()
        found(host, DONE, store="None")
    with lab.step("each change is a line of authpriv: what, the outcome, who"):
        told = host.ok("journalctl", "-q", "SYSLOG_FACILITY=10", "-t", "tslauthctl").out
        expect('change="setup --provider winbind" outcome=done uid=0' in told, told)
        expect("change=\"activate None\" outcome=done" in told, told)
    with lab.step("a command that is no command: the nearest one is named"):
        result = host.run("tslauthctl", "unsetp")
        expect(result.code == 2 and "unsetup" in result.err, str(result))


def give_back(lab, host, before):
    with lab.step("a file that was changed since stays, and unsetup says by how much"):
        spoil(host, 'cp -p "$1" /srv/policy; echo "# mine" >>"$1"', POLICY)
        result, document = host.ask("unsetup", code=LOSS)
        kept = [file for file in document["files"] if file["outcome"] == "changed-since"]
        expect_equal([(file["path"], file["lines_added"]) for file in kept], [(POLICY, 1)],
                     str(result))
        host.locals_are_well()
    with lab.step("once it is as it was made, unsetup has it go"):
        spoil(host, 'cp -p /srv/policy "$1"', POLICY)
        host.tslauthctl("unsetup")
        expect_equal(host.run("test", "-e", POLICY).code, 1, "it is there")
    with lab.step("every file of /etc is byte for byte what it was before setup"):
        changed = differences(before, host.etc())
        expect(not changed, f"{changed}\n" + host.difference("before", *changed))
    with lab.step("local users log in, with their passwords alone"):
        host.locals_are_well()
        host.wrong_password_is_refused()


def copies_and_services(lab, host):
    include = "auth include system-auth-generic"
    with lab.step("copies that dpkg and people leave keep no policy alive"):
        host.shell("""
            for end in dpkg-old dpkg-dist bak; do echo "$1" >"/etc/pam.d/sshd.$end"; done
            /usr/libexec/tslauth/keep-policy""", include)
        expect_equal(host.run("test", "-e", POLICY).code, 1, "it is there")
    with lab.step("a service that includes the policy does: unsetup leaves the default one"):
        host.set_up()
        host.shell('echo "$1" >/etc/pam.d/mine', include)
        _, document = host.ask("unsetup", code=LOSS)
        expect_equal([file["path"] for file in document["files"] if file["outcome"] == "in-use"],
                     [POLICY], "what stays")
        expect("pam_tslauth_winbind" not in host.read(POLICY), "it is the provider's still")
    with lab.step("once it is gone, purge takes the policy away, whatever copies there are"):
        host.ok("rm", "/etc/pam.d/mine")
        host.purge()
        expect_equal(host.run("test", "-e", POLICY).code, 1, "it is there")
        host.locals_are_well()
    with lab.step("while it is there, purge leaves the policy"):
        host.install()
        host.set_up()
        host.shell('echo "$1" >/etc/pam.d/mine', include)
        host.purge()
        host.ok("test", "-s", POLICY)
        host.locals_are_well()


def play(lab):
    host = StockHost("status")
    host.install()
    set_up(lab, host)
    make_desktop(lab, host)
    host.tslauthctl("unsetup")
    before = host.etc()
    host.keep_etc("before")
    host.set_up()
    every_word(lab, host)
    give_back(lab, host, before)
    copies_and_services(lab, host)
    host.down()
