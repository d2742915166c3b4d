#!/usr/bin/python3 -B
# SPDX-License-Identifier: Apache-2.0
"""Real glibc and real libpam see no difference in what `prepare` writes, nor in an activation of a
provider whose modules are not installed, which therefore answers nothing."""

import os
import random
import subprocess
import sys
import unittest

from tslauthctl import *

ROUNDS = 50

# Loads, and names modules that no host has.
SILENT_PROVIDER = "no-parameters"


def name_lookups():
    """Who is found where: in the files, in the extra users, in both with other numbers."""
    answers = []
    for arguments in (["passwd", "root", "extra", "twice", "nobody-at-all"],
                      ["group", "root", "extra", "twice", "none"], ["hosts", "node", "absent"]):
        process = subprocess.run(["getent", *arguments], stdout=subprocess.PIPE, timeout=60)
        answers.append((process.returncode, process.stdout))
    return answers


def log_ins():
    """The verdicts of a policy made of modules that only permit or deny."""
    answers = []
    for operation in ("authenticate", "acct_mgmt", "open_session"):
        process = subprocess.run(["pamtester", PAM.name, "root", operation], timeout=60,
                                 stdin=subprocess.DEVNULL, stdout=subprocess.PIPE,
                                 stderr=subprocess.STDOUT)
        answers.append((process.returncode, process.stdout))
    return answers


def random_services(chance):
    """An nsswitch.conf with blanks, brackets, comments and doubles in odd places."""
    text = ""
    databases = ["passwd", "group", "shadow", "hosts"]
    databases += chance.choices(["passwd", "group", "hosts", "gshadow", "rpc"], k=2)
    chance.shuffle(databases)
    for database in databases:
        if chance.random() < 0.15:
            text += chance.choice(["# comment\n", " # comment\n", "\n", " \t\n"])
        text += chance.choice(["", "", "", " "]) + database
        text += chance.choice([":", ":", ": ", " : ", " ", ":\t"])
        for _ in range(chance.choice([1, 1, 2, 2, 3])):
            text += chance.choice([" ", "  ", "\t"])
            text += chance.choice(["files", "files", "extrausers", "absent"]
                                  if database != "gshadow" else ["files"])
            if database != "gshadow" and chance.random() < 0.35:
                text += chance.choice(["", " "]) + chance.choice(
                    ["[NOTFOUND=return]", "[SUCCESS=continue]", "[!UNAVAIL=return]",
                     "[ NOTFOUND = return ]", "[UNAVAIL=return NOTFOUND=continue]",
                     "[SUCCESS=return]", "[!SUCCESS=return]", "[UNAVAIL=return]"])
        text += chance.choice(["", "", "", " ", "\r", " # x"]) + "\n"
    return text


def random_policy(chance):
    """A policy with includes, jumps, continuations, minus and capital letters."""
    text = "#%PAM-1.0\n"
    for _ in range(chance.randint(2, 7)):
        if chance.random() < 0.2:
            text += chance.choice(["@include held", "@Include nested", "# c \\", ""]) + "\n"
            continue
        text += chance.choice(["", "", "-"])
        text += chance.choice(["auth", "Auth", "account", "session", "auth"])
        text += chance.choice([" ", "\t", " \\\n "])
        text += chance.choice(["required", "REQUISITE", "sufficient", "optional",
                               "[success=1 default=ignore]", "[success=2  default=ignore]",
                               "[ default = ok ]", "[success=done default=bad]"])
        text += chance.choice([" ", "\t\t"])
        text += chance.choice(["pam_permit.so", "pam_permit.so", "pam_deny.so", "absent.so",
                               "/lib/security/$ISA/pam_permit.so"])
        text += chance.choice(["", "", " debug", " # c", " [a b]", " \\\n# c\n debug"]) + "\n"
    return text


class Prepare(unittest.TestCase):
    def rounds(self, make, path, look):
        carried = differing = 0
        for seed in range(ROUNDS):
            set_up(provider=SILENT_PROVIDER)
            path.write_text(make(random.Random(seed)))
            original = path.read_text()
            before = look()
            # How the answers differ between the files tells that the looking sees anything.
            differing += seed > 0 and before != previous
            previous = before
            document = ask("prepare", "--write")
            if document["exit"] == LOSS:
                self.assertEqual(original, path.read_text())
                continue
            self.assertEqual(DONE, document["exit"], original)
            carried += 1
            text = f"seed {seed}:\n{original}\n=>\n{path.read_text()}"
            self.assertEqual(before, look(), text)
            for store in (AD, "None"):
                self.assertIn(ask("plan", store)["exit"], (DONE, CHANGES), text)
                self.assertEqual(DONE, ask("activate", store)["exit"], text)
                self.assertEqual(before, look(), f"{store}: {text}")
        self.assertGreater(carried, ROUNDS // 6)
        self.assertGreater(differing, ROUNDS // 6)
        print(f"{path}: {carried} of {ROUNDS} carried, {differing} changes of answers",
              file=sys.stderr)

    def test_glibc_finds_the_same(self):
        os.makedirs("/var/lib/extrausers", exist_ok=True)
        for name, line in (("passwd", "{}:x:700{}:7001::/:/bin/sh\n"),
                           ("group", "{}:x:700{}:\n"), ("shadow", "{}:*:1{}:0:99999:7:::\n")):
            with open(f"/var/lib/extrausers/{name}", "w") as file:
                file.write(line.format("extra", 1) + line.format("twice", 2))
            with open(f"/etc/{name}", "a") as file:
                file.write(line.format("twice", 9))
        self.rounds(random_services, NSS, name_lookups)

    def test_libpam_decides_the_same(self):
        with open("/etc/pam.d/held", "w") as file:
            file.write("auth required pam_permit.so\naccount sufficient pam_permit.so\n")
        with open("/etc/pam.d/nested", "w") as file:
            file.write("@include held\nsession required pam_permit.so\n")
        self.rounds(random_policy, PAM, log_ins)


main()
