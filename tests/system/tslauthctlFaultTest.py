#!/usr/bin/python3 -B
# SPDX-License-Identifier: Apache-2.0
"""Every command that changes the host, killed or interrupted before each of its changing calls, and
with each of them failing. Without arguments a sample of fixed size is played; tools/faults plays
all of it.

  tslauthctlFaultTest.py [all [COMMAND...]]
"""

import collections
import errno
import os
import pathlib
import re
import shutil
import subprocess
import sys
import tempfile
import unittest

from tslauthctl import *

TREE = pathlib.Path(__file__).parents[2]
INJECT = pathlib.Path(os.environ["TSLAUTH_BUILD"]) / "tests/faults/inject"
KILL = "kill"
ERRORS = (errno.ENOSPC, errno.EIO, errno.EROFS, errno.EACCES, errno.EINTR, errno.EMFILE,
          errno.ENOMEM, errno.EDQUOT)
SIGNALS = ("INT", "TERM", "HUP")
FAULTS = (KILL, *ERRORS, *SIGNALS)
ACCESS = pathlib.Path("/etc/tessel/tslauth/access.conf")
# Whatever a command may write, and the folders in which it may leave something.
PLACES = ("/etc/pam.d", "/etc/nsswitch.conf", "/etc/tessel", "/var/lib/tslauth", "/var/lib/pam",
          "/lib/security/lib")
STATE = pathlib.Path("/var/lib/tslauth")
SERVICE = "fault-test"
# Of all places and faults of a command, every such one is in the sample.
STRIDE = 97


def tree(places=PLACES):
    """Every path below these, with all that a change could change."""
    found = {}
    for place in map(pathlib.Path, places):
        paths = [place, *place.rglob("*")] if place.is_dir() else [place]
        for path in paths:
            if path.is_symlink():
                found[path] = os.readlink(path)
            elif path.is_dir():
                found[path] = "folder"
            elif path.exists():
                status = path.stat()
                found[path] = (path.read_bytes(), status.st_mode & 0o7777, status.st_uid)
    return found


def restore(wanted):
    current = tree()
    for path in sorted(set(current) - set(wanted), reverse=True):
        path.rmdir() if current[path] == "folder" else path.unlink()
    for path, content in sorted(wanted.items()):
        if current.get(path) == content:
            continue
        if content == "folder":
            path.mkdir()
        elif isinstance(content, str):
            path.symlink_to(content)
        else:
            path.write_bytes(content[0])
            os.chmod(path, content[1])
            os.chown(path, content[2], -1)


def is_leftover(path):
    """A new file that never took its place: of a killed process, or of the record's own writer,
    which leaves it where it cannot be renamed."""
    return path.name.startswith(".tslauth-") or \
        re.fullmatch(re.escape(RECORD.name) + r"\.\w{6}", path.name)


def of_the_host(found):
    """Without what the tool remembers for itself, and leftovers."""
    return {path: content for path, content in found.items() if STATE not in path.parents
            and path != STATE and not is_leftover(path)}


def undo_fully():
    """The newest change of the host that is remembered is undone."""
    return run("undo", "--force")


Command = collections.namedtuple("Command", "name prepare arguments")


def set_service_policies(text):
    for path in pathlib.Path("/etc/pam.d").glob("common-*"):
        path.write_text(text)


def plain():
    follow()
    RECORD.parent.mkdir(parents=True, exist_ok=True)
    set_up()
    shutil.rmtree(STATE, ignore_errors=True)
    for name in ("system-auth-generic", SERVICE):
        for kept in pathlib.Path("/etc/pam.d").glob(name + ".tslauth-orig*"):
            kept.unlink()


def active():
    plain()
    assert run("activate", AD).returncode == DONE


def unprepared():
    plain()
    NSS.write_text(PLAIN_NSS + "gshadow: files\n")


def stock():
    plain()
    # Nobody follows the policy yet; pam-auth-update has a test of its own.
    set_service_policies("auth required pam_deny.so\naccount required pam_permit.so\n")
    shutil.rmtree("/etc/tessel")
    PAM.unlink()


def ready():
    stock()
    process = run("setup", "--provider", "example")
    assert process.returncode == DONE, process


COMMANDS = (
    Command("activate", plain, ("activate", AD)),
    Command("deactivate", active, ("activate", "None")),
    Command("prepare", unprepared, ("prepare", "--write")),
    Command("undo", active, ("undo",)),
    Command("permit", ready, ("permit", "--force", "somebody")),
    Command("setup", stock, ("setup", "--provider", "example")),
    Command("unsetup", ready, ("unsetup",)),
)


def local_users_log_in():
    """Root gets through the policy, and the C library resolves root."""
    account = subprocess.run(["pamtester", SERVICE, "root", "acct_mgmt"], stdout=subprocess.PIPE,
                             stderr=subprocess.STDOUT, timeout=60)
    known = subprocess.run(["getent", "passwd", "root"], stdout=subprocess.DEVNULL, timeout=60)
    return account.returncode == 0 and known.returncode == 0


class Play:
    """One command, and what it makes of the host where nothing fails."""

    def __init__(self, command):
        self.command = command
        command.prepare()
        self.before = tree()
        self.calls = self.run(0, KILL)[0]
        self.after = tree()

    def run(self, place, fault):
        with tempfile.NamedTemporaryFile() as report:
            process = subprocess.run(
                [INJECT, report.name, str(place), str(fault), TOOL, *self.command.arguments],
                stdout=subprocess.PIPE, stderr=subprocess.PIPE, timeout=120)
            calls, name, ended = pathlib.Path(report.name).read_text().split()
        return int(calls), name, int(ended), (process.stdout + process.stderr).decode()

    def wrong_after(self, place, fault):
        """What is not as promised, a sentence each."""
        restore(self.before)
        _, name, ended, said = self.run(place, fault)
        found, wrong = tree(), []
        old, new = of_the_host(self.before), of_the_host(self.after)
        host = of_the_host(found)
        for path in sorted(set(host) | set(old)):
            if host.get(path) not in (old.get(path), new.get(path)):
                wrong.append(f"{path} is neither what it was nor what it becomes")
        if not local_users_log_in():
            wrong.append("local users do not log in")
        if fault in SIGNALS and host not in (old, new):
            wrong.append("a signal ends it half way")
        if ended == DONE and host != new:
            wrong.append("it says that it is done, and it is not")
        if fault in ERRORS and ended != DONE and host != old and host != new and \
                "could not be put back" not in said:
            wrong.append(f"it failed half way and does not say so: {said}")
        if run("status").returncode not in (DONE, DRIFT, NOT_JOINED, FAILURE, REFUSED):
            wrong.append("status does not tell")
        return wrong + self.wrong_again(found) + self.wrong_undone(found), name

    def wrong_again(self, found):
        restore(found)
        process = run(*self.command.arguments)
        if process.returncode != DONE:
            return [f"a second time does not end well: {process}"]
        if self.command.name == "undo":
            return []  # each one undoes what is newest then
        ends = of_the_host(tree())
        return [] if ends == of_the_host(self.after) else ["a second time does not end the same"]

    def wrong_undone(self, found):
        """`undo` leads back, where the command has changed anything."""
        restore(found)
        if self.command.name in ("undo", "unsetup") or \
                of_the_host(found) == of_the_host(self.before):
            return []
        process = undo_fully()
        if process.returncode != DONE:
            return [f"undo does not end well: {process}"]
        ends = of_the_host(tree())
        return [] if ends == of_the_host(self.before) else ["undo does not lead back"]


def install():
    """What setting up needs, and a service that follows the policy."""
    share = pathlib.Path("/usr/share/tslauth")
    share.mkdir(parents=True, exist_ok=True)
    shutil.copy(TREE / "etc/system-auth-generic", share)
    for profile in pathlib.Path("/usr/share/pam-configs").glob("tslauth*"):
        profile.unlink()
    pathlib.Path("/etc/pam.d", SERVICE).write_text("@include common-account\n")


def play(command, stride, offset=0):
    """@return the faults that were played, and what went wrong"""
    play = Play(command)
    cases = [(place, fault) for place in range(1, play.calls + 1) for fault in FAULTS]
    wrong = []
    for place, fault in cases[offset::stride]:
        found, name = play.wrong_after(place, fault)
        wrong += [f"{command.name}, call {place} ({name}), {fault}: {each}" for each in found]
    return len(cases[offset::stride]), play.calls, wrong


class Faults(unittest.TestCase):
    def test_a_sample_of_every_command(self):
        for command in COMMANDS:
            with self.subTest(command.name):
                played, calls, wrong = play(command, STRIDE)
                self.assertGreater(played, 0)
                self.assertGreater(calls, 4)
                self.assertEqual([], wrong)


def play_all(names):
    failed = 0
    for command in COMMANDS:
        if names and command.name not in names:
            continue
        played, calls, wrong = play(command, 1)
        for each in wrong:
            print("failed", each, flush=True)
        failed += len(wrong)
        print(f"{command.name}: {calls} changing calls, {played} faults, {len(wrong)} findings",
              flush=True)
    sys.exit(1 if failed else 0)


if __name__ == "__main__":
    if os.environ.get("TSLAUTH_NODE") == "1":
        install()
    if sys.argv[1:2] == ["all"]:
        play_all(sys.argv[2:])
    main()
