#!/usr/bin/env python3
# SPDX-License-Identifier: Apache-2.0
"""The module for Python and the examples of the interface for C, on a host with the example
provider. Runs as root inside a node."""

import os
import pathlib
import select
import subprocess
import sys
import threading
import time
import unittest

TREE = pathlib.Path(__file__).parents[2]
BUILD = pathlib.Path(os.environ["TSLAUTH_BUILD"])
sys.path.insert(0, str(TREE / "python"))

import tslauth  # noqa: E402

ENVIRONMENT = dict(os.environ, PYTHONPATH=str(TREE / "python"))
PAM = pathlib.Path("/etc/pam.d/system-auth-generic")
NSS = pathlib.Path("/etc/nsswitch.conf")
CONFIGURATION = pathlib.Path("/etc/tessel/tslauth")
DIRECTED = pathlib.Path("/run/directed")


def join(directory, password="the secret"):
    directory.join("example.test", "joiner", password, skip_hostname_check=True)


class PythonTest(unittest.TestCase):
    def setUp(self):
        assert os.environ.get("TSLAUTH_NODE") == "1"
        for folder in (CONFIGURATION, pathlib.Path("/etc/tslauth-example"), DIRECTED):
            folder.mkdir(parents=True, exist_ok=True)
            for path in folder.glob("[!.]*"):
                path.is_file() and path.unlink()
        pathlib.Path("/var/lib/tslauth-example/joined").unlink(missing_ok=True)
        self.configure("example")
        (CONFIGURATION / "authentication.conf").write_text(
            'remote-authentication-store = "None"\n')
        PAM.write_text("# ours\nauth required pam_unix.so\naccount required pam_unix.so\n")
        NSS.write_text("# ours\npasswd: files\ngroup: files\nshadow: files\n")
        pathlib.Path("/etc/tslauth-example/accounts").write_text("joiner:the secret\n")
        pathlib.Path("/etc/tslauth-example/passwords").write_text("alice:!\n")

    def configure(self, provider):
        (CONFIGURATION / "provider.conf").write_text(f'provider = "{provider}"\n')

    def test_stores_are_listed(self):
        self.assertEqual(["Active Directory", "None"], tslauth.stores())
        self.assertEqual("None", tslauth.recorded_store())

    def test_a_plan_says_what_an_activation_writes(self):
        before = PAM.read_text()
        plan = tslauth.plan("Active Directory")
        self.assertEqual(str(PAM), plan.files[0].path)
        self.assertEqual(before, plan.files[0].before)
        self.assertEqual(([], None), (plan.losses, plan.refusal))
        tslauth.activate("Active Directory")
        self.assertEqual(plan.files[0].after, PAM.read_text())
        self.assertEqual("Active Directory", tslauth.recorded_store())
        tslauth.activate("None")
        self.assertEqual(before, PAM.read_text())

    def test_failures_have_the_class_of_what_can_be_done(self):
        with self.assertRaises(tslauth.UsageError):
            tslauth.activate("Nonsense")
        with self.assertRaises(tslauth.UsageError):
            tslauth.plan("a\0b")
        with tslauth.Directory(5) as directory:
            with self.assertRaises(tslauth.CredentialsError) as caught:
                join(directory, "wrong")
            self.assertEqual(("LogonFailureException", 1326),
                             (caught.exception.name, caught.exception.code))
            with self.assertRaises(tslauth.DomainError):
                directory.part()
        with self.assertRaises(tslauth.UsageError):
            directory.membership()
        (CONFIGURATION / "provider.conf").unlink()
        with self.assertRaises(tslauth.ConfigurationError):
            tslauth.Directory()

    def test_a_host_joins_and_parts(self):
        with tslauth.Directory(5) as directory:
            self.assertIsNone(directory.membership().domain)
            self.assertEqual(7, directory.trust_state().state)
            join(directory)
            membership = directory.membership()
            self.assertEqual(tslauth.Domain("example.test", "EXAMPLE"), membership.domain)
            self.assertEqual(0, membership.age)
            self.assertIn("CN=Computers", membership.machine_account)
            self.assertEqual([membership.domain], directory.trusted_domains().domains)
            directory.part("joiner", "the secret")
            self.assertIsNone(directory.membership().domain)

    def test_an_old_answer_says_its_age(self):
        self.configure("directed")
        (DIRECTED / "domain").write_text("corp.example")
        with tslauth.Directory(1) as directory:
            directory.membership()
            (DIRECTED / "domain").write_text("hang")
            old = directory.membership()
            self.assertEqual("corp.example", old.domain.dns_name)
            self.assertGreaterEqual(old.age, 1)
            (DIRECTED / "domain").unlink()

    def test_a_call_lets_other_threads_run(self):
        self.configure("directed")
        (DIRECTED / "part").write_text("hang")
        with tslauth.Directory(1) as directory:
            thread = threading.Thread(target=directory.part)
            thread.start()
            time.sleep(0.2)
            self.assertTrue(thread.is_alive())
            (DIRECTED / "part").unlink()
            thread.join(10)
            self.assertFalse(thread.is_alive())

    def test_a_job_is_waited_for_by_its_descriptor(self):
        with tslauth.Directory(5) as directory:
            with directory.start_join("example.test", "joiner", "the secret",
                                      skip_hostname_check=True) as job:
                self.assertEqual([job], select.select([job], [], [], 10)[0])
                self.assertIsNone(job.result())
                with self.assertRaises(tslauth.UsageError):
                    job.result()
            self.assertEqual(0, directory.start_trust_state().result().state)
            with self.assertRaises(tslauth.CredentialsError):
                directory.start_part("joiner", "wrong").result()

    def test_the_example_in_python_says_how_the_host_stands(self):
        example = TREE / "python" / "examples" / "membership.py"

        def run():
            done = subprocess.run([sys.executable, example], env=ENVIRONMENT, timeout=60,
                                  stdout=subprocess.PIPE, text=True)
            return done.returncode, done.stdout

        self.assertEqual((1, "active store: None\nthe host is in no domain\n"), run())
        with tslauth.Directory(5) as directory:
            join(directory)
        self.assertEqual(
            (0, "active store: None\ndomain: example.test\ntrust: in order\n"), run())

    def test_the_example_in_c_tells_each_change(self):
        with subprocess.Popen([BUILD / "lib" / "tslauth-c" / "trust-watch"],
                              stdout=subprocess.PIPE, text=True) as watch:
            self.assertEqual("trust state 7, 0 s old\n", watch.stdout.readline())
            with tslauth.Directory(5) as directory:
                join(directory)
            self.assertEqual("trust state 0, 0 s old\n", watch.stdout.readline())
            watch.terminate()
            self.assertEqual(0, watch.wait(30))


if __name__ == "__main__":
    unittest.main()
