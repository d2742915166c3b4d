#!/usr/bin/python3 -B
# SPDX-License-Identifier: Apache-2.0
"""What operators may do with the CAM service, over its socket and with certificates, as programs
and in a browser."""
import contextlib
import http.server
import json
import os
import pathlib
import re
import socket
import sqlite3
import ssl
import subprocess
import sys
import tempfile
import threading
import unittest

import jsonschema

sys.path.insert(0, str(pathlib.Path(__file__).parent))
from camfleet import NOBODY, TREE, Fleet  # pylint: disable=C0413

SOCKET = "/run/cam-operators"
SERVER = ("127.0.0.2", 8990)
CERTIFICATES = pathlib.Path("/run/cam-certificates")
DESCRIPTION = json.loads(
    (TREE / "cam-service/tslauth_cam_service/openapi-operators.json").read_text())
CHROMIUM = "/usr/lib/chromium/chromium"

MORE = f"""
[operators]
socket = "{SOCKET}"
address = "{SERVER[0]}"
port = {SERVER[1]}
authorities = "{CERTIFICATES}/ca.pem"
[operators.users]
root = ["read", "issue", "audit"]
[operators.certificates]
reader = ["read"]
issuer = ["read", "issue"]
auditor = ["audit"]
all = ["read", "issue", "audit"]
"""

RAW = """
import socket, sys
with socket.socket(socket.AF_UNIX) as connection:
    connection.connect(sys.argv[1])
    connection.sendall(b"GET /operators/v1/codes HTTP/1.1\\r\\nHost: x\\r\\n"
                       b"Connection: close\\r\\n\\r\\n")
    print(connection.recv(65536).decode())
"""


def make_certificates():
    CERTIFICATES.mkdir()

    def openssl(*arguments):
        subprocess.run(["openssl", *arguments], check=True, cwd=CERTIFICATES,
                       capture_output=True)
    key = ("-newkey", "ec", "-pkeyopt", "ec_paramgen_curve:prime256v1", "-nodes")
    for authority in ("ca", "other"):
        openssl("req", "-x509", *key, "-subj", f"/CN={authority}", "-days", "2", "-keyout",
                f"{authority}.key", "-out", f"{authority}.pem")
    for name, authority in (("reader", "ca"), ("issuer", "ca"), ("auditor", "ca"), ("all", "ca"),
                            ("stranger", "ca"), ("forged", "other")):
        openssl("req", *key, "-subj", f"/CN={'all' if name == 'forged' else name}", "-keyout",
                f"{name}.key", "-out", f"{name}.csr")
        openssl("x509", "-req", "-in", f"{name}.csr", "-CA", f"{authority}.pem", "-CAkey",
                f"{authority}.key", "-CAcreateserial", "-days", "2", "-out", f"{name}.pem")


def exchanged(connection, method, path, body=b"", headers=None):
    """Status, headers and body of one answer."""
    head = {"Host": f"{SERVER[0]}:{SERVER[1]}", "Connection": "close",
            "Content-Length": str(len(body)), **(headers or {})}
    connection.sendall((f"{method} {path} HTTP/1.1\r\n" + "".join(
        f"{name}: {value}\r\n" for name, value in head.items()) + "\r\n").encode() + body)
    received = b""
    while part := connection.recv(65536):
        received += part
    head, _, body = received.partition(b"\r\n\r\n")
    lines = head.decode().split("\r\n")
    return int(lines[0].split()[1]), dict(line.split(": ", 1) for line in lines[1:]), body


class Relay:
    """Hands a browser's questions on: it would take an operator's certificate from a store of its
    own, which a person fills."""

    def __init__(self, answer):
        relay = self
        self.asked = []

        class Handler(http.server.BaseHTTPRequestHandler):
            def do_GET(self):
                relay.asked.append(self.path)
                status, headers, body = answer(self.path)
                self.send_response(status)
                for name in ("Content-Type", "Content-Security-Policy"):
                    self.send_header(name, headers[name])
                self.end_headers()
                self.wfile.write(body)

            def log_message(self, *_):
                pass
        self._server = http.server.ThreadingHTTPServer(("127.0.0.1", 0), Handler)
        self.port = self._server.server_port
        threading.Thread(target=self._server.serve_forever, daemon=True).start()

    def close(self):
        self._server.shutdown()
        self._server.server_close()


class OperatorsTest(unittest.TestCase):
    @classmethod
    def setUpClass(cls):
        make_certificates()
        cls.folder = tempfile.TemporaryDirectory()
        cls.addClassCleanup(cls.folder.cleanup)
        cls.fleet = Fleet(cls.folder.name, 1, database=False, more=MORE)
        cls.addClassCleanup(cls.fleet.close)

    def setUp(self):
        """No code of another test is waiting."""
        with contextlib.closing(sqlite3.connect(f"{self.folder.name}/state0/codes.db")) as kept:
            kept.execute("UPDATE codes SET state = 'revoked'")
            kept.commit()

    def over_socket(self, method, path, **more):
        with socket.socket(socket.AF_UNIX) as connection:
            connection.connect(SOCKET)
            return exchanged(connection, method, path, **more)

    def with_certificate(self, name, method, path, **more):
        context = ssl.create_default_context(cafile="/etc/tessel/cam/cert.pem")
        context.check_hostname = False
        if name:
            context.load_cert_chain(CERTIFICATES / f"{name}.pem", CERTIFICATES / f"{name}.key")
        with socket.create_connection(SERVER) as plain, \
                context.wrap_socket(plain) as connection:
            return exchanged(connection, method, path, **more)

    def described(self, answer, path, method, status):
        got, headers, body = answer
        self.assertEqual(status, got, body[:300])
        self.assertEqual("no-store", headers["Cache-Control"])
        what = DESCRIPTION["paths"][path][method]["responses"][str(status)]
        if "$ref" in what:
            what = DESCRIPTION["components"]["responses"][what["$ref"].rsplit("/", 1)[1]]
        if "content" not in what:
            return None
        parsed = json.loads(body)
        jsonschema.validate(parsed, {**what["content"]["application/json"]["schema"],
                                     "components": DESCRIPTION["components"]})
        return parsed

    def issue(self, *orders):
        return self.over_socket("POST", "/operators/v1/codes", body=json.dumps(orders).encode())

    def test_what_is_described_is_what_is_there(self):
        path = "/operators/v1/codes"
        issued = self.described(self.issue({"host": "op1", "unit": "A/B", "minutes": 5},
                                           {"host": "op2", "networks": "192.0.2.0/24"}),
                                path, "post", 201)["codes"]
        self.assertEqual(["op1", "op2"], [one["host"] for one in issued])
        rows = self.described(self.over_socket("GET", path), path, "get", 200)["codes"]
        self.assertIn(("OP2", "192.0.2.0/24"), [(row["host"], row["networks"]) for row in rows])
        for one in issued:
            self.assertNotIn(one["code"], json.dumps(rows))
        self.described(self.over_socket("GET", path + "?limit=1001"), path, "get", 400)
        self.described(self.over_socket("GET", path + "?view=all"), path, "get", 400)
        self.described(self.issue({"host": "a b"}), path, "post", 400)
        one = path + "/{host}"
        self.described(self.over_socket("DELETE", path + "/op1"), one, "delete", 204)
        self.described(self.over_socket("DELETE", path + "/op1"), one, "delete", 404)
        audit = "/operators/v1/audit"
        done = self.described(self.over_socket("GET", audit), audit, "get", 200)["audit"]
        self.assertIn(("root", "revoked", "OP1"),
                      [(row["actor"], row["action"], row["host"]) for row in done])
        self.assertEqual(
            [], self.described(self.over_socket("GET", f"{audit}?after={done[-1]['id']}"),
                               audit, "get", 200)["audit"])

    def test_a_role_is_what_it_says(self):
        paths = {"read": ("GET", "/operators/v1/codes", b""),
                 "page": ("GET", "/", b""),
                 "metrics": ("GET", "/metrics", b""),
                 "issue": ("POST", "/operators/v1/codes", b"[]"),
                 "revoke": ("DELETE", "/operators/v1/codes/nobody", b""),
                 "form": ("POST", "/revoke", b""),
                 "audit": ("GET", "/operators/v1/audit", b""),
                 "refused": ("GET", "/refused", b"")}
        may = {"reader": {"read", "page", "metrics"},
               "issuer": {"read", "page", "metrics", "issue", "revoke", "form"},
               "auditor": {"audit", "refused"}, "all": set(paths), "stranger": set()}
        for who, allowed in may.items():
            for name, (method, path, body) in paths.items():
                status = self.with_certificate(who, method, path, body=body)[0]
                self.assertEqual(name in allowed, status != 403, (who, name, status))
        log = self.fleet.log(0)
        self.assertIn("stranger is no operator", log)
        self.assertIn("operator reader: 'issue' is not among the roles", log)

    def test_without_a_certificate_that_is_trusted_nobody_is_heard(self):
        for name in (None, "forged"):
            with self.assertRaises((ssl.SSLError, ConnectionError, IndexError), msg=name):
                self.with_certificate(name, "GET", "/")

    def test_another_user_on_the_socket_is_no_operator(self):
        told = subprocess.run(["setpriv", f"--reuid={NOBODY}", f"--regid={NOBODY}",
                               "--clear-groups", sys.executable, "-c", RAW, SOCKET],
                              check=True, capture_output=True, text=True).stdout
        self.assertTrue(told.startswith("HTTP/1.1 403"), told)

    def test_a_form_of_another_page_is_refused(self):
        form = b"host=csrf1&minutes=5"
        kind = {"Content-Type": "application/x-www-form-urlencoded"}
        for foreign in ({"Origin": "https://elsewhere.example"}, {"Origin": "null"},
                        {"Sec-Fetch-Site": "cross-site"}, {"Sec-Fetch-Site": "same-site"}):
            self.assertEqual(403, self.with_certificate(
                "all", "POST", "/issue", body=form, headers={**kind, **foreign})[0], foreign)
        status, _, body = self.with_certificate(
            "all", "POST", "/issue", body=form,
            headers={**kind, "Origin": f"https://{SERVER[0]}:{SERVER[1]}",
                     "Sec-Fetch-Site": "same-origin"})
        self.assertEqual(200, status)
        self.assertRegex(body.decode(), r"<code>([A-Z2-9]{4}-){7}[A-Z2-9]{4}</code>")

    def test_what_others_say_does_not_become_part_of_the_page(self):
        self.fleet.run("issue-code", "--host", "evil1", "--unit", "<script>alert(1)</script>")
        _, headers, body = self.with_certificate("all", "GET", "/")
        self.assertIn(b"&lt;script&gt;", body)
        self.assertNotIn(b"<script", body)
        self.assertIn("default-src 'none'", headers["Content-Security-Policy"])
        for wrong in (b"host=%3Cscript%3E&minutes=5", b"host=x&minutes=5x", b"host=x&minutes=0"):
            status, _, body = self.with_certificate(
                "all", "POST", "/issue", body=wrong,
                headers={"Content-Type": "application/x-www-form-urlencoded"})
            self.assertEqual(400, status)
            self.assertNotIn(b"<script", body)

    def test_more_hosts_than_a_page_has_come_on_the_next(self):
        self.issue(*({"host": f"page{number}"} for number in range(230)))
        seen, path = set(), "/?view=waiting"
        for _ in range(6):
            body = self.with_certificate("reader", "GET", path)[2].decode()
            seen |= set(re.findall(r'<th scope="row">(PAGE\d+)', body))
            following = re.search(r'<a href="(/\?view=waiting&amp;after=\d+)">More', body)
            if following is None:
                break
            path = following[1].replace("&amp;", "&")
        self.assertEqual(230, len(seen))

    def test_a_browser_shows_the_page_without_scripts(self):
        """The picture is left in build/, to be looked at."""
        self.issue({"host": "browser1", "unit": "Servers/Linux", "minutes": 30},
                   {"host": "browser2", "networks": "192.0.2.0/24", "minutes": 2000})
        home = pathlib.Path(self.folder.name) / "browser"
        home.mkdir(exist_ok=True)
        picture = pathlib.Path(os.environ.get("TSLAUTH_BUILD", self.folder.name)) / "cam-page.png"
        page = Relay(lambda path: self.with_certificate("all", "GET", path))
        self.addCleanup(page.close)
        common = [CHROMIUM, "--headless", "--no-sandbox", "--disable-gpu", "--no-first-run",
                  "--disable-dev-shm-usage", f"--user-data-dir={home}", "--window-size=1200,900"]
        url = f"http://127.0.0.1:{page.port}/"
        shown = subprocess.run([*common, "--dump-dom", url], check=True, capture_output=True,
                               text=True, timeout=60).stdout
        self.assertIn("BROWSER1", shown)
        self.assertIn("Issue a code", shown)
        self.assertNotIn("<script", shown)  # and the policy would let none run
        subprocess.run([*common, f"--screenshot={picture}", url], check=True, capture_output=True,
                       timeout=60)
        self.assertGreater(picture.stat().st_size, 10000)
        self.assertEqual({"/", "/style.css"}, set(page.asked) - {"/favicon.ico"})


if __name__ == "__main__":
    os.chdir("/")
    unittest.main(verbosity=0, warnings="ignore")
