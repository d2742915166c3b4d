#!/usr/bin/python3 -B
# SPDX-License-Identifier: Apache-2.0
"""What a command keeps before it changes the host, and what `undo` makes of it."""

import os
import pathlib
import shutil
import struct
import subprocess
import unittest

from tslauthctl import *

HISTORY = pathlib.Path("/var/lib/tslauth/history")
HOSTS = pathlib.Path("/etc/hosts")
INSERTED = pathlib.Path("/var/lib/tslauth/inserted")


# What acl(5) calls an access control list, in the kernel's form: another user may read.
LIST = struct.pack("<I", 2) + b"".join(
    struct.pack("<HHI", tag, permissions, user) for tag, permissions, user in (
        (1, 6, 0xffffffff), (2, 4, 54321), (4, 4, 0xffffffff), (16, 4, 0xffffffff),
        (32, 0, 0xffffffff)))


def everything(paths=FILES):
    """All that a snapshot keeps of these paths."""
    found = {}
    for path in paths:
        if path.is_symlink():
            found[path] = os.readlink(path)
        elif path.exists():
            status = path.stat()
            found[path] = (path.read_bytes(), status.st_mode, status.st_uid, status.st_gid,
                           {name: os.getxattr(path, name) for name in os.listxattr(path)})
    return found


def numbers():
    return [change["number"] for change in ask("history")["history"]]


def join(case, secret):
    """Joins the example's domain, by which the hosts file changes."""
    pathlib.Path("/var/lib/tslauth-example/joined").unlink()
    directory = pathlib.Path("/etc/tslauth-example")
    directory.mkdir(exist_ok=True)
    (directory / "accounts").write_text(f"joiner:{secret}\n")
    before = HOSTS.read_bytes()
    case.addCleanup(HOSTS.write_bytes, before)
    case.addCleanup(follow)
    have_management_address(case)
    case.done("join", "example.test", "--user", "joiner", "--password-stdin",
              input=(secret + "\n").encode())
    case.assertNotEqual(before, HOSTS.read_bytes())


class Case(unittest.TestCase):
    def setUp(self):
        set_up()
        follow()
        shutil.rmtree(HISTORY, ignore_errors=True)
        INSERTED.unlink(missing_ok=True)
        self.before = everything()

    def done(self, *arguments, **options):
        document = ask(*arguments, **options)
        self.assertEqual(DONE, document["exit"], document)
        return document


class Remembering(Case):
    def test_a_change_is_remembered_with_who_and_what(self):
        self.done("activate", AD, env={**os.environ, "SUDO_USER": "alice"})
        change, = self.done("history")["history"]
        self.assertEqual(1, change["number"])
        self.assertEqual(f"activate '{AD}' --json", change["command"])
        self.assertEqual(("alice", 0, True),
                         (change["sudo_user"], change["uid"], change["finished"]))
        self.assertLessEqual({str(path) for path in FILES}, set(change["changed"]))
        shown = self.done("history", "show", "1")
        diffs = {file["path"]: file["diff"] for file in shown["files"]}
        self.assertIn('+remote-authentication-store = "Active Directory"', diffs[str(RECORD)])
        self.assertIn(b"alice", run("history").stdout)

    def test_what_changes_nothing_is_not(self):
        for arguments in (("activate", "None"), ("prepare", "--write"), ("unsetup",)):
            self.done(*arguments)
            self.assertEqual([], numbers(), arguments)

    def test_it_is_for_root_alone(self):
        self.done("activate", AD)
        for folder, _, files in os.walk(HISTORY):
            self.assertEqual(0o700, pathlib.Path(folder).stat().st_mode & 0o7777, folder)
            for name in files:
                path = pathlib.Path(folder, name)
                self.assertEqual(0o600, path.stat().st_mode & 0o7777, path)
        for command in (("history",), ("history", "show", "1"), ("undo",), ("undo", "--dry-run")):
            document = ask(*command, preexec_fn=lambda: os.setuid(65534))
            self.assertEqual(NOT_ROOT, document["exit"])

    def test_the_newest_twenty_are_kept(self):
        for i in range(23):
            self.done("activate", (AD, "None")[i % 2])
        self.assertEqual(list(range(4, 24)), numbers())
        self.assertEqual(USAGE, ask("undo", "3")["exit"])
        self.done("undo", "5")
        self.assertEqual(list(range(5, 25)), numbers())

    def test_without_room_for_it_nothing_is_changed(self):
        HISTORY.mkdir(parents=True, exist_ok=True)
        subprocess.run(["mount", "-t", "tmpfs", "-o", "size=8k", "none", HISTORY], check=True)
        try:
            subprocess.run(["dd", "if=/dev/zero", f"of={HISTORY}/filler", "bs=4k"],
                           stderr=subprocess.DEVNULL)
            document = ask("activate", AD)
            self.assertEqual(FAILURE, document["exit"])
            self.assertIn("Nothing was changed", document["error"]["message"])
            self.assertEqual(self.before, everything())
            self.assertEqual(["filler"], os.listdir(HISTORY))
        finally:
            subprocess.run(["umount", HISTORY], check=True)
        self.done("activate", AD)

    def test_a_password_is_no_part_of_it(self):
        secret = "canary-7f3a"
        join(self, secret)
        self.assertEqual([1], numbers())
        found = subprocess.run(["grep", "-r", secret, "/var/lib/tslauth"], stdout=subprocess.PIPE)
        self.assertEqual((1, b""), (found.returncode, found.stdout))

    def test_the_files_can_be_copied_back_by_hand(self):
        os.chmod(NSS, 0o640)
        before = everything()
        self.done("activate", AD)
        for path in FILES:
            subprocess.run(["cp", f"{HISTORY}/1/before{path}", path.parent], check=True)
        self.assertEqual(before, everything())

    def test_what_cannot_be_read_is_named_and_the_rest_is_there(self):
        self.done("activate", AD)
        self.done("activate", "None")
        (HISTORY / "1/record.json").write_text("{")
        document = self.done("history")
        self.assertEqual([2], [change["number"] for change in document["history"]])
        self.assertIn("change 1", document["unreadable"][0])
        self.done("undo")
        self.assertIn(AD, RECORD.read_text())


class Undo(Case):
    def test_it_restores_all_that_a_file_has(self):
        os.chown(NSS, 12, 34)
        os.chmod(NSS, 0o640)
        os.setxattr(NSS, "system.posix_acl_access", LIST)
        real = pathlib.Path("/etc/policy-elsewhere")
        PAM.rename(real)
        PAM.symlink_to("../policy-elsewhere")
        self.addCleanup(PAM.unlink)
        paths = (*FILES, real)
        before = everything(paths)
        self.done("activate", AD)
        after = everything(paths)
        self.assertNotEqual(before, after)
        # What another tool would leave: the bytes alone.
        text = NSS.read_bytes()
        document = self.done("undo")
        self.assertEqual(before, everything(paths))
        self.assertFalse(INSERTED.exists())
        self.assertTrue(document["undone"])
        self.done("undo")
        self.assertEqual(after, everything(paths), "undone again")
        NSS.unlink()
        NSS.write_bytes(text)
        refused = ask("undo", "1")
        self.assertEqual(LOSS, refused["exit"])
        self.done("undo", "1", "--force")
        self.assertEqual(before, everything(paths))

    def test_a_preview_changes_nothing(self):
        self.done("activate", AD)
        after = everything()
        document = ask("undo", "--dry-run")
        self.assertEqual(CHANGES, document["exit"])
        self.assertFalse(document["undone"])
        self.assertLessEqual({str(path) for path in FILES},
                             {file["path"] for file in document["files"]})
        self.assertEqual(after, everything())
        self.assertEqual([1], numbers())

    def test_it_goes_back_over_several_changes(self):
        self.done("activate", AD)
        self.done("activate", "None")
        self.done("activate", AD)
        self.done("undo", "1")
        self.assertEqual(self.before, everything())
        self.assertEqual(DONE, ask("status")["exit"])
        self.assertIn("nothing had to be changed", run("undo", "1").stdout.decode())

    def test_what_others_have_edited_is_named_and_refused(self):
        self.done("activate", AD)
        NSS.write_text(NSS.read_text() + "# mine\n")
        edited = everything()
        document = ask("undo")
        self.assertEqual(LOSS, document["exit"])
        self.assertEqual([str(NSS)],
                         [file["path"] for file in document["files"] if file["edited_since"]])
        self.assertIn(str(NSS).encode(), run("undo").stderr)
        self.assertEqual(edited, everything())
        self.done("undo", "--force")
        self.assertEqual(self.before, everything())
        self.done("undo")
        self.assertEqual(edited, everything(), "the edit was remembered")

    def test_a_membership_is_more_than_files(self):
        self.done("activate", AD)
        join(self, "secret")
        joined = HOSTS.read_bytes()
        refused = ask("undo")
        self.assertEqual(REFUSED, refused["exit"])
        self.assertIn("tslauthctl part", refused["error"]["message"])
        document = self.done("undo", "1")
        self.assertEqual([2], [each["number"] for each in document["memberships"]])
        self.assertEqual((self.before, joined), (everything(), HOSTS.read_bytes()))
        self.done("undo", "2", "--force")
        self.assertNotEqual(joined, HOSTS.read_bytes())

    def test_there_may_be_nothing_to_undo(self):
        self.assertEqual(REFUSED, ask("undo")["exit"])
        self.assertEqual(USAGE, ask("undo", "7")["exit"])
        self.assertEqual(USAGE, ask("history", "show", "7")["exit"])
        self.assertIn(b"No change", run("history").stdout)

    def test_what_a_killed_command_left_is_undone_without_force(self):
        self.done("activate", AD)
        (HISTORY / "1/after.json").unlink()
        NSS.write_text(PLAIN_NSS)
        self.assertFalse(self.done("history")["history"][0]["finished"])
        self.assertIn(b"interrupted", run("history").stdout)
        self.done("undo")
        self.assertEqual(self.before, everything())


if __name__ == "__main__":
    main()
