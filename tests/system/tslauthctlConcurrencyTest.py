#!/usr/bin/python3 -B
# SPDX-License-Identifier: Apache-2.0
"""Commands that change the host at the same time, and one that is killed."""

import fcntl
import os
import random
import signal
import subprocess
import time
import unittest

from tslauthctl import *

STORES = (AD, "None")


def whole_files():
    """Each file as it is under each store."""
    set_up()
    wholes = {path: {path.read_bytes()} for path in FILES}
    for store in (*STORES, AD, "None"):
        assert ask("activate", store)["exit"] == DONE
        for path in FILES:
            wholes[path].add(path.read_bytes())
    return wholes


WAITING = b"tslauthctl: waiting for another tslauthctl to finish ...\n"


class Concurrency(unittest.TestCase):
    def test_activations_never_interleave(self):
        set_up()
        follow()
        running = [subprocess.Popen([TOOL, "activate", STORES[i % 2]], stdout=subprocess.DEVNULL,
                                    stderr=subprocess.PIPE) for i in range(60)]
        looks = 0
        while any(process.poll() is None for process in running):
            with open(LOCK, "a") as lock:
                fcntl.flock(lock, fcntl.LOCK_EX)
                document = ask("status")
                self.assertEqual(DONE, document["exit"], document)
                looks += 1
        for process in running:
            message = process.communicate()[1].replace(WAITING, b"")
            self.assertEqual((DONE, b""), (process.returncode, message))
        self.assertGreater(looks, 0)
        self.assertEqual(DONE, ask("status")["exit"])

    def test_without_the_lock_they_wait_and_say_so(self):
        set_up()
        run("activate", AD)
        with open(LOCK, "a") as lock:
            fcntl.flock(lock, fcntl.LOCK_EX)
            master, slave = os.openpty()
            process = subprocess.Popen([TOOL, "activate", "None"], stderr=slave,
                                       stdout=subprocess.DEVNULL)
            os.close(slave)
            self.assertIn(b"waiting for another tslauthctl", os.read(master, 4096))
            quiet = subprocess.Popen([TOOL, "prepare", "--write"], stderr=subprocess.PIPE,
                                     stdout=subprocess.DEVNULL)
            time.sleep(0.2)
            self.assertIsNone(process.poll())
            self.assertIsNone(quiet.poll())
            self.assertIn(b"waiting for another tslauthctl", os.read(quiet.stderr.fileno(), 4096))
            self.assertIn(AD, RECORD.read_text())
        self.assertEqual(DONE, process.wait(timeout=60))
        self.assertEqual(b"", quiet.communicate(timeout=60)[1])
        os.close(master)
        self.assertIn("None", RECORD.read_text())

    def test_a_kill_leaves_every_file_whole_and_the_lock_free(self):
        wholes = whole_files()
        random.seed(3)
        start = time.monotonic()
        for _ in range(3):
            run("activate", AD)
            run("activate", "None")
        usual = (time.monotonic() - start) / 6
        interrupted = 0
        for i in range(120):
            process = subprocess.Popen([TOOL, "activate", STORES[i % 2]],
                                       stdout=subprocess.DEVNULL, stderr=subprocess.DEVNULL)
            time.sleep(random.uniform(0, usual * 1.2))
            process.kill()
            interrupted += process.wait() == -signal.SIGKILL
            for path in FILES:
                self.assertIn(path.read_bytes(), wholes[path])
        self.assertGreater(interrupted, 10)
        # The tool does not promise to finish what was cut off, only that the next one works.
        for store in (AD, "None"):
            self.assertIn(ask("activate", store)["exit"], (DONE,))


main()
