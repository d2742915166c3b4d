#!/usr/bin/python3 -B
# SPDX-License-Identifier: Apache-2.0
"""A Debian host is set up for the provider `winbind` and becomes what it was again: with the real
libpam, pam-auth-update and modules, but for Samba's module and the program that asks the domain,
which are played. The users of the domain come from a file."""

import fcntl
import os
import pathlib
import shutil
import subprocess
import unittest

from tslauthctl import *

TREE = pathlib.Path(__file__).parents[2]
BUILD = pathlib.Path(os.environ["TSLAUTH_BUILD"])
ACCESS = pathlib.Path("/etc/tessel/tslauth/access.conf")
STATE = pathlib.Path("/var/lib/tslauth/setup")
LINK = pathlib.Path("/lib/security/lib/security")
PROFILES = pathlib.Path("/usr/share/pam-configs")
SERVICE = "setup-test"
DIRECT = "setup-test-direct"
USER = "CORP\\Ann Lee"
GROUP = "CORP\\domain users"
# A group that winbindd tells of as of a user as well.
KEEPERS = "CORP\\door keepers"

STOCK_NSS = """# /etc/nsswitch.conf

passwd:         files extrausers winbind
group:          files extrausers winbind
shadow:         files
gshadow:        files

hosts:          files mdns4_minimal [NOTFOUND=return] dns
"""

SAMBA_PROFILE = """Name: Samba's, played
Default: yes
Priority: 192
Auth-Type: Primary
Auth:
\t[success=end default=ignore]\tpam_winbind.so try_first_pass
Account-Type: Primary
Account:
\t[success=end new_authtok_reqd=done default=ignore]\tpam_winbind.so
"""


def play_domain(answer):
    program = pathlib.Path("/usr/libexec/tslauth/winbind-account")
    program.write_text(f"#!/bin/sh\necho \"$*\" >>/run/asked\necho {answer}\n")
    program.chmod(0o755)


def log_in(user, *operations, password="", service=SERVICE):
    """What pamtester says, and whether everything was let through."""
    process = subprocess.run(["pamtester", service, user, *operations], timeout=60, text=True,
                             input=password + "\n", stdout=subprocess.PIPE,
                             stderr=subprocess.STDOUT)
    return process.returncode == 0


def install():
    """What the packages would bring."""
    modules = pathlib.Path(subprocess.run(
        ["find", "/usr/lib", "-path", "*/security/pam_permit.so", "-print", "-quit"], text=True,
        check=True, stdout=subprocess.PIPE).stdout.strip()).parent
    for folder in ("lib", "usr"):
        shutil.rmtree(modules / folder, ignore_errors=True)
    for name in ("pam_tslauth_winbind.so", "pam_winbind.so"):
        shutil.copy(BUILD / "providers/modules" / name, modules)
    pathlib.Path("/usr/share/tslauth/setup").mkdir(parents=True)
    shutil.copy(TREE / "etc/system-auth-generic", "/usr/share/tslauth")
    shutil.copy(TREE / "providers/winbind/setup.conf", "/usr/share/tslauth/setup/winbind.conf")
    for profile in (TREE / "etc/pam-configs").iterdir():
        shutil.copy(profile, PROFILES)
    (PROFILES / "winbind").write_text(SAMBA_PROFILE)
    subprocess.run(["pam-auth-update", "--enable", "winbind"], check=True,
                   env={**os.environ, "DEBIAN_FRONTEND": "noninteractive"})


def populate():
    pathlib.Path("/etc/pam.d", SERVICE).write_text(
        "@include common-auth\n@include common-account\n@include common-password\n"
        "session required pam_permit.so\n@include common-session\n")
    subprocess.run(["useradd", "--create-home", "lena"], check=True)
    subprocess.run(["chpasswd"], input="lena:local secret\n", text=True, check=True)
    extra = pathlib.Path("/var/lib/extrausers")
    extra.mkdir(exist_ok=True)
    (extra / "passwd").write_text(
        f"{USER}:*:7001:7001::/home/CORP/ann:/bin/bash\n"
        "CORP\\other:*:7002:7001::/home/other:/bin/sh\n"
        f"{KEEPERS}:*:7003:7003::/home/CORP/keepers:/bin/sh\n")
    (extra / "group").write_text(f"{GROUP}:x:7001:\n{KEEPERS}:x:7003:\n")


def leave_stock_host():
    """A host where nobody has set up anything."""
    shutil.rmtree("/etc/tessel", ignore_errors=True)
    shutil.rmtree(STATE.parent, ignore_errors=True)
    PAM.unlink(missing_ok=True)
    NSS.write_text(STOCK_NSS)
    pathlib.Path("/run/asked").unlink(missing_ok=True)
    play_domain("in-order")


def removal_script():
    """As debian/rules makes it."""
    keep = (TREE / "etc/keep-policy").read_text()
    included = keep[keep.index("included() {"):]
    included = included[:included.index("\n}\n") + len("\n}\n")]
    return (TREE / "debian/tslauthctl.postrm").read_text().replace("#INCLUDED#", included)


def etc():
    """Every file of /etc: its bytes, or where it leads."""
    found = {}
    for folder, folders, names in os.walk("/etc"):
        for name in names + folders:
            path = pathlib.Path(folder, name)
            if path.is_symlink():
                found[path] = os.readlink(path)
            elif path.is_file():
                found[path] = (path.read_bytes(), path.stat().st_mode, path.stat().st_uid)
            else:
                found[path] = "folder"
    return found


class SetupTest(unittest.TestCase):
    def setUp(self):
        leave_stock_host()
        self.before = etc()

    def tearDown(self):
        self.assertIn(run("unsetup").returncode, (DONE, LOSS))
        shutil.rmtree(STATE, ignore_errors=True)
        subprocess.run(["pam-auth-update", "--force", "--disable", "tslauth", "tslauth-password",
                        "--enable", "winbind"], check=True, stdout=subprocess.DEVNULL,
                       env={**os.environ, "DEBIAN_FRONTEND": "noninteractive"})

    def set_up(self):
        document = ask("setup", "--provider", "winbind")
        self.assertEqual(document["exit"], DONE, document)
        return document

    def set_up_and_activate(self):
        self.set_up()
        self.assertEqual(ask("activate", AD)["exit"], DONE)

    def include_directly(self):
        """A service of this host that includes the policy by itself."""
        path = pathlib.Path("/etc/pam.d", DIRECT)
        path.write_text(
            "auth include system-auth-generic\naccount include system-auth-generic\n")
        self.addCleanup(path.unlink, missing_ok=True)
        return path

    def local_users_log_in(self, *services):
        for service in services:
            self.assertTrue(log_in("lena", "authenticate", "acct_mgmt", password="local secret",
                                   service=service), service)
            self.assertFalse(log_in("lena", "authenticate", password="wrong", service=service))
            self.assertTrue(log_in("root", "acct_mgmt", service=service), service)

    def test_the_plan_shows_what_setup_does_and_changes_nothing(self):
        plan = ask("plan", "setup", "--provider", "winbind")
        self.assertEqual(plan["exit"], CHANGES)
        self.assertEqual(etc(), self.before)
        self.assertIn(str(LINK), [link["path"] for link in plan["links"]])
        done = self.set_up()
        for field in ("files", "links", "profiles_on", "profiles_off"):
            self.assertEqual(done[field], plan[field])
        self.assertEqual(done["profiles_on"], ["tslauth", "tslauth-password"])
        self.assertEqual(done["profiles_off"], ["winbind"])
        self.assertTrue((LINK / "pam_access.so").exists())

    def test_status_finds_nothing_of_a_store_in_a_host_that_is_set_up(self):
        self.set_up()
        document = ask("status")
        self.assertEqual(document["exit"], DONE, document)
        self.assertEqual([finding["word"] for finding in document["findings"]], [])

    def words(self):
        return [finding["word"] for finding in ask("status")["findings"]]

    def test_status_passes_over_copies_of_policies(self):
        self.set_up_and_activate()
        copy = pathlib.Path("/etc/pam.d/common-auth.pam-old")
        copy.write_text("auth sufficient pam_winbind.so\n")
        words = [finding["word"] for finding in ask("status")["findings"]]
        copy.rename(copy.with_suffix(".in-use"))
        told = [finding["word"] for finding in ask("status")["findings"]]
        copy.with_suffix(".in-use").unlink()
        self.assertNotIn("samba-profile", words)
        self.assertIn("samba-profile", told)

    def test_a_second_setup_changes_nothing(self):
        self.set_up()
        first = etc()
        self.assertEqual(ask("plan", "setup", "--provider", "winbind")["exit"], DONE)
        document = self.set_up()
        self.assertFalse(any(file["changed"] for file in document["files"]))
        self.assertEqual(etc(), first)
        self.assertEqual(ask("activate", AD)["exit"], DONE)
        self.assertEqual(ask("plan", "setup", "--provider", "winbind")["exit"], DONE)

    def test_unsetup_restores_every_byte_of_etc(self):
        self.set_up_and_activate()
        self.assertEqual(ask("permit", USER)["exit"], DONE)
        document = ask("unsetup")
        self.assertEqual(document["exit"], DONE, document)
        self.assertEqual(etc(), self.before)
        self.assertFalse(LINK.exists())
        self.assertFalse(STATE.exists())
        self.assertIn("pam_winbind.so", pathlib.Path("/etc/pam.d/common-auth").read_text())
        self.assertEqual(ask("unsetup")["exit"], DONE)
        self.assertEqual(etc(), self.before)

    def test_a_setup_that_mends_an_active_host_is_undone_like_the_first_one(self):
        self.set_up_and_activate()
        NSS.write_text(NSS.read_text().replace("extrausers", "extrausers winbind"))
        self.assertIn("samba-service", self.words())
        self.set_up()
        self.assertNotIn("samba-service", self.words())
        self.assertEqual(ask("unsetup")["exit"], DONE)
        self.assertEqual(etc(), self.before)

    def test_setting_up_and_taking_it_back_can_be_undone(self):
        self.set_up()
        ready = etc()
        self.assertEqual(ask("undo")["exit"], DONE)
        self.assertEqual(etc(), self.before)
        self.assertFalse(LINK.exists())
        self.assertFalse(STATE.exists())
        self.assertTrue(log_in("lena", "authenticate", "acct_mgmt", password="local secret"))
        self.set_up_and_activate()
        self.assertEqual(ask("permit", USER)["exit"], DONE)
        active = etc()
        self.assertEqual(ask("unsetup")["exit"], DONE)
        leaving = [change["number"] for change in ask("history")["history"]
                   if change["command"].startswith("unsetup")]
        self.assertEqual(len(leaving), 2, "the store's deactivation is a change of its own")
        self.assertEqual(ask("undo", str(leaving[0]))["exit"], DONE)
        self.assertEqual(etc(), active)
        self.assertTrue(log_in(USER, "authenticate", "acct_mgmt"))
        self.local_users_log_in(SERVICE)
        self.assertNotEqual(active, ready)

    def test_what_was_changed_since_stays_and_is_told(self):
        self.set_up()
        NSS.write_text(NSS.read_text().replace("gshadow:        files\n", "").replace(
            "hosts:          files", "hosts:          files myhostname"))
        changed = NSS.read_bytes()
        self.assertEqual(ask("plan", "unsetup")["exit"], CHANGES)
        document = ask("unsetup")
        self.assertEqual(document["exit"], LOSS)
        outcomes = {file["path"]: file for file in document["files"]}
        self.assertEqual(outcomes[str(NSS)]["outcome"], "changed-since")
        self.assertEqual(outcomes[str(NSS)]["lines_added"], 1)
        self.assertEqual(outcomes[str(NSS)]["lines_removed"], 2)
        self.assertEqual(outcomes[str(PAM)]["outcome"], "removed")
        self.assertEqual(NSS.read_bytes(), changed)
        self.assertEqual((STATE / "before/etc/nsswitch.conf").read_text(), STOCK_NSS)
        after = etc()
        del after[NSS], self.before[NSS]
        self.assertEqual(after, self.before)

    def test_the_policy_stays_while_a_service_includes_it(self):
        self.set_up()
        direct = self.include_directly()
        planned = {file["path"]: file["outcome"] for file in ask("plan", "unsetup")["files"]}
        self.assertEqual(planned[str(PAM)], "in-use")
        self.assertEqual(ask("activate", AD)["exit"], DONE)
        said = run("unsetup")
        self.assertEqual(said.returncode, LOSS)
        self.assertIn(f"included by '{direct}'", (said.stdout + said.stderr).decode())
        self.assertEqual(PAM.read_text(), (TREE / "etc/system-auth-generic").read_text())
        self.local_users_log_in(DIRECT)
        self.assertFalse(log_in(USER, "acct_mgmt", service=DIRECT))
        direct.rename(direct.with_suffix(".dpkg-old"))
        self.addCleanup(direct.with_suffix(".dpkg-old").unlink)
        self.assertEqual(ask("unsetup")["exit"], DONE)
        self.assertFalse(PAM.exists())
        self.assertFalse(STATE.exists())

    def test_purging_removes_the_policy_that_stayed_once_nothing_includes_it(self):
        for included in (False, True):
            leave_stock_host()
            self.set_up()
            direct = self.include_directly()
            self.assertEqual(ask("unsetup")["exit"], LOSS)
            if not included:
                direct.unlink()
            purge = subprocess.run(["sh", "-c", removal_script(), "postrm", "purge"], check=True,
                                   text=True, stderr=subprocess.PIPE)
            self.assertEqual((PAM.exists(), f"{PAM} stays" in purge.stderr), (included, included))

    def test_the_policy_stays_while_pam_auth_update_leaves_edited_files_alone(self):
        self.set_up()
        account = pathlib.Path("/etc/pam.d/common-account")
        text = account.read_text()
        account.write_text(text.replace("# here are the per-package modules", "# here were"))
        document = ask("unsetup")
        self.assertEqual(document["exit"], LOSS)
        outcomes = {file["path"]: file["outcome"] for file in document["files"]}
        self.assertEqual(outcomes[str(PAM)], "in-use")
        self.assertEqual(outcomes[str(account)], "changed-since")
        self.assertIn("system-auth-generic", account.read_text())
        self.assertTrue(log_in("lena", "acct_mgmt"))
        self.assertTrue(log_in("root", "acct_mgmt"))
        self.assertFalse(log_in(USER, "acct_mgmt"))

    def test_where_none_would_lose_something_nothing_is_unset(self):
        self.set_up_and_activate()
        first = "auth\t[success=1"
        # To the denial, over the provider's entry.
        jump = "auth\t[success=4 default=ignore]\tpam_debug.so\n"
        PAM.write_text(PAM.read_text().replace(first, jump + first, 1))
        before = etc()
        self.assertEqual(ask("activate", "None")["exit"], LOSS)
        self.assertEqual(ask("unsetup")["exit"], REFUSED)
        self.assertEqual(etc(), before)
        self.assertTrue(STATE.exists())
        self.assertEqual(ask("activate", "None", "--accept-loss")["exit"], DONE)

    def test_local_users_log_in_as_before_and_are_never_asked_about(self):
        for prepare in (self.set_up, lambda: ask("activate", AD)):
            prepare()
            self.assertTrue(log_in("lena", "authenticate", "acct_mgmt", "open_session",
                                   password="local secret"))
            self.assertFalse(log_in("lena", "authenticate", password="wrong"))
            self.assertTrue(log_in("root", "acct_mgmt"))
        self.include_directly()
        self.local_users_log_in(SERVICE, DIRECT)
        self.assertFalse(pathlib.Path("/run/asked").exists())

    def test_without_the_providers_module_local_users_log_in_and_nobody_of_the_domain(self):
        self.set_up_and_activate()
        self.assertEqual(ask("permit", USER)["exit"], DONE)
        self.include_directly()
        module = next(pathlib.Path("/usr/lib").glob("*/security/pam_tslauth_winbind.so"))
        away = module.rename(module.with_suffix(".away"))
        try:
            for service in (SERVICE, DIRECT):
                self.assertTrue(log_in("root", "acct_mgmt", service=service), service)
                self.assertFalse(log_in(USER, "acct_mgmt", service=service), service)
        finally:
            away.rename(module)

    def test_nobody_of_the_domain_logs_in_until_permitted(self):
        self.set_up_and_activate()
        self.assertFalse(log_in(USER, "authenticate"))
        self.assertFalse(log_in(USER, "acct_mgmt"), "a key asks nothing else")
        self.assertEqual(ask("permit", USER)["exit"], DONE)
        self.assertTrue(log_in(USER, "authenticate", "acct_mgmt"))
        self.assertTrue(log_in(USER, "acct_mgmt"))
        self.assertFalse(log_in("CORP\\other", "acct_mgmt"))
        self.assertEqual(ask("permit", GROUP)["exit"], DONE)
        self.assertTrue(log_in("CORP\\other", "acct_mgmt"))
        self.assertEqual(ask("deny", USER)["exit"], DONE)
        self.assertFalse(log_in(USER, "authenticate", "acct_mgmt"))
        self.assertTrue(log_in("CORP\\other", "acct_mgmt"))
        self.assertEqual(ask("deny", "--all")["exit"], DONE)
        self.assertFalse(log_in("CORP\\other", "acct_mgmt"))

    def test_whom_the_domain_has_disabled_is_refused_with_a_key_as_well(self):
        self.set_up_and_activate()
        self.assertEqual(ask("permit", USER)["exit"], DONE)
        for answer in ("disabled", "locked-out", "expired", "gibberish"):
            play_domain(answer)
            self.assertFalse(log_in(USER, "acct_mgmt"), answer)
        play_domain("in-order")
        self.assertTrue(log_in(USER, "acct_mgmt"))

    def test_nobody_of_the_domain_logs_in_while_none_is_active(self):
        self.set_up_and_activate()
        self.assertEqual(ask("permit", USER)["exit"], DONE)
        self.assertEqual(ask("activate", "None")["exit"], DONE)
        self.assertFalse(log_in(USER, "authenticate", password="any"))
        self.assertFalse(log_in(USER, "acct_mgmt"))

    def test_the_home_directory_is_made_at_the_first_log_in(self):
        self.set_up_and_activate()
        self.assertEqual(ask("permit", USER)["exit"], DONE)
        home = pathlib.Path("/home/CORP/ann")
        self.assertFalse(home.exists())
        self.assertTrue(log_in(USER, "open_session"))
        self.assertEqual(home.stat().st_mode & 0o7777, 0o700)
        self.assertEqual(home.stat().st_uid, 7001)

    def test_passwords_are_changed_where_they_are_kept(self):
        self.set_up_and_activate()
        self.assertTrue(log_in("lena", "chauthtok", password="another secret\nanother secret"))
        self.assertTrue(log_in("lena", "authenticate", password="another secret"))
        self.assertFalse(log_in("lena", "authenticate", password="local secret"))
        self.assertTrue(log_in("lena", "chauthtok", password="local secret\nlocal secret"))
        self.assertTrue(log_in(USER, "chauthtok"), "Samba's module takes every change")

    def test_activate_and_back_loses_nothing(self):
        self.set_up()
        before = texts()
        self.assertEqual(ask("activate", AD)["exit"], DONE)
        self.assertIn(b"passwd:         tslauth_winbind files extrausers\n", NSS.read_bytes())
        self.assertEqual(ask("activate", "None")["exit"], DONE)
        self.assertEqual(texts(), before)

    def test_sambas_profile_that_comes_back_is_switched_off_again(self):
        self.set_up()
        (PROFILES / "winbind").write_text(SAMBA_PROFILE)
        auth = pathlib.Path("/etc/pam.d/common-auth")
        subprocess.run(["pam-auth-update", "--disable", "tslauth", "tslauth-password", "--enable",
                        "winbind"], check=True,
                       env={**os.environ, "DEBIAN_FRONTEND": "noninteractive"})
        self.assertIn("pam_winbind.so", auth.read_text())
        self.set_up()
        self.assertNotIn("pam_winbind.so", auth.read_text())
        self.assertIn("system-auth-generic", auth.read_text())

    def test_service_policies_that_were_edited_by_hand_are_named(self):
        auth = pathlib.Path("/etc/pam.d/common-auth")
        text = auth.read_text()
        auth.write_text(text.replace("# here are the per-package modules", "# here were"))
        document = ask("setup", "--provider", "winbind")
        self.assertEqual(document["exit"], REFUSED)
        self.assertIn(str(auth), document["error"]["message"])
        self.assertTrue(log_in("lena", "authenticate", "acct_mgmt", password="local secret"))
        auth.write_text(text)

    def test_a_host_whose_store_is_active_keeps_what_it_stands_on(self):
        self.set_up_and_activate()
        PAM.write_text(PLAIN_PAM)
        document = ask("setup", "--provider", "winbind")
        self.assertEqual(document["exit"], REFUSED)
        self.assertEqual(PAM.read_text(), PLAIN_PAM)

    def test_a_provider_that_is_not_installed_is_refused(self):
        for name, code in (("absent", REFUSED), ("../winbind", USAGE)):
            self.assertEqual(ask("setup", "--provider", name)["exit"], code)
        self.assertEqual(etc(), self.before)

    def test_names_that_nobody_knows_are_refused_unless_forced(self):
        self.set_up_and_activate()
        before = ACCESS.read_bytes()
        for name in ("nobody-knows-it", "lena", "root"):
            self.assertEqual(ask("permit", name)["exit"], REFUSED, name)
        self.assertEqual(ask("permit", "--force", "a,b")["exit"], REFUSED)
        for arguments in (("permit",), ("permit", "--all", USER), ("permit", "--trusted", USER)):
            self.assertEqual(ask(*arguments)["exit"], USAGE)
        self.assertEqual(ACCESS.read_bytes(), before)
        self.assertEqual(ask("permit", "--force", "nobody-knows-it")["exit"], DONE)
        self.assertIn(b"+:nobody-knows-it:ALL\n", ACCESS.read_bytes())

    def test_the_name_service_is_asked_before_other_changes_are_waited_for(self):
        self.set_up_and_activate()
        with open(LOCK, "a") as lock:
            fcntl.flock(lock, fcntl.LOCK_EX)
            self.assertEqual(ask("permit", "nobody-knows-it")["exit"], REFUSED)

    def test_permissions_are_previewed_listed_and_given_once(self):
        self.set_up_and_activate()
        before = ACCESS.read_bytes()
        plan = ask("plan", "permit", USER, f"({GROUP})")
        self.assertEqual(plan["exit"], CHANGES)
        self.assertEqual(ACCESS.read_bytes(), before)
        done = ask("permit", USER, f"({GROUP})")
        self.assertEqual(done["diff"], plan["diff"])
        self.assertFalse(ask("permit", USER, f"({GROUP})")["changed"])
        listed = ask("permit", "--list")
        self.assertEqual(
            [(rule["permits"], rule["names"]) for rule in listed["rules"]],
            [(True, [{"name": USER, "group": False}]), (True, [{"name": GROUP, "group": True}]),
             (False, [{"name": "ALL", "group": False}])])
        self.assertFalse(listed["by_default"])
        self.assertEqual(ask("permit", "--all", "--trusted")["exit"], DONE)
        self.assertTrue(ask("permit", "--list")["by_default"])

    def test_a_group_that_is_told_of_as_a_user_too_is_permitted_as_a_group(self):
        self.set_up_and_activate()
        self.assertEqual(ask("permit", KEEPERS)["exit"], DONE)
        self.assertIn(f"+:({KEEPERS}):ALL\n", ACCESS.read_text())

    def test_without_setup_nobody_is_permitted(self):
        self.assertEqual(ask("permit", "--force", USER)["exit"], REFUSED)
        self.assertEqual(ask("permit", "--list")["exit"], REFUSED)

    def test_only_root_changes_the_host(self):
        for arguments in (("setup", "--provider", "winbind"), ("unsetup",), ("permit", USER)):
            process = subprocess.run(["setpriv", "--reuid", "65534", TOOL, *arguments],
                                     stderr=subprocess.PIPE, timeout=60)
            self.assertEqual(process.returncode, NOT_ROOT)


if __name__ == "__main__":
    if os.environ.get("TSLAUTH_NODE") == "1":
        install()
        populate()
    main()
