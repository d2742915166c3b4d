# SPDX-License-Identifier: Apache-2.0
"""One-time codes and what they are bound to. Values alone: nothing here is kept or sent."""
import dataclasses
import hashlib
import hmac
import ipaddress
import json
import re
import secrets

# 160 bits; no letter or digit that is easily taken for another.
ALPHABET = "ABCDEFGHJKLMNPQRSTUVWXYZ23456789"
GROUPS, GROUP = 8, 4
assert len(ALPHABET) == 32

HOST = re.compile(r"[A-Za-z0-9]([A-Za-z0-9-]{0,13}[A-Za-z0-9])?")

# The longest that a code may be of use.
MAXIMUM_MINUTES = 10080


class Refused(Exception):
    """Why a code is not taken; for the log alone. A host learns only that it is not."""


def new_code():
    letters = [secrets.choice(ALPHABET) for _ in range(GROUPS * GROUP)]
    return "-".join("".join(letters[i:i + GROUP]) for i in range(0, len(letters), GROUP))


def digest(salt, host, code):
    """A plain digest: a code is as random as a key, so there is no guesser to slow down."""
    plain = code.replace("-", "").upper()
    return hashlib.sha256(b"\0".join((salt, host.upper().encode(), plain.encode()))).hexdigest()


def is_right(salt, expected, host, code):
    """Compared in any case, in a time that does not depend on how much is right."""
    return hmac.compare_digest(digest(bytes.fromhex(salt), host, code), expected)


def networks(text):
    """The networks that `text` names, with commas between them. ValueError where it is none."""
    return [ipaddress.ip_network(part.strip()) for part in text.split(",")]


@dataclasses.dataclass(frozen=True)
class Order:
    """What a code is to be issued for."""
    host: str
    unit: "str | None" = None
    networks: "str | None" = None
    minutes: int = 60
    reuse: bool = False

    def __post_init__(self):
        if not HOST.fullmatch(self.host):
            raise ValueError("a host has at most 15 letters, digits and hyphens (its name up to "
                             "the first dot)")
        if type(self.minutes) is not int or not 1 <= self.minutes <= MAXIMUM_MINUTES:
            raise ValueError(f"a code is valid for 1 to {MAXIMUM_MINUTES} minutes (a week)")
        if self.networks is not None:
            networks(self.networks)


def is_within(address, text):
    """Whether the address is in one of the networks; in any where none is named."""
    return text is None or any(ipaddress.ip_address(address) in network
                               for network in networks(text))


def parsed_file(text):
    """The codes by host, as the service's former version left them in a file.

    ValueError where it is no such text.
    """
    state = json.loads(text)
    if not isinstance(state, dict) or state.get("version") != 1:
        raise ValueError("it is not of version 1")
    codes = state.get("codes")
    if not isinstance(codes, dict):
        raise ValueError("it has no 'codes'")
    for host, issued in codes.items():
        right = (HOST.fullmatch(host) and isinstance(issued, dict)
                 and re.fullmatch("([0-9a-f]{2})+", str(issued.get("salt")))
                 and re.fullmatch("[0-9a-f]{64}", str(issued.get("digest")))
                 and isinstance(issued.get("unit", 0), (str, type(None)))
                 and type(issued.get("expires")) is int and type(issued.get("reuse")) is bool)
        if not right:
            raise ValueError(f"the code of '{host}' is damaged")
    return codes
