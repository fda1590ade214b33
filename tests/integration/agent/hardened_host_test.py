#!/usr/bin/env python3
"""What the installed programs do about plug-ins that meddle, lose their handler, or are not fit to be loaded.

usage: hardened_host_test.py BUILD_DIR PLUGIN_DIR [UNITTEST_ARGUMENT ...]
"""

import json
import os
import plistlib
import re
import shutil
import sys
import unittest
from pathlib import Path

sys.path.insert(0, str(Path(__file__).resolve().parents[2] / "support"))
import machine  # noqa: E402

LIBEXEC = "/usr/local/libexec"
AGENT, TOOL = f"{LIBEXEC}/wlnimbussetup", "/usr/local/bin/welcomer"
PLUGIN_FOLDER = "System/Library/CoreServices/FirstRunPlugins"
LINGER = "delaying exit by two minutes"
MARK = "/tmp/guessed"

BUILD, PLUGINS = None, None


class OnAMachine(unittest.TestCase):
    maxDiff = None

    @classmethod
    def setUpClass(cls):
        machine.for_class(cls, BUILD, "hardened-host")
        cls.machine.start_system_log()
        cls.plugins = cls.machine.root / PLUGIN_FOLDER
        cls.plugins.mkdir(parents=True)

    def setUp(self):
        shutil.rmtree(self.plugins)
        self.plugins.mkdir(parents=True)

    def install_plugin(self, source, name):
        return Path(shutil.copy(PLUGINS / f"{source}.ncdplugin", self.plugins / f"{name}.ncdplugin"))

    def records(self):
        return [text for _, _, text in self.machine.log_records("wlnimbussetup")]

    def login(self, responses, last=LINGER):
        """The agent's lines up to this one, without their seconds; what it does then nobody needs to wait for."""
        replay = self.machine.root / "tmp/replay.plist"
        replay.write_bytes(plistlib.dumps({"delegatesResponseDict": {
            "delegates": {f"org.example.{name}": response for name, response in responses.items()}}}))
        replay.chmod(0o644)
        stored = self.machine.run([TOOL, "replay", "store", "--account", "newcomer", "--file", "/tmp/replay.plist",
                                   "--bundle", "/usr/local/share/welcomer/setup-bundle"], user=True)
        self.assertEqual(stored.returncode, 0, stored)
        begin = len(self.records())
        agent = self.machine.start([AGENT], user=True)
        try:
            self.machine.wait_for(lambda: any(text.startswith(last) for text in self.records()[begin:]), f"line {last!r}")
        finally:
            agent.kill()
            agent.wait()
        return [re.sub(r"\(\d+\.\d{3} seconds\)", "(N seconds)", text) for text in self.records()[begin:]]

    def states(self):
        """What the tool says of each entry."""
        listed = self.machine.run([TOOL, "--json", "plugins", "list"], user=True)
        return {plugin["file"]: plugin["state"] for plugin in json.loads(listed.stdout)["plugins"]}


class Meddlers(OnAMachine):
    def test_nobody_ends_the_setup_of_others_by_guessing(self):
        for role in ("guesser", "victim"):
            self.install_plugin("MeddlingPlugin", role)
        lines = self.login({"guesser": MARK, "victim": MARK})
        self.assertTrue((self.machine.root / MARK.lstrip("/")).exists(), "it has guessed")
        self.assertIn("org.example.guesser setup: completed (N seconds)", lines)
        self.assertIn("org.example.victim setup: the victim's own outcome (N seconds)", lines)

    def test_an_identifier_that_changes_takes_nobodys_place(self):
        for role in ("changer", "victim"):
            self.install_plugin("MeddlingPlugin", role)
        (self.machine.root / "tmp/there").write_text("")
        lines = self.login({"changer": "", "victim": "/tmp/there"})
        self.assertEqual([line for line in lines if "changer" in line and not line.startswith("setting up")],
                         ["Nimbus Plugins: 'changer.ncdplugin' has changed its identifier to 'org.example.victim', the "
                          "one on load counts: 'org.example.changer'",
                          "org.example.changer setup: completed (N seconds)"])
        self.assertIn("org.example.victim setup: the victim's own outcome (N seconds)", lines)


    def test_one_that_never_answers_is_waited_for_while_the_others_complete(self):
        self.install_plugin("MeddlingPlugin", "silent")
        self.install_plugin("DroppingPlugin", "good")
        lines = self.login({"silent": "", "good": "called"}, last="org.example.good setup: completed")
        self.assertIn("setting up org.example.silent", lines)
        self.assertNotIn(LINGER, lines)


class Handlers(OnAMachine):
    def test_an_exception_in_a_thread_of_its_own_ends_the_agent(self):
        self.install_plugin("DroppingPlugin", "bad")
        lines = self.login({"bad": "throws in its thread"}, last="ended ")
        self.assertEqual(lines[-1], "ended outside of any call into a plug-in: uncaught exception: thrown in a thread")

    def test_one_that_is_dropped_ends_the_wait(self):
        ways = {"first": "at once", "second": "on another thread", "third": "when it throws", "fourth": "in a copy",
                "fifth": "called"}
        for name in ways:
            self.install_plugin("DroppingPlugin", name)
        lines = self.login(ways)
        outcomes = sorted(line for line in lines if "(N seconds)" in line)
        self.assertEqual(outcomes, [
            "exception in setup response for plugin org.example.third (N seconds): thrown with the handler",
            "org.example.fifth setup: completed (N seconds)",
            "org.example.first setup: handler dropped (N seconds)",
            "org.example.fourth setup: handler dropped (N seconds)",
            "org.example.second setup: handler dropped (N seconds)"])


class Entries(OnAMachine):
    def assert_refused(self, entries, **login):
        """That the agent leaves these out, sets up the good one, and the tool knows the reasons."""
        lines = self.login({"good": "called"}, **login)
        self.assertEqual(sorted(line for line in lines if line.startswith("Nimbus Plugins: ")),
                         sorted(f"Nimbus Plugins: Failed to get principal class for {name}" for name in entries))
        states = self.states()
        self.assertEqual({name: states[name] for name in entries}, entries)
        return lines

    def test_what_is_no_regular_file_is_not_opened(self):
        self.install_plugin("DroppingPlugin", "good")
        os.mkfifo(self.plugins / "pipe.ncdplugin", 0o644)
        os.mknod(self.plugins / "zeroes.ncdplugin", 0o020666, os.makedev(1, 5))
        shown = f"/{PLUGIN_FOLDER}"
        (self.plugins / "zeroes.ncdplugin").chmod(0o644)
        lines = self.assert_refused({"pipe.ncdplugin": f"{shown}/pipe.ncdplugin is no regular file",
                                     "zeroes.ncdplugin": f"{shown}/zeroes.ncdplugin is no regular file"})
        self.assertIn("org.example.good setup: completed (N seconds)", lines)

    def test_a_library_that_is_not_there_as_a_whole_is_not_mapped(self):
        whole = self.install_plugin("DroppingPlugin", "good")
        size = whole.stat().st_size
        entries = {}
        for name, length in (("begun", 4096), ("half", size // 2), ("nearly", size - 1)):
            copy = self.install_plugin("DroppingPlugin", name)
            os.truncate(copy, length)
            entries[copy.name] = f"/{PLUGIN_FOLDER}/{copy.name} is not whole: it has {length} of {size} bytes"
        lines = self.assert_refused(entries)
        self.assertIn("org.example.good setup: completed (N seconds)", lines)

    def test_a_library_that_others_may_change_is_not_loaded(self):
        self.install_plugin("DroppingPlugin", "good")
        shown = f"/{PLUGIN_FOLDER}"
        entries = {}
        for name, owner, group, mode, reason in (
                ("all", 0, 0, 0o646, "everybody may write {}"), ("group", 0, 12345, 0o664, "group 12345 may write {}"),
                ("other", 12345, 0, 0o644, "{} belongs to user 12345")):
            copy = self.install_plugin("DroppingPlugin", name)
            os.chown(copy, owner, group)
            copy.chmod(mode)
            entries[copy.name] = reason.format(f"{shown}/{copy.name}")
        lines = self.assert_refused(entries)
        self.assertIn("org.example.good setup: completed (N seconds)", lines)
        doctor = json.loads(self.machine.run([TOOL, "--json", "doctor"], user=True).stdout)
        wrong = {each["text"] for each in doctor["checks"] if each["state"] == "wrong"}
        self.assertLessEqual(set(entries.values()), wrong)

    def test_in_a_folder_that_others_may_write_nothing_is_loaded(self):
        self.install_plugin("DroppingPlugin", "good")
        for mode in (0o777, 0o1777):
            self.plugins.chmod(mode)
            lines = self.assert_refused({"good.ncdplugin": f"everybody may write /{PLUGIN_FOLDER}"})
            self.assertNotIn("setting up org.example.good", lines)

    def test_a_folder_with_a_library_is_held_to_the_same(self):
        self.install_plugin("DroppingPlugin", "good")
        shown = f"/{PLUGIN_FOLDER}"
        for name in ("info", "library", "whole"):
            folder = self.plugins / f"{name}.ncdplugin"
            folder.mkdir()
            shutil.copy(PLUGINS / "DroppingPlugin.ncdplugin", folder / f"{name}.so")
            (folder / "Info.plist").write_bytes(plistlib.dumps({"Executable": f"{name}.so"}))
        (self.plugins / "info.ncdplugin/Info.plist").chmod(0o666)
        (self.plugins / "library.ncdplugin/library.so").chmod(0o777)
        os.truncate(self.plugins / "whole.ncdplugin/whole.so", 5000)
        size = (PLUGINS / "DroppingPlugin.ncdplugin").stat().st_size
        self.assert_refused({
            "info.ncdplugin": f"everybody may write {shown}/info.ncdplugin/Info.plist",
            "library.ncdplugin": f"everybody may write {shown}/library.ncdplugin/library.so",
            "whole.ncdplugin": f"{shown}/whole.ncdplugin/whole.so is not whole: it has 5000 of {size} bytes"})


if __name__ == "__main__":
    machine.enter_namespaces()
    BUILD, PLUGINS = sys.argv[1], Path(sys.argv[2])
    unittest.main(argv=[sys.argv[0], *sys.argv[3:]])
