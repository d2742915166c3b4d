#!/usr/bin/python3 -B
# SPDX-License-Identifier: Apache-2.0
"""Several CAM services, their database and their load balancer, and what breaks among them: a code
counts once, and no account is lost."""
import asyncio
import pathlib
import sys
import tempfile
import threading
import time
import unittest

sys.path.insert(0, str(pathlib.Path(__file__).parent))
from camfleet import BALANCER, NODES, Fleet, ask, insist, join, receive  # pylint: disable=C0413

POINTS = ("before-claim", "claimed", "made-by-net", "made", "answered")


class FleetTest(unittest.TestCase):
    asked = 0

    @classmethod
    def setUpClass(cls):
        cls.folder = tempfile.TemporaryDirectory()
        cls.addClassCleanup(cls.folder.cleanup)
        cls.fleet = Fleet(cls.folder.name)
        cls.addClassCleanup(cls.fleet.close)

    def one(self, host):
        """How many accounts of the name were made."""
        return len([name for name in set(self.fleet.accounts()) if name == host])

    def end_leases(self):
        self.fleet.database.rows("UPDATE codes SET claim_until = 0 WHERE claim_until IS NOT NULL")

    def state_of(self, host):
        return self.fleet.database.rows(
            f"SELECT state FROM codes WHERE host = '{host.upper()}' ORDER BY id DESC LIMIT 1")[0]

    def at(self, server, host, code, key):
        """One question, from an address that has asked nothing before: one that was refused too
        often is not heard."""
        FleetTest.asked += 1
        address = f"127.9.{FleetTest.asked // 200}.{FleetTest.asked % 200 + 1}"

        async def asked():
            async with self.fleet.session(address) as session:
                return await ask(session, server, host, code, key)
        return asyncio.run(asked())

    def test_one_of_200_clients_with_one_code_at_three_services_gets_the_account(self):
        code = self.fleet.issue(["many"])["many"]

        async def storm():
            # From many addresses: one alone would not be heard after five wrong codes.
            async def one(number):
                async with self.fleet.session(f"127.1.{number // 4}.1") as session:
                    return await insist(session, NODES[number % 3], "many", code,
                                        str(number))
            return await asyncio.gather(*map(one, range(200)))
        answers = asyncio.run(storm())
        statuses = sorted(status for status, _ in answers)
        self.assertEqual([201] + [403] * 199, statuses)
        self.assertEqual(1, self.fleet.accounts().count("many"))

    def test_the_same_through_the_load_balancer(self):
        code = self.fleet.issue(["balanced"])["balanced"]

        async def storm():
            async def one(number):
                async with self.fleet.session(f"127.2.{number // 4}.1") as session:
                    return await insist(session, BALANCER, "balanced", code, str(number))
            return await asyncio.gather(*map(one, range(200)))
        statuses = sorted(status for status, _ in asyncio.run(storm()))
        self.assertEqual([201] + [403] * 199, statuses)
        self.assertEqual(1, self.fleet.accounts().count("balanced"))
        # The services know who asked, and not who handed it on.
        self.assertIn("127.2.", self.fleet.logs())
        self.assertNotIn("127.0.0.9 wants", self.fleet.logs())

    def test_whatever_point_it_dies_at_the_same_host_gets_its_account_elsewhere(self):
        for point in POINTS:
            with self.subTest(point):
                host = point[:15]
                code = self.fleet.issue([host])[host]
                self.fleet.kill(0)
                self.fleet.start(0, point)

                async def first():
                    async with self.fleet.session() as session:
                        status, answer = await ask(session, NODES[0], host, code, "right")
                        if status == 201:
                            status = await receive(session, NODES[0], answer["claim"])
                        return status
                self.assertIsNone(asyncio.run(first()))
                if point != "before-claim":
                    self.assertEqual(403, self.at(NODES[1], host, code, "wrong")[0])
                if point in ("claimed", "made-by-net"):
                    self.assertEqual(503, self.at(NODES[1], host, code, "right")[0])
                    self.end_leases()
                    self.assertEqual(403, self.at(NODES[1], host, code, "wrong")[0])
                status, answer = self.at(NODES[1], host, code, "right")
                self.assertEqual(201, status, answer)
                self.assertEqual(1, self.one(host))
        self.fleet.kill(0)
        self.fleet.start(0)

    def test_a_database_that_crashes_under_load_loses_nothing_and_gives_nothing_twice(self):
        hosts = [f"load{number}" for number in range(120)]
        issued = self.fleet.issue(hosts)
        crashes = []

        def crash():
            for _ in range(3):
                time.sleep(1.2)
                self.fleet.database.crash()
                time.sleep(0.3)
                self.fleet.database.start()
                crashes.append(len(set(self.fleet.accounts()) & set(hosts)))
        crasher = threading.Thread(target=crash)

        async def storm():
            async def one(number, host):
                async with self.fleet.session(f"127.3.{number}.1") as session:
                    # Not all at once: the database is to go while they come.
                    await asyncio.sleep(number * 0.03)
                    return await join(session, BALANCER, host, issued[host], host, 90)
            return await asyncio.gather(*(one(*item) for item in enumerate(hosts)))
        crasher.start()
        attempts = asyncio.run(storm())
        crasher.join()
        self.assertEqual(3, len(crashes))
        self.assertGreater(sum(attempts), len(hosts), "no host met the crash")
        self.assertEqual(set(hosts), set(self.fleet.accounts()) & set(hosts))
        # Some may not have come to say that they have it.
        self.assertLessEqual({self.state_of(host) for host in hosts}, {"used", "made"})
        for host in hosts[::10]:
            self.assertEqual(403, self.at(NODES[2], host, issued[host], "another")[0])

    def test_a_backup_is_restored(self):
        before = self.fleet.issue(["backup1"])["backup1"]
        dump = self.fleet.database.dump()
        after = self.fleet.issue(["backup2"])["backup2"]
        for number in range(3):
            self.fleet.kill(number)
        self.fleet.database.restore(dump)
        for number in range(3):
            self.fleet.start(number)
        self.assertEqual(403, self.at(NODES[1], "backup2", after, "key")[0])
        self.assertEqual(201, self.at(NODES[2], "backup1", before, "key")[0])
        with self.assertRaises(Exception, msg="the audit may be changed"):
            self.fleet.database.rows("UPDATE audit SET actor = 'nobody'")

    def test_a_service_whose_clock_is_off_takes_nothing_early_and_nothing_twice(self):
        for seconds in (7200, -7200):
            host = f"clock{'-' if seconds < 0 else ''}{abs(seconds)}"
            code = self.fleet.issue([host])[host]
            self.fleet.kill(2)
            self.fleet.start(2, f"clock:{seconds}")
            self.fleet.database.rows(
                f"UPDATE codes SET state = 'claimed', claim = 'other-' || host, claim_until = "
                f"extract(epoch FROM clock_timestamp()) + 30, found_until = "
                f"extract(epoch FROM clock_timestamp()) + 900, host_key = 'x' "
                f"WHERE host = '{host.upper()}'")
            self.assertEqual(403, self.at(NODES[2], host, code, "wrong")[0])
            code = self.fleet.issue([host])[host]
            self.assertEqual(201, self.at(NODES[2], host, code, "right")[0])
            self.assertEqual(403, self.at(NODES[1], host, code, "wrong")[0])
        self.fleet.kill(2)
        self.fleet.start(2)

    def test_a_service_that_ends_leaves_its_hosts_to_the_others(self):
        hosts = [f"drain{number}" for number in range(60)]
        issued = self.fleet.issue(hosts)
        ended = []

        async def storm():
            async def one(number, host):
                async with self.fleet.session(f"127.4.{number}.1") as session:
                    await asyncio.sleep(number * 0.05)
                    return await ask(session, BALANCER, host, issued[host], host)
            loop = asyncio.get_running_loop()
            asked = [loop.create_task(one(*item)) for item in enumerate(hosts)]
            await asyncio.sleep(0.5)
            ended.append(await loop.run_in_executor(None, self.fleet.kill, 1, 15))
            return await asyncio.gather(*asked)
        answers = asyncio.run(storm())
        self.fleet.start(1)
        self.assertEqual([0], ended)
        self.assertEqual({201}, {status for status, _ in answers},
                         [answer for status, answer in answers if status != 201][:3])


if __name__ == "__main__":
    unittest.main(verbosity=0, warnings="ignore")
