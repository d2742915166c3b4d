#!/usr/bin/python3 -B
# SPDX-License-Identifier: Apache-2.0
"""What tslauth-cam-service decides: codes, units, refusals. Nothing here opens a connection."""

import concurrent.futures
import contextlib
import importlib.machinery
import importlib.util
import io
import json
import os
import pathlib
import re
import subprocess
import sys
import tempfile
import time
import unittest
from unittest import mock

PROGRAM = pathlib.Path(__file__).parents[3] / "cam-service" / "tslauth-cam-service"
loader = importlib.machinery.SourceFileLoader("cam_service", str(PROGRAM))
service = importlib.util.module_from_spec(importlib.util.spec_from_loader("cam_service", loader))
loader.exec_module(service)

DOMAIN = "corp.example"


def anything(issued):
    pass


class Folder(unittest.TestCase):
    def setUp(self):
        folder = tempfile.TemporaryDirectory()
        self.addCleanup(folder.cleanup)
        self.folder = pathlib.Path(folder.name)
        self.codes = service.Codes(self.folder)


class Codes(Folder):
    def refused(self, reason, host, code, fits=anything):
        with self.assertRaisesRegex(service.Refused, reason):
            self.codes.take(host, code, fits)

    def test_a_code_has_more_than_128_bits_and_is_never_the_same(self):
        codes = {service.new_code() for _ in range(100)}
        self.assertEqual(100, len(codes))
        for code in codes:
            self.assertRegex(code, r"^([A-HJ-NP-Z2-9]{4}-){7}[A-HJ-NP-Z2-9]{4}$")
        self.assertEqual(32, len(set(service.CODE_ALPHABET)))

    def test_a_code_is_taken_once(self):
        code = self.codes.issue("host01", "Servers", 60, True)
        issued = self.codes.take("host01", code, anything)
        self.assertEqual(("Servers", True), (issued["unit"], issued["reuse"]))
        self.refused("no code", "host01", code)

    def test_neither_case_nor_hyphens_matter(self):
        code = self.codes.issue("Host01", None, 60, False)
        self.codes.take("HOST01", code.lower().replace("-", ""), anything)

    def test_another_hosts_code_is_wrong(self):
        first = self.codes.issue("host01", None, 60, False)
        second = self.codes.issue("host02", None, 60, False)
        self.refused("wrong", "host01", second)
        self.refused("no code", "host03", first)
        self.codes.take("host01", first, anything)

    def test_a_wrong_code_leaves_the_right_one_alone(self):
        code = self.codes.issue("host01", None, 60, False)
        for wrong in ("", "A", code[:-1], code[:-1] + ("A" if code[-1] != "A" else "B"), code * 2):
            self.refused("wrong", "host01", wrong)
        self.codes.take("host01", code, anything)

    def test_an_expired_code_is_refused(self):
        code = self.codes.issue("host01", None, 60, False)
        with mock.patch.object(service.time, "time", return_value=time.time() + 61):
            self.refused("expired", "host01", code)

    def test_a_code_for_another_use_stays(self):
        def fits(issued):
            raise service.Refused("another unit")
        code = self.codes.issue("host01", None, 60, False)
        self.refused("another unit", "host01", code, fits)
        self.codes.take("host01", code, anything)

    def test_a_new_code_replaces_the_old_one(self):
        old = self.codes.issue("host01", None, 60, False)
        new = self.codes.issue("host01", None, 60, False)
        self.refused("wrong", "host01", old)
        self.codes.take("host01", new, anything)

    def test_a_revoked_code_is_worthless(self):
        code = self.codes.issue("host01", None, 60, False)
        self.assertTrue(self.codes.revoke("HOST01"))
        self.assertFalse(self.codes.revoke("host01"))
        self.refused("no code", "host01", code)

    def test_the_file_holds_no_code_and_is_nobody_elses(self):
        code = self.codes.issue("host01", None, 60, False)
        for path in self.folder.iterdir():
            self.assertEqual(0o600, path.stat().st_mode & 0o7777, path)
            for part in (code, code.replace("-", ""), code.split("-")[0]):
                self.assertNotIn(part, path.read_text())
        self.assertEqual({"codes.json", "lock"}, {path.name for path in self.folder.iterdir()})

    def test_the_same_code_has_another_digest_each_time(self):
        digests = {service.digest(salt * 16, host, "X") for salt in (b"1", b"2") for host in "ab"}
        self.assertEqual(4, len(digests))

    def test_one_of_many_that_take_a_code_at_once_gets_it(self):
        code = self.codes.issue("host01", None, 60, False)

        def take(_):
            try:
                return bool(service.Codes(self.folder).take("host01", code, anything))
            except service.Refused:
                return False
        with concurrent.futures.ThreadPoolExecutor(16) as pool:
            self.assertEqual(1, sum(pool.map(take, range(32))))

    def test_none_of_many_that_are_issued_at_once_is_lost(self):
        with concurrent.futures.ThreadPoolExecutor(8) as pool:
            list(pool.map(lambda i: service.Codes(self.folder).issue(f"h{i}", None, 60, False),
                          range(40)))
        self.assertEqual(40, len(self.codes.list()))

    def test_a_code_is_not_taken_where_that_cannot_be_kept(self):
        code = self.codes.issue("host01", None, 60, False)
        with mock.patch.object(service.os, "rename", side_effect=OSError("no")):
            with self.assertRaises(OSError):
                self.codes.take("host01", code, anything)
        self.assertEqual({"codes.json", "lock"}, {path.name for path in self.folder.iterdir()})


class State(Folder):
    """What lies in the folder need not be what this program left there."""

    def broken(self, reason):
        for call in (self.codes.list, lambda: self.codes.issue("host01", None, 60, False),
                     lambda: self.codes.revoke("host01"),
                     lambda: self.codes.take("host01", "X", anything)):
            with self.assertRaisesRegex(service.BrokenState, reason):
                call()

    def test_no_file_is_reached_through_a_link(self):
        outside = self.folder / "outside"
        for name in ("lock", "codes.json"):
            for link in (os.symlink, os.link):
                outside.write_text('{"version": 1, "codes": {}}')
                before = outside.stat()
                link(outside, self.folder / name)
                self.broken(f"{name} is not a regular file")
                self.assertEqual((before.st_uid, before.st_mode, before.st_mtime_ns),
                                 (lambda s: (s.st_uid, s.st_mode, s.st_mtime_ns))(outside.stat()))
                (self.folder / name).unlink()

    def test_a_link_to_nothing_makes_no_file(self):
        (self.folder / "lock").symlink_to(self.folder / "elsewhere")
        self.broken("lock is not a regular file")
        self.assertFalse((self.folder / "elsewhere").exists())

    def test_a_folder_or_a_fifo_is_refused_and_not_waited_for(self):
        for name in ("lock", "codes.json"):
            for make in (os.mkfifo, os.mkdir):
                make(self.folder / name)
                self.broken(f"{name} is not a regular file")
                (os.rmdir if make is os.mkdir else os.unlink)(self.folder / name)

    def test_a_damaged_file_is_named_and_kept(self):
        self.codes.issue("host01", None, 60, False)
        file = self.folder / "codes.json"
        right = file.read_text()
        entry = json.loads(right)["codes"]["HOST01"]
        damaged = ["", "{", "[]", "{}", '{"version": 1}', '{"version": 1, "codes": []}', "[" * 9999,
                   right.replace('"version": 1', '"version": 2'), right[:-9], "\0" * 64]
        for member, values in {"salt": (None, "", "x", 1), "digest": ("", "0", None),
                               "unit": (1, []), "expires": (None, "1", 1.5, True),
                               "reuse": (None, 0, "")}.items():
            damaged += [json.dumps({"version": 1, "codes": {"HOST01": {**entry, member: value}}})
                        for value in values]
            damaged.append(json.dumps({"version": 1, "codes": {
                "HOST01": {key: entry[key] for key in entry if key != member}}}))
        for text in damaged:
            file.write_text(text)
            self.broken(r"codes\.json is damaged and was left as it is: .*; repair it")
            self.assertEqual(text, file.read_text())
        file.write_bytes(b"\xff")
        self.broken("codes.json is damaged")
        file.write_text(right)
        self.assertEqual(["HOST01"], list(self.codes.list()))

    def test_root_becomes_the_owner_of_the_folder(self):
        calls = mock.Mock()
        with mock.patch.multiple(service.os, geteuid=lambda: 0, setgroups=calls.setgroups,
                                 setresgid=calls.setresgid, setresuid=calls.setresuid):
            service.become(mock.Mock(st_uid=0, st_gid=0))
            self.assertEqual([], calls.mock_calls)
            service.become(mock.Mock(st_uid=7, st_gid=8))
        self.assertEqual([mock.call.setgroups([]), mock.call.setresgid(8, 8, 8),
                          mock.call.setresuid(7, 7, 7)], calls.mock_calls)


class Units(unittest.TestCase):
    def test_a_path_runs_from_the_outside_in(self):
        self.assertEqual("OU=Linux,OU=Servers,DC=corp,DC=example",
                         service.unit_name("Servers/Linux", DOMAIN))

    def test_a_distinguished_name_may_leave_out_the_domain(self):
        for text in ("OU=Linux,OU=Servers", "OU=Linux, OU = Servers,DC=corp,DC=example",
                     "OU=Linux,OU=Servers,dc=CORP,dc=Example"):
            self.assertEqual("OU=Linux,OU=Servers,DC=corp,DC=example",
                             service.unit_name(text, DOMAIN), text)

    def test_a_container_is_named_as_it_is(self):
        self.assertEqual("CN=Computers,DC=corp,DC=example",
                         service.unit_name("CN=Computers", DOMAIN))

    def test_what_would_end_a_name_is_escaped(self):
        self.assertEqual(r"OU=a\,DC\+b,DC=corp,DC=example", service.unit_name("a,DC+b", DOMAIN))

    def test_what_is_no_unit_of_the_domain_is_refused(self):
        for text in ("", "/", "A//B", "A/ /B", "OU=A,X=B", "OU=", "OU=A,DC=other,DC=example",
                     "DC=corp,DC=example", "OU=A,DC=corp,DC=example,OU=B", "A\nB", "A\0",
                     "A" * 2000, "OU=A,,OU=B"):
            with self.assertRaises(ValueError, msg=text):
                service.unit_name(text, DOMAIN)


class Refusals(unittest.TestCase):
    def setUp(self):
        self.now = 1000.0
        self.refusals = service.Refusals(lambda: self.now)

    def test_an_address_is_not_heard_for_a_while(self):
        for _ in range(service.REFUSALS):
            self.assertFalse(self.refusals.too_many("a"))
            self.refusals.add("a")
        self.assertTrue(self.refusals.too_many("a"))
        self.assertFalse(self.refusals.too_many("b"))
        self.now += service.REFUSAL_SECONDS
        self.assertFalse(self.refusals.too_many("a"))

    def test_many_addresses_do_not_fill_the_memory(self):
        for i in range(service.ADDRESSES + 10):
            self.refusals.add(str(i))
        self.assertEqual(service.ADDRESSES, len(self.refusals._times))


class FakeDomain:
    netbios, dns, sid, controller = "CORP", DOMAIN, "S-1-5-21-1-2-3", "dc1.corp.example"

    def __init__(self):
        self.accounts = []
        self.made = []
        self.search_error = self.error = None

    def has_account(self, host, end):
        if self.search_error:
            raise self.search_error
        return host in self.accounts

    def make_account(self, host, unit, reuse, end):
        if self.error:
            raise self.error
        self.made.append((host, unit, reuse))
        return "QkxPQg=="


class Requests(Folder):
    def setUp(self):
        super().setUp()
        self.domain = FakeDomain()
        self.service = service.Service(self.codes, self.domain, None)
        self.log = []
        patch = mock.patch.object(service, "log", lambda _, text: self.log.append(text))
        patch.start()
        self.addCleanup(patch.stop)

    def ask(self, request, secret="", address="192.0.2.1"):
        line = request if isinstance(request, str) else json.dumps({"version": 1, **request})
        answer, blob = self.service.answer(address, line, secret)
        answer = json.loads(answer)
        self.assertEqual(1, answer.pop("version"))
        return answer, blob

    def account(self, code, host="host01", **more):
        return self.ask({"request": "account", "account": host, **more}, code)

    def error(self, answer):
        self.assertEqual("", answer[1])
        return answer[0]["error"], answer[0]["spent"]

    def test_anybody_may_ask_for_the_domains_names(self):
        self.assertEqual(({"netbios": "CORP", "dns": DOMAIN, "sid": "S-1-5-21-1-2-3"}, ""),
                         self.ask({"request": "domain"}))

    def test_a_code_gives_an_account(self):
        code = self.codes.issue("host01", "Servers/Linux", 60, False)
        self.assertEqual(({"controller": "dc1.corp.example", "spent": True}, "QkxPQg=="),
                         self.account(code))
        self.assertEqual([("host01", "OU=Linux,OU=Servers,DC=corp,DC=example", False)],
                         self.domain.made)
        self.assertEqual(("code-refused", False), self.error(self.account(code)))

    def test_a_host_does_not_choose_its_unit(self):
        code = self.codes.issue("host01", None, 60, False)
        self.assertEqual(("code-refused", False), self.error(self.account(code, unit="Servers")))
        code = self.codes.issue("host01", "Servers", 60, False)
        for unit in ("Servers/Linux", "", "X=1", "OU=Servers,DC=other"):
            self.service._refusals = service.Refusals()
            self.assertEqual(("code-refused", False), self.error(self.account(code, unit=unit)))
        self.assertEqual("QkxPQg==", self.account(code, unit="ou=servers")[1])

    def test_the_services_default_unit_serves_codes_without_one(self):
        self.service = service.Service(self.codes, self.domain, "Servers")
        code = self.codes.issue("host01", None, 60, False)
        self.assertEqual("QkxPQg==", self.account(code, unit="Servers")[1])
        self.assertEqual("OU=Servers,DC=corp,DC=example", self.domain.made[0][1])

    def test_a_code_is_spent_once_the_account_may_have_been_made(self):
        for error, answer in ((service.NoSuchUnit(), "no-such-unit"),
                              (service.NetError("said"), "failed"), (OSError("no"), "failed")):
            code = self.codes.issue("host01", None, 60, False)
            self.domain.error = error
            self.assertEqual((answer, True), self.error(self.account(code)))
            self.domain.error = None
            self.service._refusals = service.Refusals()
            self.assertEqual(("code-refused", False), self.error(self.account(code)))

    def test_a_controller_that_does_not_answer_costs_no_code(self):
        code = self.codes.issue("host01", None, 60, False)
        self.domain.search_error = service.NetError("no controller")
        self.assertEqual(("failed", False), self.error(self.account(code)))
        self.domain.search_error = None
        self.assertEqual("QkxPQg==", self.account(code)[1])

    def test_an_account_that_exists_is_taken_over_on_request_alone(self):
        self.domain.accounts = ["host01"]
        code = self.codes.issue("host01", None, 60, False)
        self.assertEqual(("account-exists", False), self.error(self.account(code)))
        self.assertEqual([], self.domain.made)
        code = self.codes.issue("host01", None, 60, True)
        self.assertEqual("QkxPQg==", self.account(code)[1])
        self.assertEqual([("host01", None, True)], self.domain.made)

    def test_whether_an_account_exists_is_not_told_to_a_stranger(self):
        self.domain.accounts = ["host01"]
        self.codes.issue("host01", None, 60, False)
        self.assertEqual(self.account("WRONG"), self.account("WRONG", host="host02"))

    def test_a_unit_of_another_domain_costs_no_code(self):
        code = self.codes.issue("host01", "OU=A,DC=other", 60, False)
        self.assertEqual(("failed", False), self.error(self.account(code)))
        self.assertIn("another domain", self.log[0])

    def test_one_of_many_requests_with_a_code_makes_the_account(self):
        code = self.codes.issue("host01", None, 60, False)
        with concurrent.futures.ThreadPoolExecutor(8) as pool:
            blobs = list(pool.map(lambda i: self.ask({"request": "account", "account": "host01"},
                                                     code, f"192.0.2.{i}")[1], range(16)))
        self.assertEqual(["QkxPQg=="], [blob for blob in blobs if blob])
        self.assertEqual(1, len(self.domain.made))

    def test_who_guesses_is_not_heard_and_others_are(self):
        code = self.codes.issue("host01", None, 60, False)
        for _ in range(service.REFUSALS):
            self.assertEqual(("code-refused", False), self.error(self.account("WRONG")))
        self.assertEqual(("too-many-attempts", False), self.error(self.account(code)))
        other = self.ask({"request": "account", "account": "host01"}, code, "192.0.2.2")
        self.assertEqual("QkxPQg==", other[1])

    def test_a_host_learns_nothing_from_a_refusal(self):
        self.codes.issue("host01", None, 60, False)
        first = self.account("WRONG")
        self.assertEqual(first, self.account("WRONG", host="host02"))
        self.assertIn("wrong", self.log[0])
        self.assertIn("no code", self.log[1])

    def test_nonsense_is_refused(self):
        for request in ("", "x", "[]", "null", "{}", '{"version": 1}', '{"version": 2}', "[" * 3000,
                        '{"version": 1, "request": "other"}', '{"version": 1, "request": []}'):
            self.assertEqual(("bad-request", False), self.error(self.ask(request)), request)
        for host in (None, 1, "", "a.b", "a b", "a)(x=*", "-a", "a" * 16, "a\n", "\u0130"):
            answer = self.ask({"request": "account", "account": host}, "X")
            self.assertEqual(("bad-request", False), self.error(answer), host)
        answer = self.ask({"request": "account", "account": "a", "unit": 3}, "X")
        self.assertEqual(("bad-request", False), self.error(answer))

    def test_the_log_tells_who_asked_for_what_and_no_secret(self):
        code = self.codes.issue("host01", None, 60, False)
        self.account("WRONG-CODE", unit="bad\nunit")
        self.account(code)
        text = "\n".join(self.log)
        for part in ("192.0.2.1", "host01"):
            self.assertIn(part, self.log[0])
            self.assertIn(part, self.log[1])
        for secret in (code, code.replace("-", ""), "WRONG-CODE", "QkxPQg"):
            self.assertNotIn(secret, text)

    def test_a_broken_file_of_codes_is_no_refusal(self):
        (self.folder / "codes.json").write_text("{")
        self.assertEqual(("failed", False), self.error(self.account("X")))
        self.assertIn("codes.json is damaged", self.log[0])


class Log(Folder):
    def test_a_line_stays_one_line(self):
        with mock.patch("builtins.print") as printed, mock.patch.object(service.syslog, "syslog"):
            service.log(0, "a\nb\x1b[0m\u202e")
        self.assertEqual("a?b?[0m?", printed.call_args[0][0])

    def test_no_stdout_makes_it_fail(self):
        closed = io.StringIO()
        closed.close()
        with open("/dev/full", "w") as full, open(os.devnull) as unwritable:
            for stdout in (io.TextIOWrapper(io.BytesIO(), encoding="ascii"), closed, full,
                           unwritable, None):
                with mock.patch.object(service.sys, "stdout", stdout), \
                        mock.patch.object(service.syslog, "syslog") as syslog:
                    service.log(0, "Büro \udcff")
                syslog.assert_called_once_with(0, "Büro ?")
            with contextlib.suppress(OSError):
                full.close()

    def test_an_answer_is_not_lost_where_it_cannot_be_logged(self):
        code = self.codes.issue("host01", "Büro", 60, False)
        asked = service.Service(self.codes, FakeDomain(), None)
        request = {"version": 1, "request": "account", "account": "host01"}
        stdout = io.TextIOWrapper(io.BytesIO(), encoding="ascii")
        with mock.patch.object(service.sys, "stdout", stdout), \
                mock.patch.object(service.syslog, "syslog"):
            self.assertEqual("QkxPQg==", asked.answer("192.0.2.1", json.dumps(request), code)[1])

    def test_the_program_says_what_the_stdout_has_no_letters_for(self):
        with tempfile.TemporaryDirectory() as folder:
            run = [sys.executable, "-B", PROGRAM]
            environment = {**os.environ, "LC_ALL": "C.UTF-8", "PYTHONIOENCODING": "ascii"}
            subprocess.run([*run, "issue-code", "--state", folder, "--host", "h", "--unit", "Büro"],
                           check=True, capture_output=True, env=environment)
            listed = subprocess.run([*run, "list-codes", "--state", folder], check=True, text=True,
                                    capture_output=True, env=environment).stdout
        self.assertRegex(listed, r"^H\tB\\xfcro\t60 min\n$")


if __name__ == "__main__":
    unittest.main(verbosity=0)
