# SPDX-License-Identifier: Apache-2.0
"""What the scenarios share: nodes to run commands in, and steps with a name and a time."""
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
        return ["nsenter", "--target", self.holder, "--mount", "--uts", "--net", "--ipc", "--pid",
                "--wdns=/", "--", *command]

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

    def snapshot(self, *folders):
        """Every file below the folders: name -> (kind, mode, owner, group, target, sum)."""
        listing = self.ok("find", *folders, "-printf", r"%p\t%y %m %U %G %l\n").out
        found = dict(line.split("\t", 1) for line in listing.splitlines())
        sums = self.shell(
            'find "$@" -type f -print0 | xargs -0r sha256sum --zero | tr "\\0" "\\n"',
            *folders).out
        for line in sums.splitlines():
            digest, path = line.split("  ", 1)
            found[path] += " " + digest
        return found


def differences(before, after):
    """The paths that two snapshots do not agree on: path -> "new", "gone" or "changed"."""
    found = {path: "gone" for path in before if path not in after}
    for path, state in after.items():
        if path not in before:
            found[path] = "new"
        elif before[path] != state:
            found[path] = "changed"
    return found


class Lab:
    """The domain, its hosts, and the steps of a scenario."""

    def __init__(self):
        self.passed = 0
        self.failed = 0
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

    @contextlib.contextmanager
    def step(self, text):
        """One thing that is shown: what is done below it must not raise. The rest of the scenario
        goes on."""
        start = time.monotonic()
        try:
            yield
        except (Mismatch, AssertionError, subprocess.SubprocessError, OSError) as failure:
            self.failed += 1
            print(f"  FAILED  {text}", flush=True)
            for line in (str(failure) or repr(failure)).splitlines()[-25:]:
                print(f"      | {line}", flush=True)
        else:
            self.passed += 1
            print(f"  ok  {text:<76} {1000 * (time.monotonic() - start):6.0f} ms", flush=True)


def expect(condition, text):
    if not condition:
        raise Mismatch(text)


def expect_equal(found, expected, what):
    expect(found == expected, f"{what}: {expected!r} was expected, {found!r} was found")
