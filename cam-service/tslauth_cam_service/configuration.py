# SPDX-License-Identifier: Apache-2.0
"""The one file that configures the service: text becomes a checked value."""
import dataclasses
import ipaddress
import os
import tomllib

from . import units

PATH = "/etc/tessel/tslauth-cam-service.toml"
STATE = "/var/lib/tslauth-cam-service"

ROLES = ("read", "issue", "audit")


class Wrong(Exception):
    """What is wrong with the configuration, in words for whoever wrote it."""


def text(value):
    if not isinstance(value, str) or not value or not value.isprintable():
        raise ValueError("a text is wanted")
    return value


def path(value):
    if not text(value).startswith("/"):
        raise ValueError("an absolute path is wanted")
    return value


def ipv4(value):
    return str(ipaddress.IPv4Address(text(value)))


def addresses(value):
    if not isinstance(value, list):
        raise ValueError("a list of addresses is wanted")
    return [str(ipaddress.ip_address(text(one))) for one in value]


def number(least, most):
    def checked(value):
        if type(value) is not int or not least <= value <= most:
            raise ValueError(f"a number from {least} to {most} is wanted")
        return value
    return checked


def unit(value):
    units.unit_parts(text(value))
    return value


def one_of(*words):
    def checked(value):
        if value not in words:
            raise ValueError(f"one of {', '.join(words)} is wanted")
        return value
    return checked


def url(value):
    if not text(value).startswith(("sqlite:////", "postgresql+psycopg2://")):
        raise ValueError("sqlite:////PATH or postgresql+psycopg2://... is wanted")
    return value


def roles(value):
    if not isinstance(value, dict):
        raise ValueError("a table is wanted: a name = a list of roles")
    for who, granted in value.items():
        if not isinstance(granted, list) or not set(granted) <= set(ROLES):
            raise ValueError(f"the roles of '{who}' must be of {', '.join(ROLES)}")
    return value


# What each section may hold: the check of the value, and what it is where nothing is said.
REQUIRED = object()
SECTIONS = {
    "": {"state": (path, STATE), "log": (one_of("text", "json"), "text")},
    "server": {
        "address": (ipv4, "0.0.0.0"), "port": (number(0, 65535), 8989),
        "certificate": (path, REQUIRED), "key": (path, REQUIRED),
        "proxies": (addresses, []), "drain_seconds": (number(0, 300), 0)},
    "domain": {
        "controller": (text, REQUIRED), "credentials": (path, REQUIRED),
        "default_unit": (unit, None), "net_program": (text, "net")},
    "database": {"url": (url, None)},
    "limits": {
        "connections": (number(1, 65536), 2048),
        "connections_of_an_address": (number(1, 65536), 128),
        "accounts_at_once": (number(1, 256), 4),
        "refusals_a_minute": (number(1, 1000000), 5)},
    "retention": {
        "closed_codes_days": (number(1, 3650), 30), "audit_days": (number(31, 3650), 400)},
    "metrics": {"address": (ipv4, "127.0.0.1"), "port": (number(0, 65535), None)},
    "operators": {
        "socket": (path, None), "users": (roles, {}),
        "address": (ipv4, "0.0.0.0"), "port": (number(0, 65535), None),
        "authorities": (path, None), "certificates": (roles, {})},
}


@dataclasses.dataclass(frozen=True)
class Configuration:
    """Sections by name; a value as SECTIONS tells."""
    sections: dict

    def __getitem__(self, section):
        return self.sections[section]

    @property
    def state(self):
        return self.sections[""]["state"]

    @property
    def database(self):
        return self.sections["database"]["url"] or f"sqlite:///{self.state}/codes.db"


def parsed(content, serves=True):
    """The configuration that `content` holds. Wrong where it holds none.

    Who does not serve needs to know only where the codes are.
    """
    try:
        given = tomllib.loads(content)
    except tomllib.TOMLDecodeError as error:
        raise Wrong(str(error)) from None
    top = {name: value for name, value in given.items() if not isinstance(value, dict)}
    given = {"": top, **{name: value for name, value in given.items() if isinstance(value, dict)}}
    result = {}
    for section in given:
        if section not in SECTIONS:
            raise Wrong(f"there is no section [{section}]")
    for section, members in SECTIONS.items():
        result[section] = {}
        values = given.get(section, {})
        for name in values:
            if name not in members:
                raise Wrong(f"[{section}] has no '{name}'")
        for name, (check, default) in members.items():
            if name in values:
                try:
                    result[section][name] = check(values[name])
                except ValueError as error:
                    raise Wrong(f"[{section}] {name}: {error}") from None
            elif default is REQUIRED and serves:
                raise Wrong(f"[{section}] lacks '{name}'")
            else:
                result[section][name] = None if default is REQUIRED else default
    operators = result["operators"]
    if operators["port"] is not None and operators["authorities"] is None:
        raise Wrong("[operators] port needs 'authorities', who sign operators' certificates")
    return Configuration(result)


def read(file, serves=True):
    try:
        with open(file, encoding="utf-8") as opened:
            return parsed(opened.read(), serves)
    except (OSError, UnicodeDecodeError) as error:
        raise Wrong(str(error)) from None
    except Wrong as error:
        raise Wrong(f"{file}: {error}") from None


def require_protected(file):
    """Wrong where others may read the file."""
    try:
        status = os.stat(file)
    except OSError as error:
        raise Wrong(f"{file}: {error.strerror}") from None
    if status.st_mode & 0o077:
        raise Wrong(f"{file} must be readable to its owner alone (mode 0600)")
