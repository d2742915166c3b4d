# SPDX-License-Identifier: Apache-2.0
"""The command line."""
import argparse
import contextlib
import json
import os
import pwd
import re
import sys
import syslog

from . import codes, configuration, orders, units
from .configuration import Wrong
from .domain import NetError
from .store import BrokenState, NoStore, Store

NAME = "tslauth-cam-service"


def host_name(text):
    if not codes.HOST.fullmatch(text):
        raise argparse.ArgumentTypeError(
            "a host has at most 15 letters, digits and hyphens (its name up to the first dot)")
    return text


def unit_text(text):
    try:
        units.unit_parts(text)
    except ValueError as error:
        raise argparse.ArgumentTypeError(str(error)) from None
    return text


def networks_text(text):
    try:
        codes.networks(text)
    except ValueError as error:
        raise argparse.ArgumentTypeError(str(error)) from None
    return text


def minutes(text):
    if not re.fullmatch(r"[0-9]{1,5}", text) or not 1 <= int(text) <= codes.MAXIMUM_MINUTES:
        raise argparse.ArgumentTypeError("from 1 to 10080 minutes (a week)")
    return int(text)


def arguments(line):
    parser = argparse.ArgumentParser(
        prog=NAME, allow_abbrev=False,
        description="Makes machine accounts for hosts that show a one-time code.")
    verbs = parser.add_subparsers(dest="verb", required=True, metavar="VERB")

    def verb(name, text):
        added = verbs.add_parser(name, help=text, description=text, allow_abbrev=False)
        added.add_argument("--configuration", metavar="FILE", default=configuration.PATH,
                           help="what configures the service (%(default)s)")
        return added

    issue = verb("issue-code", "Issue the code with which one host may join, once")
    issue.add_argument("--host", type=host_name, required=True, help="the host's short name")
    issue.add_argument("--unit", type=unit_text, help="A/B (B inside A) or a distinguished name")
    issue.add_argument("--networks", type=networks_text, metavar="NETWORK[,...]",
                       help="from where alone the code counts, such as 192.0.2.0/24")
    issue.add_argument("--valid-for", type=minutes, default=60, metavar="MINUTES",
                       help="after which the code is refused (%(default)s)")
    issue.add_argument("--reuse", action="store_true",
                       help="take over an account of that name, which makes its secret invalid")
    bulk = verb("issue-codes", "Issue the codes of a list of hosts: all of them or none")
    bulk.add_argument("--input", metavar="FILE", required=True,
                      help="CSV whose first line names its columns (host, unit, networks, minutes, "
                           "reuse), or a list of such objects in JSON")
    bulk.add_argument("--output", metavar="FILE", required=True,
                      help="gets the hosts and codes in the same form; it must not exist")
    bulk.add_argument("--recipient", metavar="CERTIFICATE",
                      help="encrypt the output to the certificate's owner (openssl cms)")
    export = verb("export-audit", "Print what was done, an object of JSON a line")
    export.add_argument("--after", type=int, default=0, metavar="NUMBER",
                        help="what comes behind the entry of that number")
    backup = verb("backup", "Copy the codes and the audit, while the service runs")
    backup.add_argument("--output", metavar="FILE", required=True, help="it must not exist")
    verb("list-codes", "List the hosts that have an unused code")
    revoke = verb("revoke-code", "Make a host's code worthless")
    revoke.add_argument("--host", type=host_name, required=True)
    verb("check", "Say whether the configuration is right, and what it names is there")
    verb("serve", "Answer hosts until SIGTERM")
    return parser.parse_args(line)


def prepare(folder):
    """The state's folder: nobody else's, made where it is missing. Its status."""
    os.makedirs(folder, mode=0o700, exist_ok=True)
    status = os.stat(folder)
    if status.st_mode & 0o077:
        raise Wrong(f"{folder} must be open to its owner alone (mode 0700)")
    return status


def become(owner):
    """From root to the owner of the folder: its files are then the service's own, and nothing that
    the service may have put there makes root touch a file that is not."""
    if os.geteuid() != 0 or owner.st_uid == 0:
        return
    os.setgroups([])
    os.setresgid(owner.st_gid, owner.st_gid, owner.st_gid)
    os.setresuid(owner.st_uid, owner.st_uid, owner.st_uid)


def operator():
    """Who runs this, for the audit: whoever became root is still himself."""
    name = os.environ.get("SUDO_USER", "")
    if re.fullmatch(r"[A-Za-z0-9._-]{1,64}", name):
        return name
    try:
        return pwd.getpwuid(os.getuid()).pw_name
    except KeyError:
        return f"user {os.getuid()}"


def issue_code(store, options, who):
    order = codes.Order(options.host, options.unit, options.networks, options.valid_for,
                        options.reuse)
    code = store.issue(order, who)
    syslog.syslog(syslog.LOG_NOTICE, f"a code for {options.host} was issued by {who}")
    print(code)


def pages(store):
    after = 0
    while rows := store.page(after):
        yield from rows
        after = rows[-1]["id"]


def list_codes(store, _, __):
    for row in sorted(pages(store), key=lambda row: row["host"]):
        left = int(row["seconds_left"])
        state = "expired" if left <= 0 else f"{(left + 59) // 60} min"
        print(row["host"], row["unit"] or "-", state if row["state"] == "issued" else row["state"],
              *(["reuse"] if row["reuse"] else []),
              *([row["networks"]] if row["networks"] else []), sep="\t")


def form_of(file):
    return "json" if file.endswith(".json") else "csv"


class Lists:
    """The operator's own files, which the service's user need not reach; nothing is issued where
    one of them is not as it should be."""

    def __init__(self, options):
        self._form = form_of(options.input)
        with open(options.input, encoding="utf-8") as file:
            self.wanted = orders.parsed(file.read(), self._form)
        self._recipient = None
        if options.recipient:
            with open(options.recipient, encoding="utf-8") as file:
                self._recipient = file.read()
            orders.encrypted("", self._recipient)
        self._output = open(options.output, "x", encoding="utf-8")  # mode 0600, by the mask

    def write(self, issued):
        text = orders.printed(self.wanted, issued, self._form)
        with self._output as file:
            file.write(orders.encrypted(text, self._recipient) if self._recipient else text)
            file.flush()
            os.fsync(file.fileno())

    def withdraw(self, path):
        self._output.close()
        with contextlib.suppress(OSError):  # the operator's folder is not the service's user's
            os.unlink(path)


def issue_codes(store, options, who):
    try:
        issued = store.issue_all(options.lists.wanted, who)
    except BaseException:
        options.lists.withdraw(options.output)
        raise
    options.lists.write(issued)
    syslog.syslog(syslog.LOG_NOTICE, f"{len(issued)} codes were issued by {who}")


def export_audit(store, options, _):
    after = options.after
    while rows := store.audit(after):
        for row in rows:
            print(json.dumps(row))
        after = rows[-1]["id"]


def backup(store, options, _):
    with options.output_file as file:
        file.write(store.copy())
        file.flush()
        os.fsync(file.fileno())


def revoke_code(store, options, who):
    if not store.revoke(options.host, who):
        raise Wrong(f"{options.host} has no code")


ON_THE_STORE = {"issue-code": issue_code, "issue-codes": issue_codes, "list-codes": list_codes,
                "revoke-code": revoke_code, "export-audit": export_audit, "backup": backup}


def run(options):
    serves = options.verb in ("serve", "check")
    configured = configuration.read(options.configuration, serves)
    who = operator()
    os.umask(0o077)
    if options.verb == "issue-codes":
        options.lists = Lists(options)
    elif options.verb == "backup":
        options.output_file = open(options.output, "xb")  # where the operator may write
    become(prepare(configured.state))
    if options.verb == "serve":
        from .server import serve  # what it takes, the other verbs need not wait for
        serve(configured)
    elif options.verb == "check":
        from .checking import check
        check(configured)
    else:
        store = Store(configured.database, configured.state)
        store.open()
        ON_THE_STORE[options.verb](store, options, who)


def main():
    options = arguments(sys.argv[1:])
    if sys.stdout is not None:  # closed
        sys.stdout.reconfigure(errors="backslashreplace")
    syslog.openlog(NAME, syslog.LOG_PID, syslog.LOG_AUTH)
    try:
        run(options)
    except (OSError, ValueError, NetError, BrokenState, NoStore, Wrong) as error:
        sys.exit(f"{NAME}: {error}")
