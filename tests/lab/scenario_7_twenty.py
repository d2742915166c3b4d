# SPDX-License-Identifier: Apache-2.0
"""Many hosts at the same time."""
import json

from lab import at_once, expect_equal

TITLE = "Twenty hosts at once"

HOSTS = 20
PLACES = ("CN=Computers", "OU=Linux,OU=Servers")
HEALTHY = 0


def join(host, in_unit, by_library):
    target = "corp.example/Servers/Linux" if in_unit else "corp.example"
    return (host.join_by_library if by_library else host.join)(target).seconds


def part(host, by_library):
    return (host.part_by_library if by_library else host.part)().seconds


def ask(host):
    """What a host says of itself."""
    document = json.loads(host.tslauthctl("--json", "info").out)
    return {
        "dn": document["machine_account"],
        "domain": document["domain"]["dns"],
        "state": document["trust_state"],
        "principal": host.tslauthctl("principal").out.strip(),
    }


def told_by(host, in_unit):
    """What it has to say."""
    return {
        "dn": f"CN={host.name.upper()},{PLACES[in_unit]},DC=corp,DC=example",
        "domain": "corp.example",
        "state": HEALTHY,
        "principal": f"host/{host.name}.corp.example@CORP.EXAMPLE",
    }


def accounts(lab, hosts):
    """The hosts' accounts in the controller's directory: dn -> record."""
    names = "".join(f"(sAMAccountName={host.name}$)" for host in hosts)
    found = lab.dc1.directory(f"(|{names})", "objectSid", "dNSHostName", "sAMAccountName")
    return {record["dn"]: record for record in found}


def expect_own_answers(hosts, units, answers):
    for host, in_unit, answer in zip(hosts, units, answers):
        expect_equal(answer, told_by(host, in_unit), f"what {host.name} says")


def slowest(step, seconds):
    step.note(f"the slowest host {max(seconds):.1f} s")


def play(lab):
    with lab.step(f"{HOSTS} hosts start"):
        hosts = lab.hosts(HOSTS)
    units = [index % 2 for index in range(HOSTS)]
    libraries = [index // 2 % 2 == 1 for index in range(HOSTS)]
    before = at_once(lambda host: host.snapshot("/etc"), hosts)
    with lab.step("all join at once, half by the library, half into a unit") as step:
        slowest(step, at_once(join, hosts, units, libraries))
    with lab.step(f"the controller has {HOSTS} accounts, each in its place, with its own name"):
        found = accounts(lab, hosts)
        expect_equal({dn: record["dNSHostName"] for dn, record in found.items()},
                     {told_by(host, in_unit)["dn"]: [f"{host.name}.corp.example"]
                      for host, in_unit in zip(hosts, units)}, "the accounts")
        expect_equal(len({record["objectSid"][0] for record in found.values()}), HOSTS,
                     "the number of identifiers")
    with lab.step("all are asked at once: each tells its own account and principal"):
        expect_own_answers(hosts, units, at_once(ask, hosts))

    leaving, staying = hosts[:HOSTS // 2], hosts[HOSTS // 2:]
    with lab.step("half of them part, and the others are asked at the same time") as step:
        results = at_once(lambda host, by_library:
                          part(host, by_library) if host in leaving else ask(host),
                          hosts, libraries)
        slowest(step, results[:len(leaving)])
        expect_own_answers(staying, units[len(leaving):], results[len(leaving):])
    with lab.step("the controller has deleted those accounts, and no other"):
        expect_equal(sorted(accounts(lab, hosts)), sorted(
            told_by(host, in_unit)["dn"] for host, in_unit in zip(hosts, units)
            if host in staying), "the accounts")
    with lab.step("the others part"):
        at_once(part, staying, libraries[len(leaving):])
        expect_equal(accounts(lab, hosts), {}, "the accounts that are left")
    with lab.step("each host's /etc is as before, but for its name in /etc/hosts"):
        after = at_once(lambda host: host.snapshot("/etc"), hosts)
        for host, old, new in zip(hosts, before, after):
            old.pop("/etc/hosts")
            new.pop("/etc/hosts")
            expect_equal(sorted(set(new.items()) ^ set(old.items())), [], host.name)
