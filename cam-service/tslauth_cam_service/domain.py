# SPDX-License-Identifier: Apache-2.0
"""The domain as its controller describes it, and the accounts that are made in it.

Samba's `net` does the work, with a configuration of its own for each account: it wants the name of
the host there, and must not meet this machine's.
"""
import asyncio
import base64
import binascii
import contextlib
import os
import pathlib
import re
import signal
import tempfile
import time

# What Samba's program may take for one host.
NET_SECONDS = 20

# Names and identifiers as a controller gives them; they go into a configuration file.
NAME = re.compile(r"[A-Za-z0-9._-]{1,253}")
SID = re.compile(r"S-1-[0-9-]{1,180}")


class NetError(Exception):
    """What Samba's program said when it failed."""


class NoSuchUnit(Exception):
    pass


async def command_result(command, seconds):
    """Exit code, output and complaints of a command without a shell. It and what it started are
    killed when it takes too long, and it does not outlive this process, whose death would leave
    nobody to hear it."""
    environment = {"PATH": "/usr/local/sbin:/usr/local/bin:/usr/sbin:/usr/bin:/sbin:/bin",
                   "LC_ALL": "C"}
    process = await asyncio.create_subprocess_exec(
        "setpriv", "--pdeathsig", "KILL", *command, stdin=asyncio.subprocess.DEVNULL,
        stdout=asyncio.subprocess.PIPE, stderr=asyncio.subprocess.PIPE, env=environment,
        start_new_session=True)
    try:
        output, complaints = await asyncio.wait_for(process.communicate(), max(seconds, 0))
    except asyncio.TimeoutError:
        raise NetError(f"'{command[0]}' took more than {seconds:.0f} s") from None
    finally:
        if process.returncode is None:
            with contextlib.suppress(ProcessLookupError):
                os.killpg(process.pid, signal.SIGKILL)
            await process.wait()
    return process.returncode, output.decode(errors="replace"), complaints.decode(errors="replace")


class Domain:
    def __init__(self, net, controller, credentials):
        self._net = net
        self._credentials = credentials
        self.controller = controller
        self.netbios = self.dns = self.sid = ""

    async def discover(self):
        """Asks the controller for the domain's names and identifier, which never change."""
        if not NAME.fullmatch(self.controller):
            raise NetError(f"'{self.controller}' is no controller's name")
        text = await self._run("lookup", NET_SECONDS, ["ads", "lookup", "-S", self.controller])
        self.dns = self._field(text, "Domain", NAME).lower()
        self.netbios = self._field(text, "Pre-Win2k Domain", NAME)
        self.controller = self._field(text, "Domain Controller", NAME)
        text = await self._run("lookup", NET_SECONDS,
                               ["ads", "search", "(objectClass=domainDNS)", "objectSid",
                                "-S", self.controller, *self._authentication()])
        self.sid = self._field(text, "objectSid", SID)

    async def has_account(self, host, end):
        """Whether there is an account of that name. `end` is when to give up, as below."""
        found = await self._run(host, end - time.monotonic(),
                                ["ads", "search", f"(sAMAccountName={host}$)", "name",
                                 "-S", self.controller, *self._authentication()])
        count = re.search(r"^Got (\d+) replies", found, re.M)
        if count is None:
            raise NetError("the controller's answer to a search is not understood")
        return int(count[1]) > 0

    async def make_account(self, host, unit, reuse, end):
        """The blob with which `host` joins. `unit` is a distinguished name, or None.

        `net` takes over an account that exists wherever its rights let it, whatever `reuse` says:
        has_account has to be asked before.
        """
        text = await self._run(
            host, end - time.monotonic(),
            ["offlinejoin", "provision", f"domain={self.dns}", f"machine_name={host}",
             f"dcname={self.controller}", *([f"machine_account_ou={unit}"] if unit else []),
             *(["reuse"] if reuse else []), "printblob", *self._authentication()])
        # The blob is the only line that is one.
        for line in text.splitlines():
            with contextlib.suppress(binascii.Error):
                if len(line) >= 64 and base64.b64decode(line, validate=True):
                    return line
        raise NetError("'net' has made an account and printed no blob")

    def _authentication(self):
        return ["-A", self._credentials]

    async def _run(self, host, seconds, arguments):
        with tempfile.TemporaryDirectory(prefix="tslauth-cam-") as folder:  # mode 0700
            lines = ["[global]", f"netbios name = {host}", "security = ads",
                     "kerberos method = secrets only", "log file = /dev/null"]
            if self.dns:
                lines += [f"realm = {self.dns.upper()}", f"workgroup = {self.netbios}"]
            for name in ("private dir", "state directory", "cache directory", "lock directory",
                         "pid directory", "ncalrpc dir"):
                lines.append(f"{name} = {folder}")
            configuration = pathlib.Path(folder) / "smb.conf"
            configuration.write_text("\n".join(lines) + "\n")
            code, output, complaints = await command_result(
                [self._net, f"--configfile={configuration}", *arguments], seconds)
        if code != 0:
            # A blob is printed by success alone.
            said = " ".join((complaints + " " + output).split())
            if arguments[0] == "offlinejoin" and "No such object" in said:
                raise NoSuchUnit()
            raise NetError(f"'net {' '.join(arguments[:2])}' failed ({code}): {said[-500:]}")
        return output

    @staticmethod
    def _field(text, name, pattern):
        found = re.search(rf"^\s*{re.escape(name)}:\s*(\S+)\s*$", text, re.M)
        if found is None or not pattern.fullmatch(found[1]):
            raise NetError(f"the controller does not tell its '{name}'")
        return found[1]
