#!/usr/bin/env python3
"""How the installed programs end: plug-ins that end the agent, limits, options, and a user without a home.

usage: agent_ending_test.py BUILD_DIR PLUGIN_DIR [UNITTEST_ARGUMENT ...]
"""

import os
import plistlib
import resource
import shutil
import signal
import stat
import sys
import unittest
from pathlib import Path

sys.path.insert(0, str(Path(__file__).resolve().parents[2] / "support"))
import machine  # noqa: E402

LABEL = "com.corvid.welcomer.nimbussetup.user"
LIBEXEC = "/usr/local/libexec"
AGENT, TOOL = f"{LIBEXEC}/wlnimbussetup", "/usr/local/bin/welcomer"
PLUGIN_FOLDER = "System/Library/CoreServices/FirstRunPlugins"
ACCOUNT = "newcomer@nimbus.example"
REPLAY = {"delegatesResponseDict": {"delegates": {"org.example.ending": {"status": 0}}}}
RECORD = (115, "14.3")
STRANGER = 54321  # a user whom the password database does not know

BUILD, PLUGINS = None, None


class OnAMachine(unittest.TestCase):
    """One machine for all the tests of a class."""

    @classmethod
    def setUpClass(cls):
        machine.for_class(cls, BUILD, "agent-ending")
        cls.machine.start_system_log()
        replay = cls.machine.root / "tmp/replay.plist"
        replay.write_bytes(plistlib.dumps(REPLAY))
        replay.chmod(0o644)
        cls.plugins = cls.machine.root / PLUGIN_FOLDER
        cls.plugins.mkdir(parents=True)

    def install_plugin(self, name, entry):
        for old in self.plugins.iterdir():
            old.unlink()
        shutil.copy(PLUGINS / f"{name}.ncdplugin", self.plugins / entry)

    def store_replay_item(self):
        stored = self.machine.run([TOOL, "replay", "store", "--account", ACCOUNT, "--file", "/tmp/replay.plist",
                                   "--bundle", "/usr/local/share/welcomer/setup-bundle"], user=True)
        self.assertEqual(stored.returncode, 0, stored)

    def records_since(self, begin, last):
        """The agent's records after the first `begin`, once the system log has written one that begins so."""
        found = []

        def has_last():
            found[:] = self.machine.log_records("wlnimbussetup")[begin:]
            return any(text.startswith(last) for _, _, text in found)

        self.machine.wait_for(has_last, f"a record {last!r}")
        return found

    def run_agent(self, last, ending="", **options):
        """One login, which ends with status 0 as every one does; returns its records."""
        self.store_replay_item()
        begin = len(self.machine.log_records("wlnimbussetup"))
        ended = self.machine.run(["/usr/bin/env", f"ENDING={ending}", AGENT], user=True, **options)
        self.assertEqual((ended.returncode, ended.stdout, ended.stderr), (0, "", ""), (ending, ended))
        return self.records_since(begin, last)


class Endings(OnAMachine):
    def assert_ends(self, ending, line):
        records = self.run_agent("ended ", ending)
        self.assertEqual([record for record in records if record[2].startswith("ended ")], [(*RECORD, line)])
        self.assertEqual(records[-1][2], line, "nothing comes after it")

    def test_whatever_ends_the_agent_in_a_plugin_is_said_with_status_zero(self):
        self.install_plugin("EndingPlugin", "Bad.ncdplugin")
        for where in ("load", "create", "identify", "complete"):
            for how, what in (("fault", "SIGSEGV"), ("SIGABRT", "SIGABRT"), ("exit", "exit(7)"),
                              ("quick_exit", "quick_exit()"), ("overflow", "SIGSEGV")):
                with self.subTest(where=where, how=how):
                    self.assert_ends(f"{where} {how}", f"ended by plug-in Bad.ncdplugin: {what}")

    def test_every_signal_that_tells_of_a_fault(self):
        self.install_plugin("EndingPlugin", "Bad.ncdplugin")
        for signal in ("SIGBUS", "SIGFPE", "SIGILL", "SIGSYS", "SIGTRAP"):
            with self.subTest(signal):
                self.assert_ends(f"complete {signal}", f"ended by plug-in Bad.ncdplugin: {signal}")

    def test_on_a_thread_of_its_own_the_plugin_has_no_name(self):
        self.install_plugin("EndingPlugin", "Bad.ncdplugin")
        for how, what in (("thread-fault", "SIGSEGV"), ("thread-exit", "exit(7)")):
            with self.subTest(how):
                self.assert_ends(f"complete {how}", f"ended outside of any call into a plug-in: {what}")

    def test_what_nobody_can_catch_ends_it_without_a_line(self):
        self.install_plugin("EndingPlugin", "Bad.ncdplugin")
        for how, status in (("_exit", 7), ("thread-overflow", -signal.SIGSEGV)):
            with self.subTest(how):
                self.store_replay_item()
                begin = len(self.machine.log_records("wlnimbussetup"))
                ended = self.machine.run(["/usr/bin/env", f"ENDING=complete {how}", AGENT], user=True)
                self.assertEqual(ended.returncode, status, ended)
                texts = [text for _, _, text in self.records_since(begin, "setting up org.example.ending")]
                self.assertEqual([text for text in texts if text.startswith("ended ")], [])

    def test_of_two_threads_that_fault_at_once_one_speaks(self):
        self.install_plugin("EndingPlugin", "Bad.ncdplugin")
        self.assert_ends("complete two-at-once", "ended outside of any call into a plug-in: SIGSEGV")

    def test_forked_children_end_as_they_always_did(self):
        self.install_plugin("EndingPlugin", "Bad.ncdplugin")
        self.assert_ends("complete fork", "ended by plug-in Bad.ncdplugin: exit(61)")

    def test_it_is_said_also_where_no_descriptor_is_left(self):
        self.install_plugin("EndingPlugin", "Bad.ncdplugin")
        self.assert_ends("complete descriptors", "ended by plug-in Bad.ncdplugin: SIGABRT")

    def test_an_initialiser_that_throws_costs_the_login_and_is_named(self):
        self.install_plugin("ThrowingInitialiser", "Thrower.ncdplugin")
        self.assert_ends("", "ended by plug-in Thrower.ncdplugin: uncaught exception: thrown\\x0awhile loading")

    def test_the_name_stays_one_line(self):
        self.install_plugin("EndingPlugin", "Bad\n\x1b[1mé\u009b.ncdplugin")
        self.assert_ends("create fault", r"ended by plug-in Bad\x0a\x1b[1mé\xc2\x9b.ncdplugin: SIGSEGV")

    def test_no_file_may_grow_and_the_setup_goes_on(self):
        self.install_plugin("EndingPlugin", "Bad.ncdplugin")
        # The deletion of the last item writes nothing; the account that comes after it does.
        limit = lambda: resource.setrlimit(resource.RLIMIT_FSIZE, (0, 0))
        texts = [text for _, _, text in self.run_agent("ended ", "complete exit", preexec_fn=limit)]
        self.assertIn("setting up org.example.ending", texts)
        self.assertEqual(texts[-1], "ended by plug-in Bad.ncdplugin: exit(7)")
        shown = self.machine.run([TOOL, "replay", "show"], user=True)
        self.assertEqual(shown.returncode, 1, shown)

    def test_a_program_that_the_agent_starts_ignores_no_signal(self):
        self.install_plugin("EndingPlugin", "Bad.ncdplugin")
        script = self.machine.root / "tmp/killall"
        script.write_text("#!/bin/sh\nexec /bin/grep SigIgn /proc/self/status > /tmp/ignored\n", encoding="utf-8")
        script.chmod(0o755)
        killall = self.machine.root / "usr/bin/killall"
        machine.mount(script, killall, None, machine.MS_BIND)
        try:
            self.run_agent("ended ", "complete exit")
        finally:
            machine.unmount(killall)
        name, mask = (self.machine.root / "tmp/ignored").read_text().split()
        # The C library has the two signals of its own, behind the standard ones, ignored in what it starts.
        self.assertEqual((name, int(mask, 16) & 0x7FFFFFFF), ("SigIgn:", 0))


class Options(OnAMachine):
    def run_program(self, program, *arguments):
        return self.machine.run([f"{LIBEXEC}/{program}", *arguments], user=True)

    def test_help_and_version(self):
        version = self.machine.run([TOOL, "--version"]).stdout.split()[1]
        self.assertRegex(version, r"^\d+\.\d+\.\d+$")
        for program, usage in (("wlnimbussetup", " [LABEL]"), ("welcomer-launch-agents", " [--end-of-login]"),
                               ("welcomer-resolver-sync", "")):
            with self.subTest(program):
                asked = self.run_program(program, "--help")
                self.assertEqual((asked.returncode, asked.stdout, asked.stderr), (0, f"usage: {program}{usage}\n", ""))
                asked = self.run_program(program, "--version")
                self.assertEqual((asked.returncode, asked.stdout, asked.stderr), (0, f"{program} {version}\n", ""))

    def test_an_unknown_option_gets_the_usage_line(self):
        for program, usage, status in (("wlnimbussetup", " [LABEL]", 0),
                                       ("welcomer-launch-agents", " [--end-of-login]", 2),
                                       ("welcomer-resolver-sync", "", 2)):
            with self.subTest(program):
                asked = self.run_program(program, "--no-such-option", LABEL)
                self.assertEqual((asked.returncode, asked.stdout, asked.stderr),
                                 (status, "", f"usage: {program}{usage}\n"))

    def test_the_agent_does_nothing_then(self):
        self.store_replay_item()
        agents = self.machine.home / "Library/LaunchAgents"
        for option in ("--help", "--version", "--", "--other"):
            shutil.copy(agents / f"{LABEL}.plist", agents / f"{option}.plist")
            self.assertEqual(self.run_program("wlnimbussetup", option).returncode, 0)
        self.assertEqual(sorted(path.name for path in agents.iterdir()),
                         sorted(f"{name}.plist" for name in (LABEL, "--help", "--version", "--", "--other")))
        self.assertEqual(self.machine.run([TOOL, "replay", "show"], user=True).returncode, 0)
        # A record after all of this: none of the agent's is before it.
        self.machine.run(["/usr/bin/logger", "-t", "afterwards", "done"])
        self.machine.wait_for(lambda: self.machine.log_records("afterwards"), "the record")
        self.assertEqual(self.machine.log_records("wlnimbussetup"), [])


class WithoutHome(OnAMachine):
    @classmethod
    def setUpClass(cls):
        super().setUpClass()
        # What would be the stranger's, were "/" its home.
        agents = cls.machine.root / "Library/LaunchAgents"
        agents.mkdir(parents=True)
        (agents / f"{LABEL}.plist").write_bytes(b"not to be removed")
        credentials = cls.machine.root / "Library/Credentials"
        credentials.mkdir(mode=0o700)
        for path in (agents.parent, agents, credentials):
            os.chown(path, STRANGER, STRANGER)

    def run_as_stranger(self, *command):
        return self.machine.run(["/usr/bin/setpriv", f"--reuid={STRANGER}", f"--regid={STRANGER}", "--clear-groups",
                                 *command])

    def snapshot(self):
        """Everything that a program without a home could change: path, kind, size and time of change."""
        found = {}
        for folder, folders, files in os.walk(self.machine.root):
            if Path(folder) == self.machine.root:
                folders[:] = [name for name in folders if name not in ("proc", "dev", "run", "usr")]
            for path in (Path(folder), *(Path(folder) / name for name in files)):
                status = path.lstat()
                found[str(path)] = (stat.S_IFMT(status.st_mode), status.st_size, status.st_mtime_ns)
        return found

    def test_the_agent_says_so_and_touches_nothing(self):
        before = self.snapshot()
        ended = self.run_as_stranger(AGENT)
        self.assertEqual((ended.returncode, ended.stdout, ended.stderr), (0, "", ""))
        texts = [text for _, _, text in self.records_since(0, "exiting")]
        self.assertEqual(texts[:2], ["Self destructing...", f"Failed to remove wlnimbussetup plist for {STRANGER}: "
                                     f"the user {STRANGER} has no home folder"])
        self.assertRegex(texts[2], r"^Failed to find replay keychain item: [1-9]\d*$")
        self.assertEqual(texts[3:], ["exiting"])
        self.assertEqual(self.snapshot(), before)

    def test_the_tool_says_so_in_one_line(self):
        before = self.snapshot()
        for command in (["replay", "show"], ["replay", "delete"], ["account", "list"], ["state", "show"],
                        ["services", "list"], ["replay", "store", "--account", "a", "--file", "/tmp/replay.plist",
                                                  "--bundle", "/usr/local/share/welcomer/setup-bundle"]):
            with self.subTest(command):
                asked = self.run_as_stranger(TOOL, *command)
                self.assertEqual((asked.returncode, asked.stdout, asked.stderr),
                                 (1, "", f"welcomer: the user {STRANGER} has no home folder\n"))
        self.assertEqual(self.snapshot(), before)

    def test_what_needs_no_home_works(self):
        for command in (["plugins", "list"], ["network", "ports"], ["switch", "show"]):
            with self.subTest(command):
                asked = self.run_as_stranger(TOOL, *command)
                self.assertEqual((asked.returncode, asked.stderr), (0, ""), asked)

    def test_no_launch_agent_starts(self):
        started = self.run_as_stranger(f"{LIBEXEC}/welcomer-launch-agents")
        self.assertEqual((started.returncode, started.stdout, started.stderr), (1, "", ""))
        found = []

        def is_said():
            found[:] = self.machine.log_records("welcomer-launch-agents")
            return found

        self.machine.wait_for(is_said, "the record")
        self.assertEqual([text for _, _, text in found],
                         [f"Launch agents cannot start: the user {STRANGER} has no home folder"])


if __name__ == "__main__":
    machine.enter_namespaces()
    BUILD, PLUGINS = sys.argv[1], Path(sys.argv[2])
    unittest.main(argv=[sys.argv[0], *sys.argv[3:]])
