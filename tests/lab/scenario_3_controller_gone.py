# SPDX-License-Identifier: Apache-2.0
"""The controller freezes, cannot be reached, dies and comes back: what hosts and users notice."""
import concurrent.futures
import subprocess
import time

import outage
from lab import (LOCAL_PASSWORD, LOGIN_SERVICE, LogIn, PASSWORD, STATE, expect, expect_equal, until)

TITLE = "The controller frozen, cut off, killed and back"

# Seconds. The store's own timeout, and what may pass beyond it until the answer is read here.
TIMEOUT, SLACK = 1, 0.7
# What the provider's header promises of a question.
QUESTION = 10
# A local user's log-in; with a working controller it takes a twentieth of this.
LOCAL = 1.0
# In which the store answers when it does not wait for the provider; a controller takes longer.
AT_ONCE = 0.01
# In which everything is to be as it was, once the controller is there again.
RECOVERY = 30

HEALTHY, NO_CONTROLLER = "0", "2"


class Service:
    """A process that keeps one store, as a host-management service does."""

    def __init__(self, host):
        self._process = host.start(f"{STATE}/library-client", "--timeout", str(TIMEOUT), "watch",
                                   stdin=subprocess.PIPE, stdout=subprocess.PIPE)

    def ask(self, question):
        """The answer, and the seconds until it came."""
        print(question, file=self._process.stdin, flush=True)
        answer = self._process.stdout.readline()
        seconds = self._process.stdout.readline()
        expect(answer.startswith(f"{question}=") and seconds.startswith("seconds="),
               f"asked for '{question}', the service said '{answer}{seconds}'")
        return answer.partition("=")[2].strip(), float(seconds.partition("=")[2])

    def end(self):
        self._process.stdin.close()
        self._process.wait(10)


def winbindd(host):
    return host.ok("pgrep", "-o", "-x", "winbindd").out


def begin_local(host):
    return {user: LogIn(host, user, LOCAL_PASSWORD) for user in ("root", "lena")}


def end_local(lab, when, attempts):
    with lab.step(f"{when}: root and lena log in without delay") as step:
        taken = {user: attempt.is_let_in() for user, attempt in attempts.items()}
        step.took(max(taken.values()))
        for user, seconds in taken.items():
            expect(seconds < LOCAL, f"{user}: {seconds:.2f} s, more than {LOCAL} s")


def answers_in_time(lab, when, service, before):
    """The three timed questions. The trust state asks for the trusted domains first, and each of
    the two may take the timeout."""
    limits = {"configuration": TIMEOUT, "trusted": TIMEOUT, "state": 2 * TIMEOUT}
    for question, limit in limits.items():
        with lab.step(f"{when}: the store answers '{question}' as before in {limit} s") as step:
            answer, seconds = service.ask(question)
            step.took(seconds)
            expect_equal(answer, before[question], "the answer")
            expect(seconds < limit + SLACK, f"{seconds:.2f} s, more than {limit} s")


def tool_gives_up(lab, when, result):
    with lab.step(f"{when}: tslauthctl info --timeout {TIMEOUT} ends with exit code 8") as step:
        step.took(result.seconds)
        expect_equal(result.code, 8, f"the exit code of\n{result}\n")
        expect(f"No answer within {TIMEOUT} second" in result.out + result.err, str(result))
        expect(result.seconds < TIMEOUT + SLACK, f"{result.seconds:.2f} s")


def ask_tool(host):
    return host.run("tslauthctl", "info", "--timeout", str(TIMEOUT))


def user_is_known(lab, when, host, entry):
    with lab.step(f"{when}: getent passwd 'CORP\\user1' answers from winbindd's cache") as step:
        result = host.ok("getent", "passwd", "CORP\\user1")
        step.took(result.seconds)
        expect_equal(result.out, entry, "the entry")
        expect(result.seconds < LOCAL, f"{result.seconds:.2f} s, more than {LOCAL} s")


def is_fresh(service, question, expected):
    """Whether the provider itself has given the answer: while it still waits for one that it was
    asked for when the controller was away, the store answers at once."""
    answer, seconds = service.ask(question)
    return answer == expected and (question == "trusted" or seconds > AT_ONCE)


def recovers(lab, what, host, service, before, process):
    """Without a restart of anything on the host."""
    start = time.monotonic()
    user = "CORP\\user1"
    with lab.step(f"{what}: tslauthctl info finds all well, within {RECOVERY} s") as step:
        until("exit code 0", lambda: host.run("tslauthctl", "info").code == 0, RECOVERY)
        step.took(time.monotonic() - start)
    with lab.step(f"{what}: {user} logs in again, within {RECOVERY} s") as step:
        until("a log-in", lambda: host.run(
            "pamtester", LOGIN_SERVICE, user, "authenticate", "acct_mgmt",
            text=PASSWORD + "\n").code == 0, start + RECOVERY - time.monotonic())
        step.took(time.monotonic() - start)
    for question in ("configuration", "trusted", "state"):
        with lab.step(f"{what}: the provider answers '{question}' as in the beginning") as step:
            until(f"'{before[question]}'",
                  lambda question=question: is_fresh(service, question, before[question]), QUESTION)
            step.took(time.monotonic() - start)
    with lab.step(f"{what}: winbindd is the process that it was"):
        expect_equal(winbindd(host), process, "winbindd's number")


def set_up(lab):
    host = lab.host()
    host.make_local_users()
    with lab.step(f"{host.name} joins, and CORP\\user1 logs in"):
        host.join()
        host.tslauthctl("activate", "Active Directory")
        LogIn(host, "CORP\\user1", PASSWORD).is_let_in()
    return host


def no_question_hangs(lab, host, asked):
    """Those that are not under the store's timeout, and those that are, without it."""
    for name, future in asked.items():
        with lab.step(f"frozen: tslauthctl {name} ends within {QUESTION} s") as step:
            result = future.result()
            step.took(result.seconds)
            step.note(f"exit code {result.code}")
            expect(result.code in (0, 8), str(result))
            expect(result.seconds < QUESTION + SLACK, f"{result.seconds:.2f} s")


def frozen(lab, pool, host, service, before, entry):
    process = winbindd(host)
    outage.freeze(lab.dc1)
    try:
        local = begin_local(host)
        user = LogIn(host, "CORP\\user1", PASSWORD)
        tool = pool.submit(ask_tool, host)
        asked = {name: pool.submit(host.run, "tslauthctl", *name.split(), "--timeout", "60")
                 for name in ("info", "dc other.example", "principal other.example",
                              "canonical plain1@corp.example")}
        answers_in_time(lab, "frozen", service, before)
        with lab.step("frozen: asked again while the provider waits, it answers at once") as step:
            answer, seconds = service.ask("state")
            step.took(seconds)
            expect_equal(answer, before["state"], "the trust state")
            expect(seconds < SLACK, f"{seconds:.2f} s")
        end_local(lab, "frozen", local)
        user_is_known(lab, "frozen", host, entry)
        tool_gives_up(lab, "frozen", tool.result())
        with lab.step("frozen: the provider ends its wait: trust state 2, no controller") as step:
            until("trust state 2", lambda: service.ask("state")[0] == NO_CONTROLLER, QUESTION + 5)
        no_question_hangs(lab, host, asked)
        with lab.step("frozen: CORP\\user1 cannot be checked, and is refused") as step:
            step.took(user.is_refused("pamtester: "))
    finally:
        outage.thaw(lab.dc1)
    recovers(lab, "thawed", host, service, before, process)


def away(lab, pool, when, host, service, before, entry):
    """What holds while the controller cannot be reached, whyever."""
    local = begin_local(host)
    tool = pool.submit(ask_tool, host)
    answers_in_time(lab, when, service, before)
    end_local(lab, when, local)
    user_is_known(lab, when, host, entry)
    tool_gives_up(lab, when, tool.result())


def play(lab):
    host = set_up(lab)
    service = Service(host)
    before = {question: service.ask(question)[0]
              for question in ("configuration", "trusted", "state")}
    entry = host.ok("getent", "passwd", "CORP\\user1").out
    with lab.step("the host is healthy, and the store answers") as step:
        expect_equal(before["state"], HEALTHY, "the trust state")
        expect(before["configuration"].lower().startswith(f"corp.example cn={host.name},"),
               before["configuration"])
        expect_equal(before["trusted"], "other.example/OTHER", "the trusted domains")
    with concurrent.futures.ThreadPoolExecutor(max_workers=16) as pool:
        frozen(lab, pool, host, service, before, entry)
        process = winbindd(host)
        outage.cut(host)
        try:
            away(lab, pool, "link cut", host, service, before, entry)
        finally:
            outage.mend(host)
        recovers(lab, "link mended", host, service, before, process)
        outage.kill(lab.dc1)
        try:
            away(lab, pool, "killed", host, service, before, entry)
        finally:
            outage.start(lab.dc1)
        recovers(lab, "started again", host, service, before, process)
    service.end()
