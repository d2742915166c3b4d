#!/usr/bin/python3 -B
# SPDX-License-Identifier: Apache-2.0
"""What tslauth-cam-service decides: codes, units, refusals, who counts as the same host. Nothing
here opens a connection."""

import asyncio
import concurrent.futures
import contextlib
import io
import json
import os
import pathlib
import re
import struct
import subprocess
import sys
import tempfile
import unittest
from unittest import mock

SERVICE = pathlib.Path(__file__).parents[3] / "cam-service"
PROGRAM = SERVICE / "tslauth-cam-service"
sys.path.insert(0, str(SERVICE))

import alembic.autogenerate  # pylint: disable=wrong-import-position
import alembic.migration
import sqlalchemy as sa

from tslauth_cam_service import (codes, commands, configuration, domain, doors, joining, limits,
                                 log, orders, schema, store, units)

DNS = "corp.example"
BLOB = "QkxPQg=="


def anything(unit):
    pass


class Folder(unittest.TestCase):
    def setUp(self):
        folder = tempfile.TemporaryDirectory()
        self.addCleanup(folder.cleanup)
        self.folder = pathlib.Path(folder.name)
        self.now = 1000000.0
        self.store = self.another()
        self.store.open()

    def another(self):
        """A store of the same tables, as another process has it."""
        made = store.Store(f"sqlite:///{self.folder}/codes.db", self.folder, lambda: self.now)
        self.addCleanup(made.close)
        return made

    def issue(self, host="host01", unit=None, minutes=1, reuse=False, networks=None):
        return self.store.issue(codes.Order(host, unit, networks, minutes, reuse), "alice")

    def attempt(self, code, host="host01", key="key", address="192.0.2.1", unit=None):
        return store.Attempt(host, code, key, address, unit)

    def take(self, code, fits=anything, **more):
        """What a host does from its code to its account. Refused where it gets none."""
        claim = self.store.claim(self.attempt(code, **more), fits)
        self.assertTrue(self.store.made(claim))
        self.assertTrue(self.store.received(claim.name, "192.0.2.1"))
        return claim

    def refused(self, reason, code, fits=anything, **more):
        for step in (self.store.check, self.store.claim):
            with self.assertRaisesRegex(codes.Refused, reason):
                step(self.attempt(code, **more), fits)

    def audit(self):
        return [(row["action"], row["host"], row["outcome"]) for row in self.store.audit()]

    def sql(self, text):
        with self.store._engine.begin() as connection:
            connection.exec_driver_sql(text)


class Codes(Folder):
    def test_a_code_has_more_than_128_bits_and_is_never_the_same(self):
        made = {codes.new_code() for _ in range(100)}
        self.assertEqual(100, len(made))
        for code in made:
            self.assertRegex(code, r"^([A-HJ-NP-Z2-9]{4}-){7}[A-HJ-NP-Z2-9]{4}$")
        self.assertEqual(32, len(set(codes.ALPHABET)))

    def test_a_code_is_taken_once(self):
        code = self.issue(unit="Servers", reuse=True)
        claim = self.take(code)
        self.assertEqual(("Servers", True, False), (claim.unit, claim.reuse, claim.is_again))
        self.refused("no code", code)

    def test_neither_case_nor_hyphens_matter(self):
        code = self.issue("Host01")
        self.take(code.lower().replace("-", ""), host="HOST01")

    def test_another_hosts_code_is_wrong(self):
        first, second = self.issue("host01"), self.issue("host02")
        self.refused("wrong", second)
        self.refused("no code", first, host="host03")
        self.take(first)

    def test_a_wrong_code_leaves_the_right_one_alone(self):
        code = self.issue()
        for wrong in ("", "A", code[:-1], code[:-1] + ("A" if code[-1] != "A" else "B"), code * 2):
            self.refused("wrong", wrong)
        self.take(code)

    def test_an_expired_code_is_refused(self):
        code = self.issue()
        self.now += 60
        self.refused("expired", code)

    def test_a_clock_that_jumps_brings_no_used_code_back(self):
        code = self.issue()
        self.take(code)
        for jump in (-86400, 172800):
            self.now += jump
            self.refused("no code", code)

    def test_a_code_for_another_use_stays(self):
        def fits(unit):
            raise codes.Refused("another unit")
        code = self.issue()
        self.refused("another unit", code, fits)
        self.take(code)

    def test_a_code_counts_in_its_networks_alone(self):
        code = self.issue(networks="192.0.2.0/28, 2001:db8::/32")
        self.refused("another network", code, address="192.0.2.16")
        self.refused("another network", code, address="2001:db9::1")
        self.store.check(self.attempt(code, address="2001:db8::1"), anything)
        self.take(code, address="192.0.2.15")

    def test_what_no_code_can_be_bound_to_is_refused(self):
        for wrong in ({"host": ""}, {"host": "a.b"}, {"host": "a" * 16}, {"minutes": 0},
                      {"minutes": 10081}, {"minutes": "1"}, {"minutes": True},
                      {"networks": "192.0.2.1/24"}, {"networks": ""}, {"networks": "x"}):
            with self.assertRaises(ValueError, msg=wrong):
                codes.Order(**{"host": "host01", **wrong})

    def test_a_new_code_replaces_the_old_one(self):
        old, new = self.issue(), self.issue()
        self.refused("wrong", old)
        self.take(new)

    def test_a_revoked_code_is_worthless(self):
        code = self.issue()
        self.assertTrue(self.store.revoke("HOST01", "alice"))
        self.assertFalse(self.store.revoke("host01", "alice"))
        self.refused("no code", code)

    def test_the_files_hold_no_code_and_are_nobody_elses(self):
        mask = os.umask(0o077)
        self.addCleanup(os.umask, mask)
        with tempfile.TemporaryDirectory() as folder:
            self.folder = pathlib.Path(folder)
            self.store = self.another()
            self.store.open()
            code = self.issue()
            claim = self.store.claim(self.attempt(code, key="the-key-of-the-host"), anything)
            self.store.made(claim)
            for path in self.folder.iterdir():
                self.assertEqual(0o600, path.stat().st_mode & 0o7777, path)
                for part in (code, code.replace("-", ""), "the-key-of-the-host"):
                    self.assertNotIn(part.encode(), path.read_bytes())

    def test_the_same_code_has_another_digest_each_time(self):
        digests = {codes.digest(salt * 16, host, "X") for salt in (b"1", b"2") for host in "ab"}
        self.assertEqual(4, len(digests))

    def test_all_of_many_codes_are_issued_or_none(self):
        orders = [codes.Order(f"host{i}") for i in range(50)]
        issued = self.store.issue_all(orders, "alice")
        self.assertEqual(50, len(set(issued)))
        self.take(issued[17], host="host17")
        with mock.patch.object(codes, "digest", side_effect=["0" * 64, OSError("no")]):
            with self.assertRaises(OSError):
                self.store.issue_all([codes.Order("other1"), codes.Order("other2")], "alice")
        self.assertEqual(49, len(self.store.page()))

    def test_none_of_many_that_are_issued_at_once_is_lost(self):
        with concurrent.futures.ThreadPoolExecutor(8) as pool:
            list(pool.map(lambda i: self.another().issue(codes.Order(f"h{i}"), "alice"), range(40)))
        self.assertEqual(40, len(self.store.page()))

    def test_a_list_comes_in_pages(self):
        self.store.issue_all([codes.Order(f"host{i}") for i in range(25)], "alice")
        seen, after = [], 0
        while rows := self.store.page(after, 10):
            self.assertLessEqual(len(rows), 10)
            seen += [row["host"] for row in rows]
            after = rows[-1]["id"]
        self.assertEqual([f"HOST{i}" for i in range(25)], seen)


class Claims(Folder):
    """Between the code and the account."""

    def test_one_of_many_that_take_a_code_at_once_gets_it(self):
        code = self.issue()

        def take(number):
            try:
                return bool(self.another().claim(self.attempt(code, key=str(number)), anything))
            except codes.Refused:
                return False
        with concurrent.futures.ThreadPoolExecutor(16) as pool:
            self.assertEqual(1, sum(pool.map(take, range(32))))

    def test_while_it_lasts_a_claim_is_one_attempts_alone(self):
        code = self.issue()
        self.store.claim(self.attempt(code), anything)
        with self.assertRaises(store.InUse):
            self.store.claim(self.attempt(code), anything)
        self.refused("the code is used", code, key="another")

    def test_a_claim_that_was_answered_twice_is_the_same(self):
        attempt = self.attempt(self.issue())
        first = self.store.claim(attempt, anything)
        self.assertEqual(first, self.store.claim(attempt, anything))

    def test_after_a_crash_the_same_host_alone_comes_back(self):
        code = self.issue()
        lost = self.store.claim(self.attempt(code), anything)
        self.now += store.LEASE_SECONDS
        self.refused("the code is used", code, key="another")
        again = self.take(code)
        self.assertTrue(again.is_again)
        self.assertFalse(self.store.made(lost))
        self.refused("no code", code)

    def test_who_has_lost_its_claim_may_not_tell_of_the_account(self):
        code = self.issue()
        slow = self.store.claim(self.attempt(code), anything)
        self.now += store.LEASE_SECONDS
        self.store.claim(self.attempt(code), anything)
        self.assertFalse(self.store.made(slow))
        self.assertFalse(self.store.give_up(slow, "failed"))
        self.assertFalse(self.store.received(slow.name, "192.0.2.1"))

    def test_an_account_that_did_not_arrive_is_found_again_at_once(self):
        code = self.issue()
        self.store.made(self.store.claim(self.attempt(code), anything))
        self.refused("the code is used", code, key="another")
        self.assertTrue(self.take(code).is_again)

    def test_the_time_to_come_back_ends_and_does_not_begin_anew(self):
        code = self.issue()
        for _ in range(3):
            self.store.made(self.store.claim(self.attempt(code), anything))
            self.now += store.FOUND_SECONDS / 3
        self.refused("the time to come back is over", code)

    def test_where_surely_nothing_was_made_the_code_is_what_it_was(self):
        code = self.issue()
        self.store.give_up(self.store.claim(self.attempt(code), anything), "no such unit", True)
        self.take(code, key="another")

    def test_where_something_may_have_been_made_the_code_is_the_same_hosts(self):
        code = self.issue()
        self.store.give_up(self.store.claim(self.attempt(code), anything), "failed")
        self.refused("the code is used", code, key="another")
        # Also where nothing was made the second time.
        self.store.give_up(self.store.claim(self.attempt(code), anything), "no such unit", True)
        self.refused("the code is used", code, key="another")
        self.assertTrue(self.take(code).is_again)

    def test_a_code_that_is_revoked_in_the_middle_gives_no_account(self):
        code = self.issue()
        claim = self.store.claim(self.attempt(code), anything)
        self.store.revoke("host01", "alice")
        self.assertFalse(self.store.made(claim))

    def test_a_database_that_comes_back_loses_no_step(self):
        code = self.issue()
        real, fails = store.Store._now, [3]

        def failing(*arguments):
            if fails[0]:
                fails[0] -= 1
                raise sa.exc.OperationalError("step", {}, Exception("gone"))
            return real(*arguments)
        with mock.patch.object(store.Store, "_now", failing), \
                mock.patch.object(store.time, "sleep"):
            claim = self.store.claim(self.attempt(code), anything)
            fails[0] = 2
            self.assertTrue(self.store.made(claim))

    def test_a_database_that_stays_away_is_no_refusal(self):
        code = self.issue()
        with mock.patch.object(store, "PATIENCE_SECONDS", 0), \
                mock.patch.object(store.Store, "_now",
                                  side_effect=sa.exc.OperationalError("x", {}, Exception("gone"))):
            with self.assertRaisesRegex(store.NoStore, "gone"):
                self.store.claim(self.attempt(code), anything)


class Tables(Folder):
    def test_the_migrations_make_what_the_schema_says(self):
        with self.store._engine.begin() as connection:
            context = alembic.migration.MigrationContext.configure(connection)
            self.assertEqual([], alembic.autogenerate.compare_metadata(context, schema.METADATA))
            self.assertEqual(store.REVISION, context.get_current_revision())

    def test_tables_of_a_later_version_are_left_alone(self):
        self.sql("UPDATE alembic_version SET version_num = '9999'")
        with self.assertRaisesRegex(store.BrokenState, "later version"):
            self.another().open()
        self.assertFalse(self.store.is_ready())

    def test_opened_twice_they_are_the_same(self):
        code = self.issue()
        self.another().open()
        self.take(code)

    def test_a_damaged_database_is_named_and_kept(self):
        self.store.close()
        file = self.folder / "codes.db"
        for path in self.folder.iterdir():
            path.unlink()
        file.write_bytes(b"no database at all" * 100)
        with self.assertRaisesRegex(store.BrokenState, "not a database"):
            self.another().open()
        self.assertEqual(b"no database at all" * 100, file.read_bytes())

    def test_no_step_looks_at_every_code(self):
        steps = []
        code = self.issue()
        with contextlib.ExitStack() as stack:
            def said(_, cursor, statement, parameters, *__):
                steps.append((statement, parameters))
            sa.event.listen(self.store._engine, "before_cursor_execute", said)
            stack.callback(sa.event.remove, self.store._engine, "before_cursor_execute", said)
            self.store.check(self.attempt(code), anything)
            self.take(code)
            self.issue()
            self.store.revoke("host01", "alice")
            self.store.page(7, 10, (schema.ISSUED,))
            self.store.audit(7)
        planned = [step for step in steps if step[0].startswith(("SELECT", "UPDATE"))]
        self.assertGreater(len(planned), 8)
        for statement, parameters in planned:
            with self.store._engine.begin() as connection:
                plan = " ".join(row[3] for row in connection.exec_driver_sql(
                    "EXPLAIN QUERY PLAN " + statement, parameters))
            self.assertNotIn("SCAN", plan, statement)
            # The state alone would find nearly all of them.
            if "LIMIT" not in statement:
                self.assertNotIn("codes_state", plan, statement)

    def test_the_audit_only_grows(self):
        self.now = 4000000000.0
        self.issue()
        for statement in ("UPDATE audit SET actor = 'nobody'", "DELETE FROM audit"):
            with self.assertRaisesRegex(sa.exc.DatabaseError, "only grows"):
                self.sql(statement)
        self.assertEqual([("issued", "HOST01", "done")], self.audit())

    def test_every_step_is_in_the_audit(self):
        code = self.issue()
        self.store.refused([("host01", "192.0.2.9", "the code is wrong")])
        self.take(code)
        self.store.revoke("host01", "alice")
        self.assertEqual(
            [("issued", "HOST01", "done"), ("refused", "HOST01", "the code is wrong"),
             ("claimed", "HOST01", "done"), ("made", "HOST01", "done"),
             ("received", "HOST01", "done"), ("revoked", "HOST01", "no code")], self.audit())
        self.assertEqual(["alice", "host", "host", "service", "host", "alice"],
                         [row["actor"] for row in self.store.audit()])

    def test_what_is_old_goes_and_what_is_open_stays(self):
        used, waiting = self.issue("host01"), self.issue("host02", minutes=10080)
        self.issue("host03")
        self.take(used)
        self.now += 3600
        self.store.tidy(86400, 100 * 86400)
        self.assertEqual({"used": 1, "issued": 1, "lapsed": 1}, self.store.counts())
        self.now += 86401
        self.store.tidy(86400, 100 * 86400)
        self.assertEqual({"issued": 1}, self.store.counts())
        self.assertEqual(6, len(self.audit()))
        self.now += 100 * 86400
        self.store.tidy(86400, 100 * 86400)
        self.assertEqual([], self.audit())
        self.refused("no code", waiting, host="host02")


class FormerFile(Folder):
    """The codes of the former version, which had a file of its own."""

    ENTRY = {"salt": "00ff", "digest": codes.digest(b"\0\xff", "host01", "CODE"), "unit": "Servers",
             "expires": 1000060, "reuse": True}

    def write(self, entries):
        self.file = self.folder / "codes.json"
        self.file.write_text(json.dumps({"version": 1, "codes": entries}))

    def test_its_codes_count_as_before(self):
        self.write({"HOST01": self.ENTRY})
        self.store.open()
        claim = self.take("CODE")
        self.assertEqual(("Servers", True), (claim.unit, claim.reuse))
        self.assertFalse(self.file.exists())
        self.assertTrue((self.folder / "codes.json.taken-in").exists())

    def test_taken_in_twice_it_is_the_same(self):
        self.write({"HOST01": self.ENTRY})
        self.store.open()
        self.take("CODE")
        self.write({"HOST01": self.ENTRY})  # as if the power had failed before it was renamed
        self.store.open()
        self.refused("no code", "CODE")

    def test_a_damaged_one_is_named_and_kept(self):
        right = json.dumps({"version": 1, "codes": {"HOST01": self.ENTRY}})
        damaged = ["", "{", "[]", "{}", '{"version": 1}', '{"version": 1, "codes": []}', "[" * 9999,
                   right.replace('"version": 1', '"version": 2'), right[:-9], "\0" * 64]
        for member, values in {"salt": (None, "", "x", 1), "digest": ("", "0", None),
                               "unit": (1, []), "expires": (None, "1", 1.5, True),
                               "reuse": (None, 0, "")}.items():
            damaged += [json.dumps({"version": 1, "codes": {"HOST01": {**self.ENTRY, member: v}}})
                        for v in values]
            damaged.append(json.dumps({"version": 1, "codes": {
                "HOST01": {key: v for key, v in self.ENTRY.items() if key != member}}}))
        file = self.folder / "codes.json"
        for content in damaged:
            file.write_text(content)
            with self.assertRaisesRegex(store.BrokenState, "is damaged and was left as it is"):
                self.store.open()
            self.assertEqual(content, file.read_text())
        self.assertEqual({}, self.store.counts())

    def test_no_file_is_reached_through_a_link(self):
        outside = self.folder / "outside"
        outside.write_text(json.dumps({"version": 1, "codes": {"HOST01": self.ENTRY}}))
        (self.folder / "codes.json").symlink_to(outside)
        with self.assertRaises(store.BrokenState):
            self.store.open()

    def test_a_pipe_is_not_waited_for(self):
        os.mkfifo(self.folder / "codes.json")
        with self.assertRaises(store.BrokenState):
            self.store.open()


class Units(unittest.TestCase):
    def test_a_path_runs_from_the_outside_in(self):
        self.assertEqual("OU=Linux,OU=Servers,DC=corp,DC=example",
                         units.unit_name("Servers/Linux", DNS))

    def test_a_distinguished_name_may_leave_out_the_domain(self):
        for text in ("OU=Linux,OU=Servers", "OU=Linux, OU = Servers,DC=corp,DC=example",
                     "OU=Linux,OU=Servers,dc=CORP,dc=Example"):
            self.assertEqual("OU=Linux,OU=Servers,DC=corp,DC=example",
                             units.unit_name(text, DNS), text)

    def test_a_container_is_named_as_it_is(self):
        self.assertEqual("CN=Computers,DC=corp,DC=example", units.unit_name("CN=Computers", DNS))

    def test_what_would_end_a_name_is_escaped(self):
        self.assertEqual(r"OU=a\,DC\+b,DC=corp,DC=example", units.unit_name("a,DC+b", DNS))

    def test_what_is_no_unit_of_the_domain_is_refused(self):
        for text in ("", "/", "A//B", "A/ /B", "OU=A,X=B", "OU=", "OU=A,DC=other,DC=example",
                     "DC=corp,DC=example", "OU=A,DC=corp,DC=example,OU=B", "A\nB", "A\0",
                     "A" * 2000, "OU=A,,OU=B"):
            with self.assertRaises(ValueError, msg=text):
                units.unit_name(text, DNS)


class Refusals(unittest.TestCase):
    def setUp(self):
        self.now = 1000.0
        self.refusals = limits.Refusals(5, lambda: self.now)

    def test_an_address_is_not_heard_for_a_while(self):
        for _ in range(5):
            self.assertFalse(self.refusals.too_many("a"))
            self.refusals.add("a")
        self.assertTrue(self.refusals.too_many("a"))
        self.assertFalse(self.refusals.too_many("b"))
        self.now += limits.REFUSAL_SECONDS
        self.assertFalse(self.refusals.too_many("a"))

    def test_many_addresses_do_not_fill_the_memory(self):
        for i in range(limits.ADDRESSES + 10):
            self.refusals.add(str(i))
        self.assertEqual(limits.ADDRESSES, len(self.refusals._times))


class Proxies(unittest.TestCase):
    """What a load balancer tells of the client, before TLS begins."""

    @staticmethod
    def header(command, family, body):
        return doors.SIGNATURE + bytes([0x20 | command, family]) + struct.pack("!H", len(body)) \
            + body

    def test_the_clients_address_is_read(self):
        ports = b"\0\1\0\2"
        four = self.header(1, 0x11, bytes([192, 0, 2, 7, 10, 0, 0, 1]) + ports)
        self.assertEqual("192.0.2.7", doors.proxied_address(four))
        six = self.header(1, 0x21, bytes.fromhex("20010db8" + "0" * 23 + "7") + bytes(16) + ports)
        self.assertEqual("2001:db8::7", doors.proxied_address(six))
        self.assertIsNone(doors.proxied_address(self.header(0, 0, b"")))

    def test_what_is_no_such_header_is_refused(self):
        for wrong in (b"\x16\x03\x01" + bytes(13), self.header(1, 0x31, bytes(216)),
                      self.header(1, 0x11, bytes(4)), self.header(2, 0x11, bytes(12)),
                      self.header(1, 0x21, bytes(12)),
                      b"PROXY TCP4 192.0.2.7 10.0.0.1 1 2\r\n"):
            with self.assertRaises(ValueError, msg=wrong):
                doors.proxied_address(wrong)


class FakeDomain:
    netbios, dns, sid, controller = "CORP", DNS, "S-1-5-21-1-2-3", "dc1.corp.example"

    def __init__(self):
        self.accounts = []
        self.made = []
        self.search_error = self.error = None

    async def has_account(self, host, end):
        await asyncio.sleep(0)
        if self.search_error:
            raise self.search_error
        return host in self.accounts

    async def make_account(self, host, unit, reuse, end):
        await asyncio.sleep(0.01)
        if self.error:
            raise self.error
        self.made.append((host, unit, reuse))
        self.accounts.append(host)
        return BLOB


class Joining(Folder):
    def setUp(self):
        super().setUp()
        self.domain = FakeDomain()
        self.default_unit = None
        self.refusals = limits.Refusals(1000)
        self.log = []
        for module in (joining,):
            patch = mock.patch.object(module, "log",
                                      lambda _, text, **fields: self.log.append(text))
            patch.start()
            self.addCleanup(patch.stop)

    def ask(self, *attempts):
        """What the attempts get that are made at once: a blob or the name of an error."""
        async def together():
            service = joining.Joining(self.store, self.domain, self.default_unit, self.refusals, 4)

            async def one(attempt):
                try:
                    return await service.account(attempt)
                except joining.Answer as answer:
                    return answer.error
            return await asyncio.gather(*map(one, attempts))
        return asyncio.run(together())

    def account(self, code, **more):
        result = self.ask(self.attempt(code, **more))[0]
        return result if isinstance(result, str) else result.blob

    def test_a_code_gives_an_account(self):
        code = self.issue(unit="Servers/Linux")
        account = self.ask(self.attempt(code))[0]
        self.assertEqual((BLOB, "dc1.corp.example"), (account.blob, account.controller))
        self.assertEqual([("host01", "OU=Linux,OU=Servers,DC=corp,DC=example", False)],
                         self.domain.made)
        self.assertTrue(self.store.received(account.claim, "192.0.2.1"))
        self.assertEqual("code-refused", self.account(code))

    def test_a_host_does_not_choose_its_unit(self):
        code = self.issue()
        self.assertEqual("code-refused", self.account(code, unit="Servers"))
        code = self.issue(unit="Servers")
        for unit in ("Servers/Linux", "X=1", "OU=Servers,DC=other"):
            self.assertEqual("code-refused", self.account(code, unit=unit))
        self.assertEqual(BLOB, self.account(code, unit="ou=servers"))

    def test_the_services_default_unit_serves_codes_without_one(self):
        self.default_unit = "Servers"
        self.assertEqual(BLOB, self.account(self.issue(), unit="Servers"))
        self.assertEqual("OU=Servers,DC=corp,DC=example", self.domain.made[0][1])

    def test_an_account_that_may_have_been_made_is_the_same_hosts(self):
        for error, answer in ((domain.NetError("said"), "failed"), (OSError("no"), "failed")):
            code = self.issue()
            self.domain.error = error
            self.assertEqual(answer, self.account(code))
            self.assertEqual("code-refused", self.account(code, key="another"))
            self.domain.error, self.domain.accounts = None, ["host01"]
            self.assertEqual(BLOB, self.account(code))
            self.assertTrue(self.domain.made[-1][2])
            self.domain.accounts = []

    def test_a_unit_that_is_not_there_costs_no_code(self):
        code = self.issue()
        self.domain.error = domain.NoSuchUnit()
        self.assertEqual("no-such-unit", self.account(code))
        self.domain.error = None
        self.assertEqual(BLOB, self.account(code, key="another"))

    def test_a_controller_that_does_not_answer_costs_no_code(self):
        code = self.issue()
        self.domain.search_error = domain.NetError("no controller")
        self.assertEqual("failed", self.account(code))
        self.domain.search_error = None
        self.assertEqual(BLOB, self.account(code, key="another"))

    def test_an_account_that_exists_is_taken_over_on_request_alone(self):
        self.domain.accounts = ["host01"]
        code = self.issue()
        self.assertEqual("account-exists", self.account(code))
        self.assertEqual([], self.domain.made)
        self.assertEqual(BLOB, self.account(self.issue(reuse=True)))
        self.assertEqual([("host01", None, True)], self.domain.made)

    def test_who_comes_behind_another_is_refused_and_not_told_of_its_account(self):
        code = self.issue()
        real = self.domain.has_account

        async def meanwhile(host, end):
            if not self.domain.made:
                self.store.claim(self.attempt(code, key="another"), anything)
                await self.domain.make_account(host, None, False, end)
            return await real(host, end)
        self.domain.has_account = meanwhile
        self.assertEqual("code-refused", self.account(code))

    def test_every_one_of_many_refusals_is_noted(self):
        self.ask(*(self.attempt("WRONG", host=f"host{i}") for i in range(40)))
        noted = [row["host"] for row in self.store.audit() if row["action"] == "refused"]
        self.assertEqual({f"HOST{i}" for i in range(40)}, set(noted))
        self.assertEqual(40, len(noted))

    def test_whether_an_account_exists_is_not_told_to_a_stranger(self):
        self.domain.accounts = ["host01"]
        self.issue()
        self.assertEqual(self.account("WRONG"), self.account("WRONG", host="host02"))

    def test_a_unit_of_another_domain_costs_no_code(self):
        code = self.issue(unit="OU=A,DC=other")
        self.assertEqual("failed", self.account(code))
        self.assertIn("another domain", self.log[0])

    def test_one_of_many_hosts_with_a_code_gets_the_account(self):
        code = self.issue()
        got = self.ask(*(self.attempt(code, key=str(i), address=f"192.0.2.{i}")
                         for i in range(32)))
        self.assertEqual(1, sum(not isinstance(one, str) for one in got))
        self.assertEqual(1, len(self.domain.made))

    def test_a_host_that_asks_twice_at_once_is_told_to_wait(self):
        code = self.issue()
        first, second = self.attempt(code), self.attempt(code)
        self.store.claim(first, anything)
        self.assertEqual(["busy"], self.ask(second))

    def test_who_guesses_is_not_heard_and_others_are(self):
        self.refusals = limits.Refusals(5)
        code = self.issue()
        for _ in range(5):
            self.assertEqual("code-refused", self.account("WRONG"))
        self.assertEqual("too-many-attempts", self.account(code))
        self.assertEqual(BLOB, self.account(code, address="192.0.2.2"))

    def test_a_host_learns_nothing_from_a_refusal(self):
        self.issue()
        self.assertEqual(self.account("WRONG"), self.account("WRONG", host="host02"))
        self.assertIn("wrong", self.log[0])
        self.assertIn("no code", self.log[1])

    def test_the_log_tells_who_asked_for_what_and_no_secret(self):
        code = self.issue()
        self.account("WRONG-CODE", unit="bad unit")
        self.account(code)
        for part in ("192.0.2.1", "host01"):
            self.assertIn(part, self.log[0])
            self.assertIn(part, self.log[1])
        for secret in (code, code.replace("-", ""), "WRONG-CODE", BLOB):
            self.assertNotIn(secret, "\n".join(self.log))

    def test_a_database_that_is_away_is_no_refusal(self):
        with mock.patch.object(self.store, "check", side_effect=store.NoStore("gone")):
            self.assertEqual("failed", self.account("X"))
        self.assertIn("gone", self.log[0])


class Log(Folder):
    def test_a_line_stays_one_line(self):
        with mock.patch("builtins.print") as printed, mock.patch.object(log.syslog, "syslog"):
            log.log(0, "a\nb\x1b[0m\u202e")
        self.assertEqual("a?b?[0m?", printed.call_args[0][0])

    def test_fields_can_be_read_by_programs(self):
        self.assertEqual('said [address="192.0.2.1" host=host01]', log.line(
            log.NOTICE, "said", {"address": "192.0.2.1", "host": "host01", "none": None}))
        with mock.patch.object(log, "form", "json"):
            self.assertEqual({"level": "warning", "text": "said", "host": "a\"b"},
                             json.loads(log.line(log.WARNING, "said", {"host": "a\"b"})))

    def test_no_stdout_makes_it_fail(self):
        closed = io.StringIO()
        closed.close()
        with open("/dev/full", "w") as full, open(os.devnull) as unwritable:
            for stdout in (io.TextIOWrapper(io.BytesIO(), encoding="ascii"), closed, full,
                           unwritable, None):
                with mock.patch.object(sys, "stdout", stdout), \
                        mock.patch.object(log.syslog, "syslog") as syslog:
                    log.log(0, "Büro \udcff")
                syslog.assert_called_once_with(0, "Büro ?")
            with contextlib.suppress(OSError):
                full.close()


class Configurations(unittest.TestCase):
    LEAST = '[server]\ncertificate = "/c"\nkey = "/k"\n[domain]\ncontroller = "dc1"\n' \
            'credentials = "/p"\n'

    def test_what_is_not_said_has_a_value(self):
        read = configuration.parsed(self.LEAST)
        self.assertEqual(8989, read["server"]["port"])
        self.assertEqual("sqlite:////var/lib/tslauth-cam-service/codes.db", read.database)

    def test_who_does_not_serve_needs_no_certificate(self):
        self.assertEqual("/x", configuration.parsed('state = "/x"', False).state)

    def test_what_is_wrong_is_named(self):
        for text, named in (
                ("x", "Expected"), ("[other]", "section \\[other\\]"),
                ("colour = 1", "no 'colour'"), ("", "lacks 'certificate'"),
                (self.LEAST + "[limits]\nconnections = 0", "connections: a number from 1"),
                (self.LEAST + '[limits]\nconnections = "8"', "connections: a number"),
                (self.LEAST + "[server2]", "server2"),
                ('state = "relative"', "state: an absolute path"),
                ('[server]\naddress = "dc1"', "address: Expected 4 octets"),
                (self.LEAST + 'default_unit = "A//B"', "default_unit: a part"),
                (self.LEAST + '[database]\nurl = "mysql://x"', "url: sqlite"),
                (self.LEAST + '[operators.users]\nalice = ["all"]', "roles of 'alice'"),
                (self.LEAST + "[operators]\nport = 1", "authorities")):
            with self.assertRaisesRegex(configuration.Wrong, named, msg=text):
                configuration.parsed(text)


class Lists(unittest.TestCase):
    """Of hosts, and of their codes."""

    def test_csv_and_json_say_the_same(self):
        wanted = [codes.Order("h1", "A/B", "192.0.2.0/24", 30, True), codes.Order("h2")]
        self.assertEqual(wanted, orders.parsed(
            'host,unit,networks,minutes,reuse\nh1,A/B,192.0.2.0/24,30,yes\nh2,,,,\n', "csv"))
        self.assertEqual(wanted, orders.parsed(json.dumps([
            {"host": "h1", "unit": "A/B", "networks": "192.0.2.0/24", "minutes": 30,
             "reuse": True}, {"host": "h2"}]), "json"))
        self.assertEqual("host,code\nh1,X\nh2,Y\n", orders.printed(wanted, "XY", "csv"))
        self.assertEqual([{"host": "h1", "code": "X"}, {"host": "h2", "code": "Y"}],
                         json.loads(orders.printed(wanted, "XY", "json")))

    def test_a_wrong_entry_is_named_and_nothing_is_taken(self):
        for text, form, named in (
                ("[", "json", "no JSON"), ("{}", "json", "a list"), ("[" * 9999, "json", "no JSON"),
                ('[{"host": "a"}, {"host": "A"}]', "json", "entry 2: A is named twice"),
                ('[{"host": "a", "colour": 1}]', "json", "entry 1: an entry has no other"),
                ('[{"host": 3}]', "json", "'host' is a text"), ("[3]", "json", "entry 1"),
                ('[{"host": "a", "minutes": true}]', "json", "minutes"),
                ('[{"host": "a", "reuse": "yes"}]', "json", "'reuse' is true or false"),
                ("host\na b\n", "csv", "entry 1: a host has"), ("name\na\n", "csv", "entry 1"),
                ("host,reuse\na,true\n", "csv", "'reuse' is yes or no"),
                ("host\na,b\n", "csv", "more or fewer"), ("host,unit\na\n", "csv", "more or"),
                ("host,minutes\na,1x\n", "csv", "'minutes' is a number")):
            with self.assertRaisesRegex(orders.Wrong, named, msg=text):
                orders.parsed(text, form)

    def test_the_owner_of_the_certificate_reads_the_codes(self):
        with tempfile.TemporaryDirectory() as folder:
            def run(*command, **more):
                return subprocess.run(command, check=True, capture_output=True, cwd=folder, **more)
            run("openssl", "req", "-x509", "-newkey", "rsa:2048", "-nodes", "-subj", "/CN=x",
                "-keyout", "key.pem", "-out", "cert.pem")
            file = pathlib.Path(folder, "service.toml")
            file.write_text(f'state = "{folder}/state"\n')
            pathlib.Path(folder, "hosts.csv").write_text("host\nh1\nh2\n")
            command = [sys.executable, "-B", PROGRAM, "issue-codes", "--configuration", file,
                       "--input", "hosts.csv", "--recipient", "cert.pem", "--output", "codes.cms"]
            run(*command)
            output = pathlib.Path(folder, "codes.cms")
            self.assertEqual(0o600, output.stat().st_mode & 0o7777)
            self.assertIn("-----BEGIN CMS-----", output.read_text())
            plain = run("openssl", "cms", "-decrypt", "-inform", "PEM", "-in", "codes.cms",
                        "-inkey", "key.pem", "-recip", "cert.pem").stdout.decode()
            self.assertRegex(plain, r"^host,code\r?\nh1,([A-Z2-9]{4}-?){8}\r?\nh2,")
            kept = store.Store(f"sqlite:///{folder}/state/codes.db", folder)
            self.addCleanup(kept.close)
            code = re.search("h1,(.*)", plain)[1].strip()
            kept.check(store.Attempt("h1", code, "key", "192.0.2.1"), anything)
            # What is there is not written over, and what cannot be encrypted is not issued.
            for wrong in ([], ["--output", "other", "--recipient", "hosts.csv"]):
                with self.assertRaises(subprocess.CalledProcessError):
                    run(*command, *wrong)
            self.assertEqual(2, len(kept.page()))
            exported = run(sys.executable, "-B", PROGRAM, "export-audit", "--configuration",
                           file).stdout.decode().splitlines()
            self.assertEqual(["H1", "H2"], [json.loads(line)["host"] for line in exported])


class Commands(unittest.TestCase):
    def test_root_becomes_the_owner_of_the_folder(self):
        calls = mock.Mock()
        with mock.patch.multiple(commands.os, geteuid=lambda: 0, setgroups=calls.setgroups,
                                 setresgid=calls.setresgid, setresuid=calls.setresuid):
            commands.become(mock.Mock(st_uid=0, st_gid=0))
            self.assertEqual([], calls.mock_calls)
            commands.become(mock.Mock(st_uid=7, st_gid=8))
        self.assertEqual([mock.call.setgroups([]), mock.call.setresgid(8, 8, 8),
                          mock.call.setresuid(7, 7, 7)], calls.mock_calls)

    def test_why_nothing_was_issued_is_told_also_where_the_output_stays(self):
        lists = object.__new__(commands.Lists)
        lists.wanted, lists._output = [], io.StringIO()
        kept = mock.Mock()
        kept.issue_all.side_effect = store.NoStore("away")
        with mock.patch.object(commands.os, "unlink", side_effect=PermissionError), \
                self.assertRaisesRegex(store.NoStore, "away"):
            commands.issue_codes(kept, mock.Mock(lists=lists, output="codes.csv"), "somebody")

    def test_the_program_says_what_the_stdout_has_no_letters_for(self):
        with tempfile.TemporaryDirectory() as folder:
            file = pathlib.Path(folder) / "service.toml"
            file.write_text(f'state = "{folder}/state"\n')
            run = [sys.executable, "-B", PROGRAM]
            where = ["--configuration", file]
            environment = {**os.environ, "LC_ALL": "C.UTF-8", "PYTHONIOENCODING": "ascii"}
            subprocess.run([*run, "issue-code", *where, "--host", "h", "--unit", "Büro"],
                           check=True, capture_output=True, env=environment)
            listed = subprocess.run([*run, "list-codes", *where], check=True, text=True,
                                    capture_output=True, env=environment).stdout
        self.assertRegex(listed, r"^H\tB\\xfcro\t60 min\n$")


class Net(unittest.TestCase):
    """Samba's program, played."""

    def test_what_takes_too_long_is_killed_with_all_that_it_started(self):
        with tempfile.TemporaryDirectory() as folder:
            marker = pathlib.Path(folder) / "pid"
            with self.assertRaisesRegex(domain.NetError, "took more than"):
                asyncio.run(domain.command_result(
                    ["/bin/sh", "-c", f"sleep 60 & echo $! > {marker}; wait"], 0.5))
            child = int(marker.read_text())
            state = pathlib.Path(f"/proc/{child}/stat")
            self.assertTrue(not state.exists() or ") Z " in state.read_text())

    def test_its_end_is_told(self):
        self.assertEqual((3, "out", "err"), asyncio.run(domain.command_result(
            ["/bin/sh", "-c", "printf out; printf err >&2; exit 3"], 5)))


if __name__ == "__main__":
    unittest.main(verbosity=0)
