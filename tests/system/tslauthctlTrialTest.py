#!/usr/bin/python3 -B
# SPDX-License-Identifier: Apache-2.0
"""A change is tried before it is made: one that locks out who must get in is not made."""

import json
import os
import pathlib
import subprocess
import unittest

from tslauthctl import *

HISTORY = pathlib.Path("/var/lib/tslauth/history")
# The provider's entry stands behind the first line, and the jump then ends at the denial.
JUMP = """auth required /lib/security/$ISA/pam_unix.so
account [success=1 default=ignore] /lib/security/$ISA/pam_access.so
account required /lib/security/$ISA/pam_deny.so
account required /lib/security/$ISA/pam_permit.so
session required /lib/security/$ISA/pam_permit.so
"""


class Trial(unittest.TestCase):
    def setUp(self):
        set_up()
        follow()

    def unchanged(self, code, *arguments):
        before = texts(), sorted(os.listdir(HISTORY)) if HISTORY.exists() else []
        mounts = pathlib.Path("/proc/self/mountinfo").read_text()
        document = ask(*arguments)
        self.assertEqual(code, document["exit"], document)
        after = texts(), sorted(os.listdir(HISTORY)) if HISTORY.exists() else []
        self.assertEqual(before[0], after[0])
        self.assertEqual(before[1], after[1])
        self.assertEqual(mounts, pathlib.Path("/proc/self/mountinfo").read_text())
        return document

    def test_a_policy_that_locks_root_out_is_not_made(self):
        set_up(pam=JUMP)
        document = self.unchanged(LOCKS_OUT, "activate", AD, "--accept-loss")
        self.assertEqual("locks-out", document["outcome"])
        self.assertIn("'root' would no longer get in through system-auth-generic",
                      document["error"]["message"])
        self.assertTrue(document["tried"])

    def test_one_that_lets_everybody_in_as_before_is_made(self):
        document = ask("activate", AD)
        self.assertEqual((DONE, True), (document["exit"], document["tried"]))

    def test_who_did_not_get_in_before_is_no_reason_to_stop(self):
        set_up(pam=PLAIN_PAM + "account required /lib/security/$ISA/pam_deny.so\n")
        self.assertEqual(DONE, ask("activate", AD)["exit"])

    def test_a_file_outside_that_a_link_leads_to_is_tried_and_left_alone(self):
        real = pathlib.Path("/srv/policy")
        real.write_text(JUMP)
        PAM.unlink()
        PAM.symlink_to(real)
        self.addCleanup(PAM.unlink)
        self.unchanged(LOCKS_OUT, "activate", AD, "--accept-loss")
        self.assertEqual(JUMP, real.read_text())

    def test_undoing_to_a_policy_that_locks_root_out_is_refused(self):
        self.assertEqual(DONE, ask("activate", AD)["exit"])
        number = ask("history")["history"][-1]["number"]
        kept = HISTORY / str(number) / "before/etc/pam.d/system-auth-generic"
        kept.write_text("auth required pam_deny.so\naccount required pam_deny.so\n")
        self.unchanged(LOCKS_OUT, "undo", str(number))

    def test_where_it_cannot_be_tried_that_is_told(self):
        process = subprocess.run(["setpriv", "--bounding-set=-sys_admin", TOOL, "activate", AD,
                                  "--json"], stdout=subprocess.PIPE, timeout=60)
        document = json.loads(process.stdout)
        self.assertEqual((DONE, False), (process.returncode, document["tried"]))


if __name__ == "__main__":
    main()
