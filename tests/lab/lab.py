# SPDX-License-Identifier: Apache-2.0
"""What the scenarios share: nodes to run commands in, and steps with a name and a time."""
import base64
import concurrent.futures
import contextlib
import os
import subprocess
import sys
import time

TREE = os.path.dirname(os.path.dirname(os.path.dirname(os.path.realpath(__file__))))
STATE = os.environ.get("LAB_STATE") or os.path.join(TREE, "build/lab")
BUILD = os.environ.get("LAB_BUILD") or os.path.join(TREE, "build/release")
DOMAIN_LAB = os.path.join(TREE, "tools/domain-lab")
PASSWORD = "Lab-Passw0rd"
# Of the local users; no user of the domain has it.
LOCAL_PASSWORD = "local secret"
# A service that includes the policy which the library keeps.
LOGIN_SERVICE = "lab-login"
ENVIRONMENT = {
    "PATH": "/usr/local/sbin:/usr/local/bin:/usr/sbin:/usr/bin:/sbin:/bin",
    "LC_ALL": "C",
    "HOME": "/root",
}


class Mismatch(Exception):
    """Something is not as it should be; the text says what was seen."""


class Result:
    """What a command did: its exit code and what it printed."""

    def __init__(self, command, completed, seconds):
        self.command = command
        self.code = completed.returncode
        self.out = completed.stdout
        self.err = completed.stderr
        self.seconds = seconds

    def __str__(self):
        return (f"{' '.join(self.command)}\nexit code {self.code} after {self.seconds:.2f} s\n"
                f"{self.out}{self.err}")


class Node:
    """A machine of the lab."""

    def __init__(self, name):
        self.name = name
        with open(f"{STATE}/nodes/{name}/pid", encoding="ascii") as file:
            self.holder = file.read().strip()

    def command(self, *command):
        return ["nsenter", "--target", self.holder, "--mount", "--root", "--uts", "--net",
                "--ipc", "--pid", "--wdns=/", "--", *command]

    def run(self, *command, text=None, timeout=60):
        """Runs a command to its end, whatever that is. `text` is its standard input."""
        start = time.monotonic()
        completed = subprocess.run(
            self.command(*command), input=text or "", capture_output=True, text=True,
            timeout=timeout, env=ENVIRONMENT, check=False, errors="replace")
        return Result(command, completed, time.monotonic() - start)

    def start(self, *command, **options):
        """Starts a command and lets it run."""
        return subprocess.Popen(self.command(*command), text=True, env=ENVIRONMENT, **options)

    def ok(self, *command, **options):
        """Runs a command that must succeed."""
        result = self.run(*command, **options)
        if result.code != 0:
            raise Mismatch(str(result))
        return result

    def exits(self, code, *command, **options):
        """Runs a command that must end with this exit code."""
        result = self.run(*command, **options)
        if result.code != code:
            raise Mismatch(f"exit code {code} was expected\n{result}")
        return result

    def shell(self, script, *arguments, **options):
        """Runs a bash script that must succeed."""
        return self.ok("bash", "-euc", script, "shell", *arguments, **options)

    def read(self, path):
        return self.ok("cat", path).out

    def write(self, path, text, mode="0644"):
        self.shell('umask 077; cat >"$1"; chmod "$2" "$1"', path, mode, text=text)

    def tslauthctl(self, *arguments, **options):
        """A command of the tool that must succeed."""
        return self.ok("tslauthctl", *arguments, **options)

    def library(self, *arguments, **options):
        """What a service that calls the library sees; its failures have exit code 1."""
        return self.run(f"{STATE}/library-client", *arguments, **options)

    def by_library(self, *arguments, **options):
        """A call of the library that must succeed and has no answer."""
        result = self.library(*arguments, **options)
        if result.code != 0 or result.out:
            raise Mismatch(str(result))
        return result

    def join(self, domain="corp.example", *options, user="joiner1", password=PASSWORD):
        return self.tslauthctl("join", domain, "--user", user, "--password-stdin", *options,
                               text=password + "\n", timeout=150)

    def join_by_library(self, domain="corp.example", *options):
        return self.by_library("join", domain, "joiner1", *options, text=PASSWORD + "\n",
                               timeout=150)

    def part(self, user="joiner1", password=PASSWORD):
        return self.tslauthctl("part", "--user", user, "--password-stdin", text=password + "\n",
                               timeout=90)

    def part_by_library(self):
        return self.by_library("part-as", "joiner1", text=PASSWORD + "\n", timeout=90)

    def make_local_users(self):
        """The local user lena, a password for root, and a service to log in to."""
        self.shell("""
            hash=$(openssl passwd -6 "$1")
            useradd --no-create-home --password "$hash" lena
            usermod --password "$hash" root
            printf '%s\\tinclude\\tsystem-auth-generic\\n' auth account session >"/etc/pam.d/$2"
            """, LOCAL_PASSWORD, LOGIN_SERVICE)

    def samba_tool(self, *arguments):
        """A command of Samba's tool, which takes the first python3 that it finds otherwise."""
        return self.ok("/usr/bin/python3", "/usr/bin/samba-tool", *arguments)

    def directory(self, query, *attributes):
        """What a controller's own database holds: a list of name -> values, where the name "dn" has
        one value."""
        listing = self.ok("ldbsearch", "-H", "/var/lib/samba/private/sam.ldb", query, *attributes)
        records = []
        for block in listing.out.replace("\n ", "").split("\n\n"):
            record = {}
            for line in block.splitlines():
                if line.startswith("#"):
                    continue
                name, _, value = line.partition(":")
                if value.startswith(":"):
                    value = base64.b64decode(value[1:]).decode(errors="replace")
                record.setdefault(name, []).append(value.strip())
            if "dn" in record:
                record["dn"] = record["dn"][0]
                records.append(record)
        return records

    def account_of(self, host, *attributes):
        """The machine account of a host in a controller's own database, or None."""
        found = self.directory(f"(sAMAccountName={host.name}$)", *attributes)
        return found[0] if found else None

    def snapshot(self, *folders):
        """Every file below the folders: name -> (kind, mode, owner, group, target, sum). What comes
        or goes meanwhile may lack its sum."""
        listing = self.ok("find", *folders, "-xdev", "-printf", r"%p\t%y %m %U %G %l\n").out
        found = dict(line.split("\t", 1) for line in listing.splitlines())
        sums = self.shell(
            'find "$@" -xdev -type f -print0 | xargs -0r sha256sum --zero 2>/dev/null |'
            ' tr "\\0" "\\n"', *folders).out
        for line in sums.splitlines():
            digest, path = line.split("  ", 1)
            if path in found:
                found[path] += " " + digest
        return found


_BESIDE = concurrent.futures.ThreadPoolExecutor(max_workers=64)


class Story:
    """Steps of one host, (text, function) each, that are taken one after the other beside what else
    goes on. `Lab.tell` shows them."""

    def __init__(self, *steps):
        self.outcomes = [(text, concurrent.futures.Future()) for text, _ in steps]
        _BESIDE.submit(self._play, [function for _, function in steps])

    def _play(self, functions):
        for function, (_, future) in zip(functions, self.outcomes):
            start = time.monotonic()
            try:
                function()
                future.set_result(time.monotonic() - start)
            except BaseException as failure:  # pylint: disable=broad-exception-caught
                future.set_exception(failure)


class LogIn:
    """A user who logs in through the policy. It starts at once and runs beside others, since
    libpam takes two seconds before it says no."""

    def __init__(self, host, user, password):
        self._user = user
        self._result = _BESIDE.submit(
            host.run, "pamtester", LOGIN_SERVICE, user, "authenticate", "acct_mgmt",
            text=password + "\n")

    def is_let_in(self):
        """How long that took, in seconds."""
        result = self._result.result()
        answer = result.err + result.out
        expect(result.code == 0 and "pamtester: account management done.\n" in answer,
               f"{self._user} was not let in\n{result}")
        return result.seconds

    def is_refused(self, told="pamtester: Authentication failure"):
        """How long that took, in seconds. `told` is part of what the user is told."""
        result = self._result.result()
        answer = result.err + result.out
        expect(result.code == 1 and "account management done" not in answer,
               f"{self._user} was let in\n{result}")
        expect(told in answer, f"{self._user} was not told '{told}'\n{result}")
        return result.seconds


def at_once(function, *lists):
    """Calls the function for each item of the lists at the same time; a list of its results."""
    with concurrent.futures.ThreadPoolExecutor(max_workers=len(lists[0])) as pool:
        return list(pool.map(function, *lists))


def until(what, holds, seconds=15):
    """Asks until it holds."""
    end = time.monotonic() + seconds
    while not holds():
        expect(time.monotonic() < end, f"not seen within {seconds} s: {what}")
        time.sleep(0.05)


def differences(before, after):
    """The paths that two snapshots do not agree on: path -> "new", "gone" or "changed"."""
    found = {path: "gone" for path in before if path not in after}
    for path, state in after.items():
        if path not in before:
            found[path] = "new"
        elif before[path] != state:
            found[path] = "changed"
    return found


class Measures:
    """What a step says of itself."""

    def __init__(self):
        self._start = time.monotonic()
        self.seconds = None
        self._notes = ""

    def took(self, seconds):
        """The time of what was begun before the step, or beside others."""
        self.seconds = seconds

    def note(self, text):
        self._notes += f"  ({text})"

    def __str__(self):
        seconds = time.monotonic() - self._start if self.seconds is None else self.seconds
        return f"{1000 * seconds:6.0f} ms{self._notes}"


class Lab:
    """The domain, its hosts, and the steps of a scenario."""

    def __init__(self):
        self.passed = 0
        self.failed = 0
        self._said = []
        self.dc1 = Node("dc1")
        self.dc2 = Node("dc2")
        self._next_host = 1 + max(
            (int(name[4:]) for name in os.listdir(f"{STATE}/nodes") if name.startswith("host")),
            default=0)

    def hosts(self, number):
        """New machines, which are joined to nothing."""
        names = [f"host{self._next_host + index}" for index in range(number)]
        self._next_host += number
        subprocess.run([DOMAIN_LAB, "host", *names], check=True, stdout=sys.stderr)
        return [Node(name) for name in names]

    def host(self):
        return self.hosts(1)[0]

    def say(self, text):
        """A line below the step that goes on."""
        self._said.append(text)

    @contextlib.contextmanager
    def step(self, text):
        """One thing that is shown: what is done below it must not raise. The rest of the scenario
        goes on."""
        self._said = []
        measures = Measures()
        try:
            yield measures
        except (Mismatch, AssertionError, subprocess.SubprocessError, OSError) as failure:
            self.failed += 1
            print(f"  FAILED  {text}", flush=True)
            for line in (str(failure) or repr(failure)).splitlines()[-25:]:
                print(f"      | {line}", flush=True)
        else:
            self.passed += 1
            print(f"  ok  {text:<76} {measures}", flush=True)
            for line in self._said:
                print(f"      {line}", flush=True)


    def tell(self, story):
        for text, future in story.outcomes:
            with self.step(text) as step:
                step.took(future.result())


def expect(condition, text):
    if not condition:
        raise Mismatch(text)


def expect_equal(found, expected, what):
    expect(found == expected, f"{what}: {expected!r} was expected, {found!r} was found")
