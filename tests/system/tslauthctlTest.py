#!/usr/bin/python3 -B
# SPDX-License-Identifier: Apache-2.0
"""The commands of tslauthctl on the fixed paths: what they say, what they change, how they end."""

import glob
import os
import pathlib
import re
import subprocess
import tempfile
import unittest

from tslauthctl import *

STOCK_NSS = """# /etc/nsswitch.conf
#
# Example configuration of GNU Name Service Switch functionality.
# If you have the `glibc-doc-reference' and `info' packages installed, try:
# `info libc "Name Service Switch"' for information about this file.

passwd:         files
group:          files
shadow:         files
gshadow:        files

hosts:          files mdns4_minimal [NOTFOUND=return] dns
networks:       files

protocols:      db files
services:       db files
ethers:         db files
rpc:            db files

netgroup:       nis
"""

# Of two lines for a database the C library uses the last, and the library's reader both.
TWICE_NSS = PLAIN_NSS + "passwd: files\n"

# An entry behind the access rules would move where the jump lands.
JUMPING_PAM = """auth [success=2 default=ignore] u.so
auth required /lib/security/$ISA/pam_access.so
auth required b.so [x  y]
auth required c.so
"""
JUMP_LOSS = ("auth: the jump 'success=2' of '[success=2 default=ignore] u.so' would land "
             "elsewhere")

STOCK_PAM = """#
# A policy as Debian's are.
auth       optional   pam_faildelay.so  delay=3000000
auth [success=ok new_authtok_reqd=ok ignore=ignore user_unknown=bad default=die] pam_securetty.so
@include common-auth
-session   optional   pam_systemd.so
session    required   pam_env.so \\
           readenv=1 envfile=/etc/default/locale
@include common-account
@include common-session
@include common-password
"""


def nobody():
    os.setgroups([])
    os.setgid(65534)
    os.setuid(65534)


class Case(unittest.TestCase):
    def setUp(self):
        set_up()
        for path in glob.glob("/etc/*.tslauth-orig*") + glob.glob("/etc/pam.d/*.tslauth-orig*"):
            os.unlink(path)

    def unchanged(self, *arguments, **options):
        """Runs the tool and makes sure that it leaves no trace."""
        before = state()
        names = sorted(os.listdir("/etc") + os.listdir("/etc/pam.d"))
        document = ask(*arguments, **options)
        self.assertEqual(before, state())
        self.assertEqual(names, sorted(os.listdir("/etc") + os.listdir("/etc/pam.d")))
        return document


def states():
    """Whether the files agree with the record, whatever else status finds."""
    return {file["state"] for file in ask("status")["files"]}


class Stores(Case):
    def test_the_active_one_is_marked(self):
        self.assertEqual([{"name": AD, "active": False}, {"name": "None", "active": True}],
                         ask("stores")["stores"])
        self.assertEqual(b"  Active Directory\n* None\n", run("stores").stdout)

    def test_they_are_listed_without_a_record(self):
        RECORD.unlink()
        document = ask("stores")
        self.assertEqual(REFUSED, document["exit"])
        self.assertIsNone(document["recorded"])
        self.assertEqual("tessel::authentication::IOError", document["error"]["exception"])
        self.assertEqual(2, len(document["stores"]))


class Plan(Case):
    def test_it_is_what_activate_writes(self):
        for store in (AD, "None"):
            document = self.unchanged("plan", store)
            self.assertEqual(CHANGES, document["exit"])
            expected = texts()
            for file in document["files"]:
                with tempfile.NamedTemporaryFile() as copy:
                    copy.write(expected[file["path"]])
                    copy.flush()
                    subprocess.run(["patch", "-s", copy.name], input=file["diff"].encode(),
                                   check=True, timeout=60)
                    expected[file["path"]] = pathlib.Path(copy.name).read_bytes()
            activated = ask("activate", store)
            self.assertEqual(DONE, activated["exit"])
            self.assertEqual([file["path"] for file in document["files"]], activated["changed"])
            self.assertEqual(expected, texts())
            again = self.unchanged("plan", store)
            self.assertEqual(DONE, again["exit"])

    def test_the_files_come_in_the_order_of_writing(self):
        paths = [file["path"] for file in ask("plan", AD)["files"]]
        self.assertEqual([str(PAM), str(NSS), str(RECORD)], paths)
        ask("activate", AD)
        paths = [file["path"] for file in ask("plan", "None")["files"]]
        self.assertEqual([str(RECORD), str(PAM), str(NSS)], paths)

    def test_it_needs_no_root(self):
        self.assertEqual(CHANGES, self.unchanged("plan", AD, preexec_fn=nobody)["exit"])

    def test_every_loss_is_named(self):
        set_up(nss="passwd: files\ngroup: files\nhosts: files [NOTFOUND=return] dns\n",
               pam="# one\n" + JUMPING_PAM)
        losses = {file["path"]: file["losses"] for file in ask("plan", AD)["files"]}
        self.assertIn("account: the policy 'other', which decides where there is no entry, would "
                      "no longer", losses[str(PAM)])
        PAM.write_text(PAM.read_text() + "account required c.so\n")
        document = self.unchanged("plan", AD)
        self.assertEqual(LOSS, document["exit"])
        losses = {file["path"]: file["losses"] for file in document["files"]}
        self.assertEqual({str(PAM): [JUMP_LOSS], str(NSS): [], str(RECORD): []}, losses)
        self.assertEqual([], [note for file in document["files"] for note in file["notes"]])

    def test_a_file_that_its_readers_understand_differently_is_refused(self):
        set_up(nss=TWICE_NSS)
        document = self.unchanged("plan", AD)
        self.assertEqual(REFUSED, document["exit"])
        self.assertEqual({"message": "The service 'extrausers' has no place in 'passwd' where all "
                                     "readers of the file find it",
                          "afterwards": False,
                          "exception": "tessel::authentication::ConfigurationError"},
                         document["refusal"])
        self.assertIn(b"tslauthctl prepare", run("plan", AD).stderr)

    def test_an_unknown_recorded_store_is_refused_after_the_record(self):
        set_up(store="Example Store")
        document = self.unchanged("plan", "None")
        self.assertEqual(REFUSED, document["exit"])
        self.assertTrue(document["refusal"]["afterwards"])
        self.assertEqual([str(RECORD)], [file["path"] for file in document["files"]])

    def test_control_characters_are_escaped(self):
        set_up(nss=PLAIN_NSS + "rpc: \x1b]0;title\x07\n")
        process = run("plan", AD, "--color=never")
        self.assertIn(b" rpc: \\x1b]0;title\\x07\n", process.stdout)
        self.assertNotIn(b"\x1b", process.stdout)
        self.assertIn("\x1b]0;title\x07", ask("plan", AD)["files"][1]["diff"])

    def test_colours_are_for_terminals_and_on_demand(self):
        self.assertNotIn(b"\x1b[", run("plan", AD).stdout)
        self.assertIn(b"\x1b[32m+", run("plan", AD, "--color=always").stdout)
        self.assertIn(b"\x1b[32m+", self.on_a_terminal({}))
        self.assertNotIn(b"\x1b[", self.on_a_terminal({"NO_COLOR": "1"}))
        self.assertNotIn(b"\x1b[", self.on_a_terminal({"TERM": "dumb"}))

    def on_a_terminal(self, variables):
        environment = {"PATH": os.environ["PATH"], "TERM": "xterm", **variables}
        master, slave = os.openpty()
        process = subprocess.Popen([TOOL, "plan", AD], stdout=slave, stderr=slave, stdin=slave,
                                   env=environment)
        os.close(slave)
        output = b""
        try:
            while data := os.read(master, 65536):
                output += data
        except OSError:
            pass  # how the end of a pseudo-terminal shows
        os.close(master)
        self.assertEqual(CHANGES, process.wait(timeout=60))
        return output


class Activate(Case):
    def test_a_file_with_a_loss_is_left_alone_unless_it_is_accepted(self):
        set_up(pam=JUMPING_PAM + "account required c.so\n")
        document = self.unchanged("activate", AD)
        self.assertEqual(LOSS, document["exit"])
        self.assertEqual([{"path": str(PAM), "loss": JUMP_LOSS}], document["losses"])
        process = run("activate", AD)
        self.assertIn(JUMP_LOSS.encode(), process.stderr)
        self.assertEqual(DONE, ask("activate", AD, "--accept-loss")["exit"])
        self.assertIn("pam_pwdfile.so", PAM.read_text())

    def test_there_and_back_loses_nothing_of_a_stock_debian_host(self):
        set_up(pam=STOCK_PAM, nss=STOCK_NSS)
        os.chown(NSS, 12, 34)
        os.chmod(NSS, 0o640)
        before = texts()
        self.assertEqual(DONE, ask("activate", AD)["exit"])
        self.assertEqual({"in-step"}, states())
        for path in (PAM, NSS):
            lines = path.read_bytes().splitlines()
            for line in before[str(path)].splitlines():
                edited = path == NSS and line.startswith((b"passwd:", b"group:", b"shadow:"))
                self.assertEqual(not edited, line in lines, line)
        self.assertEqual(DONE, ask("activate", "None")["exit"])
        self.assertEqual(before, texts())
        status = NSS.stat()
        self.assertEqual((12, 34, 0o640), (status.st_uid, status.st_gid, status.st_mode & 0o7777))

    def test_a_file_in_which_nothing_changes_is_not_written(self):
        ask("activate", AD)
        before = state((PAM, NSS))
        self.assertEqual(DONE, ask("activate", AD)["exit"])
        self.assertEqual(before, state((PAM, NSS)))

    def test_a_refusal_leaves_everything_alone_whatever_is_accepted(self):
        set_up(nss=TWICE_NSS)
        for arguments in (("activate", AD), ("activate", AD, "--accept-loss")):
            document = self.unchanged(*arguments)
            self.assertEqual(REFUSED, document["exit"])
            self.assertEqual("tessel::authentication::ConfigurationError",
                             document["error"]["exception"])

    def test_an_unknown_recorded_store_is_left_with_its_refusal(self):
        set_up(store="Example Store")
        document = ask("activate", "None")
        self.assertEqual(REFUSED, document["exit"])
        self.assertEqual("The specified store 'Example Store' is unknown",
                         document["error"]["message"])
        self.assertEqual([str(RECORD)], document["changed"])
        self.assertEqual(DONE, ask("activate", "None")["exit"])

    def test_none_is_not_recorded_over_entries_that_would_stay(self):
        ask("activate", AD)
        inserted = pathlib.Path("/var/lib/tslauth/inserted")
        inserted.unlink()
        PROVIDER.write_text('provider = "gone"\n')
        self.assertEqual(REFUSED, self.unchanged("activate", "None")["exit"])
        document = ask("activate", "None", "--accept-loss")
        self.assertEqual(DONE, document["exit"])
        self.assertEqual([str(RECORD)], document["changed"])
        self.assertIn("None", RECORD.read_text())

    def test_a_change_that_cannot_be_remembered_is_not_made(self):
        ask("activate", AD)
        before = texts()
        folder = pathlib.Path("/var/lib/tslauth")
        subprocess.run(["mount", "--bind", folder, folder], check=True)
        subprocess.run(["mount", "-o", "remount,bind,ro", folder], check=True)
        try:
            document = ask("activate", "None")
        finally:
            subprocess.run(["umount", folder], check=True)
        self.assertEqual(FAILURE, document["exit"])
        self.assertIn("Nothing was changed", document["error"]["message"])
        self.assertEqual(before, texts())
        self.assertEqual(DONE, ask("activate", "None")["exit"])

    def test_what_was_written_before_a_failure_is_put_back(self):
        before = texts()
        # The folder of the record takes no new file; those of the others do.
        subprocess.run(["mount", "--bind", RECORD.parent, RECORD.parent], check=True)
        subprocess.run(["mount", "-o", "remount,bind,ro", RECORD.parent], check=True)
        try:
            document = ask("activate", AD)
        finally:
            subprocess.run(["umount", RECORD.parent], check=True)
        self.assertEqual(REFUSED, document["exit"])
        self.assertEqual("tessel::authentication::IOError", document["error"]["exception"])
        self.assertEqual([], document["changed"])
        self.assertLessEqual({str(PAM), str(NSS)}, set(document["put_back"]))
        self.assertEqual(before, texts())
        self.assertEqual(DONE, ask("status")["exit"])

    def test_it_wants_root(self):
        document = self.unchanged("activate", AD, preexec_fn=nobody)
        self.assertEqual(NOT_ROOT, document["exit"])

    def test_the_lock_must_be_roots_own_file(self):
        LOCK.unlink(missing_ok=True)
        for make in (lambda: LOCK.symlink_to("/etc/target"), LOCK.mkdir,
                     lambda: (LOCK.touch(), os.chown(LOCK, 65534, 65534))):
            make()
            self.assertEqual(FAILURE, self.unchanged("activate", AD)["exit"])
            LOCK.rmdir() if LOCK.is_dir() else LOCK.unlink()
        self.assertFalse(pathlib.Path("/etc/target").exists())
        self.assertEqual(DONE, ask("activate", AD)["exit"])
        self.assertEqual(0o600, LOCK.stat().st_mode & 0o7777)


class Prepare(Case):
    def test_a_stock_debian_host_goes_all_the_way(self):
        set_up(pam=STOCK_PAM, nss=STOCK_NSS)
        shown = self.unchanged("prepare")
        self.assertEqual(CHANGES, shown["exit"], shown)
        os.chown(NSS, 12, 34)
        os.chmod(NSS, 0o640)
        original = state()
        written = ask("prepare", "--write")
        self.assertEqual(DONE, written["exit"])
        for file, path in zip(written["files"], (PAM, NSS)):
            kept = pathlib.Path(file["original"])
            self.assertEqual(f"{path}.tslauth-orig", str(kept))
            self.assertEqual(original[path], state([kept])[kept])
        status = NSS.stat()
        self.assertEqual((12, 34, 0o640), (status.st_uid, status.st_gid, status.st_mode & 0o7777))
        self.assertIn("\nhosts: files[SUCCESS=return]mdns4_minimal[NOTFOUND=return] dns\n",
                      NSS.read_text())
        self.assertEqual(DONE, self.unchanged("prepare")["exit"])
        for store in (AD, "None"):
            self.assertEqual(CHANGES, self.unchanged("plan", store)["exit"])
            self.assertEqual(DONE, ask("activate", store)["exit"])
            self.assertEqual({"in-step"}, states())

    def test_the_original_of_a_second_time_gets_a_number(self):
        for kept in ("", ".1", ".2"):
            set_up(nss=PLAIN_NSS + "gshadow: files\n")
            document = ask("prepare", "--write")
            self.assertEqual(f"{NSS}.tslauth-orig{kept}", document["files"][1]["original"])
            self.assertIsNone(document["files"][0]["original"])

    def test_where_no_edit_exists_nothing_is_written_unless_accepted(self):
        set_up(nss=PLAIN_NSS + "gshadow: files systemd\nrpc : files\n")
        self.assertEqual(LOSS, self.unchanged("prepare")["exit"])
        document = self.unchanged("prepare", "--write")
        self.assertEqual(LOSS, document["exit"])
        self.assertFalse(document["written"])
        self.assertEqual([5], [line["line"] for line in document["files"][1]["impossible"]])
        self.assertEqual(DONE, ask("prepare", "--write", "--accept-loss")["exit"])
        self.assertEqual(PLAIN_NSS + "rpc: files\n", NSS.read_text())

    def test_without_a_provider_one_is_assumed(self):
        PROVIDER.unlink()
        self.assertEqual(DONE, self.unchanged("prepare")["exit"])

    def test_writing_wants_root(self):
        set_up(nss=PLAIN_NSS + "gshadow: files\n")
        self.assertEqual(NOT_ROOT, self.unchanged("prepare", "--write", preexec_fn=nobody)["exit"])
        self.assertEqual(CHANGES, self.unchanged("prepare", preexec_fn=nobody)["exit"])


class Status(Case):
    def parts(self, document):
        return {part["name"]: part["state"] for file in document["files"] for part in file["parts"]}

    def test_in_step(self):
        document = self.unchanged("status")
        self.assertEqual((DONE, "None", True),
                         (document["exit"], document["recorded"], document["known"]))
        self.assertEqual("example", document["provider"]["name"])
        ask("activate", AD)
        follow()
        document = self.unchanged("status")
        self.assertEqual(DONE, document["exit"], document)
        self.assertEqual({"in-step"}, set(self.parts(document).values()))

    def test_drift_is_told_by_facility_and_database(self):
        ask("activate", AD)
        lines = PAM.read_text().splitlines(keepends=True)
        PAM.write_text("".join(line for line in lines
                               if not re.match("auth.*(pwdfile|example)", line)))
        NSS.write_text(PLAIN_NSS)
        document = self.unchanged("status")
        self.assertEqual(DRIFT, document["exit"])
        self.assertEqual(["partly", "not-at-all"], [file["state"] for file in document["files"]])
        self.assertEqual({"auth": "not-at-all", "account": "in-step", "passwd": "not-at-all",
                          "group": "not-at-all", "shadow": "not-at-all"}, self.parts(document))

    def test_entries_left_behind_are_drift(self):
        ask("activate", AD)
        RECORD.write_text('remote-authentication-store = "None"\n')
        self.assertEqual(DRIFT, self.unchanged("status")["exit"])

    def test_an_unknown_store_is_drift(self):
        set_up(store="Example Store")
        document = self.unchanged("status")
        self.assertEqual((DRIFT, False), (document["exit"], document["known"]))

    def words(self, document):
        return {finding["word"] for finding in document["findings"]}

    def test_services_that_do_not_follow_are_found(self):
        ask("activate", AD)
        follow()
        (pathlib.Path("/etc/pam.d") / "common-auth").write_text("auth required pam_unix.so\n")
        document = self.unchanged("status")
        self.assertEqual((DRIFT, {"services-not-following"}),
                         (document["exit"], self.words(document)))

    def test_a_host_that_is_active_and_not_joined_is_found(self):
        ask("activate", AD)
        follow()
        pathlib.Path("/var/lib/tslauth-example/joined").unlink()
        document = self.unchanged("status")
        self.assertEqual((NOT_JOINED, {"not-joined"}), (document["exit"], self.words(document)))

    def test_the_trust_is_looked_at_on_demand(self):
        script(domain="a domain", trust="1")
        ask("activate", AD)
        follow()
        self.assertNotIn("trust", self.words(ask("status")))
        self.assertIn("trust", self.words(ask("status", "--deep")))

    def test_entries_of_a_provider_that_is_no_longer_configured_are_found_and_taken_out(self):
        ask("activate", AD)
        PROVIDER.write_text('provider = "plain"\n')
        RECORD.write_text('remote-authentication-store = "None"\n')
        document = self.unchanged("status")
        self.assertEqual((DRIFT, {"entries-left"}), (document["exit"], self.words(document)))
        self.assertEqual(DONE, ask("activate", "None")["exit"])
        self.assertNotIn(b"pwdfile", PAM.read_bytes())
        self.assertEqual(set(), self.words(ask("status")))

    def test_a_second_activation_finishes_what_a_first_one_left(self):
        ask("activate", AD)
        RECORD.write_text('remote-authentication-store = "None"\n')
        document = ask("activate", "None")
        self.assertEqual((DONE, {str(PAM), str(NSS)}),
                         (document["exit"], set(document["changed"])))
        self.assertEqual(DONE, self.unchanged("status")["exit"])

    def test_without_its_provider_it_cannot_be_told(self):
        follow()
        for store, provider, code in ((AD, "gone", REFUSED), ("None", "gone", REFUSED),
                                      ("None", "", DONE)):
            set_up(store=store, provider=provider)
            document = self.unchanged("status")
            self.assertEqual(code, document["exit"])
            self.assertFalse(document["provider"]["loaded"])
            self.assertIsNotNone(document["provider"]["error"]["exception"])
            self.assertEqual({"unknown"}, set(self.parts(document).values()))

    def test_a_missing_file_cannot_be_told(self):
        NSS.unlink()
        document = ask("status")
        self.assertEqual(FAILURE, document["exit"])
        self.assertEqual(f"Cannot open '{NSS}': No such file or directory",
                         document["files"][1]["error"])

    def test_a_missing_record_is_refused(self):
        RECORD.write_text("x = 1\n")
        document = self.unchanged("status")
        self.assertEqual((REFUSED, "tessel::authentication::InvalidKeyException"),
                         (document["exit"], document["error"]["exception"]))


class Provider(Case):
    """What the tool refuses before it would load it."""

    def refused(self):
        document = self.unchanged("activate", AD)
        self.assertEqual(REFUSED, document["exit"])
        return document["error"]["message"]

    def test_a_name_that_leads_out_of_the_folder_is_refused(self):
        set_up(provider="x/../../../../tmp/y")
        self.assertIn("its name holds a '/'", self.refused())

    @unittest.skipIf(os.environ.get("TSLAUTH_SANITIZE"), "the sanitizer catches the signal itself")
    def test_a_truncated_one_is_found_out_in_a_child(self):
        whole = pathlib.Path("/usr/libexec/tslauth/libexample.so").read_bytes()
        path = pathlib.Path("/usr/libexec/tslauth/libtruncated.so")
        self.addCleanup(path.unlink)
        path.write_bytes(whole[:4096])
        set_up(provider="truncated")
        self.refused() # by the loader, or because loading ends the child

    def test_the_way_back_to_none_needs_none_that_cannot_be_loaded(self):
        before = texts()
        for name in ("x/../../../../tmp/y", "gone"):
            set_up()
            self.assertEqual(DONE, ask("activate", AD)["exit"])
            PROVIDER.write_text(f'provider = "{name}"\n')
            self.assertEqual(REFUSED, self.unchanged("activate", "None")["exit"])
            document = ask("activate", "None", "--accept-loss")
            self.assertEqual((DONE, {str(path) for path in FILES}),
                             (document["exit"], set(document["changed"])))
            self.assertEqual(before, texts())
            self.assertEqual(DONE, ask("activate", "None")["exit"])

    def test_a_pipe_in_its_place_is_not_waited_for(self):
        path = pathlib.Path("/usr/libexec/tslauth/libpipe.so")
        os.mkfifo(path)
        self.addCleanup(path.unlink)
        set_up(provider="pipe")
        self.refused()


class Suggestions(Case):
    def test_the_nearest_command_or_option_is_suggested(self):
        for arguments, suggestion in ((("statsu",), b"'status'"), (("activte", AD), b"'activate'"),
                                      (("status", "--jsn"), b"'--json'"),
                                      (("cam", "improt"), b"'import'")):
            process = run(*arguments)
            self.assertEqual(USAGE, process.returncode)
            self.assertIn(b"did you mean " + suggestion, process.stderr)
        self.assertNotIn(b"did you mean", run("xyzzy").stderr)

    def test_help_is_a_command_as_well(self):
        self.assertEqual(run("--help").stdout, run("help").stdout)
        self.assertEqual(run("join", "--help").stdout, run("help", "join").stdout)


class Modules(Case):
    """The modules of the example provider are installed; those of "gate" are not."""

    def test_installed_ones_are_not_spoken_of(self):
        for arguments in (("plan", AD), ("activate", AD), ("status",)):
            self.assertNotIn("warnings", ask(*arguments))

    def test_missing_ones_are_warned_of_and_stop_nothing(self):
        set_up(provider="gate")
        self.assertNotIn("warnings", ask("status"), "nobody wants them yet")
        for arguments, code in ((("plan", AD), CHANGES), (("activate", AD), DONE),
                                (("status",), DRIFT)):
            document = ask(*arguments)
            self.assertEqual(code, document["exit"])
            pam, nss = document["warnings"]
            self.assertIn("'/lib/security/$ISA/pam_gate.so' is not installed", pam)
            self.assertIn("'libnss_gate.so.2' is not installed", nss)
        self.assertNotIn("warnings", ask("activate", "None"))


class Usage(Case):
    def test_it_is_told_what_is_wrong(self):
        for arguments in ((), ("plan",), ("plan", "a", "b"), ("nothing",), ("status", "--odd"),
                          ("activate",), ("stores", "--color=sometimes")):
            document = self.unchanged(*arguments)
            self.assertEqual(USAGE, document["exit"], arguments)
            process = run(*arguments)
            self.assertEqual(USAGE, process.returncode)
            self.assertEqual(b"", process.stdout)
            self.assertTrue(process.stderr.startswith(b"tslauthctl: "), process.stderr)

    def test_an_unknown_store_is_answered_with_the_known_ones(self):
        for command in ("plan", "activate"):
            self.assertEqual("Unknown store 'none'. Known are: 'Active Directory', 'None'",
                             self.unchanged(command, "none")["error"]["message"])

    def test_the_message_names_what_is_wrong(self):
        for arguments, message in (
                (("nothing",), b"Unknown command 'nothing' (see tslauthctl --help)"),
                (("--color", "never", "nothing"), b"Unknown command 'nothing'"),
                (("stores", "--color=sometimes"), b"'sometimes' is none of auto, always, never"),
                (("stores", "--color=1"), b"'1' is none of auto, always, never"),
                (("activate",), b"(see tslauthctl activate --help)")):
            self.assertIn(message, run(*arguments).stderr)

    def test_help_and_version_succeed(self):
        for command in ([], ["stores"], ["status"], ["plan"], ["activate"], ["prepare"], ["join"]):
            self.assertRegex(run(*command, "--version").stdout, rb"^tslauthctl \d+\.\d+\.\d+\n$")
        for command in ([], ["stores"], ["status"], ["plan"], ["activate"], ["prepare"]):
            process = run(*command, "--help")
            self.assertEqual(DONE, process.returncode)
            for code in range(8):
                self.assertIn(f"\n  {code}  ".encode(), process.stdout)

    def test_output_that_cannot_be_written_is_a_failure(self):
        for arguments in (("stores",), ("plan", AD), ("status", "--json"), ("--help",)):
            with open("/dev/full", "wb") as full:
                self.assertEqual(FAILURE, run(*arguments, stdout=full).returncode, arguments)


main()
