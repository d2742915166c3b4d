#!/usr/bin/python3 -B
# SPDX-License-Identifier: Apache-2.0
"""What the CAM service costs, with Samba's program played and its time stated; in a node:

  sudo tools/node -- bench/cam/load.py joins [SERVICES...]     2000 joins through so many services
  sudo tools/node -- bench/cam/load.py refusals                 a wrong code, 500 times a second
  sudo tools/node -- bench/cam/load.py stored                   with 1000 to 1,000,000 codes stored
  sudo tools/node -- bench/cam/load.py added                    beside `net` alone, 4 and 32 at once

All of it runs on this machine, clients and database as well.
"""
import asyncio
import os
import pathlib
import resource
import statistics
import sys
import tempfile
import time

sys.path.insert(0, str(pathlib.Path(__file__).resolve().parents[2] / "tests" / "system"))
from camfleet import BALANCER, NODES, STAND_IN, TREE, Fleet, ask, receive  # pylint: disable=C0413

MORE = "refusals_a_minute = 1000000\n"  # of the section that comes last


def percentile(values, part):
    return sorted(values)[min(len(values) - 1, int(len(values) * part))]


def told(values):
    return (f"p50 {statistics.median(values) * 1000:.0f} ms, "
            f"p99 {percentile(values, .99) * 1000:.0f} ms")


def memory(process):
    for line in pathlib.Path(f"/proc/{process.pid}/status").read_text().splitlines():
        if line.startswith("VmHWM"):
            return int(line.split()[1]) / 1024
    return 0


def processor(processes):
    """Seconds of processor that the processes and what they waited for have had."""
    tick = os.sysconf("SC_CLK_TCK")
    return sum(sum(map(int, pathlib.Path(f"/proc/{one.pid}/stat").read_text().rsplit(")", 1)[1]
                       .split()[11:15])) for one in processes) / tick


async def joined(fleet, server, issued, at_once):
    """The seconds that each join took, and all of them."""
    places = asyncio.Semaphore(at_once)
    times = []

    async def one(session, host, code):
        async with places:
            begin = time.monotonic()
            while True:
                status, answer = await ask(session, server, host, code, host)
                if status == 201:
                    break
                if status not in (None, 503):
                    raise AssertionError(f"{host}: {status} {answer}")
                await asyncio.sleep(0.2)
            await receive(session, server, answer["claim"])
            times.append(time.monotonic() - begin)
    begin = time.monotonic()
    async with fleet.session() as session:
        await asyncio.gather(*(one(session, *item) for item in issued.items()))
    return times, time.monotonic() - begin


def joins(counts):
    for count in map(int, counts or ("1", "2", "3")):
        with tempfile.TemporaryDirectory() as folder:
            fleet = Fleet(folder, count, more="accounts_at_once = 32\n" + MORE)
            try:
                begin = time.monotonic()
                issued = fleet.issue([f"n{number}" for number in range(10000)])
                print(f"10,000 codes issued in {time.monotonic() - begin:.1f} s")
                some = dict(list(issued.items())[:2000])
                before = processor(fleet.processes.values())
                times, seconds = asyncio.run(joined(
                    fleet, BALANCER if count > 1 else NODES[0], some, 64))
                used = processor(fleet.processes.values()) - before
                print(f"{count} services: 2000 joins in {seconds:.1f} s, "
                      f"{2000 / seconds:.0f} a second, {told(times)}, "
                      f"{max(memory(one) for one in fleet.processes.values()):.0f} MiB, "
                      f"processor of the services {used / seconds:.2f}", flush=True)
            finally:
                fleet.close()


async def wrong_codes(fleet, reuse, rate, seconds=5):
    """The times of those that were answered, how many were not, and how long it took."""
    times, lost = [], []

    async def one(session, number):
        begin = time.monotonic()
        status, _ = await ask(session, NODES[0], f"n{number % 1000}", "WRONG", "key")
        if status == 403:
            times.append(time.monotonic() - begin)
        else:
            lost.append(status)
    async with fleet.session(reuse=reuse) as session:
        begin = time.monotonic()
        tasks = []
        for number in range(rate * seconds):
            tasks.append(asyncio.create_task(one(session, number)))
            await asyncio.sleep(max(0, begin + (number + 1) / rate - time.monotonic()))
        await asyncio.gather(*tasks)
        return times, len(lost), time.monotonic() - begin


def refusals(_):
    with tempfile.TemporaryDirectory() as folder:
        fleet = Fleet(folder, 1, database=False, more=MORE)
        try:
            fleet.issue([f"n{number}" for number in range(1000)])
            for reuse, rate in ((True, 100), (True, 500), (False, 100), (False, 500)):
                before = processor(fleet.processes.values())
                times, lost, seconds = asyncio.run(wrong_codes(fleet, reuse, rate))
                each = (processor(fleet.processes.values()) - before) / (len(times) + lost)
                print(f"a wrong code, {rate} a second wanted, {len(times) / seconds:.0f} answered, "
                      f"{lost} lost, {'connections kept' if reuse else 'a connection each'}: "
                      f"{told(times)}, {each * 1000:.1f} ms of processor each", flush=True)
        finally:
            fleet.close()


def stored(_):
    sys.path.insert(0, str(TREE / "cam-service"))
    from tslauth_cam_service import codes, store
    with tempfile.TemporaryDirectory() as folder:
        kept = store.Store(f"sqlite:///{folder}/codes.db", folder)
        kept.open()
        number = 0
        for total in (1000, 10000, 100000, 1000000):
            begin = time.monotonic()
            added = total - number
            while number < total:
                part = min(20000, total - number)
                issued = kept.issue_all([codes.Order(f"n{number + i}") for i in range(part)], "b")
                number += part
            each = (time.monotonic() - begin) / added
            timed = []
            for step in range(50):
                host = f"n{number - 1 - step}"
                begin = time.monotonic()
                attempt = store.Attempt(host, issued[-1 - step], "key", "192.0.2.1")
                claim = kept.claim(attempt, lambda unit: None)
                kept.made(claim)
                kept.received(claim.name, "192.0.2.1")
                timed.append(time.monotonic() - begin)
            begin = time.monotonic()
            for after in range(0, total, max(1, total // 20)):
                kept.page(after, 100)
            print(f"{total:9,} codes: issue {each * 1e6:.0f} µs each, "
                  f"use {statistics.median(timed) * 1000:.1f} ms, "
                  f"a page of 100 {(time.monotonic() - begin) / 20 * 1000:.1f} ms, "
                  f"{os.stat(f'{folder}/codes.db').st_size / 1e6:.0f} MB", flush=True)
        kept.close()


def added(_):
    """Beside the same calls of `net` without a service."""
    net = f"{TREE}/tests/system/stand-in-net"

    async def run(*arguments):
        process = await asyncio.create_subprocess_exec(
            net, "--configfile=x", *arguments, stdout=asyncio.subprocess.DEVNULL)
        await process.wait()

    async def alone(at_once, number):
        places = asyncio.Semaphore(at_once)

        async def one(host):
            async with places:
                await run("ads", "search", f"(sAMAccountName={host}$)", "name")
                await run("offlinejoin", "provision", "domain=d", f"machine_name={host}")
        begin = time.monotonic()
        await asyncio.gather(*(one(f"a{i}") for i in range(number)))
        return time.monotonic() - begin
    seconds = 0.25  # what each of the two calls takes, played
    for at_once in (4, 32):
        with tempfile.TemporaryDirectory() as folder:
            fleet = Fleet(folder, 1, database=False,
                          more=f"accounts_at_once = {at_once}\n" + MORE)
            try:
                (STAND_IN / "takes").write_text(str(seconds))
                number = at_once * 12
                bare = asyncio.run(alone(at_once, number))
                issued = fleet.issue([f"n{i}" for i in range(number)])
                _, served = asyncio.run(joined(fleet, NODES[0], issued, at_once))
                print(f"{at_once} at once, each call of net {seconds} s: {number} joins in "
                      f"{served:.2f} s, net alone {bare:.2f} s: {(served / bare - 1) * 100:+.0f} %",
                      flush=True)
            finally:
                (STAND_IN / "takes").unlink(missing_ok=True)
                fleet.close()


def main():
    what = {"joins": joins, "refusals": refusals, "stored": stored, "added": added}
    if len(sys.argv) < 2 or sys.argv[1] not in what:
        sys.exit(__doc__)
    resource.setrlimit(resource.RLIMIT_NOFILE, (16384, 16384))
    what[sys.argv[1]](sys.argv[2:])


main()
