#!/usr/bin/python3 -B
# SPDX-License-Identifier: Apache-2.0
"""How tslauthctl reads a password, on a real terminal and from elsewhere, and where that password
is not to be found."""

import contextlib
import errno
import fcntl
import os
import pathlib
import pty
import re
import resource
import select
import signal
import struct
import subprocess
import tempfile
import termios
import time
import unittest

from tslauthctl import *

PASSWORD = b"correct-horse-77"
PROMPT = b"Password of 'joiner' for corp.example: "
JOIN = ("join", "corp.example", "--user", "joiner", "--skip-hostname-check")


# A sanitizer's own handlers would take some of the signals.
SIGNALS_AS_USUAL = "handle_segv=0:handle_sigbus=0:handle_sigfpe=0:handle_sigill=0:handle_abort=0"
os.environ["ASAN_OPTIONS"] = ":".join(filter(None, [os.environ.get("ASAN_OPTIONS"),
                                                    SIGNALS_AS_USUAL]))


class Terminal:
    """A new terminal on which the tool is the foreground job of a shell that does nothing but see
    it stop and end."""

    def __init__(self, *arguments, ignored=(), columns=60):
        self.master, self.slave = pty.openpty()
        fcntl.ioctl(self.slave, termios.TIOCSWINSZ, struct.pack("HHHH", 24, columns, 0, 0))
        self.before = self.settings()
        self.output = b""
        self.events, reports = os.pipe()
        orders, self.orders = os.pipe()
        self.shell = os.fork()
        if self.shell == 0:
            try:
                os.close(self.events)
                os.close(self.orders)
                self._be_shell(reports, orders, arguments, ignored)
            finally:
                os._exit(99)
        os.close(reports)
        os.close(orders)
        self.pid = int(self.event())

    def _be_shell(self, reports, orders, arguments, ignored):
        os.setsid()
        fcntl.ioctl(self.slave, termios.TIOCSCTTY, 0)
        signal.signal(signal.SIGTTOU, signal.SIG_IGN)
        signal.signal(signal.SIGHUP, signal.SIG_IGN)
        job = os.fork()
        if job == 0:
            os.setpgid(0, 0)
            os.tcsetpgrp(self.slave, os.getpid())
            # The two last ones Python ignores by itself.
            for number in (signal.SIGTTOU, signal.SIGHUP, signal.SIGPIPE, signal.SIGXFSZ):
                signal.signal(number, signal.SIG_DFL)
            for number in ignored:
                signal.signal(number, signal.SIG_IGN)
            for descriptor in range(3):
                os.dup2(self.slave, descriptor)
            os.execve(TOOL, [TOOL, *arguments], dict(os.environ, TERM="xterm"))
        os.write(reports, b"%d\n" % job)
        while True:
            _, status = os.waitpid(job, os.WUNTRACED)
            if os.WIFSTOPPED(status):
                # As a shell does, without which the terminal would stay the stopped job's.
                os.tcsetpgrp(self.slave, os.getpgrp())
                os.write(reports, b"stopped %d\n" % os.WSTOPSIG(status))
                order = os.read(orders, 1)
                if order == b"f":
                    os.tcsetpgrp(self.slave, job)
                if order:
                    os.killpg(job, signal.SIGCONT)
            elif os.WIFSIGNALED(status):
                os.write(reports, b"signal %d core %d\n" % (os.WTERMSIG(status),
                                                            os.WCOREDUMP(status)))
                os._exit(0)
            else:
                os.write(reports, b"exit %d\n" % os.WEXITSTATUS(status))
                os._exit(0)

    def close(self):
        with contextlib.suppress(ProcessLookupError):
            os.kill(self.pid, signal.SIGKILL)
        os.close(self.orders)
        os.waitpid(self.shell, 0)
        for descriptor in (self.master, self.slave, self.events):
            os.close(descriptor)

    def event(self):
        """What the shell has seen next."""
        line = b""
        while not line.endswith(b"\n"):
            if not select.select([self.events], [], [], 30)[0]:
                raise AssertionError(f"nothing happened; the terminal shows {self.output}")
            line += os.read(self.events, 1)
        return line.decode().strip()

    def read(self, seconds=0.0):
        """Everything that the terminal has shown."""
        end = time.monotonic() + seconds
        while select.select([self.master], [], [], max(0, end - time.monotonic()))[0]:
            try:
                self.output += os.read(self.master, 4096)
            except OSError as e:
                if e.errno != errno.EIO:
                    raise
                break
        return self.output

    def wait_for(self, text, times=1):
        end = time.monotonic() + 30
        while self.output.count(text) < times:
            if time.monotonic() > end:
                raise AssertionError(f"no {text} in {self.output}")
            self.read(0.05)

    def type(self, text):
        os.write(self.master, text)

    def settings(self):
        return termios.tcgetattr(self.slave)

    def echoes(self):
        return bool(self.settings()[3] & termios.ECHO)

    def resume(self, where):
        """In the "fg" or the "bg"."""
        os.write(self.orders, where[:1].encode())


class Case(unittest.TestCase):
    def setUp(self):
        set_up()
        script()

    def terminal(self, *arguments, **options):
        terminal = Terminal(*arguments, **options)
        self.addCleanup(terminal.close)
        return terminal


class OnATerminal(Case):
    def ask(self, **options):
        terminal = self.terminal(*JOIN, **options)
        terminal.wait_for(PROMPT)
        self.assertFalse(terminal.echoes())
        return terminal

    def put_back(self, terminal):
        self.assertTrue(terminal.echoes())
        self.assertEqual(terminal.before, terminal.settings())

    def test_it_is_asked_for_without_echo(self):
        terminal = self.ask()
        terminal.type(PASSWORD + b"\n")
        self.assertEqual("exit 0", terminal.event())
        self.put_back(terminal)
        self.assertNotIn(PASSWORD, terminal.read(0.1))
        self.assertIn(b"The host is joined to corp.example.", terminal.output)

    def test_an_empty_one_is_refused(self):
        for answer in (b"\n", b"\x04"):
            terminal = self.ask()
            terminal.type(answer)
            self.assertEqual(f"exit {CREDENTIALS}", terminal.event())
            self.put_back(terminal)

    def test_the_terminal_is_put_back_for_every_signal_that_ends(self):
        ending = [number for number in signal.valid_signals()
                  if number not in (signal.SIGKILL, signal.SIGSTOP, signal.SIGCHLD, signal.SIGCONT,
                                    signal.SIGURG, signal.SIGWINCH, signal.SIGTSTP, signal.SIGTTIN,
                                    signal.SIGTTOU)]
        self.assertGreater(len(ending), 20)
        for number in ending:
            with self.subTest(number):
                terminal = self.ask()
                terminal.type(PASSWORD)
                os.kill(terminal.pid, number)
                self.assertEqual(f"signal {int(number)} core 0", terminal.event())
                self.put_back(terminal)
                self.assertNotIn(PASSWORD, terminal.read())
                # Nor does a shell get half of it.
                os.set_blocking(terminal.slave, False)
                with self.assertRaises(BlockingIOError):
                    os.read(terminal.slave, 100)

    def test_keys_that_interrupt(self):
        for key, number in ((b"\x03", signal.SIGINT), (b"\x1c", signal.SIGQUIT)):
            terminal = self.ask()
            terminal.type(b"half" + key)
            self.assertEqual(f"signal {int(number)} core 0", terminal.event())
            self.put_back(terminal)

    def test_a_stop_puts_it_back_and_it_asks_again(self):
        for stop in (lambda terminal: terminal.type(b"half\x1a"),
                     lambda terminal: os.kill(terminal.pid, signal.SIGTSTP),
                     lambda terminal: os.kill(terminal.pid, signal.SIGTTIN),
                     lambda terminal: os.kill(terminal.pid, signal.SIGTTOU)):
            terminal = self.ask()
            stop(terminal)
            self.assertIn(terminal.event(), {f"stopped {int(number)}" for number in (
                signal.SIGTSTP, signal.SIGTTIN, signal.SIGTTOU)})
            self.put_back(terminal)
            terminal.resume("fg")
            terminal.wait_for(PROMPT, times=2)
            self.assertFalse(terminal.echoes())
            terminal.type(PASSWORD + b"\n")
            self.assertEqual("exit 0", terminal.event())
            self.put_back(terminal)

    def test_after_a_stop_that_cannot_be_caught_the_echo_is_turned_off_again(self):
        terminal = self.ask()
        os.kill(terminal.pid, signal.SIGSTOP)
        self.assertEqual(f"stopped {int(signal.SIGSTOP)}", terminal.event())
        termios.tcsetattr(terminal.slave, termios.TCSANOW, terminal.before)  # as a shell does
        terminal.resume("fg")
        terminal.wait_for(PROMPT, times=2)
        self.assertFalse(terminal.echoes())
        terminal.type(PASSWORD + b"\n")
        self.assertEqual("exit 0", terminal.event())
        self.put_back(terminal)

    def test_in_the_background_it_stops_and_leaves_the_terminal_alone(self):
        terminal = self.ask()
        os.kill(terminal.pid, signal.SIGSTOP)
        self.assertEqual(f"stopped {int(signal.SIGSTOP)}", terminal.event())
        termios.tcsetattr(terminal.slave, termios.TCSANOW, terminal.before)
        terminal.resume("bg")
        self.assertEqual(f"stopped {int(signal.SIGTTIN)}", terminal.event())
        self.put_back(terminal)

    def test_a_signal_that_was_ignored_stays_so(self):
        terminal = self.ask(ignored=[signal.SIGHUP])
        os.kill(terminal.pid, signal.SIGHUP)
        time.sleep(0.1)
        terminal.type(PASSWORD + b"\n")
        self.assertEqual("exit 0", terminal.event())
        self.put_back(terminal)

    def test_control_characters_of_the_arguments_are_escaped(self):
        terminal = self.terminal("join", "a\x1b[31mb", "--user", "c\x07")
        terminal.wait_for(b"Password of 'c\\x07' for a\\x1b[31mb: ")

    def test_a_terminal_as_the_standard_input_would_show_it(self):
        terminal = self.terminal(*JOIN, "--password-stdin")
        self.assertEqual(f"exit {USAGE}", terminal.event())

    def test_without_a_terminal_it_says_what_to_give(self):
        document = ask(*JOIN, start_new_session=True, stdin=subprocess.DEVNULL)
        self.assertEqual(USAGE, document["exit"])
        self.assertIn("--password-stdin", document["error"]["message"])


class WhileWaiting(Case):
    def test_what_is_waited_for_is_shown_and_leaves_nothing(self):
        script(dc="hang")
        terminal = self.terminal("dc", "corp.example", "--timeout", "40")
        terminal.wait_for(b"\r\x1b[Ktslauthctl: waiting for the provider to name a domain contr")
        (SCRIPTS / "dc").unlink()
        terminal.event()
        shown = terminal.read(0.1)
        # No line is longer than the terminal, and the last one was wiped out.
        lines = [line for line in re.split(rb"[\r\n]|\x1b\[K", shown) if b"waiting" in line]
        self.assertTrue(lines)
        self.assertLess(max(map(len, lines)), 60)
        self.assertIn(b"\r\x1b[Ktslauthctl: The provider does not name", shown)

    def test_the_seconds_and_the_limit_are_shown(self):
        script(canonical="hang")
        terminal = self.terminal("canonical", "a", "--timeout", "3", columns=200)
        self.assertEqual(f"exit {UNREACHABLE}", terminal.event())
        shown = terminal.read(0.1)
        self.assertRegex(shown, rb"\r\x1b\[Ktslauthctl: "
                         rb"waiting for the provider to convert the name "
                                rb"of a user: [12] of 3 seconds \(\^C interrupts\)")

    def test_an_interrupt_ends_at_once_and_wipes_the_line(self):
        script(part="hang")
        terminal = self.terminal("part")
        terminal.wait_for(b"waiting for the provider to part the host")
        terminal.type(b"\x03")
        self.assertEqual(f"signal {int(signal.SIGINT)} core 0", terminal.event())
        self.assertIn(b"\r\x1b[Ktslauthctl: interrupted while waiting for the provider to part",
                      terminal.read(0.1))
        self.assertEqual(terminal.before, terminal.settings())

    def test_nothing_is_shown_where_nobody_sits(self):
        script(dc="hang")
        process = run("dc", "a", "--timeout", "2")
        self.assertEqual(1, process.stderr.count(b"\n"))
        self.assertNotIn(b"\x1b", process.stderr)


class FromElsewhere(Case):
    def setUp(self):
        super().setUp()
        PROVIDER.write_text('provider = "example"\n')
        pathlib.Path("/etc/tslauth-example").mkdir(exist_ok=True)
        pathlib.Path("/etc/tslauth-example/accounts").write_bytes(
            b"joiner:" + PASSWORD + b"\njoiner2: two  words \nlong:" + b"x" * 4094 + b"\n")
        subprocess.run(["rm", "-rf", "/var/lib/tslauth-example"], check=True, timeout=60)
        folder = tempfile.TemporaryDirectory()
        self.addCleanup(folder.cleanup)
        self.file = pathlib.Path(folder.name) / "password"
        self.file.write_bytes(PASSWORD + b"\n")
        self.file.chmod(0o600)

    def join(self, *arguments, name="joiner", **options):
        document = ask("join", "example.test", "--user", name, "--skip-hostname-check", *arguments,
                       **options)
        if document["exit"] == DONE:
            ask("part")
        return document

    def ends(self, code, *arguments, **options):
        document = self.join(*arguments, **options)
        self.assertEqual(code, document["exit"], document)
        self.assertNotIn(PASSWORD.decode(), json.dumps(document))
        return document

    def test_the_first_line_counts_without_its_end(self):
        for text in (PASSWORD, PASSWORD + b"\n", PASSWORD + b"\r\n", PASSWORD + b"\nmore\n"):
            self.ends(DONE, "--password-stdin", input=text)
        self.ends(DONE, "--password-stdin", input=b" two  words \n", name="joiner2")
        self.ends(CREDENTIALS, "--password-stdin", input=b"\n" + PASSWORD)
        self.ends(CREDENTIALS, "--password-stdin", input=b"")

    def test_the_longest_one(self):
        for end in (b"", b"\n", b"\r\n"):
            self.ends(DONE, "--password-stdin", input=b"x" * 4094 + end, name="long")
            self.ends(USAGE, "--password-stdin", input=b"x" * 4095 + end, name="long")
        self.ends(USAGE, "--password-stdin", input=b"x" * 100000, name="long")

    def test_a_zero_byte_would_cut_it(self):
        self.ends(USAGE, "--password-stdin", input=PASSWORD + b"\0more\n")

    def test_it_comes_in_pieces(self):
        reader, writer = os.pipe()
        os.set_blocking(reader, False)
        process = subprocess.Popen([TOOL, "join", "example.test", "--user", "joiner",
                                    "--skip-hostname-check", "--password-fd", str(reader)],
                                   pass_fds=[reader], stdout=subprocess.DEVNULL)
        for byte in PASSWORD + b"\n":
            os.write(writer, bytes([byte]))
            time.sleep(0.01)
        self.assertEqual(DONE, process.wait(timeout=30))
        os.close(reader)
        os.close(writer)

    def test_a_descriptor(self):
        descriptor = os.open(self.file, os.O_RDONLY)
        self.ends(DONE, "--password-fd", str(descriptor), pass_fds=[descriptor])
        os.close(descriptor)
        self.ends(USAGE, "--password-fd", "77")
        self.ends(USAGE, "--password-fd", "-1")

    def test_a_closed_input_is_never_what_is_opened_in_its_place(self):
        for _ in range(20):
            self.ends(USAGE, "--password-stdin", preexec_fn=lambda: os.close(0))

    def test_closed_outputs_are_not_written_by_way_of_another_file(self):
        before = state((NSS, RECORD))
        process = subprocess.run([TOOL, "status"], timeout=60,
                                 preexec_fn=lambda: (os.close(0), os.close(1), os.close(2)))
        self.assertEqual(FAILURE, process.returncode)
        self.assertEqual(before, state((NSS, RECORD)))

    def test_a_file_of_its_owner_alone(self):
        self.ends(DONE, "--password-file", str(self.file))
        for mode in (0o400, 0o700, 0o1600):
            self.file.chmod(mode)
            self.ends(DONE, "--password-file", str(self.file))
        for mode in (0o640, 0o604, 0o620, 0o602, 0o610, 0o601, 0o666):
            self.file.chmod(mode)
            document = self.ends(USAGE, "--password-file", str(self.file))
            self.assertIn("chmod 600", document["error"]["message"])

    def test_what_is_no_file_of_root(self):
        os.chown(self.file, 65534, 65534)
        self.assertIn("another user",
                      self.ends(USAGE, "--password-file", str(self.file))["error"]["message"])
        os.chown(self.file, 0, 0)
        link = self.file.with_name("link")
        link.symlink_to(self.file)
        self.assertIn("a link", self.ends(USAGE, "--password-file", str(link))["error"]["message"])
        fifo = self.file.with_name("fifo")
        os.mkfifo(fifo, 0o600)
        for path in (fifo, self.file.parent, "/dev/null"):
            self.assertIn("not a regular file",
                          self.ends(USAGE, "--password-file", str(path))["error"]["message"])
        self.ends(USAGE, "--password-file", str(self.file.with_name("none")))
        self.ends(USAGE, "--password-file", "")


class Secrecy(Case):
    @contextlib.contextmanager
    def hanging_join(self, *arguments):
        """The tool, in the middle of a join, with no limit for cores and an empty folder."""
        script(join="hang")
        with tempfile.TemporaryDirectory() as folder:
            process = subprocess.Popen(
                [TOOL, *JOIN, "--password-stdin", *arguments], stdin=subprocess.PIPE,
                stdout=subprocess.PIPE, stderr=subprocess.PIPE, cwd=folder,
                preexec_fn=lambda: resource.setrlimit(
                    resource.RLIMIT_CORE, (resource.RLIM_INFINITY, resource.RLIM_INFINITY)))
            process.stdin.write(PASSWORD + b"\n")
            process.stdin.close()
            process.stdin = None
            # With the worker there are two threads.
            end = time.monotonic() + 30
            while len(os.listdir(f"/proc/{process.pid}/task")) < 2:
                self.assertLess(time.monotonic(), end)
                time.sleep(0.01)
            time.sleep(0.1)
            yield process, folder
            if process.poll() is None:
                process.kill()
            process.communicate(timeout=30)

    def test_it_is_in_one_place_of_the_memory_and_nowhere_else(self):
        with self.hanging_join() as (process, _):
            proc = pathlib.Path(f"/proc/{process.pid}")
            self.assertNotIn(PASSWORD, (proc / "cmdline").read_bytes())
            self.assertNotIn(PASSWORD, (proc / "environ").read_bytes())
            places = []
            with open(proc / "mem", "rb", buffering=0) as memory:
                for line in (proc / "maps").read_text().splitlines():
                    begin, end = (int(number, 16) for number in line.split()[0].split("-"))
                    # The last one is what a sanitizer keeps its books in.
                    if "r" not in line.split()[1] or "[v" in line or end - begin > 1 << 30:
                        continue
                    memory.seek(begin)
                    places += [line.split()[0]] * memory.read(end - begin).count(PASSWORD)
            self.assertEqual(1, len(places))
            # That place is locked, and left out of dumps. The address sanitizer locks nothing.
            smaps = (proc / "smaps").read_text()
            flags = re.search(rf"^{places[0]} .*?^VmFlags:(.*?)$", smaps, re.M | re.S)[1].split()
            self.assertIn("dd", flags)
            if b"__asan_init" not in pathlib.Path(TOOL).read_bytes():
                self.assertIn("lo", flags)

    def test_no_core_is_left(self):
        for number in (signal.SIGABRT, signal.SIGSEGV, signal.SIGQUIT):
            with self.hanging_join() as (process, folder):
                limits = pathlib.Path(f"/proc/{process.pid}/limits").read_text()
                self.assertRegex(limits, r"Max core file size +0 +0 ")
                process.send_signal(number)
                _, status = os.waitpid(process.pid, 0)
                process.returncode = -number
                self.assertEqual(number, os.WTERMSIG(status))
                self.assertFalse(os.WCOREDUMP(status))
                self.assertEqual([], os.listdir(folder))

    def test_no_other_process_of_the_user_may_look_into_it(self):
        with self.hanging_join() as (process, _):
            # A process that may not be dumped may not be traced by its own user either.
            look = subprocess.run(["setpriv", "--bounding-set=-all", "--inh-caps=-all", "cat",
                                   f"/proc/{process.pid}/environ"], capture_output=True, timeout=30)
            self.assertNotEqual(0, look.returncode)
            self.assertIn(b"Permission denied", look.stderr)

    def test_it_is_in_no_output(self):
        for code in ("code 1326", "code 4711", ""):
            script(join=code)
            for arguments in ((), ("--json",)):
                process = run(*JOIN, "--password-stdin", *arguments, input=PASSWORD)
                self.assertNotIn(PASSWORD, process.stdout + process.stderr)

    def test_neither_an_argument_nor_the_environment_gives_it(self):
        for arguments in (("--password", "x"), ("--password=x",), ("-p", "x")):
            self.assertEqual(USAGE, ask(*JOIN, *arguments)["exit"])
        environment = dict(os.environ, PASSWORD="x", TSLAUTHCTL_PASSWORD="x", PASSWD="x")
        self.assertEqual(USAGE, ask(*JOIN, env=environment, start_new_session=True)["exit"])


if __name__ == "__main__":
    # A job in a script's background has these two ignored, and so would the tool.
    signal.signal(signal.SIGQUIT, signal.SIG_DFL)
    signal.signal(signal.SIGINT, signal.default_int_handler)
    main()
