#!/usr/bin/env python3
"""The installed agent at a login: real paths, a real system log, real plug-ins, a real home folder, two real minutes.

usage: installed-agent-test.py BUILD_DIR PLUGIN ...
"""

import plistlib
import re
import shutil
import signal
import sys
import tempfile
import time
import unittest
from pathlib import Path

sys.path.insert(0, str(Path(__file__).resolve().parents[2] / "support"))
import machine  # noqa: E402

LABEL = "com.corvid.welcomer.nimbussetup.user"
ACCOUNT = "newcomer@nimbus.example"
PREFERENCE_PROCESS = "com.corvid.onlineaccounts"
AGENT_PRIORITY = (115, "14.3")

REPLAY = {
    "delegatesResponseDict": {
        "delegates": {
            "com.corvid.vidlink": {"status": 0},
            "com.corvid.chatter": {"status": 0},
            "com.corvid.storefront": {"status": 0},
            "com.corvid.nowhere": {"status": 0},
            "com.corvid.gcc.c": "other thread",
            "com.corvid.gcc.frozen": "other thread",
            "com.corvid.gcc.layer": {"asked": "this"},
            "com.corvid.clang.c": "after return",
            "com.corvid.clang.frozen": "other thread",
            "com.corvid.clang.layer": {"asked": "this"},
        }
    },
    "vlAliases": ["newcomer@nimbus.example", "+1 555 0100"],
    "imAliases": ["newcomer@nimbus.example"],
}


def masked(text):
    """A line without what differs from run to run, or what the error's own text looks like."""
    text = re.sub(r"\(\d+\.\d{3} seconds\)", "(N seconds)", text)
    return re.sub(r"(\.layer setup: ).*\basked=this;.*( \(N seconds\))", r"\1AN ERROR\2", text)


class InstalledAgent(unittest.TestCase):
    build = None
    plugins = ()

    @classmethod
    def setUpClass(cls):
        cls.folder = Path(tempfile.mkdtemp(prefix="installed-agent-"))
        # Three first logins side by side, each on a machine of its own, so that the two minutes pass once.
        cls.logins = [
            Login(cls, "none", []),
            Login(cls, "one", [LABEL]),
            Login(cls, "two", ["org.example.other", LABEL]),
        ]
        started = time.monotonic()
        for login in cls.logins:
            login.start()
        for login in cls.logins:
            login.libraries = login.loaded_after_the_last_service()
        for login in cls.logins:
            login.status = login.process.wait(timeout=200)
            login.seconds = time.monotonic() - started
            login.first_records = login.records_up_to("exiting")

    @classmethod
    def tearDownClass(cls):
        for login in cls.logins:
            for process in (login.preferences, login.neighbour):
                process.kill()
                process.wait()
            login.machine.stop()
        cls.folder.rmdir()

    def login(self, name):
        return next(login for login in self.logins if login.name == name)

    def test_the_exit_status_is_zero_after_the_two_minutes(self):
        for login in self.logins:
            with self.subTest(login.name):
                self.assertEqual(login.status, 0)
                self.assertGreaterEqual(login.seconds, 120)

    def test_every_record_has_the_install_facility_and_severity_error(self):
        for login in self.logins:
            with self.subTest(login.name):
                self.assertTrue(login.first_records)
                self.assertEqual({record[:2] for record in login.first_records}, {AGENT_PRIORITY})

    def test_the_records_come_in_order(self):
        for login in self.logins:
            with self.subTest(login.name):
                self.assert_records_of_a_whole_run(login)

    def assert_records_of_a_whole_run(self, login):
        texts = [masked(text) for _, _, text in login.first_records]
        self.assertEqual(texts[:3], ["Self destructing...", "Killing onlineaccounts",
                                     f"Enabling post-login services for account {ACCOUNT}"])
        begin = texts.index("Vidlink: 2 aliases")
        self.assertEqual(texts[begin + 1], "Chatter: 1 aliases")
        linger = texts.index("delaying exit by two minutes")
        middle, end = texts[begin + 2 : linger], texts[linger + 1 :]
        # These two services are turned on ten seconds after the others, side by side, and so during the linger.
        self.assertEqual(sorted(end[:-1]), [f"Enabling Nimbus service 'com.corvid.nimbus.service.{name}'"
                                            for name in ("calendars", "reminders")])
        self.assertEqual(end[-1], "exiting")
        # Jobs run beside one another: only each delegate's own two lines have an order.
        pairs = [
            (f"setting up com.corvid.{name}", f"com.corvid.{name} {outcome} (N seconds)")
            for name, outcome in (
                ("chatter", "setup+chosen: completed"), ("storefront", "setup: completed"),
                ("vidlink", "setup+chosen: completed"),
                ("gcc.c", "setup: completed"), ("gcc.frozen", "setup: completed"), ("gcc.layer", "setup: AN ERROR"),
                ("clang.c", "setup: completed"), ("clang.frozen", "setup: completed"), ("clang.layer", "setup: AN ERROR"))
        ]
        self.assertEqual(sorted(middle), sorted(line for pair in pairs for line in pair))
        for first, second in pairs:
            self.assertLess(middle.index(first), middle.index(second))

    def test_without_an_argument_the_own_file_is_removed(self):
        login = self.login("none")
        self.assertFalse(login.launch_agent(LABEL).exists())
        self.assertFalse(any("Failed to remove" in text for _, _, text in login.first_records))

    def test_with_one_argument_its_file_is_removed(self):
        self.assertFalse(self.login("one").launch_agent(LABEL).exists())

    def test_with_two_arguments_the_first_ones_file_is_removed(self):
        login = self.login("two")
        self.assertTrue(login.launch_agent(LABEL).exists())
        self.assertFalse(login.launch_agent("org.example.other").exists())

    def test_the_preference_process_is_ended_and_no_other(self):
        for login in self.logins:
            with self.subTest(login.name):
                self.assertEqual(login.preferences.wait(timeout=60), -signal.SIGKILL)
                self.assertIsNone(login.neighbour.poll(), "its name only begins like the other's")

    def test_the_replay_item_is_gone(self):
        for login in self.logins:
            with self.subTest(login.name):
                shown = login.machine.run(["/usr/local/bin/welcomer", "replay", "show"], user=True)
                self.assertEqual(shown.returncode, 1, shown)

    def test_without_a_session_bus_no_library_of_one_is_loaded(self):
        for login in self.logins:
            with self.subTest(login.name):
                self.assertIn("/libc.so", login.libraries)
                for name in ("/libgio-", "/libgoa-", "/libsecret-"):
                    self.assertNotIn(name, login.libraries)

    def test_of_the_desktops_libraries_the_run_loops_alone_is_loaded(self):
        for login in self.logins:
            with self.subTest(login.name):
                self.assertIn("/libglib-2.0.so", login.libraries)
                for name in ("/libgio-2.0.so", "/libgoa-1.0.so", "/libsecret-1.so"):
                    self.assertNotIn(name, login.libraries)

    def test_a_second_login_ends_at_once(self):
        login = self.login("none")
        before = len(login.machine.log_records("wlnimbussetup"))
        again = login.machine.run(login.program, user=True, timeout=60)
        self.assertEqual((again.returncode, again.stdout, again.stderr), (0, "", ""))
        texts = [text for _, _, text in login.records_up_to("exiting", before)]
        self.assertEqual(texts[0], "Self destructing...")
        self.assertRegex(texts[1], rf"^Failed to remove wlnimbussetup plist for {machine.USER}: .+")
        self.assertRegex(texts[2], r"^Failed to find replay keychain item: -?[1-9]\d*$")
        self.assertEqual(texts[3:], ["exiting"])


class Login:
    """One user's machine, from the setup application's hand-over to the agent's start."""

    def __init__(self, test, name, arguments):
        self.name = name
        self.machine = machine.Machine(test.folder / name)
        self.machine.install(test.build)
        plugin_folder = self.machine.root / "System/Library/CoreServices/FirstRunPlugins"
        plugin_folder.mkdir(parents=True)
        for plugin in test.plugins:
            copy = shutil.copytree if Path(plugin).is_dir() else shutil.copy
            copy(plugin, plugin_folder / Path(plugin).name)
        self.machine.start_system_log()
        replay = self.machine.root / "tmp/replay.plist"
        replay.write_bytes(plistlib.dumps(REPLAY))
        replay.chmod(0o644)
        stored = self.machine.run(
            ["/usr/local/bin/welcomer", "replay", "store", "--account", ACCOUNT, "--file", "/tmp/replay.plist",
             "--bundle", "/usr/local/share/welcomer/setup-bundle"], user=True)
        if stored.returncode != 0:
            raise AssertionError(f"storing the replay item failed: {stored}")
        definition = plistlib.loads(self.launch_agent(LABEL).read_bytes())
        assert definition["Label"] == LABEL and definition["RunAtLoad"] is True, definition
        assert definition["ProgramArguments"][1:] == [LABEL], definition
        self.program = definition["ProgramArguments"][:1]
        self.arguments = arguments
        if arguments and arguments[0] != LABEL:
            shutil.copy(self.launch_agent(LABEL), self.launch_agent(arguments[0]))
        self.preferences = self.start_named(PREFERENCE_PROCESS)
        self.neighbour = self.start_named(PREFERENCE_PROCESS + "-of-another-kind")

    def start_named(self, name):
        """A process of the user's with a name of its own, which does nothing for longer than the test takes."""
        shutil.copy("/bin/sleep", self.machine.root / "tmp" / name)
        process = self.machine.start([f"/tmp/{name}", "1000"], user=True)
        command = self.machine.root / "proc" / str(process.pid) / "cmdline"
        self.machine.wait_for(lambda: command.read_bytes().startswith(f"/tmp/{name}\0".encode()), f"the process {name}")
        return process

    def records_up_to(self, last, begin=0):
        """The agent's records after the first `begin`, once the system log has written the last one."""
        found = []

        def has_last():
            found[:] = self.machine.log_records("wlnimbussetup")[begin:]
            return found and found[-1][2] == last

        self.machine.wait_for(has_last, f"the record {last!r}")
        return found

    def loaded_after_the_last_service(self):
        last = {f"Enabling Nimbus service 'com.corvid.nimbus.service.{name}'" for name in ("calendars", "reminders")}
        self.machine.wait_for(lambda: last <= {text for _, _, text in self.machine.log_records("wlnimbussetup")},
                              "the services that come last")
        return (self.machine.root / "proc" / str(self.process.pid) / "maps").read_text()

    def launch_agent(self, label):
        return self.machine.home / "Library/LaunchAgents" / f"{label}.plist"

    def start(self):
        self.process = self.machine.start([*self.program, *self.arguments], user=True)


if __name__ == "__main__":
    machine.enter_namespaces()
    InstalledAgent.build, InstalledAgent.plugins = sys.argv[1], sys.argv[2:]
    unittest.main(argv=sys.argv[:1], verbosity=2)
