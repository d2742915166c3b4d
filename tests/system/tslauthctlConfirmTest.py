#!/usr/bin/python3 -B
# SPDX-License-Identifier: Apache-2.0
"""A change that is undone by itself unless somebody confirms it in time."""

import json
import os
import pathlib
import shutil
import signal
import subprocess
import time
import unittest

from tslauthctl import *

STATE = pathlib.Path("/var/lib/tslauth")
OPEN = STATE / "confirmation.json"


class Confirm(unittest.TestCase):
    def setUp(self):
        set_up()
        follow()
        shutil.rmtree(STATE, ignore_errors=True)
        self.before = texts()

    def tearDown(self):
        OPEN.unlink(missing_ok=True)

    def wait_until_undone(self):
        end = time.monotonic() + 30
        while OPEN.exists() and time.monotonic() < end:
            time.sleep(0.05)
        self.assertFalse(OPEN.exists())
        self.assertEqual(self.before, texts())
        self.assertEqual(DONE, ask("status")["exit"])

    def test_what_nobody_confirms_is_undone(self):
        document = ask("activate", AD, "--confirm-within", "5")
        self.assertEqual((DONE, {"number": 1, "seconds": 5}),
                         (document["exit"], document["confirm"]))
        self.assertNotEqual(self.before, texts())
        self.wait_until_undone()

    def test_what_is_confirmed_stays(self):
        process = run("activate", AD, "--confirm-within", "3000")
        self.assertIn(b"tslauthctl confirm", process.stdout)
        after = texts()
        self.assertEqual(1, ask("confirm")["number"])
        # What is started when the time is over.
        self.assertEqual(DONE, ask("undo", "--unconfirmed")["exit"])
        self.assertEqual(after, texts())
        self.assertEqual(REFUSED, ask("confirm")["exit"])

    def test_the_session_that_made_it_may_be_gone(self):
        shell = subprocess.Popen(["sh", "-c", '"$0" activate "Active Directory" --confirm-within 5 '
                                  '>/dev/null; sleep 60', TOOL], start_new_session=True)
        end = time.monotonic() + 30
        while self.before == texts() and time.monotonic() < end:
            time.sleep(0.02)
        self.assertNotEqual(self.before, texts())
        for number in (signal.SIGHUP, signal.SIGKILL):
            os.killpg(shell.pid, number)
        shell.wait()
        self.wait_until_undone()

    def test_a_restart_undoes_it_whatever_time_is_left(self):
        self.assertEqual(DONE, ask("activate", AD, "--confirm-within", "3000")["exit"])
        self.assertEqual(DONE, ask("undo", "--unconfirmed")["exit"])
        self.assertNotEqual(self.before, texts(), "it is not due")
        OPEN.write_text(json.dumps({**json.loads(OPEN.read_text()), "boot": "the one before"}))
        self.assertEqual(DONE, ask("undo", "--unconfirmed")["exit"])
        self.assertFalse(OPEN.exists())
        self.assertEqual(self.before, texts())
        self.assertEqual(DONE, ask("undo", "--unconfirmed")["exit"])

    def test_status_tells_of_it_and_nothing_else_changes_meanwhile(self):
        self.assertEqual(DONE, ask("activate", AD, "--confirm-within", "3000")["exit"])
        open_one = ask("status")["confirm"]
        self.assertEqual(1, open_one["number"])
        self.assertIn(open_one["seconds"], range(2900, 3001))
        document = ask("activate", "None")
        self.assertEqual(REFUSED, document["exit"])
        self.assertIn("tslauthctl confirm", document["error"]["message"])
        self.assertEqual(DONE, ask("undo")["exit"])
        self.assertFalse(OPEN.exists())
        self.assertEqual(self.before, texts())

    def test_what_changes_nothing_waits_for_nobody(self):
        document = ask("activate", "None", "--confirm-within", "3000")
        self.assertEqual(DONE, document["exit"])
        self.assertNotIn("confirm", document)
        self.assertFalse(OPEN.exists())

    def test_what_cannot_be_read_is_in_nobodys_way_for_ever(self):
        OPEN.parent.mkdir(parents=True, exist_ok=True)
        OPEN.write_text("{")
        self.assertEqual(FAILURE, ask("activate", AD)["exit"])
        self.assertEqual(FAILURE, ask("confirm")["exit"])
        self.assertEqual(REFUSED, ask("confirm")["exit"])
        self.assertEqual(DONE, ask("activate", AD)["exit"])

    def test_seconds_are_some(self):
        for seconds in ("0", "-1", "x", "86401"):
            self.assertEqual(USAGE, ask("activate", AD, "--confirm-within", seconds)["exit"])


if __name__ == "__main__":
    main()
