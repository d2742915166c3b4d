# SPDX-License-Identifier: Apache-2.0
"""Hosts join, and users log in through what the library wrote."""
from lab import PASSWORD

TITLE = "Joining with credentials, and logging in"


def play(lab):
    host = lab.host()
    with lab.step("join"):
        host.ok("tslauthctl", "join", "corp.example", "--user", "joiner1", "--password-stdin", text=PASSWORD + "\n")
