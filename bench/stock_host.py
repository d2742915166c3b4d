#!/usr/bin/python3 -B
# SPDX-License-Identifier: Apache-2.0
"""What a set-up, a join and a local user's log-in cost on a stock Debian host, beside what they
cost without us, in the same run. tools/bench --host runs it."""
import os
import statistics
import sys

TREE = os.path.dirname(os.path.dirname(os.path.realpath(__file__)))
sys.path[:0] = [os.path.join(TREE, "tests", folder) for folder in ("lab", "stock")]
import outage
from lab import LOCAL_PASSWORD, PASSWORD, Lab
from stock import StockHost

JOINS, SETUPS, LOG_INS = 7, 7, 101


def row(case, ours, floor, unit, bar, is_met):
    print(f"{case:<52} {ours:>9} {floor:>9} {unit:<5} {bar:<24} {'met' if is_met else 'NOT MET'}",
          flush=True)


def milliseconds(seconds):
    return 1000 * statistics.median(seconds)


def log_in(host):
    """The milliseconds of a log-in of a local user's, in the middle of many."""
    times = host.shell("""
        for ((i = 0; i < $1; ++i)); do
            start=${EPOCHREALTIME/./}
            pamtester sshd lena authenticate acct_mgmt open_session close_session \\
                <<<"$2" >/dev/null 2>&1
            echo $((${EPOCHREALTIME/./} - start))
        done""", str(LOG_INS), LOCAL_PASSWORD, timeout=300).out
    return statistics.median(int(line) for line in times.split()) / 1000


def log_in_row(case, with_policy, without):
    more = with_policy - without
    row(case, f"{with_policy:.1f}", f"{without:.1f}", "ms", f"{more:+.1f} ms, at most +5",
        more <= 5)


def measure_setup(host):
    seconds = []
    for _ in range(SETUPS):
        seconds.append(host.tslauthctl("setup", "--provider", "winbind").seconds)
        host.tslauthctl("unsetup")
    took = milliseconds(seconds)
    row("setup", f"{took:.0f}", "-", "ms", "below 1000 ms", took < 1000)


def join_bare(host):
    host.write("/srv/bare.conf", "[global]\nworkgroup = CORP\nrealm = CORP.EXAMPLE\n"
               "security = ads\nprivate dir = /srv/bare\nlock directory = /srv/bare\n")
    host.ok("mkdir", "-p", "/srv/bare")
    took = host.ok("net", "-s", "/srv/bare.conf", "ads", "join", "--no-dns-updates",
                   "-U", f"joiner1%{PASSWORD}").seconds
    host.ok("net", "-s", "/srv/bare.conf", "ads", "leave", "-U", f"joiner1%{PASSWORD}")
    return took


def measure_join(host):
    ours, bare = [], []
    for _ in range(JOINS):
        bare.append(join_bare(host))
        ours.append(host.join().seconds)
        host.part()
    ratio = milliseconds(ours) / milliseconds(bare)
    row("join, beside a bare 'net ads join'", f"{milliseconds(ours):.0f}",
        f"{milliseconds(bare):.0f}", "ms", f"{ratio:.2f}, at most 1.6", ratio <= 1.6)


def main():
    lab = Lab()
    host = StockHost("bench")
    host.apt("install", "pamtester")
    without = log_in(host)
    host.install()
    print(f"{'case':<52} {'ours':>9} {'without':>9}")
    measure_setup(host)
    host.set_up()
    measure_join(host)
    host.join()
    host.activate()
    log_in_row("a local log-in, the controller in order", log_in(host), without)
    outage.lose(host, lab.dc1)
    log_in_row("a local log-in, nothing reaches the controller", log_in(host), without)
    host.down()


main()
