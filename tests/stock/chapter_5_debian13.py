# SPDX-License-Identifier: Apache-2.0
"""The main path on Debian 13, whose libpam, Samba and pam-auth-update are other ones."""
from chapter_4_domain import main_path
from lab import PASSWORD, expect
from stock import POLICY, StockHost

TITLE = "Debian 13: the main path"


def play(lab):
    host = StockHost("debian13", release=13)
    with lab.step("local users log in before anything is installed"):
        host.locals_are_well()
        host.wrong_passwords_are_refused()
    with lab.step("the packages are installed from files: local users log in"):
        host.install()
        host.locals_are_well()
        host.follows_no_longer()
    main_path(lab, host)
    with lab.step("set up, its services follow"):
        host.follows()
    with lab.step("libpam-winbind is reinstalled: they still do, and CORP\\user1 logs in"):
        host.apt("install", "--reinstall", "libpam-winbind", "libpam-runtime")
        host.follows()
        expect(host.ssh("CORP\\user1", PASSWORD).code == 0, "user1 is refused")
    with lab.step("the policy is deleted: it is back, and local users never noticed"):
        host.ok("rm", POLICY)
        host.locals_are_well()
        host.ok("test", "-s", POLICY)
    with lab.step("all is purged: local users log in"):
        host.part()
        host.purge()
        host.follows_no_longer()
        host.locals_are_well()
    host.down()
