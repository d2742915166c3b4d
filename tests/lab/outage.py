# SPDX-License-Identifier: Apache-2.0
"""Takes controllers and links away, and gives them back."""
import contextlib
import os
import select
import subprocess

from lab import Node, expect_equal, until

# Every program that a controller consists of.
CONTROLLER = "samba|smbd|winbindd|cleanupd|rpcd"
ADDRESS = {"dc1": "10.99.0.1", "dc2": "10.99.0.2"}
DOMAIN = {"dc1": "corp.example", "dc2": "other.example"}
# A machine that no wire leads to.
NOBODY = "02:00:00:00:00:99"


def freeze(controller):
    """The controller's machine is up, and none of its programs runs on."""
    controller.ok("pkill", "-STOP", CONTROLLER)


def thaw(controller):
    controller.ok("pkill", "-CONT", CONTROLLER)


def kill(controller):
    """As if the power of the controller had failed: what listened is gone."""
    controller.run("pkill", "-KILL", CONTROLLER)
    until("the controller's programs have ended",
          lambda: controller.run("pgrep", CONTROLLER).code == 1)


def start(controller):
    """Starts a killed controller again and waits until it gives names and reads its directory."""
    controller.shell("samba -D -M single >/dev/null 2>&1 </dev/null")
    record = f"_ldap._tcp.dc._msdcs.{DOMAIN[controller.name]}"
    until("the controller answers", lambda: controller.run(
        "bash", "-c", 'host -W 1 -t SRV "$0" 127.0.0.1 && '
        'timeout 2 ldbsearch -H ldap://localhost -b "" -s base defaultNamingContext',
        record).code == 0, 30)


def cut(node):
    """Pulls the node's wire out of the switch."""
    _wire(node, "down")


def mend(node):
    _wire(node, "up")


def _wire(node, state):
    subprocess.run(["nsenter", "--target", Node("switch").holder, "--net",
                    "ip", "link", "set", f"v-{node.name}", state], check=True)


def lose(host, controller):
    """From now on the host's packets to the controller are lost without a word; others still reach
    it. What the host asks names of is another machine then."""
    host.shell("ip neighbour replace $1 lladdr $2 dev eth0 nud permanent",
               ADDRESS[controller.name], NOBODY)


def find(host, controller):
    host.shell("ip neighbour delete $1 dev eth0", ADDRESS[controller.name])


@contextlib.contextmanager
def when_account_appears(controller, host, signal):
    """While this holds: the moment that the directory has an account of the host, every program of
    the controller gets the signal. Gives a function that waits until this has happened."""

    def says(word):
        ready, _, _ = select.select([watch.stdout], [], [], 10)
        expect_equal(watch.stdout.readline() if ready else "", word + "\n", "what the watch says")

    watch = controller.start(
        os.path.join(os.path.dirname(os.path.realpath(__file__)), "when-account-appears"),
        DOMAIN[controller.name], host.name.upper(), signal, CONTROLLER,
        stdin=subprocess.DEVNULL, stdout=subprocess.PIPE)
    try:
        says("watching")
        yield lambda: says("appeared")
    finally:
        watch.kill()
        watch.wait()
