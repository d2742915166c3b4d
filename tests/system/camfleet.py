# SPDX-License-Identifier: Apache-2.0
"""Services of cam-service/example with their database and their load balancer, in a node; and
hosts that ask them. Samba's program is played by stand-in-net."""
import asyncio
import contextlib
import glob
import os
import pathlib
import random
import signal
import ssl
import subprocess
import sys
import time

import aiohttp

TREE = pathlib.Path(__file__).resolve().parents[2]
EXAMPLE = TREE / "cam-service" / "example"
PROGRAM = TREE / "cam-service" / "tslauth-cam-service"
WRAPPED = TREE / "tests" / "system" / "cam-service-with-fault"
STAND_IN = pathlib.Path("/run/stand-in")
NODES = ("127.0.0.2", "127.0.0.3", "127.0.0.4")
BALANCER = "127.0.0.1"
NOBODY = 65534


def until(what, happens, seconds=20):
    end = time.monotonic() + seconds
    while not happens():
        if time.monotonic() > end:
            raise AssertionError(f"in vain waited for {what}")
        time.sleep(0.02)


class PostgreSQL:
    """A server of its own, whose data lie in the node's memory; root may not be its user."""

    SOCKETS = pathlib.Path("/run/cam-postgresql")

    def __init__(self, folder):
        self._programs = sorted(glob.glob("/usr/lib/postgresql/*/bin"))[-1]
        self._data = folder / "data"
        for path in (self.SOCKETS, self._data):
            path.mkdir(parents=True, mode=0o700, exist_ok=True)
            os.chown(path, NOBODY, NOBODY)
        self._run("initdb", "-D", self._data, "-U", "cam", "-A", "trust", "--no-sync")
        self.start()
        self._run("createdb", "-h", self.SOCKETS, "-U", "cam", "cam")

    def _run(self, name, *arguments):
        subprocess.run(["setpriv", f"--reuid={NOBODY}", f"--regid={NOBODY}", "--clear-groups",
                        f"{self._programs}/{name}", *arguments], check=True, cwd="/",
                       stdout=subprocess.DEVNULL)

    def _control(self, *arguments):
        self._run("pg_ctl", "-w", "-D", self._data, "-l", self._data / "log", *arguments)

    def start(self):
        self._control("-o", f"-c listen_addresses= -c unix_socket_directories={self.SOCKETS} "
                            "-c max_connections=200", "start")

    def crash(self):
        self._control("-m", "immediate", "stop")

    def stop(self):
        self._control("-m", "fast", "stop")

    def dump(self):
        return subprocess.run([f"{self._programs}/pg_dump", "-h", self.SOCKETS, "-U", "cam", "cam"],
                              check=True, stdout=subprocess.PIPE).stdout

    def restore(self, dump):
        """Into a database that is empty; nobody may be connected."""
        for name in ("dropdb", "createdb"):
            self._run(name, "-h", self.SOCKETS, "-U", "cam", "cam")
        subprocess.run([f"{self._programs}/psql", "-h", self.SOCKETS, "-U", "cam", "-q", "-v",
                        "ON_ERROR_STOP=1", "cam"], check=True, input=dump,
                       stdout=subprocess.DEVNULL)

    def rows(self, statement):
        return subprocess.run(
            [f"{self._programs}/psql", "-h", self.SOCKETS, "-U", "cam", "-At", "-c", statement],
            check=True, stdout=subprocess.PIPE, text=True).stdout.split()


class Fleet:
    """`number` services, started; close() ends everything."""

    def __init__(self, folder, number=3, database=True, more=""):
        self.folder = pathlib.Path(folder)
        os.chmod(folder, 0o755)
        self._number = number
        self._more = more
        self._stack = contextlib.ExitStack()
        self.processes = {}
        self._identity()
        self.database = None
        if database:
            self.database = PostgreSQL(self.folder / "postgresql")
            self._stack.callback(self.database.stop)
        for number in range(self._number):
            self.start(number)
        if self._number > 1:
            self._balance()
        self._trust = ssl.create_default_context(cafile="/etc/tessel/cam/cert.pem")
        self._trust.check_hostname = False

    def close(self):
        for number in list(self.processes):
            self.kill(number)
        self._stack.close()

    def _identity(self):
        own = pathlib.Path("/etc/tessel/cam")
        own.mkdir(parents=True, exist_ok=True)
        subprocess.run(["openssl", "req", "-x509", "-newkey", "ec", "-pkeyopt",
                        "ec_paramgen_curve:prime256v1", "-nodes", "-days", "2", "-subj", "/CN=cam",
                        "-keyout", own / "key.pem", "-out", own / "cert.pem"],
                       check=True, stderr=subprocess.DEVNULL)
        os.chmod(own / "key.pem", 0o600)
        (own / "credentials").write_text("username = joiner\npassword = the-service-s-own\n")
        os.chmod(own / "credentials", 0o600)
        STAND_IN.mkdir(exist_ok=True)
        (STAND_IN / "accounts").write_text("")

    # --- services ---

    def configuration(self, number):
        text = (EXAMPLE / "service.toml").read_text()
        state = self.folder / f"state{number}"
        text = text.replace("STATE", str(state), 1).replace('"STATE"', f'"{state}"')
        text = text.replace('"ADDRESS"', f'"{NODES[number]}"').replace(
            "[domain]\n", f'[domain]\nnet_program = "{TREE}/tests/system/stand-in-net"\n')
        if self.database is None:
            text = text[:text.index("[database]")] + text[text.index("[limits]"):]
        path = self.folder / f"service{number}.toml"
        path.write_text(text + self._more)
        return path

    def start(self, number, fault=None):
        program = [PROGRAM] if fault is None else [WRAPPED, fault]
        with open(self.folder / f"log{number}", "a") as log:
            where = log.tell()
            self.processes[number] = subprocess.Popen(
                [sys.executable, "-B", *program, "serve", "--configuration",
                 self.configuration(number)], stdout=log, stderr=subprocess.STDOUT)
        until(f"service {number}: {self.log(number)[-500:]}",
              lambda: "serving" in self.log(number)[where:])

    def kill(self, number, how=signal.SIGKILL):
        process = self.processes.pop(number)
        process.send_signal(how)
        return process.wait(60)

    def log(self, number):
        return (self.folder / f"log{number}").read_text()

    def logs(self):
        return "".join(self.log(number) for number in range(self._number))

    def run(self, *verb, text=None):
        """What a verb of the command line prints."""
        return subprocess.run([sys.executable, "-B", PROGRAM, *verb, "--configuration",
                               self.folder / "service0.toml"], check=True, text=True, input=text,
                              stdout=subprocess.PIPE).stdout

    def issue(self, hosts):
        """Codes by host, as one process of the service issues them."""
        sys.path.insert(0, str(TREE / "cam-service"))
        from tslauth_cam_service import codes, configuration, store
        kept = store.Store(configuration.read(self.folder / "service0.toml").database, self.folder)
        orders = [codes.Order(host) for host in hosts]
        issued = dict(zip(hosts, kept.issue_all(orders, "tests")))
        kept.close()
        return issued

    def _balance(self):
        process = subprocess.Popen(["haproxy", "-db", "-f", EXAMPLE / "haproxy.cfg"],
                                   stdout=subprocess.DEVNULL, stderr=subprocess.DEVNULL)
        self._stack.callback(process.wait)
        self._stack.callback(process.kill)
        until("the load balancer", lambda: self._status(BALANCER) == 200)

    def _status(self, address):
        async def ask():
            async with self.session() as session:
                try:
                    async with session.get(f"https://{address}:8989/readyz") as answer:
                        return answer.status
                except (aiohttp.ClientError, OSError):
                    return None
        return asyncio.run(ask())

    # --- hosts ---

    def session(self, address=None, reuse=False):
        context = getattr(self, "_trust", None)
        if context is None:
            context = ssl.create_default_context(cafile="/etc/tessel/cam/cert.pem")
            context.check_hostname = False
        return aiohttp.ClientSession(
            connector=aiohttp.TCPConnector(ssl=context, limit=0, force_close=not reuse,
                                           local_addr=(address, 0) if address else None),
            timeout=aiohttp.ClientTimeout(total=30))

    @staticmethod
    def accounts():
        return (STAND_IN / "accounts").read_text().split()


async def ask(session, server, host, code, key):
    """Status and answer of one question for an account; None and a text where none came."""
    try:
        async with session.post(f"https://{server}:8989/v1/accounts", json={
                "host": host, "code": code, "host_key": key}) as answer:
            return answer.status, await answer.json()
    except (aiohttp.ClientError, OSError, asyncio.TimeoutError, ValueError) as error:
        return None, repr(error)


async def insist(session, server, host, code, key):
    """As `ask`, and again where no answer came: a busy machine gives connections up."""
    for _ in range(10):
        answer = await ask(session, server, host, code, key)
        if answer[0] is not None:
            break
    return answer


async def receive(session, server, claim):
    try:
        async with session.post(f"https://{server}:8989/v1/accounts/received",
                                json={"claim": claim}) as answer:
            return answer.status
    except (aiohttp.ClientError, OSError, asyncio.TimeoutError):
        return None


async def join(session, server, host, code, key, seconds=60):
    """A host that tries until it has its account, as its administrator would. The number of
    attempts."""
    end = time.monotonic() + seconds
    attempts = 0
    while time.monotonic() < end:
        attempts += 1
        status, answer = await ask(session, server, host, code, key)
        if status == 201:
            await receive(session, server, answer["claim"])
            return attempts
        if status not in (None, 500, 503):
            raise AssertionError(f"{host}: {status} {answer}")
        await asyncio.sleep(random.uniform(0.2, 0.6))
    raise AssertionError(f"{host} has no account: {status} {answer}")
