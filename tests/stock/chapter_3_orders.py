# SPDX-License-Identifier: Apache-2.0
"""In whatever order packages come and go while a directory is active, local users log in."""
from lab import expect, expect_equal
from stock import POLICY, StockHost

TITLE = "Debian 12: every order of packages while \"Active Directory\" is active"


def is_safe(host):
    host.locals_are_well()
    host.wrong_password_is_refused()


def is_none(host):
    """The host lets in its own users, and no entry of the provider is left."""
    services = host.read("/etc/nsswitch.conf")
    expect("tslauth_winbind" not in services, services)
    if host.run("test", "-e", POLICY).code == 0:
        # Entries that an activation makes have this form; those of the set-up stay with it.
        expect("$ISA/pam_tslauth_winbind" not in host.read(POLICY), host.read(POLICY))


def make_active(host):
    """From whatever it was to set up and active."""
    host.install()
    host.set_up()
    host.activate()
    expect(host.is_active(), "it is not active")


def play(lab):
    host = StockHost("orders")
    before = host.read("/etc/nsswitch.conf")
    with lab.step("installed, set up and active: local users log in"):
        make_active(host)
        is_safe(host)
    for name in ("libtslauth1", "libstrandctl1", "tslauthctl", "tslauth-provider-winbind"):
        with lab.step(f"{name} is reinstalled: the store stays active"):
            host.dpkg("-i", *host.files(name))
            expect(host.is_active(), "it is active no longer")
            expect_equal(host.store(), "Active Directory", "the record")
            host.follows()
    with lab.step("ours are upgraded: the store stays active, local users log in"):
        host.dpkg("-i", *(host.newer(name) for name in (
            "libstrandctl1", "libtslauth1", "tslauthctl", "tslauth-provider-winbind")))
        expect(host.is_active(), "it is active no longer")
        expect_equal(host.store(), "Active Directory", "the record")
        host.follows()
        is_safe(host)
    with lab.step("the older ones come back (downgrade)"):
        host.apt("install", "--allow-downgrades",
                 *host.files("libtslauth1", "libstrandctl1", "tslauthctl",
                                                              "tslauth-provider-winbind"))
        expect(host.is_active(), "it is active no longer")
        is_safe(host)

    ways = (
        ("the provider is removed", ("remove", "tslauth-provider-winbind")),
        ("the tool is removed", ("remove", "tslauthctl")),
        ("everything of ours is removed", ("remove", "libstrandctl1")),
        ("the tool is purged", ("purge", "tslauthctl")),
        ("the provider is purged", ("purge", "tslauth-provider-winbind")),
        ("libpam-winbind is removed", ("remove", "libpam-winbind")),
        ("winbind is removed", ("remove", "winbind")),
        ("all of Samba is purged", ("purge", "--autoremove", "samba-common", "libwbclient0")),
        ("the library is purged", ("purge", "--autoremove", "libtslauth1")),
    )
    for text, command in ways:
        with lab.step(f"{text}: back to \"None\" first, local users log in"):
            host.apt(*command)
            is_none(host)
            is_safe(host)
        with lab.step("    installed again, set up and active"):
            make_active(host)
            is_safe(host)
    with lab.step("purged while active: back to \"None\""):
        host.purge()
        is_none(host)
        is_safe(host)
    with lab.step("nsswitch.conf is byte for byte what it was"):
        expect_equal(host.read("/etc/nsswitch.conf"), before, "it")
    with lab.step("no record and no policy is left"):
        host.exits(1, "test", "-e", "/etc/tessel")
        host.exits(1, "test", "-e", POLICY)
    host.down()
