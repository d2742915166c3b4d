# SPDX-License-Identifier: Apache-2.0
"""What the tests of the tool share. They run as root inside a node."""

import functools
import json
import os
import pathlib
import shutil
import subprocess
import sys
import unittest

import jsonschema

TOOL = os.environ["TSLAUTHCTL"]
SCHEMA = json.loads(
    (pathlib.Path(__file__).parents[2] / "docs" / "tslauthctl.schema.json").read_text())

PAM = pathlib.Path("/etc/pam.d/system-auth-generic")
NSS = pathlib.Path("/etc/nsswitch.conf")
RECORD = pathlib.Path("/etc/tessel/tslauth/authentication.conf")
PROVIDER = pathlib.Path("/etc/tessel/tslauth/provider.conf")
LOCK = pathlib.Path("/run/tslauthctl.lock")
FILES = (PAM, NSS, RECORD)

AD = "Active Directory"

(DONE, FAILURE, USAGE, NOT_ROOT, REFUSED, LOSS, DRIFT, CHANGES, UNREACHABLE, CREDENTIALS,
 NOT_JOINED, JOINED_ELSEWHERE, UNTRUSTED, LOCKS_OUT) = range(14)

PLAIN_PAM = """#%PAM-1.0
auth required /lib/security/$ISA/pam_access.so
auth sufficient /lib/security/$ISA/pam_unix.so
account required /lib/security/$ISA/pam_unix.so
session required /lib/security/$ISA/pam_permit.so
"""
PLAIN_NSS = "passwd: files\ngroup: files\nshadow: files\nhosts: files\n"


@functools.cache
def validator():
    jsonschema.Draft202012Validator.check_schema(SCHEMA)
    return jsonschema.Draft202012Validator(SCHEMA)


def run(*arguments, **options):
    """The finished process of the tool, with its output as bytes."""
    return subprocess.run([TOOL, *arguments], stdout=options.pop("stdout", subprocess.PIPE),
                          stderr=subprocess.PIPE, timeout=60, **options)


def ask(*arguments, **options):
    """The JSON document, which is valid and says the exit code of the process."""
    process = run(*arguments, "--json", **options)
    document = json.loads(process.stdout)
    validator().validate(document)
    assert document["exit"] == process.returncode, process
    assert process.stderr == b"", process.stderr
    return document


def set_up(pam=PLAIN_PAM, nss=PLAIN_NSS, store="None", provider="example"):
    PAM.write_bytes(pam if isinstance(pam, bytes) else pam.encode())
    NSS.write_bytes(nss if isinstance(nss, bytes) else nss.encode())
    RECORD.write_text(f'remote-authentication-store = "{store}"\n')
    PROVIDER.write_text(f'provider = "{provider}"\n')
    for path in FILES:
        os.chown(path, 0, 0)
        os.chmod(path, 0o644)


def follow():
    """Lets the services of the host follow the policy, and joins it to the example's domain."""
    for path in pathlib.Path("/etc/pam.d").glob("common-*"):
        path.write_text("".join(f"{facility} include system-auth-generic\n"
                                for facility in ("auth", "account", "password", "session")))
    state = pathlib.Path("/var/lib/tslauth-example")
    state.mkdir(exist_ok=True)
    (state / "joined").write_text("CN=node,CN=Computers,DC=example,DC=test\n")


def have_management_address(case):
    """Gives the host an interface for as long as the test lasts."""
    case.addCleanup(subprocess.run, ["ip", "link", "delete", "management"])
    for command in ("ip link add management type dummy 2>/dev/null || "
                    "ip link add management type veth",
                    "ip address add 192.0.2.10/24 dev management",
                    "ip link set management up", "ip route add default via 192.0.2.254"):
        subprocess.run(["sh", "-c", command], check=True)


SCRIPTS = pathlib.Path("/run/directed")


def script(**entries):
    """Makes the provider "directed" the host's, and tells it what to do; see directed.c."""
    PROVIDER.write_text('provider = "directed"\n')
    shutil.rmtree(SCRIPTS, ignore_errors=True)
    SCRIPTS.mkdir()
    for entry, text in entries.items():
        (SCRIPTS / entry.replace("_", "-")).write_text(text)


def state(paths=FILES):
    """Everything about the files that a change would change."""
    found = {}
    for path in paths:
        status = path.stat()
        found[path] = (path.read_bytes(), status.st_ino, status.st_mtime_ns, status.st_mode,
                       status.st_uid, status.st_gid)
    return found


def texts():
    return {str(path): path.read_bytes() for path in FILES}


def main():
    if os.environ.get("TSLAUTH_NODE") != "1":
        sys.exit("to be run inside a node: tools/node")
    unittest.main(module="__main__", verbosity=0)
