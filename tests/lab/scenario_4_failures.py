# SPDX-License-Identifier: Apache-2.0
"""Joins that fail, each for another reason: what the caller is told, and that the host is as it
was."""
import concurrent.futures
import json
import subprocess

import outage
from lab import PASSWORD, differences, expect, expect_equal, until

TITLE = "Joins that fail, and leave the host as it was"

# What may hold anything that a join writes. /usr is compared by its upper folder, /run/node/usr.
FOLDERS = ("/etc", "/var/lib/samba", "/var/cache/samba", "/var/log/samba", "/run", "/usr/libexec",
           "/tmp", "/home")
# Locks may outlive those who took them. The log is this scenario's own, see SystemLog.
EXEMPT = {"/run/tslauthctl.lock", "/run/tslauth-winbind.lock", "/run/system.log",
          "/run/node/var/lib/tslauth"}

# What the kernel keeps for the overlays of a node, and tslauthctl of its changes.
KEPT = ("/run/node/usr.work", "/run/node/var.work", "/run/node/var/lib/tslauth/history")

# Exit codes of tslauthctl.
DONE, REFUSED, UNREACHABLE, CREDENTIALS = 0, 4, 8, 9

# What the library makes of the provider's codes.
TOLD = {
    5: ("AccessDeniedException", "Access is denied."),
    87: ("InvalidParameterException", "The parameter is incorrect."),
    1062: ("ServiceNotActiveException", "The service has not been started."),
    1210: ("InvalidComputerNameException",
           "The format of the specified computer name is invalid."),
    1212: ("InvalidDomainNameException", "The format of the specified domain name is invalid."),
    1311: ("NoLogonServersException",
           "There are currently no logon servers available to service the logon request."),
    1326: ("LogonFailureException",
           "The attempted logon is invalid. This is due to either a bad user name or "
           "authentication information."),
    1330: ("PasswordExpiredException",
           "Logon failure: the specified account password has expired."),
    1331: ("AccountDisabledException", "Logon failure: account currently disabled."),
    1355: ("NoSuchDomainException",
           "The specified domain either does not exist or could not be contacted."),
    1398: ("TimeSkewException",
           "There is a time and/or date difference between the client and server."),
    2691: ("SetupAlreadyJoinedException", "This machine is already joined to a domain."),
    10060: ("WSATimedOutException",
            "A connection attempt failed because the connected party did not properly respond "
            "after a period of time, or established connection failed because connected host has "
            "failed to respond."),
    0xFFFF0000: ("UnknownException", "Unknown exception"),
    0xFFFF0001: ("UnknownException", "Unknown exception"),
}


class Attempt:
    """A join that must fail, through the library and through tslauthctl."""

    def __init__(self, text, code, exit_code, domain="corp.example", user="joiner1",
                 password=PASSWORD, before="true", after="true", limit=15):
        self.text = text
        self.code = code
        self.exit_code = exit_code
        self.domain = domain
        self.user = user
        self.password = password
        # Scripts that make the host what it must be, and undo that.
        self.before = before
        self.after = after
        # Seconds that each of the two may take.
        self.limit = limit

    def __str__(self):
        name, text = TOLD[self.code]
        return f"{name}: {self.message()}"

    def message(self):
        return f"Exception 0x{self.code:08x}: {TOLD[self.code][1]}"

    def check_library(self, result):
        expect_equal((result.code, result.out), (1, f"{self}\n"), "what the library threw")
        expect(result.seconds < self.limit, f"{result.seconds:.1f} s, more than {self.limit} s")

    def check_tool(self, result):
        expect_equal(result.code, self.exit_code, f"the exit code of\n{result}\n")
        error = json.loads(result.out)["error"]
        # The library's text, and behind it the provider's own words on the cause.
        text, _, cause = error["message"].partition(" (")
        expect_equal((error["exception"], text),
                     ("tessel::authentication::" + TOLD[self.code][0], self.message()),
                     "what tslauthctl told")
        expect(cause.endswith(")") and self.password not in cause, error["message"])
        expect(result.seconds < self.limit, f"{result.seconds:.1f} s, more than {self.limit} s")


class Tried:
    """What came of an attempt."""

    def __init__(self, library, tool, changes, started):
        self.library = library
        self.tool = tool
        self.changes = changes
        self.started = started


def processes(host):
    listing = host.ok("ps", "-eo", "pid=,args=").out
    return {line for line in listing.splitlines() if not line.endswith("ps -eo pid=,args=")}


def state_of(host):
    return host.snapshot(*FOLDERS), processes(host)


def compare(host, before):
    """What differs by now, but for what is exempt; and which processes are new."""
    files, running = before
    changes = {path: kind for path, kind in differences(files, host.snapshot(*FOLDERS)).items()
               if path not in EXEMPT and not path.startswith(KEPT)}
    return changes, sorted(processes(host) - running)


def through_library(host, attempt, *options):
    return host.library("join", attempt.domain, attempt.user, *options,
                        text=attempt.password + "\n", timeout=200)


def through_tool(host, attempt, *options):
    return host.run("tslauthctl", "--json", "join", attempt.domain, "--user", attempt.user,
                    "--password-stdin", *options, text=attempt.password + "\n", timeout=200)


def both_ways(host, attempt):
    host.shell(attempt.before)
    try:
        before = state_of(host)
        library = through_library(host, attempt, "skip")
        tool = through_tool(host, attempt, "--skip-hostname-check")
        return Tried(library, tool, *compare(host, before))
    finally:
        host.shell(attempt.after)


def tell(lab, host, attempt, future):
    what = f"{attempt.text}: {TOLD[attempt.code][0]}, exit code {attempt.exit_code}"
    with lab.step(what) as step:
        tried = future.result()
        step.took(tried.library.seconds + tried.tool.seconds)
        step.note(f"library {tried.library.seconds:.2f} s, tslauthctl {tried.tool.seconds:.2f} s")
        attempt.check_library(tried.library)
        attempt.check_tool(tried.tool)
        unchanged(host, tried.changes, tried.started)


def unchanged(host, changes, started):
    expect_equal(changes, {}, f"what the failed join left on {host.name}")
    expect_equal(started, [], f"what still runs on {host.name}")


# dc1's packets are lost without a word, on this host alone.
LOSE = f"ip neighbour replace 10.99.0.1 lladdr {outage.NOBODY} dev eth0 nud permanent"
FIND = "ip neighbour delete 10.99.0.1 dev eth0"

# The names come from another machine, so that only the controller is silent.
SILENT = Attempt("controller that is silent, never met", 1311, UNREACHABLE,
                 before=f"echo nameserver 10.99.0.253 >/etc/resolv.conf; {LOSE}", after=FIND)
ACCOUNTS = [
    Attempt("wrong password", 1326, CREDENTIALS, password="Not-the-Passw0rd"),
    Attempt("unknown user", 1326, CREDENTIALS, user="nobody1"),
    Attempt("disabled user", 1331, CREDENTIALS, user="disabled1"),
    Attempt("expired user", 1330, CREDENTIALS, user="expired1"),
    Attempt("user who must change the password", 1330, CREDENTIALS, user="mustchange1"),
    Attempt("plain user, who may not add computers", 5, CREDENTIALS, user="plain1"),
]
NAMES = [
    Attempt("unknown unit", 87, REFUSED, domain="corp.example/NoSuch"),
    Attempt("unknown unit, as distinguished name", 87, REFUSED,
            domain="corp.example/OU=NoSuch,OU=Servers,DC=corp,DC=example"),
    Attempt("malformed unit", 87, REFUSED, domain="corp.example/Servers//Linux"),
    Attempt("malformed unit, as distinguished name", 87, REFUSED, domain="corp.example/OU=,OU=x"),
    Attempt("unknown domain", 1355, UNREACHABLE, domain="nosuch.example"),
    Attempt("malformed domain", 1212, REFUSED, domain="corp..example"),
    Attempt("name of the host that is too long for an account", 1210, REFUSED,
            before="hostname a-very-long-name-for-a-host",
            after='hostname "$(cat /etc/hostname)"'),
]
NETWORK = [
    Attempt("no name server", 1355, UNREACHABLE, before=": >/etc/resolv.conf",
            after="echo nameserver 10.99.0.1 >/etc/resolv.conf"),
    Attempt("own link down", 1355, UNREACHABLE, before="ip link set eth0 down",
            after="ip link set eth0 up; ip route add default via 10.99.0.254"),
    Attempt("clock an hour ahead", 1398, REFUSED,
            before="echo +1h >/etc/faketimerc; echo "
                   "/usr/lib/x86_64-linux-gnu/faketime/libfaketime.so.1 >/etc/ld.so.preload",
            after="rm /etc/ld.so.preload /etc/faketimerc"),
    Attempt("clock ten minutes behind", 1398, REFUSED,
            before="echo -10m >/etc/faketimerc; echo "
                   "/usr/lib/x86_64-linux-gnu/faketime/libfaketime.so.1 >/etc/ld.so.preload",
            after="rm /etc/ld.so.preload /etc/faketimerc"),
]
SILENT_NAMES = [
    Attempt("name server that is silent", 10060, UNREACHABLE, before=LOSE, after=FIND),
    Attempt("name server whose address nobody has", 1355, UNREACHABLE,
            before="echo nameserver 10.99.0.252 >/etc/resolv.conf",
            after="echo nameserver 10.99.0.1 >/etc/resolv.conf"),
]
SILENT_WARM = Attempt("controller that is silent, joined to before", SILENT.code, SILENT.exit_code,
                      before=SILENT.before, after=SILENT.after)


class JoinedAlready(Attempt):
    """The library refuses; the tool says that the host is where it is to be."""

    def check_tool(self, result):
        expect_equal(result.code, self.exit_code, f"the exit code of\n{result}\n")
        expect(json.loads(result.out)["already_joined"], result.out)


JOINED = JoinedAlready("host that is joined already", 2691, DONE)


def joined_already(host):
    host.join()
    # Samba's programs write their databases while they run.
    host.shell("pkill -STOP 'winbindd|samba|rpcd'")
    try:
        return both_ways(host, JOINED)
    finally:
        host.shell("pkill -CONT 'winbindd|samba|rpcd'")


def silent_after_part(host):
    host.part()
    until("winbindd has ended", lambda: host.run("pgrep", "-x", "winbindd").code == 1)
    return both_ways(host, SILENT_WARM)


def begin(pool, host, attempts):
    """Plays the attempts on the host, one after the other and beside what else goes on. What will
    have come of each."""
    futures = [concurrent.futures.Future() for _ in attempts]

    def play_all():
        for attempt, future in zip(attempts, futures):
            try:
                future.set_result(both_ways(host, attempt))
            except Exception as failure:  # pylint: disable=broad-exception-caught
                future.set_exception(failure)

    pool.submit(play_all)
    return futures


# --- half-way ------------------------------------------------------------------------------------

# What stands in the place of winbindd where a join shall not be finished.
NO_WINBINDD = "#!/bin/bash\nexit 1\n"
CUTTING_WINBINDD = "#!/bin/bash\nip link set eth0 down\nexit 1\n"


class OneWay:
    """What came of a join that was tried once."""

    def __init__(self, result, changes, started):
        self.result = result
        self.changes = changes
        self.started = started

    def check(self, host, attempt):
        if self.result.command[0] == "tslauthctl":
            attempt.check_tool(self.result)
        else:
            attempt.check_library(self.result)
        unchanged(host, self.changes, self.started)


def one_way(host, attempt, through):
    before = state_of(host)
    result = through(host, attempt)
    return OneWay(result, *compare(host, before))


UNFINISHED = Attempt("winbindd does not start", 1062, REFUSED)
NOT_UNDONE = Attempt("winbindd does not start, and the link is gone", 0xFFFF0001, REFUSED, limit=60)
KILLED = Attempt("controller killed half-way", 1311, UNREACHABLE, limit=30)


def skipping(through, *options):
    return lambda host, attempt: through(host, attempt, *options)


WAYS = {"library": skipping(through_library, "skip"),
        "tslauthctl": skipping(through_tool, "--skip-hostname-check")}


def replace_winbindd(host, script):
    host.shell("rm /usr/sbin/winbindd")
    host.write("/usr/sbin/winbindd", script, "0755")


def unfinished(host, way):
    """A join whose second half fails on the host, beside others."""
    replace_winbindd(host, NO_WINBINDD)
    return one_way(host, UNFINISHED, WAYS[way])


def tell_unfinished(lab, host, way, future):
    """What the controller has done is undone."""
    with lab.step(f"{UNFINISHED.text}: {TOLD[UNFINISHED.code][0]} ({way})") as step:
        tried = future.result()
        step.took(tried.result.seconds)
        tried.check(host, UNFINISHED)
    with lab.step("  the account that the join made is deleted again"):
        expect_equal(lab.dc1.account_of(host), None, "the account")


def not_undone(host, way):
    replace_winbindd(host, CUTTING_WINBINDD)
    log = SystemLog(host)
    return one_way(host, NOT_UNDONE, WAYS[way]), log


def tell_not_undone(lab, host, way, future):
    """What the controller has done cannot be undone."""
    with lab.step(f"{NOT_UNDONE.text}: code 0xffff0001 ({way})") as step:
        tried, log = future.result()
        step.took(tried.result.seconds)
        tried.check(host, NOT_UNDONE)
    with lab.step("  the account stands on the controller, and the system log says so"):
        expect(lab.dc1.account_of(host), "no account")
        until("a line about the account", lambda: f"'{host.name.upper()}$'" in log.read(), 2)
        lab.say(log.read().strip().splitlines()[-1][:160] + "...")


class SystemLog:
    """What a host's programs say to the system log. /dev is the whole machine's, so the host gets
    one of its own first."""

    LISTENER = """
import socket
listener = socket.socket(socket.AF_UNIX, socket.SOCK_DGRAM)
listener.bind("/dev/log")
print(flush=True)
while True:
    line = listener.recv(65536).decode(errors="replace").strip()
    print(line, file=open("/run/system.log", "a"), flush=True)
"""

    def __init__(self, host):
        self._host = host
        host.shell("""
            mkdir /run/dev
            cp -a /dev/null /dev/zero /dev/full /dev/random /dev/urandom /dev/tty /run/dev/
            ln -s /proc/self/fd /run/dev/fd
            mkdir -m 1777 /run/dev/shm
            mount --bind /run/dev /dev
            : >/run/system.log""")
        self._listener = host.start("/usr/bin/python3", "-c", self.LISTENER,
                                    stdin=subprocess.DEVNULL, stdout=subprocess.PIPE)
        self._listener.stdout.readline()

    def read(self):
        return self._host.read("/run/system.log")


def kill_half_way(lab, pool, host, way):
    with outage.when_account_appears(lab.dc1, host, "SIGKILL") as wait:
        future = pool.submit(one_way, host, KILLED, WAYS[way])
        try:
            wait()
            return future.result()
        finally:
            outage.kill(lab.dc1)
            outage.start(lab.dc1)


def can_be_repeated(lab, host):
    with lab.step(f"  and it can be repeated: {host.name} joins over the account that was left"):
        host.join()
        expect_equal(json.loads(host.tslauthctl("--json", "info").out)["trust_state"], 0,
                     "the trust state")


def half_way(lab, pool, host, way):
    with lab.step(f"{KILLED.text}: {TOLD[KILLED.code][0]} ({way})") as step:
        tried = kill_half_way(lab, pool, host, way)
        step.took(tried.result.seconds)
        tried.check(host, KILLED)


def play(lab):
    # What waits goes beside what works: a controller that twelve hosts ask at once falls silent.
    lists = (ACCOUNTS + NAMES + NETWORK, [SILENT], *([attempt] for attempt in SILENT_NAMES))
    hosts = lab.hosts(len(lists) + 6)
    ways = ("library", "tslauthctl")
    with concurrent.futures.ThreadPoolExecutor(max_workers=32) as pool:
        begun = [begin(pool, host, attempts) for host, attempts in zip(hosts, lists)]
        joined, left, *others = hosts[len(lists):]
        again = pool.submit(joined_already, joined)
        one_by_one = concurrent.futures.ThreadPoolExecutor(max_workers=1)
        halves = [one_by_one.submit(unfinished, host, way) for way, host in zip(ways, others)]
        without_link = one_by_one.submit(not_undone, left, "library")
        tell(lab, joined, JOINED, again)
        warm = pool.submit(silent_after_part, joined)
        for host, attempts, futures in zip(hosts, lists, begun):
            for attempt, future in zip(attempts, futures):
                tell(lab, host, attempt, future)
        tell(lab, joined, SILENT_WARM, warm)
        for way, host, future in zip(ways, others, halves):
            tell_unfinished(lab, host, way, future)
        tell_not_undone(lab, left, "library", without_link)
        for way, host in zip(ways, others[2:]):
            half_way(lab, pool, host, way)
        can_be_repeated(lab, others[3])
