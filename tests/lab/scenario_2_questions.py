# SPDX-License-Identifier: Apache-2.0
"""Every question about the domain, beside what the controllers themselves say."""
import json
import re

from lab import PASSWORD, Story, at_once, expect, expect_equal, until

TITLE = "The domain's answers, and what the controllers say"

# The bits of a trust relationship, and the trust states, as tslauth_winbind_provider.h has them.
IN_FOREST, TRANSITIVE, INBOUND, OUTBOUND = 1, 2, 4, 8
HEALTHY, SECRET_REFUSED, NOT_RUNNING, NOT_JOINED = 0, 1, 3, 7
DOMAINS = ("corp.example", "CORP", "other.example", "OTHER", "nowhere.example")
# Exit codes of tslauthctl.
REFUSED, UNREACHABLE, UNJOINED = 4, 8, 10
NO_SUCH_DOMAIN = "NoSuchDomainException: "
# Of the directory (MS-ADTS 6.1.6.7.9 and 6.1.6.7.12).
WITHIN_FOREST, FOREST_TRANSITIVE = 0x20, 0x8

# Passes on what a controller is asked before anything else (CLDAP, by UDP), and notes who asks.
RELAY = """
import socket
relay = socket.socket(socket.AF_INET, socket.SOCK_DGRAM)
relay.bind(("", 389))
open("/run/relay.ready", "w").close()
while True:
    question, client = relay.recvfrom(65535)
    print(client[0], flush=True)
    with socket.socket(socket.AF_INET, socket.SOCK_DGRAM) as controller:
        controller.settimeout(5)
        controller.sendto(question, ("10.99.0.1", 389))
        relay.sendto(controller.recv(65535), client)
"""


def ask(host, *domains):
    """What the library tells: name -> text, and for the domains, domain -> (name -> text)."""
    result = host.library("ask", *domains)
    expect_equal(result.code, 0, f"the exit code of\n{result}\n")
    answers, about = {"preferred": []}, {}
    current = answers
    for line in result.out.splitlines():
        name, _, text = line.partition("=")
        if name == "about":
            current = about.setdefault(text, {})
        elif name == "preferred":
            answers["preferred"].append(text)
        else:
            current[name] = text.strip()
    return answers, about


def info(host, code=0):
    return json.loads(host.exits(code, "tslauthctl", "--json", "info").out)


def state(host):
    return int(ask(host)[0]["state"])


def controllers_of(node, domain):
    """As the controller's own DNS lists them."""
    listing = node.ok("host", "-t", "SRV", f"_ldap._tcp.dc._msdcs.{domain}", "127.0.0.1").out
    return re.findall(r"SRV record \d+ \d+ 389 (\S+)\.$", listing, re.MULTILINE)


def trusts_of(node):
    """As the controller's own directory has them: DNS name -> (NetBIOS name, bits)."""
    trusts = {}
    for trust in node.directory("(objectClass=trustedDomain)", "trustPartner", "flatName",
                                "trustDirection", "trustAttributes"):
        attributes = int(trust["trustAttributes"][0])
        direction = int(trust["trustDirection"][0])
        bits = (IN_FOREST if attributes & WITHIN_FOREST else 0) | \
            (TRANSITIVE if attributes & (WITHIN_FOREST | FOREST_TRANSITIVE) else 0) | \
            (INBOUND if direction & 1 else 0) | (OUTBOUND if direction & 2 else 0)
        trusts[trust["trustPartner"][0]] = (trust["flatName"][0], bits)
    return trusts


def before_the_join(lab, host):
    with lab.step("not joined: the library knows no domain, no account and no trusted domain"):
        answers, about = ask(host, "corp.example")
        expect_equal(answers["domain"], "DNS Name: (unset), NetBIOS Name: (unset)", "the domain")
        expect_equal((answers["dn"], answers["trusted"]), ("", ""), "account and trusted domains")
        expect_equal(about["corp.example"]["relationship"], "0", "the relationship")
        expect(about["corp.example"]["principal"].startswith(NO_SUCH_DOMAIN),
               about["corp.example"]["principal"])
    with lab.step("not joined: DNS names a controller of corp.example all the same"):
        expect_equal(about["corp.example"]["dc"], "dc1.corp.example", "the library's answer")
    with lab.step(f"not joined: the trust state is {NOT_JOINED}"):
        expect_equal(state(host), NOT_JOINED, "the trust state")
    with lab.step("not joined: tslauthctl info says so with exit code 10"):
        document = info(host, UNJOINED)
        expect_equal((document["joined"], document["trust_state"]), (False, NOT_JOINED), "joined")


def own_domain(lab, host):
    listing = lab.dc1.samba_tool("domain", "info", "127.0.0.1").out
    own = dict(re.findall(r"^(.*\S)\s*: (.*)$", listing, re.MULTILINE))
    account = lab.dc1.account_of(host)
    answers, about = ask(host, *DOMAINS)
    document = info(host)
    with lab.step(f"the domain is {own['Domain']} ({own['Netbios domain']}), as samba-tool says"):
        expect_equal(answers["domain"], f"DNS Name: {own['Domain']}, "
                     f"NetBIOS Name: {own['Netbios domain']}", "the library's answer")
        expect_equal(document["domain"], {"dns": own["Domain"], "netbios": own["Netbios domain"]},
                     "tslauthctl's answer")
    with lab.step(f"the account is {account['dn']}, as in the directory"):
        expect_equal(answers["dn"], account["dn"], "the library's answer")
        expect_equal(document["machine_account"], account["dn"], "tslauthctl's answer")
    with lab.step("the trusted domains are those of samba-tool domain trust list"):
        listing = lab.dc1.samba_tool("domain", "trust", "list").out
        names = re.findall(r"Name\[(\S+)\]", listing)
        trusts = trusts_of(lab.dc1)
        expect(names and sorted(names) == sorted(trusts), f"{listing}{trusts}")
        expect_equal(answers["trusted"].split(), [f"{name}/{trusts[name][0]}" for name in names],
                     "the library's answer")
        expect_equal(document["trusted_domains"],
                     [{"dns": name, "netbios": trusts[name][0]} for name in names],
                     "tslauthctl's answer")
    with lab.step("the trust state is 0, and wbinfo --check-secret agrees"):
        expect_equal((int(answers["state"]), document["trust_state"]), (HEALTHY, HEALTHY),
                     "the answers of library and tslauthctl")
        host.ok("wbinfo", "--check-secret")
    return about


def controllers(lab, host, about):
    for node, domain, short in ((lab.dc1, "corp.example", "CORP"),
                                (lab.dc2, "other.example", "OTHER")):
        listed = controllers_of(node, domain)
        with lab.step(f"a controller of {domain} is {', '.join(listed)}, as its DNS says"):
            expect(listed, "DNS lists none")
            for name, told in zip((domain, short), at_once(
                    lambda name: host.tslauthctl("dc", name).out.strip(), (domain, short))):
                expect(about[name]["dc"] in listed, f"the library: {about[name]['dc']}")
                expect(told in listed, f"tslauthctl: {told}")
    with lab.step("nowhere.example has none: there is no such domain"):
        expect(about["nowhere.example"]["dc"].startswith(NO_SUCH_DOMAIN),
               about["nowhere.example"]["dc"])
        host.exits(UNREACHABLE, "tslauthctl", "dc", "nowhere.example")


def relationships(lab, about):
    for domain, (short, bits) in trusts_of(lab.dc1).items():
        with lab.step(f"the trust to {domain} has the bits {bits}, as in the directory"):
            expect(bits, "the directory has none")
            for name in (domain, short):
                expect_equal(int(about[name]["relationship"]), bits, f"the library's about {name}")
    with lab.step("the own domain has all bits, and nowhere.example none"):
        expect_equal([int(about[name]["relationship"]) for name in (DOMAINS[0], DOMAINS[-1])],
                     [IN_FOREST | TRANSITIVE | INBOUND | OUTBOUND, 0], "the library's answers")


def principal(lab, host, about):
    expected = f"host/{host.name}.corp.example@CORP.EXAMPLE"
    with lab.step(f"the principal is {expected}, and the account has it"):
        for name, told in zip(DOMAINS, at_once(
                lambda name: host.tslauthctl("principal", name).out.strip(), DOMAINS[:-1])):
            expect_equal(about[name]["principal"], expected, f"the library's for {name}")
            expect_equal(told, expected, f"tslauthctl's for {name}")
        names = lab.dc1.account_of(host, "servicePrincipalName")["servicePrincipalName"]
        expect(expected.partition("@")[0].lower() in [name.lower() for name in names], str(names))
    for user in ("user1@CORP.EXAMPLE", "user2@OTHER.EXAMPLE"):
        with lab.step(f"a controller gives {user} a ticket for it (kinit, kvno)"):
            host.shell("""
                export KRB5CCNAME=/run/lab.ticket
                trap 'rm -f "$KRB5CCNAME"' EXIT
                kinit "$1"
                kvno "$2"
                """, user, expected, text=PASSWORD + "\n")
    with lab.step("there is none in nowhere.example: there is no such domain"):
        expect(about["nowhere.example"]["principal"].startswith(NO_SUCH_DOMAIN),
               about["nowhere.example"]["principal"])


def canonical(lab, host):
    lab.dc1.samba_tool("user", "create", f"ada-{host.name}", PASSWORD, "--given-name=Ada",
                       f"--surname={host.name}", "--userou=OU=Linux,OU=Servers")
    forms = {
        "CORP\\user1": ("corp.example/Users/user1", "CORP\\user1", "user1@corp.example",
                        "corp\\USER1", "corp.example\\user1"),
        "OTHER\\user2": ("other.example/Users/user2", "OTHER\\user2", "user2@other.example"),
        # In the directory she has another name than she logs in with.
        f"CORP\\ada-{host.name}": (f"corp.example/Servers/Linux/Ada {host.name}",
                                   f"ada-{host.name}@corp.example"),
    }
    for expected, names in forms.items():
        node = lab.dc1 if expected.startswith("CORP") else lab.dc2
        with lab.step(f"{expected} is {', '.join(names)}"):
            asked = host.library("canonical", *names)
            expect_equal(asked.out.splitlines(), [f"{name}={expected}" for name in names],
                         "the library's answers")
            told = at_once(lambda name: host.tslauthctl("canonical", name).out.strip(), names)
            expect_equal(told, [expected] * len(names), "tslauthctl's answers")
        with lab.step(f"{expected} is the user of that identifier on {node.name}"):
            found = node.directory(f"(sAMAccountName={expected.partition(chr(92))[2]})",
                                   "objectSid", "canonicalName")[0]
            expect(found["canonicalName"][0] == names[0], str(found))
            expect_equal(host.ok("wbinfo", "--name-to-sid", expected).out.split()[0],
                         found["objectSid"][0], "the host's and the controller's")
    for name, exception, code in (
            ("CORP\\nobody", "NoSuchUserException", REFUSED),
            ("corp.example/Users/nobody", "NoSuchUserException", REFUSED),
            ("corp.example/Servers/user1", "NoSuchUserException", REFUSED),
            ("user1@nowhere.example", "NoSuchDomainException", UNREACHABLE),
            ("user1", "InvalidAccountNameException", REFUSED)):
        with lab.step(f"{name} is refused with {exception}"):
            asked = host.library("canonical", name).out
            expect(asked.startswith(f"{name}={exception}: Exception 0x"), asked)
            host.exits(code, "tslauthctl", "canonical", name)


def stop_winbindd(host):
    host.shell('kill "$(cat /run/samba/winbindd.pid)"')
    until("winbindd has ended", lambda: host.run("pgrep", "-x", "winbindd").code == 1)


def start_winbindd(host):
    host.ok("winbindd", "-D")
    until("winbindd answers", lambda: host.run("wbinfo", "--ping").code == 0)


def start_relay(node):
    node.shell('setsid /usr/bin/python3 -c "$1" >/run/relay.asked 2>&1 </dev/null &', RELAY)
    until("the relay is ready", lambda: node.run("test", "-e", "/run/relay.ready").code == 0)


def preferred(host, relay):
    """The preferred controllers, through library and tool, in other processes than set them."""
    two, one = ["dc1.corp.example", "dc7.corp.example"], ["dc1.corp.example"]

    def join():
        address = host.ok("hostname", "-I").out.strip()
        start_relay(relay)
        host.shell('echo "$1 relay.corp.example" >>/etc/hosts',
                   relay.ok("hostname", "-I").out.strip())
        host.tslauthctl("preferred-dcs", "set", "relay.corp.example")
        host.join()
        expect(address in relay.read("/run/relay.asked").split(), "the relay was not asked")

    def prefer_two():
        host.by_library("prefer", *two)
        expect_equal(host.tslauthctl("preferred-dcs").out.split(), two, "the list")
        expect_equal(info(host)["preferred_domain_controllers"], two, "the list of info")

    def prefer_one():
        host.tslauthctl("preferred-dcs", "set", *one)
        expect_equal(ask(host)[0]["preferred"], one, "the list")

    def tell_winbindd():
        servers = host.ok("testparm", "-s", "--parameter-name=password server").out.split()
        expect_equal(servers[0].strip(","), one[0], "the first of winbindd's controllers")
        until("the trust is healthy", lambda: state(host) == HEALTHY)

    def restart():
        stop_winbindd(host)
        start_winbindd(host)
        expect_equal(ask(host)[0]["preferred"], one, "the list")
        until("the trust is healthy", lambda: state(host) == HEALTHY)

    def prefer_none():
        host.tslauthctl("preferred-dcs", "clear")
        expect_equal(ask(host)[0]["preferred"], [], "the list")
        expect_equal(host.tslauthctl("preferred-dcs").out, "", "tslauthctl's list")

    return Story(
        (f"{host.name}, a preference is set before the join: the join asks that name", join),
        (f"{host.name}, the library prefers two controllers: tslauthctl knows them", prefer_two),
        (f"{host.name}, tslauthctl prefers one: the library knows it", prefer_one),
        (f"{host.name}, winbindd is to ask it first (testparm), and answers", tell_winbindd),
        (f"{host.name}, winbindd is stopped and started: it is still preferred", restart),
        (f"{host.name}, tslauthctl preferred-dcs clear: none is preferred", prefer_none))


def trust_states(lab, host):
    """What makes a trust unhealthy, and healthy again."""
    def stop():
        stop_winbindd(host)
        answers, about = ask(host, "corp.example")
        expect_equal(int(answers["state"]), NOT_RUNNING, "the trust state")
        expect(answers["trusted"].startswith("ServiceNotActiveException: Exception 0x00000426: "),
               answers["trusted"])
        expect(answers["domain"].startswith("DNS Name: corp.example,"), answers["domain"])
        expect(about["corp.example"]["dc"].startswith("ServiceNotActiveException: "),
               about["corp.example"]["dc"])

    def tell():
        document = info(host, REFUSED)
        expect_equal(document["trust_state"], NOT_RUNNING, "the trust state")
        expect_equal([(failure["of"], failure["exception"].rpartition(":")[2])
                      for failure in document["failures"]],
                     [("trusted_domains", "ServiceNotActiveException")], "the failures")

    def start():
        start_winbindd(host)
        until("the trust is healthy", lambda: state(host) == HEALTHY)

    def change_secret():
        lab.dc1.samba_tool("user", "setpassword", f"{host.name}$",
                           "--newpassword=Another-Secret-1")
        until("the secret is refused", lambda: state(host) == SECRET_REFUSED)
        expect_equal(info(host)["trust_state"], SECRET_REFUSED, "tslauthctl's")

    def join_again():
        host.part()
        host.join()
        expect_equal(state(host), HEALTHY, "the trust state")

    def delete_account():
        lab.dc1.samba_tool("computer", "delete", host.name)
        until("the secret is refused", lambda: state(host) == SECRET_REFUSED)

    return Story(
        (f"{host.name}, winbindd is stopped: the trust state is {NOT_RUNNING}", stop),
        (f"{host.name}, tslauthctl info says so, and that it cannot tell everything", tell),
        (f"{host.name}, winbindd is started: the trust state is {HEALTHY}", start),
        (f"{host.name}, the controller changes its secret: the trust state is {SECRET_REFUSED}",
         change_secret),
        (f"{host.name}, part and join: the trust state is {HEALTHY}", join_again),
        (f"{host.name}, the controller deletes its account: the trust state is {SECRET_REFUSED}",
         delete_account))


def play(lab):
    host, other, third = lab.hosts(3)
    before_the_join(lab, host)
    # Beside each other, each on a host of its own.
    preferences = preferred(third, relay=host)
    with lab.step("two hosts join corp.example"):
        at_once(lambda each: each.join(), (host, other))
    states = trust_states(lab, other)
    about = own_domain(lab, host)
    controllers(lab, host, about)
    relationships(lab, about)
    principal(lab, host, about)
    canonical(lab, host)
    lab.tell(preferences)
    lab.tell(states)
