#!/usr/bin/python3 -B
# SPDX-License-Identifier: Apache-2.0
"""One CAM service and who connects to it: its description holds, slow clients starve nobody, a new
certificate is taken, and no secret gets out."""
import asyncio
import json
import os
import pathlib
import re
import signal
import socket
import ssl
import subprocess
import sys
import tempfile
import unittest
import urllib.request

import jsonschema

sys.path.insert(0, str(pathlib.Path(__file__).parent))
from camfleet import NODES, STAND_IN, TREE, Fleet, ask, receive, until  # pylint: disable=C0413

SERVER = NODES[0]
URL = f"https://{SERVER}:8989"
DESCRIPTION = json.loads((TREE / "cam-service/tslauth_cam_service/openapi.json").read_text())


def schema(part):
    """A schema of the description, with what it refers to."""
    return {**part, "components": DESCRIPTION["components"]}


class TrafficTest(unittest.TestCase):
    @classmethod
    def setUpClass(cls):
        cls.folder = tempfile.TemporaryDirectory()
        cls.addClassCleanup(cls.folder.cleanup)
        cls.fleet = Fleet(cls.folder.name, 1, database=False, more="[metrics]\nport = 9189\n")
        cls.addClassCleanup(cls.fleet.close)

    def setUp(self):
        for name in ("says", "hangs"):
            (STAND_IN / name).unlink(missing_ok=True)

    def answered(self, method, path, address, **what):
        """Status, headers and body of one answer."""
        async def asked():
            async with self.fleet.session(address) as session:
                async with session.request(method, URL + path, **what) as answer:
                    return answer.status, answer.headers, await answer.read()
        return asyncio.run(asked())

    def check(self, method, path, address, status, **what):
        """The answer has the status that is wanted, and is what the description says of it."""
        got, headers, body = self.answered(method, path, address, **what)
        self.assertEqual(status, got, body)
        self.assertEqual("no-store", headers["Cache-Control"])
        described = DESCRIPTION["paths"][path][method]["responses"][str(status)]
        for name in described.get("headers", {}):
            self.assertRegex(headers[name], "^[0-9]+$")
        if "content" not in described:
            self.assertEqual(b"", body)
            return None
        answer = json.loads(body)
        self.assertTrue(headers["Content-Type"].startswith("application/json"))
        jsonschema.validate(answer, schema(described["content"]["application/json"]["schema"]))
        return answer

    def test_the_service_is_what_its_description_says(self):
        codes = self.fleet.issue(["made", "exists", "nowhere", "broken"])

        def question(host, **more):
            asked = {"host": host, "code": codes.get(host, "WRONG"), "host_key": "key", **more}
            jsonschema.validate(asked, schema(DESCRIPTION["components"]["schemas"]["Request"]))
            return {"json": asked}
        path, address = "/v1/accounts", "127.5.0.1"
        seen = set()

        def check(method, path, status, **what):
            seen.add((path, method, str(status)))
            return self.check(method, path, address, status, **what)
        check("get", "/v1/domain", 200)
        check("get", "/healthz", 200)
        check("get", "/readyz", 200)
        self.assertEqual(DESCRIPTION, check("get", "/openapi.json", 200))
        account = check("post", path, 201, **question("made"))
        receipt = {"claim": account["claim"]}
        jsonschema.validate(receipt, schema(DESCRIPTION["components"]["schemas"]["Receipt"]))
        check("post", path + "/received", 204, json=receipt)
        check("post", path + "/received", 404, json=receipt)
        for wrong in (b"", b"x", b"[]", b"{}", b"[" * 3000, b'{"claim": 1}'):
            check("post", path + "/received", 400, data=wrong)
        for wrong in ({"host": None}, {"host": "a.b"}, {"host": "a)(x=*"}, {"host": "a" * 16},
                      {"code": ""}, {"code": 1}, {"code": "\u0130"}, {"host_key": ""},
                      {"host_key": "\u0130"}, {"unit": 3}, {"unit": ""}, {"host": "a\n"}):
            check("post", path, 400, json={"host": "h", "code": "c", "host_key": "k", **wrong})
        check("post", path, 403, **question("made"))
        check("post", path, 413, data=b"x" * 5000)
        with (STAND_IN / "accounts").open("a") as accounts:
            accounts.write("exists\n")
        check("post", path, 409, **question("exists"))
        (STAND_IN / "says").write_text("No such object")
        check("post", path, 422, **question("nowhere"))
        (STAND_IN / "says").write_text("something else")
        check("post", path, 500, **question("broken"))
        (STAND_IN / "says").unlink()
        # A claim that somebody else holds, as if its account was being made.
        self.sql("UPDATE codes SET claim = 'other', claim_until = 4e9 WHERE host = 'BROKEN'")
        check("post", path, 503, **question("broken"))
        for _ in range(5):
            self.answered("post", path, address, **question("nobody"))
        check("post", path, 429, **question("nobody"))
        described = {(path, method, status) for path, methods in DESCRIPTION["paths"].items()
                     for method, what in methods.items() for status in what["responses"]}
        # These take a database that is away: the tests of several services see it.
        self.assertEqual({("/readyz", "get", "503"), ("/v1/accounts/received", "post", "500")},
                         described - seen)

    def sql(self, statement):
        subprocess.run([sys.executable, "-c", "import sqlite3, sys; c = sqlite3.connect("
                        "sys.argv[1]); c.execute(sys.argv[2]); c.commit()",
                        f"{self.folder.name}/state0/codes.db", statement], check=True)

    def test_96_slow_clients_of_three_addresses_starve_nobody(self):
        async def slow(address, way):
            """Connects, and takes its time; again and again."""
            context = ssl.create_default_context(cafile="/etc/tessel/cam/cert.pem")
            context.check_hostname = False
            while True:
                try:
                    if way == "tcp":
                        _, writer = await asyncio.open_connection(
                            SERVER, 8989, local_addr=(address, 0))
                    else:
                        _, writer = await asyncio.open_connection(
                            SERVER, 8989, local_addr=(address, 0), ssl=context)
                        writer.write(b"POST /v1/accounts HTTP/1.1\r\nHost: x\r\n")
                    while not writer.is_closing():
                        if way == "drip":
                            writer.write(b"X: y\r\n")
                            await writer.drain()
                        await asyncio.sleep(0.3)
                except OSError:
                    await asyncio.sleep(0.05)

        async def honest(address):
            try:
                async with self.fleet.session(address) as session:
                    async with session.get(URL + "/v1/domain") as answer:
                        return answer.status
            except Exception as error:  # pylint: disable=broad-except
                return repr(error)

        async def both():
            loop = asyncio.get_running_loop()
            slow_ones = [loop.create_task(slow(f"127.6.0.{number % 3 + 1}",
                                               ("tcp", "tls", "drip")[number // 3 % 3]))
                         for number in range(96)]
            await asyncio.sleep(2)
            others = await asyncio.gather(*(honest(f"127.6.1.{n + 1}") for n in range(40)))
            same = [await honest(f"127.6.0.{n % 3 + 1}") for n in range(40)]
            for one in slow_ones:
                one.cancel()
            await asyncio.gather(*slow_ones, return_exceptions=True)
            return others, same
        others, same = asyncio.run(both())
        self.assertEqual([200] * 40, others)
        self.assertEqual([200] * 40, same)

    def test_who_asks_nothing_is_ended_in_time(self):
        with socket.create_connection((SERVER, 8989)) as silent:
            silent.settimeout(8)
            with self.assertRaises(ConnectionResetError):
                if silent.recv(1) == b"":
                    raise ConnectionResetError

    def test_the_unit_leaves_the_service_little(self):
        judged = subprocess.run(
            ["systemd-analyze", "security", "--offline=true", "--no-pager", "--threshold=15",
             TREE / "cam-service/tslauth-cam-service.service"], capture_output=True, text=True)
        self.assertEqual(0, judged.returncode, judged.stdout[-300:] + judged.stderr)

    def test_a_backup_is_restored(self):
        before, after = self.fleet.issue(["backup1"])["backup1"], None
        copy = pathlib.Path(self.folder.name, "copy")
        self.fleet.run("backup", "--output", copy)
        self.assertEqual(0o600, copy.stat().st_mode & 0o7777)
        after = self.fleet.issue(["backup2"])["backup2"]
        self.fleet.kill(0)
        state = pathlib.Path(self.folder.name, "state0")
        for path in state.glob("codes.db*"):
            path.unlink()
        copy.rename(state / "codes.db")
        self.fleet.start(0)
        try:
            self.assertEqual(403, self.at("backup2", after))
            self.assertEqual(201, self.at("backup1", before))
        finally:
            self.assertIn("BACKUP1", self.fleet.run("export-audit"))

    def at(self, host, code):
        async def asked():
            async with self.fleet.session("127.5.1.1") as session:
                return (await ask(session, SERVER, host, code, "key"))[0]
        return asyncio.run(asked())

    def test_a_new_certificate_is_taken_without_a_restart(self):
        own = pathlib.Path("/etc/tessel/cam")
        process = self.fleet.processes[0]
        before = ssl.get_server_certificate((SERVER, 8989))
        right = {name: (own / name).read_text() for name in ("key.pem", "cert.pem")}
        try:
            (own / "cert.pem").write_text("none at all")
            process.send_signal(signal.SIGHUP)
            until("the complaint", lambda: "the certificate stays" in self.fleet.log(0))
            self.assertEqual(before, ssl.get_server_certificate((SERVER, 8989)))
            subprocess.run(["openssl", "req", "-x509", "-newkey", "rsa:2048", "-nodes", "-days",
                            "3", "-subj", "/CN=new", "-keyout", own / "key.pem", "-out",
                            own / "cert.pem"], check=True, stderr=subprocess.DEVNULL)
            process.send_signal(signal.SIGHUP)
            until("the new certificate",
                  lambda: ssl.get_server_certificate((SERVER, 8989))
                  == (own / "cert.pem").read_text())
        finally:
            for name, text in right.items():
                (own / name).write_text(text)
            process.send_signal(signal.SIGHUP)
            until("the old certificate",
                  lambda: ssl.get_server_certificate((SERVER, 8989)) == before)
        self.assertIsNone(process.poll())

    def test_no_secret_gets_out(self):
        """Of codes, blobs, the hosts' keys and the service's password: not into the log, the
        tables, the metrics, the command line or the environment."""
        hosts = [f"canary{number}" for number in range(8)]
        issued = self.fleet.issue(hosts[:7])
        issued[hosts[7]] = self.fleet.run("issue-code", "--host", hosts[7]).strip()
        secrets = {"the-service-s-own"}

        async def play():
            for number, host in enumerate(hosts):
                code, key = issued[host], f"key-of-{host}"
                secrets.update((code, code.replace("-", ""), key, f"wrong-{host}"))
                async with self.fleet.session(f"127.7.0.{number + 1}") as session:
                    await ask(session, SERVER, host, f"wrong-{host}", key)
                    if number == 6:
                        (STAND_IN / "says").write_text("refused")
                    status, answer = await ask(session, SERVER, host, code, key)
                    (STAND_IN / "says").unlink(missing_ok=True)
                    if status == 201:
                        secrets.add(answer["blob"])
                        if number % 2:
                            await receive(session, SERVER, answer["claim"])
                    async with session.get(f"{URL}/v1/accounts?code={code}") as nonsense:
                        await nonsense.read()
        asyncio.run(play())
        self.assertEqual(7, sum(len(secret) > 60 for secret in secrets), "the blobs")
        with urllib.request.urlopen("http://127.0.0.1:9189/metrics") as answer:
            metrics = answer.read()
        self.assertIn(b'tslauth_cam_answers_total{status="201"', metrics)
        process = pathlib.Path(f"/proc/{self.fleet.processes[0].pid}")
        places = {"metrics": metrics, "log": self.fleet.log(0).encode(),
                  "command": (process / "cmdline").read_bytes(),
                  "environment": (process / "environ").read_bytes(),
                  "list": self.fleet.run("list-codes").encode()}
        for path in pathlib.Path(self.folder.name, "state0").iterdir():
            places[path.name] = path.read_bytes()
        found = [name for name, content in places.items()
                 if any(secret.encode() in content for secret in secrets)]
        self.assertEqual([], found)
        # The look is able to find something.
        self.assertTrue(any(b"CANARY3" in content for name, content in places.items()
                            if name.startswith("codes.db")))
        self.assertTrue(re.search("canary3", self.fleet.log(0)))


if __name__ == "__main__":
    os.chdir("/")
    unittest.main(verbosity=0, warnings="ignore")
