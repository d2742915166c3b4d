#!/usr/bin/python3 -B
# SPDX-License-Identifier: Apache-2.0
"""Joining, asking and parting with tslauthctl: through the example providers as a user does, and
through one that fails and hangs as it is told."""

import fcntl
import os
import pathlib
import re
import shutil
import signal
import subprocess
import tempfile
import time
import unittest

from tslauthctl import *

EXAMPLE = pathlib.Path("/etc/tslauth-example")
STATE = pathlib.Path("/var/lib/tslauth-example")
HOSTS = pathlib.Path("/etc/hosts")
RESOLV = pathlib.Path("/etc/resolv.conf")
PINNED = pathlib.Path("/etc/tessel/tslauth/camservers.conf")
CAM_PROVIDER = pathlib.Path("/etc/tessel/tslauth/camprovider.conf")
OPTIONS = pathlib.Path("/etc/tessel/advanced.conf")
CERTIFICATES = pathlib.Path(__file__).parents[1] / "data" / "certificates"

SERVER = "192.0.2.1"
LIBRARY = "tessel::authentication::"


def nobody():
    os.setgroups([])
    os.setgid(65534)
    os.setuid(65534)


def command(*line):
    subprocess.run(line, check=True, timeout=60, capture_output=True)


def wait_until_caught(process, number):
    """Until the process has a handler for the signal."""
    status = pathlib.Path(f"/proc/{process.pid}/status")
    end = time.monotonic() + 30
    while time.monotonic() < end:
        caught = int(re.search(r"^SigCgt:\s*(\w+)", status.read_text(), re.M)[1], 16)
        if caught & 1 << number - 1:
            return
        time.sleep(0.01)
    raise AssertionError("the signal is not caught")


def certificate(path, name="cam.example.test"):
    command("openssl", "req", "-x509", "-newkey", "rsa:2048", "-nodes", "-keyout", "/dev/null",
            "-subj", f"/CN={name}", "-out", str(path))


def thumbprint(path):
    found = subprocess.run(["openssl", "x509", "-in", str(path), "-noout", "-fingerprint", "-sha1"],
                           check=True, timeout=60, stdout=subprocess.PIPE, text=True).stdout
    return found.strip().split("=", 1)[1]


def holds(document, text):
    """Whether `text` is a value anywhere in a JSON document."""
    if isinstance(document, dict):
        return any(holds(value, text) for value in document.values())
    if isinstance(document, list):
        return any(holds(value, text) for value in document)
    return document == text


class Case(unittest.TestCase):
    def setUp(self):
        set_up()
        shutil.rmtree(STATE, ignore_errors=True)
        shutil.rmtree(EXAMPLE, ignore_errors=True)
        (EXAMPLE / "cam").mkdir(parents=True)
        (EXAMPLE / "accounts").write_text("joiner:secret\n")
        (EXAMPLE / "passwords").write_text("alice:x\n")
        CAM_PROVIDER.write_text('provider = "example-cam"\n')
        PINNED.write_text("")
        OPTIONS.write_text('UserVars.ActiveDirectoryVerifyCAMCertificate = "1"\n')
        HOSTS.write_text("127.0.0.1 localhost\n127.0.1.1 node\n")
        RESOLV.write_text("nameserver 127.0.0.1\n")

    def fails(self, code, exception, *arguments, **options):
        document = ask(*arguments, **options)
        self.assertEqual(code, document["exit"], document)
        self.assertEqual(exception and LIBRARY + exception, document["error"]["exception"])
        return document

    def join(self, *arguments, password="secret", name="joiner"):
        return ask("join", "example.test", "--user", name, "--password-stdin",
                   "--skip-hostname-check", *arguments, input=password.encode())


class Membership(Case):
    def test_join_ask_and_part(self):
        self.assertFalse(self.fails(NOT_JOINED, None, "info")["joined"])
        joined = self.join()
        self.assertEqual(DONE, joined["exit"])
        self.assertEqual({"joined": True, "domain": "example.test", "organisational_unit": None,
                          "cam_server": None, "hostname_checked": False},
                         {key: joined[key] for key in ("joined", "domain", "organisational_unit",
                                                       "cam_server", "hostname_checked")})
        info = ask("info")
        self.assertEqual(DONE, info["exit"])
        self.assertEqual({"dns": "example.test", "netbios": "EXAMPLE"}, info["domain"])
        self.assertEqual([info["domain"]], info["trusted_domains"])
        self.assertEqual("CN=node,CN=Computers,DC=example,DC=test", info["machine_account"])
        self.assertEqual((True, 0, [], []), (info["joined"], info["trust_state"],
                                             info["preferred_domain_controllers"],
                                             info["failures"]))
        self.assertEqual("node", ask("dc")["controller"])
        self.assertEqual("node", ask("dc", "EXAMPLE")["controller"])
        self.assertEqual("host/node@EXAMPLE.TEST", ask("principal")["principal"])
        self.assertEqual("alice", ask("canonical", "EXAMPLE\\alice")["canonical"])
        self.assertTrue(ask("part")["parted"])
        self.assertEqual(NOT_JOINED, ask("info")["exit"])

    def test_a_host_that_is_joined_already_is_left_alone(self):
        self.assertFalse(self.join()["already_joined"])
        again = self.join(password="wrong")
        self.assertEqual((DONE, True, True),
                         (again["exit"], again["joined"], again["already_joined"]))
        document = ask("join", "other.test", "--user", "joiner", "--password-stdin",
                       input=b"secret")
        self.assertEqual(JOINED_ELSEWHERE, document["exit"])
        self.assertEqual("The host is joined to example.test, and not to other.test; "
                         "'tslauthctl part' "
                         "takes it out", document["error"]["message"])

    def test_a_failure_tells_its_cause_in_the_providers_words(self):
        script(join="code 87", last_failure="there is no unit 'Attic'")
        document = self.join()
        self.assertEqual(LIBRARY + "InvalidParameterException", document["error"]["exception"])
        self.assertIn("(there is no unit 'Attic')", document["error"]["message"])

    def test_a_dry_run_changes_nothing(self):
        before = HOSTS.read_bytes(), RESOLV.read_bytes()
        document = ask("join", "example.test/Servers", "--dry-run")
        self.assertEqual((CHANGES, False, "example.test", "Servers"),
                         (document["exit"], document["joined"], document["domain"],
                          document["organisational_unit"]))
        self.assertEqual(before, (HOSTS.read_bytes(), RESOLV.read_bytes()))
        self.assertEqual(NOT_JOINED, ask("info")["exit"])

    def test_a_dry_run_tells_what_the_provider_finds(self):
        script(preview_join="clock: 2 seconds behind\n", get_any_domain_controller="dc1")
        document = ask("join", "example.test", "--dry-run")
        self.assertEqual({"clock": "2 seconds behind"}, document["found"])
        text = run("join", "example.test", "--dry-run").stdout.decode()
        self.assertIn("clock: 2 seconds behind\n", text)
        script(preview_join="code 1326", get_any_domain_controller="dc1")
        document = ask("join", "example.test", "--dry-run", "--user", "joiner", "--password-stdin",
                       input=b"wrong\n")
        self.assertEqual(CREDENTIALS, document["exit"])

    def test_a_failed_join_puts_the_name_resolution_back(self):
        have_management_address(self)
        HOSTS.write_text("127.0.0.1 localhost\n127.0.1.1 node.old.test node\n"
                         "192.0.2.7 example.test\n192.0.2.10 files.test node\n")
        before = HOSTS.read_bytes(), RESOLV.read_bytes()
        document = ask("join", "example.test", "--user", "joiner", "--password-stdin",
                       input=b"wrong")
        self.assertEqual(CREDENTIALS, document["exit"], document)
        self.assertEqual(["files.test"], document["dropped_names"])
        self.assertIn(str(HOSTS), document["put_back"])
        self.assertEqual(before, (HOSTS.read_bytes(), RESOLV.read_bytes()))

    def test_the_text_for_people(self):
        self.assertEqual(b"The host is joined to example.test.\n",
                         run("join", "example.test", "--user", "joiner", "--password-stdin",
                             "--skip-hostname-check", input=b"secret\n").stdout)
        self.assertEqual(b"provider: example\n"
                         b"domain: example.test (EXAMPLE)\n"
                         b"machine account: CN=node,CN=Computers,DC=example,DC=test\n"
                         b"preferred domain controllers: none\n"
                         b"trusted domains: example.test (EXAMPLE)\n"
                         b"trust state: in-order (0)\n", run("info").stdout)
        self.assertEqual(b"The host is parted from its domain.\n", run("part").stdout)

    def test_a_join_repairs_the_name_resolution(self):
        have_management_address(self)
        # The names differ, so that the domain becomes a search domain, since it resolves.
        HOSTS.write_text("127.0.0.1 localhost\n127.0.1.1 node.old.test node\n"
                         "192.0.2.7 example.test\n")
        joined = ask("join", "example.test", "--user", "joiner", "--password-stdin",
                     input=b"secret")
        self.assertEqual(DONE, joined["exit"], joined)
        self.assertTrue(joined["hostname_checked"])
        self.assertIn("192.0.2.10", HOSTS.read_text())
        self.assertEqual("node.old.test node", [
            line.split(None, 1)[1] for line in HOSTS.read_text().splitlines()
            if line.startswith("192.0.2.10")][0].replace("\t", " "))
        self.assertIn("search example.test", RESOLV.read_text())

    def test_a_host_name_that_does_not_fit_is_refused(self):
        HOSTS.write_text("127.0.0.1 localhost\n")
        self.fails(REFUSED, "InvalidHostNameException", "join", "example.test", "--user", "joiner",
                   "--password-stdin", input=b"secret")
        self.assertFalse(STATE.exists())

    def test_refused_credentials_have_a_code_of_their_own(self):
        self.assertEqual(CREDENTIALS, self.join(password="wrong")["exit"])
        self.assertEqual(CREDENTIALS, self.join(name="nobody")["exit"])
        document = self.join(password="")
        self.assertEqual(CREDENTIALS, document["exit"])
        self.assertEqual(LIBRARY + "InvalidCredentialsException", document["error"]["exception"])
        self.assertFalse(document["joined"])
        self.join()
        self.fails(CREDENTIALS, "LogonFailureException", "part", "--user", "joiner",
                   "--password-stdin", input=b"wrong")
        self.assertTrue(ask("part", "--user", "joiner", "--password-stdin",
                            input=b"secret")["parted"])

    def test_a_host_that_is_not_joined_is_told_from_an_unreachable_domain(self):
        for arguments in (("part",), ("principal", "example.test")):
            self.fails(NOT_JOINED, "NoSuchDomainException", *arguments)
        for arguments in (("dc",), ("principal",)):
            self.fails(NOT_JOINED, None, *arguments)
        self.fails(UNREACHABLE, "NoSuchDomainException", "dc", "other.test")
        document = ask("join", "other.test", "--user", "joiner", "--password-stdin",
                       "--skip-hostname-check", input=b"secret")
        self.assertEqual(UNREACHABLE, document["exit"])
        self.join()
        self.fails(UNREACHABLE, "NoSuchDomainException", "principal", "other.test")

    def test_a_unit_is_handed_over(self):
        document = ask("join", "example.test/Servers/Linux", "--user", "joiner",
                       "--password-stdin", "--skip-hostname-check", input=b"secret")
        self.assertEqual("Servers/Linux", document["organisational_unit"])
        # The example's directory has none.
        self.assertEqual(LIBRARY + "FileNotFoundException", document["error"]["exception"])

    def test_preferred_controllers_are_set_listed_and_cleared(self):
        self.assertEqual([], ask("preferred-dcs")["controllers"])
        names = ["b.example.test", "a.example.test"]
        self.assertEqual(names, ask("preferred-dcs", "set", *names)["controllers"])
        self.assertEqual(names, ask("preferred-dcs")["controllers"])
        self.assertEqual(b"b.example.test\na.example.test\n", run("preferred-dcs").stdout)
        self.assertEqual([], ask("preferred-dcs", "clear")["controllers"])
        self.assertEqual([], ask("preferred-dcs")["controllers"])

    def test_what_changes_the_host_needs_root(self):
        for arguments in (("join", "example.test", "--user", "joiner", "--password-stdin"),
                          ("join", "--cam", SERVER), ("part",), ("preferred-dcs", "set", "a"),
                          ("preferred-dcs", "clear"), ("cam", "import", SERVER, "/etc/hosts")):
            document = ask(*arguments, input=b"secret", preexec_fn=nobody)
            self.assertEqual(NOT_ROOT, document["exit"], arguments)
        for arguments in (("info",), ("preferred-dcs",), ("cam", "list")):
            self.assertIn(ask(*arguments, preexec_fn=nobody)["exit"], (DONE, NOT_JOINED))

    def test_wrong_usage(self):
        for arguments in (("join",), ("join", "example.test"), ("join", "a", "--cam", SERVER),
                          ("join", "--cam", SERVER, "--user", "a"), ("join", "--cam", ""),
                          ("join", "--cam", SERVER, "--password-stdin"),
                          ("join", "a", "--user", "b", "--ou", "c"), ("part", "--password-stdin"),
                          ("join", "a", "--user", "b", "--password", "c"),
                          ("join", "a", "--user", "b", "--password-stdin", "--password-fd", "3"),
                          ("info", "--timeout", "0"), ("info", "--timeout", "x"),
                          ("info", "--timeout", "2147483648"), ("canonical",), ("cam",),
                          ("cam", "import", SERVER), ("preferred-dcs", "set"), ("dc", "")):
            self.assertEqual(USAGE, ask(*arguments)["exit"], arguments)


class Failures(Case):
    def test_the_exit_code_follows_the_class(self):
        rows = ((1229, UNREACHABLE), (1225, UNREACHABLE), (1201, UNREACHABLE), (1311, UNREACHABLE),
                (1222, UNREACHABLE), (1355, UNREACHABLE), (10060, UNREACHABLE), (5, CREDENTIALS),
                (86, CREDENTIALS), (1326, CREDENTIALS), (1330, CREDENTIALS), (1331, CREDENTIALS),
                (1786, NOT_JOINED), (1787, NOT_JOINED), (2691, REFUSED), (1398, REFUSED),
                (4711, REFUSED))
        for code, expected in rows:
            script(join=f"code {code}")
            self.assertEqual(expected, self.join()["exit"], code)
        script(part="code 5", domain="a domain")
        # Nobody's credentials were refused.
        self.fails(REFUSED, "AccessDeniedException", "part")

    def test_a_number_without_a_text_sends_the_reader_to_the_system_log(self):
        advice = b"the provider may have said more in the system log"
        for code, expected in ((4711, True), (1398, False)):
            script(part=f"code {code}", domain="a domain")
            process = run("part")
            self.assertEqual(REFUSED, process.returncode)
            self.assertEqual(expected, advice in process.stderr, process.stderr)

    def test_a_provider_that_hangs_costs_one_limit_and_is_never_an_empty_answer(self):
        hangs = {"domain": "hang", "trusted": "hang", "trust": "hang"}
        script(**hangs)
        begin = time.monotonic()
        document = self.fails(UNREACHABLE, None, "info", "--timeout", "1")
        took = time.monotonic() - begin
        self.assertGreaterEqual(took, 1)
        self.assertLess(took, 2.9)  # and not one after the other
        self.assertEqual([("--timeout", 1)] * 3, [(expired["limit"], expired["seconds"])
                                                  for expired in document["expired"]])
        for key in ("joined", "domain", "machine_account", "preferred_domain_controllers",
                    "trusted_domains", "trust_state"):
            self.assertIsNone(document[key], key)
        text = run("info", "--timeout", "1")
        self.assertIn(b"trusted domains: cannot be told: No answer within 1 second, the limit of "
                      b"--timeout", text.stdout)
        self.assertNotIn(b"none", text.stdout)

    def test_one_question_that_hangs_leaves_the_others(self):
        script(domain="corp.example", trusted="hang", trust="4")
        document = self.fails(UNREACHABLE, None, "info", "--timeout", "1")
        self.assertEqual(({"dns": "corp.example", "netbios": ""}, True, 4, None),
                         (document["domain"], document["joined"], document["trust_state"],
                          document["trusted_domains"]))
        self.assertEqual(["trusted_domains"], [failure["of"] for failure in document["failures"]])

    def test_every_question_has_the_limit(self):
        for entry, arguments in (("domain", ("dc",)), ("dc", ("dc", "a")),
                                 ("principal", ("principal", "a")),
                                 ("canonical", ("canonical", "a")),
                                 ("controllers", ("preferred-dcs",))):
            script(**{entry: "hang"})
            document = self.fails(UNREACHABLE, None, *arguments, "--timeout", "1")
            self.assertEqual(1, len(document["expired"]), arguments)

    def test_an_answer_within_the_limit_is_waited_for(self):
        script(dc="hang")
        process = subprocess.Popen([TOOL, "dc", "a", "--timeout", "50"], stdout=subprocess.PIPE)
        time.sleep(1.2)
        self.assertIsNone(process.poll())
        # As a whole, since the provider reads it at any time.
        (SCRIPTS / "new").write_text("dc1.corp.example")
        (SCRIPTS / "new").rename(SCRIPTS / "dc")
        self.assertEqual(b"dc1.corp.example\n", process.communicate(timeout=30)[0])
        self.assertEqual(DONE, process.returncode)

    def test_the_longest_limit(self):
        script(dc="dc1")
        self.assertEqual("dc1", ask("dc", "a", "--timeout", str(2 ** 31 - 1))["controller"])

    def test_what_changes_the_host_waits_for_the_lock(self):
        script()
        ask("part")  # makes the lock's file
        for arguments in (("part",), ("preferred-dcs", "clear"), ("cam", "import", SERVER, "/none"),
                          ("join", "--cam", SERVER), ("join", "a", "--user", "b",
                                                      "--password-stdin")):
            with open(LOCK, "r+b") as lock:
                fcntl.flock(lock, fcntl.LOCK_EX)
                process = subprocess.Popen([TOOL, *arguments], stdin=subprocess.DEVNULL,
                                           stdout=subprocess.DEVNULL, stderr=subprocess.DEVNULL)
                with self.assertRaises(subprocess.TimeoutExpired, msg=arguments):
                    process.wait(timeout=0.3)
            process.wait(timeout=30)

    def test_a_failed_question_is_told_with_its_class(self):
        script(domain="code 5", controllers="dc1", trusted="code 2", trust="4")
        document = self.fails(REFUSED, "AccessDeniedException", "info")
        self.assertEqual({"domain": LIBRARY + "AccessDeniedException",
                          "trusted_domains": LIBRARY + "FileNotFoundException"},
                         {failure["of"]: failure["exception"]
                          for failure in document["failures"]})
        self.assertEqual((["dc1"], 7, None), (document["preferred_domain_controllers"],
                                              document["trust_state"], document["joined"]))

    def test_what_a_provider_does_not_offer(self):
        PROVIDER.write_text('provider = "null-entries"\n')
        document = ask("info")
        self.assertEqual(DONE, document["exit"], document)
        self.assertIsNone(document["joined"])
        self.assertIsNone(document["domain"])
        self.assertEqual(b"bob\n", run("canonical", "bob").stdout)
        self.fails(REFUSED, None, "dc", "a")
        self.fails(REFUSED, "CallNotImplementedException", "preferred-dcs", "set", "a")

    def test_control_characters_of_a_provider_are_escaped(self):
        evil = "e\x1b[31mv\x07i\u009bl\r\nx"
        script(domain=evil, controllers=evil, trusted=evil, machine=evil, dc=evil, principal=evil,
               canonical=evil)
        for arguments in (("info",), ("dc", "a"), ("dc",), ("principal", "a"), ("canonical", "a"),
                          ("preferred-dcs",)):
            process = run(*arguments)
            self.assertEqual(DONE, process.returncode)
            self.assertIn(b"e\\x1b[31mv\\x07i\\xc2\\x9bl\\x0d\\x0ax", process.stdout, arguments)
            bare = run(*arguments, "--json").stdout
            for output in (process.stdout, bare):
                self.assertEqual([], [byte for byte in output
                                      if (byte < 32 and byte != 10) or byte > 126], arguments)
            self.assertTrue(holds(json.loads(bare), evil), arguments)

    def test_an_interrupted_call_ends_by_the_signal_and_leaves_the_lock(self):
        script(part="hang")
        for number in (signal.SIGINT, signal.SIGTERM, signal.SIGHUP):
            process = subprocess.Popen([TOOL, "part"], stdout=subprocess.PIPE,
                                       stderr=subprocess.PIPE)
            wait_until_caught(process, number)
            process.send_signal(number)
            output, errors = process.communicate(timeout=30)
            self.assertEqual((-number, b""), (process.returncode, output))
            self.assertEqual(b"tslauthctl: interrupted while waiting for the provider to part the "
                             b"host from its domain\n", errors)
        script()
        self.assertTrue(ask("part")["parted"])


class CAM(Case):
    def setUp(self):
        super().setUp()
        self.folder = tempfile.TemporaryDirectory()
        self.addCleanup(self.folder.cleanup)
        self.pem = pathlib.Path(self.folder.name) / "cam.pem"
        certificate(self.pem)
        shutil.copy(self.pem, EXAMPLE / "cam" / f"{SERVER}.pem")

    def test_pin_list_and_join(self):
        self.assertEqual([], ask("cam", "list")["servers"])
        self.fails(REFUSED, "InvalidCAMCertificateException", "join", "--cam", SERVER,
                   "--skip-hostname-check")
        document = ask("cam", "import", SERVER, str(self.pem))
        self.assertEqual((DONE, thumbprint(self.pem), None),
                         (document["exit"], document["thumbprint"], document["replaced"]))
        self.assertEqual([{"server": SERVER, "thumbprint": thumbprint(self.pem)}],
                         ask("cam", "list")["servers"])
        joined = ask("join", "--cam", SERVER, "--skip-hostname-check")
        self.assertEqual((DONE, True, SERVER), (joined["exit"], joined["joined"],
                                                joined["cam_server"]), joined)
        self.assertEqual("example.test", ask("info")["domain"]["dns"])

    def test_another_certificate_replaces_the_pinned_one_and_says_so(self):
        ask("cam", "import", SERVER, str(self.pem))
        other = pathlib.Path(self.folder.name) / "other.pem"
        certificate(other, "other")
        document = ask("cam", "import", SERVER, str(other))
        self.assertEqual(thumbprint(self.pem), document["replaced"])
        self.assertEqual(thumbprint(other), document["thumbprint"])
        self.fails(REFUSED, "InvalidCAMCertificateException", "join", "--cam", SERVER,
                   "--skip-hostname-check")

    def test_the_domain_is_asked_without_verifying(self):
        self.assertEqual("example.test", ask("cam", "domain", SERVER)["domain"])
        self.assertIn(b"not verified", run("cam", "domain", SERVER).stdout)
        self.fails(UNREACHABLE, "ConnectionRefusedException", "cam", "domain", "192.0.2.99")

    def test_a_unit_goes_to_the_server(self):
        ask("cam", "import", SERVER, str(self.pem))
        document = ask("join", "--cam", SERVER, "--ou", "Servers", "--skip-hostname-check")
        self.assertEqual("Servers", document["organisational_unit"])
        self.assertEqual(REFUSED, document["exit"])

    def test_bad_input_is_refused_by_class(self):
        self.fails(REFUSED, "InvalidIPAddressException", "cam", "import", "300.1.1.1",
                   str(self.pem))
        self.fails(REFUSED, "InvalidIPAddressException", "join", "--cam", "300.1.1.1")
        self.fails(REFUSED, "FileNotFoundException", "cam", "import", SERVER, "/none")
        self.fails(REFUSED, "InvalidCertificateException", "cam", "import", SERVER, "/etc/hosts")
        PINNED.unlink()
        self.fails(REFUSED, "IOError", "cam", "import", SERVER,
                   str(self.pem))
        self.fails(REFUSED, "IOError", "cam", "list")
        OPTIONS.unlink()
        document = ask("join", "--cam", SERVER)
        self.assertEqual((REFUSED, "HostCtl::Lib::HostCtlException"),
                         (document["exit"], document["error"]["exception"]))


if __name__ == "__main__":
    main()
