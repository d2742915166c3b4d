# SPDX-License-Identifier: Apache-2.0
"""Lists of hosts in, lists of codes out: text to values and back, as CSV or JSON."""
import csv
import io
import json
import subprocess
import tempfile

from .codes import Order

COLUMNS = ("host", "unit", "networks", "minutes", "reuse")
MAXIMUM = 100000


class Wrong(ValueError):
    """Which entry of a list is wrong, and what about it."""


def order_of(entry):
    """The order that an object describes. ValueError where it is none."""
    if not isinstance(entry, dict) or not set(entry) <= set(COLUMNS):
        raise ValueError(f"an entry has no other members than {', '.join(COLUMNS)}")
    for name in ("host", "unit", "networks"):
        if not isinstance(entry.get(name, ""), (str, type(None))):
            raise ValueError(f"'{name}' is a text")
    if type(entry.get("reuse", False)) is not bool:
        raise ValueError("'reuse' is true or false")
    return Order(entry.get("host") or "", entry.get("unit") or None, entry.get("networks") or None,
                 entry.get("minutes", 60), entry.get("reuse", False))


def from_row(row):
    """An entry as JSON would have it, from a line of CSV."""
    entry = {name: text for name, text in row.items() if text}
    if None in row or None in row.values():
        raise ValueError("more or fewer columns than the first line has")
    if "minutes" in entry:
        if not entry["minutes"].isdigit():
            raise ValueError("'minutes' is a number")
        entry["minutes"] = int(entry["minutes"])
    if "reuse" in entry:
        if entry["reuse"] not in ("yes", "no"):
            raise ValueError("'reuse' is yes or no")
        entry["reuse"] = entry["reuse"] == "yes"
    return entry


def parsed(text, form):
    """The orders of a list. Wrong where an entry is none, or a host is named twice."""
    if form == "json":
        try:
            entries = json.loads(text)
        except (ValueError, RecursionError) as error:
            raise Wrong(f"no JSON: {error}") from None
        if not isinstance(entries, list):
            raise Wrong("a list is wanted")
    else:
        entries = list(csv.DictReader(io.StringIO(text)))
    if len(entries) > MAXIMUM:
        raise Wrong(f"more than {MAXIMUM} hosts")
    orders, seen = [], set()
    for number, entry in enumerate(entries, 1):
        try:
            order = order_of(from_row(entry) if form == "csv" else entry)
            if order.host.upper() in seen:
                raise ValueError(f"{order.host} is named twice")
        except ValueError as error:
            raise Wrong(f"entry {number}: {error}") from None
        seen.add(order.host.upper())
        orders.append(order)
    return orders


def printed(orders, codes, form):
    if form == "json":
        return json.dumps([{"host": order.host, "code": code}
                           for order, code in zip(orders, codes)], indent=1) + "\n"
    out = io.StringIO()
    writer = csv.writer(out, lineterminator="\n")
    writer.writerow(("host", "code"))
    writer.writerows((order.host, code) for order, code in zip(orders, codes))
    return out.getvalue()


def encrypted(text, certificate):
    """As CMS in PEM, which `openssl cms -decrypt -inform PEM` of the certificate's owner reads.

    `certificate` is its text in PEM.
    """
    with tempfile.NamedTemporaryFile("w", suffix=".pem") as file:
        file.write(certificate)
        file.flush()
        done = subprocess.run(["openssl", "cms", "-encrypt", "-aes-256-cbc", "-binary", "-outform",
                               "PEM", file.name], input=text.encode(), capture_output=True)
    if done.returncode != 0:
        said = done.stderr.decode(errors="replace").strip().splitlines()
        raise Wrong(f"nothing can be encrypted to that certificate: {said[0] if said else '?'}")
    return done.stdout.decode()
