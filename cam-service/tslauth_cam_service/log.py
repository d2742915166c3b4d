# SPDX-License-Identifier: Apache-2.0
"""What the service says, in lines for people that programs can read as well."""
import contextlib
import json
import os
import syslog

DEBUG, INFO, NOTICE = syslog.LOG_DEBUG, syslog.LOG_INFO, syslog.LOG_NOTICE
WARNING, ERROR = syslog.LOG_WARNING, syslog.LOG_ERR
LEVELS = {DEBUG: "debug", INFO: "info", NOTICE: "notice", WARNING: "warning", ERROR: "error"}

# Set once at the start: "text" ends a line with its fields, "json" makes an object of each.
form = "text"


def clean(text):
    return "".join(c if c.isprintable() else "?" for c in str(text))


def line(priority, text, fields):
    fields = {name: value for name, value in fields.items() if value is not None}
    if form == "json":
        return json.dumps({"level": LEVELS[priority], "text": text, **fields})
    ends = [f"{name}={value}" if str(value).isalnum() else f"{name}={json.dumps(str(value))}"
            for name, value in fields.items()]
    return clean(" ".join([text] + ([f"[{' '.join(ends)}]"] if ends else [])))


def log(priority, text, **fields):
    """One line. Never with a code or a blob, and never with an exception: an answer that was paid
    for with a code must not be lost over a line that says so."""
    said = line(priority, clean(text), fields)
    with contextlib.suppress(OSError, ValueError):  # nobody reads, or not these characters
        print(said, flush=True)
    if "JOURNAL_STREAM" not in os.environ:  # the journal has read the line already
        syslog.syslog(priority, said)
